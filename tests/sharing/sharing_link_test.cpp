// A visitor's way: the link's row, the log-in, the cookie, the page.
#include "orvel/sharing_link.h"

#include "sharing/link_lookup.h"
#include "sharing/visitor_fixture.h"
#include "support/sqlite.h"
#include "vexo/auto_block.h"

using OrvelLogin::FolderSharingLoginManager;

namespace {

using Texts = std::vector<std::string>;

class SharingLinkTest : public VisitorTest {
 protected:
    void SetUp() override {
        VisitorTest::SetUp();
        makeFolder(systemRoot() + "/var/lib/vexo");
        makeFolder(fs::path(database()).parent_path());
    }
    static std::string database() { return systemRoot() + "/usr/vexo/etc/pexlander/pxsharing.db"; }
    static std::string pathOf(const std::string& link) {
        setenv("HTTP_FOLDER_SHARING", link.c_str(), 1);
        VEXO::WebCGI cgi;
        return FolderSharingLoginManager().GetSharingFolderPath(cgi);
    }
    static std::string headerOf(VEXO::WebCGI& cgi) {
        testing::internal::CaptureStdout();
        cgi.WriteHeader("x");
        fflush(stdout);
        return testing::internal::GetCapturedStdout();
    }
    FolderSharingLoginManager manager;
};

TEST_F(SharingLinkTest, TheRowOfALink) {
    const long now = time(nullptr);
    const auto insert = [](const std::string& id, const std::string& values) {
        return "INSERT INTO sharingLinks VALUES('" + id + "'," + values + ");";
    };
    sql(database(),
        "CREATE TABLE sharingLinks(linkID TEXT, uid TEXT, filepath TEXT, filename TEXT, password TEXT, AvailDate TEXT, "
        "ExpDate TEXT);" +
            insert("open", "'alice','/photo','f','p','0','0'") +
            insert("it''s \"", "'alice','/quoted','f','p','0','0'") +
            insert("future", "'alice','/photo','f','p','" + std::to_string(now + 1000) + "','99999999999'") +
            insert("noUser", "NULL,'/photo','f','p','0','0'") + insert("noPath", "'alice',NULL,'f','p','0','0'") +
            insert("noBegin", "'alice','/photo','f','p',NULL,'0'") +
            insert("noEnd", "'alice','/photo','f','p','0',NULL") +
            insert("nothing", "'alice','/photo','f','p',NULL,'10'"));
    for (auto [link, path, log] : rowsOf<std::string, std::string, Texts>("sharing/rows_of_links")) {
        EXPECT_EQ(pathOf(link), path) << link;
        for (std::string& text : log) text.insert(0, "orvellogin:# ");
        EXPECT_EQ(takeLogTexts(), log) << link;
    }

    // The header comes before the parameter; without both nothing is asked.
    setenv("QUERY_STRING", "FOLDER_SHARING=open", 1);
    EXPECT_EQ(pathOf("noPath"), "");
    unsetenv("HTTP_FOLDER_SHARING");
    VEXO::WebCGI cgi;
    EXPECT_EQ(manager.GetSharingFolderPath(cgi), "/photo");
    unsetenv("QUERY_STRING");
    VEXO::WebCGI none;
    vexo::gate::reset();
    EXPECT_TRUE(manager.GetSharingFolderPath(none).empty() && !manager.isAuthorized(none));
    EXPECT_EQ(vexo::gate::calls("VEXODBConnect"), 0);
}

TEST_F(SharingLinkTest, DatabasesThatCannotBeAsked) {
    const Texts unconnected = {"orvellogin:# Failed to connect to database", "orvellogin:# DB Query failed",
                               "orvellogin:# Sharing download DBquery failed"};
    EXPECT_EQ(pathOf("x"), "");
    EXPECT_EQ(takeLogTexts(), unconnected);
    EXPECT_FALSE(fs::exists(database())) << "never made";
    writeFile(database(), "no database at all, but long enough to be taken for the header of one.......");
    EXPECT_EQ(pathOf("it's"), "");
    EXPECT_EQ(
        takeLogTexts(),
        (Texts{"orvellogin:# Failed to exec [SELECT * FROM sharingLinks WHERE linkID = 'it''s' LIMIT 1;] (file is "
               "not a database)",
               unconnected[1], unconnected[2]}));
    fs::remove(database());
    sql(database(), "CREATE TABLE sharingLinks(linkID TEXT)");
    EXPECT_EQ(orvel::sharedPathOf(std::string(2 << 20, '\'')), "");
    EXPECT_EQ(takeLogTexts(), (Texts{"orvellogin:# faild to fetch query result", unconnected[2]}));
}

TEST_F(SharingLinkTest, LoggedInByACookieOfTheLink) {
    VEXO::WebCGI first;
    char user[64] = "untouched";
    _tag_confirm_policy policy = {.flags = 15, .keepAccessTime = 0};
    EXPECT_EQ(manager.isAuthorized(&first, user, sizeof user, &policy, CGI_POSITION_FILE_MANAGER, "L"), -5);
    EXPECT_STREQ(user, "untouched");
    EXPECT_EQ(manager.GetLoginUserName(), "");
    ASSERT_TRUE(manager.folderSharingLogin(first, "L", "alice"));
    ASSERT_TRUE(manager.folderSharingLogin(first, "K", "carol"));
    EXPECT_EQ(manager.GetLoginUserName(), "carol");
    EXPECT_EQ(secondsSlept, 2U);

    const std::string header = headerOf(first), lines = records();
    const auto sessionOf = [&](const std::string& line) { return lines.substr(lines.find(line) + line.size(), 13); };
    const std::string alice = sessionOf("10.0.0.5,alice,"), carol = sessionOf("10.0.0.5,carol,");
    const std::string kAttributes = "; Path=/; HttpOnly; SameSite=Lax\r\n";
    EXPECT_EQ(header, "Set-Cookie: L=" + alice + kAttributes + "Set-Cookie: K=" + carol + kAttributes +
                          "Content-Type: x\r\n\r\n");

    setenv("HTTP_COOKIE", ("L=" + alice + "; K=" + carol).c_str(), 1);
    setenv("HTTP_FOLDER_SHARING", "K", 1);
    VEXO::WebCGI second;
    FolderSharingLoginManager later;
    EXPECT_EQ(later.isAuthorized(&second, user, sizeof user, &policy, CGI_POSITION_FILE_MANAGER, "K"), 2);
    EXPECT_TRUE(later.isAuthorized(second, "L"));
    EXPECT_EQ(later.GetLoginUserName(), "alice");
    EXPECT_TRUE(later.isAuthorized(second));
    EXPECT_EQ(later.GetLoginUserName(), "carol");
    EXPECT_TRUE(later.folderSharingLogin(second, "L", "bob")) << "logged in already: nothing new";
    EXPECT_EQ(later.GetLoginUserName(), "alice");
    EXPECT_EQ(secondsSlept, 2U);

    setenv("HTTP_COOKIE", ("L=\x01" + alice + "\n; K=").c_str(), 1);
    VEXO::WebCGI hostile;
    EXPECT_FALSE(later.isAuthorized(hostile, "L"));
    EXPECT_EQ(later.isAuthorized(&hostile, user, sizeof user, &policy, CGI_POSITION_FILE_MANAGER, "K"), -5);

    // A check that fails leaves what stands in the buffer: the name of a user who may no longer pass.
    writeRootFile("/etc/vexo/applications", "VEXO.QDS.App.Quorvane3.Instance: carol\n");
    user[0] = '\0';
    EXPECT_EQ(later.isAuthorized(&second, user, sizeof user, &policy, CGI_POSITION_FILE_MANAGER, "L"), -2);
    EXPECT_EQ(later.GetLoginUserName(), "alice");
    EXPECT_EQ(later.isAuthorized(&second, nullptr, 0, &policy, CGI_POSITION_FILE_MANAGER, "K"), -4);
}

TEST_F(SharingLinkTest, RefusedLogins) {
    VEXO::WebCGI cgi;
    _tag_login_params params = {
        .user = "alice", .password = "p", .service = "s", .allowedKinds = 15, .neverExpires = 0};
    char session[8] = {};
    const auto login = [&](const char* user, int kinds, const char* log) {
        if (log != nullptr) announceLog(log);
        params.user = user;
        params.allowedKinds = kinds;
        return manager.login(&cgi, session, sizeof session, &params, "L");
    };
    addUser("DOM\\adam", 30001, kAdminGid);  // an administrator: needs both kinds
    for (const auto& [user, kinds] :
         {std::pair{"alice", 13}, {"carol", 14}, {"DOM\\dora", 11}, {"dan@ldap", 7}, {"DOM\\adam", 4}})
        EXPECT_EQ(login(user, kinds, "LOGIN_ERR_INVALID"), -3) << user;
    for (const auto& [user, kinds] : {std::pair{"alice", 2}, {"carol", 1}, {"DOM\\dora", 4}, {"dan@ldap", 8}}) {
        EXPECT_EQ(login(user, kinds, nullptr), 1) << user;  // a user who is not known is not logged
    }
    vexo::gate::fail("VEXOGroupIsAdminGroupMemEx", VEXO_ERR_GENERAL, EIO, 1);
    EXPECT_EQ(login("bob", 2, "VEXOGroupIsAdminGroupMem(bob) failed. [0x8100 "), 1) << "counts as no administrator";
    vexo::gate::fail("VEXO::WebCGI::AddCookieToHeader", 0, 0, 1);
    EXPECT_EQ(login("alice", 15, ") AddCookieToHeader failed."), 1);
    EXPECT_EQ(std::string(session).size(), 7U) << "cut to its buffer";
    EXPECT_EQ(login(nullptr, 15, ") Bad parameter."), -4);
    params.password = nullptr;
    EXPECT_EQ(login("alice", 15, ") Bad parameter."), -4);
    params.password = "p";
    announceLog(") Bad parameter.");
    EXPECT_EQ(login("a,b", 15, "VexoCgiLoginAddUser failed."), -4);

    setenv("REMOTE_ADDR", "10.0.0.66", 1);
    setSetting("autoblock_attempts", "2");
    for (int i = 0; i < 2; ++i) {
        manager.folderSharingFailLoginSet();
        EXPECT_EQ(login("alice", 15, nullptr), 1) << "one failure, which success forgets";
    }
    for (int i = 0; i < 2; ++i) manager.folderSharingFailLoginSet();
    EXPECT_EQ(login("alice", 15, "VEXOAutoBlockIsDeniedIP"), -3);
    unsetenv("REMOTE_ADDR");
    EXPECT_EQ(login("alice", 15, "Failed to get client ip."), -4);
    announceLog("Failed to get client ip.");
    manager.folderSharingFailLoginSet();
}

TEST_F(SharingLinkTest, ThePageOnStandardOutput) {
    const std::string desktop = systemRoot() + "/usr/vexo/vexoman/webman";
    makeFolder(desktop);
    setenv("QUERY_STRING", "tunnel=/t{path}&noCache=", 1);
    VEXO::WebCGI cgi;
    ASSERT_TRUE(cgi.AddCookieToHeader("/", "L", "s"));
    const auto page = [&](VEXO::WebCGI& request) {
        testing::internal::CaptureStdout();
        manager.WriteWebPage(request, "c'h</script>", "/photo/a'b\\c\"d<{tunnel}>\n&\xFF");
        return testing::internal::GetCapturedStdout();
    };
    const std::string plain = page(cgi), version = std::to_string(statusOf(desktop).st_mtime);
    EXPECT_TRUE(plain.starts_with(
        "Set-Cookie: L=s; Path=/; HttpOnly; SameSite=Lax\r\nContent-Type: text/html; charset=\"UTF-8\"\r\n\r\n"
        "    <!DOCTYPE html>    <html>\n"));
    EXPECT_TRUE(plain.ends_with("<body>\n</body></html>\n"));
    for (const std::string& part :
         {"var g_FolderPath = '/photo/a\\'b\\\\c\\\"d<{tunnel}>\n&\xFF';" + std::string(),
          std::string("<title>a'b\\c\"d<{tunnel}>\n&\xFF</title>"), std::string("var g_MD5 = 'c'h</script>';"),
          "src='/t{path}/webman/vexodefs.cgi?v=" + version + "'", "FolderSharingLoader.js?" + version + "'"})
        EXPECT_NE(plain.find(part), std::string::npos) << part;

    setenv("QUERY_STRING", "noCache=1", 1);
    VEXO::WebCGI fresh;
    const std::string busted = page(fresh), before = "FolderSharingLoader.js?" + version;
    const int number = atoi(busted.c_str() + busted.find(before) + before.size());
    EXPECT_TRUE(number >= 1 && number <= 1000) << number;
    EXPECT_NE(busted.find("style.css?v=" + version + std::to_string(number) + "'"), std::string::npos);
    EXPECT_NE(busted.find("var g_Version = '" + version + "'"), std::string::npos) << "no suffix here";
}

}  // namespace
