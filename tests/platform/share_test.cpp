// Shares on a running appliance: records, rights from the lists, files that change, homes.
#include "vexo/share.h"

#include "support/testing.h"

namespace {

constexpr const char* kDefinitions = "/etc/vexo/shares.conf";

// The root of a share, or "" with the platform error when there is none.
std::string rootOf(const char* name) {
    PVEXOSHARE share = nullptr;
    const int result = VEXOShareGet(name, &share);
    EXPECT_EQ(result == 0, share != nullptr);
    std::string root = share == nullptr ? "" : share->szPath;
    VEXOShareFree(share);
    return root;
}

std::string allNames() {
    const PVEXOSHAREDB db = VEXOShareDBOpen();
    if (db == nullptr) return "no database";
    std::string names;
    PVEXOSHARE share = nullptr;
    while (VEXOShareDBCursorGet(db, &share) == 0) names += std::string(share->szName) + '|';
    VEXOShareFree(share);
    VEXOShareDBClose(db);
    return names;
}

class ShareTest : public ApplianceTest {
 protected:
    void define(const std::string& text) { writeRootFile(kDefinitions, text); }
};

std::string textOf(const char* name) {
    PVEXOSHARE share = nullptr;
    if (VEXOShareGet(name, &share) != 0) return "none";
    std::string text = std::string(share->szName) + " no " + joined(share->naList) + " rw " + joined(share->rwList) +
                       " ro " + joined(share->roList);
    for (const auto number : {static_cast<int>(share->fStatus), static_cast<int>(share->mask), share->ftp, share->acl,
                              share->synced, share->index}) {
        text += ' ' + std::to_string(number);
    }
    VEXOShareFree(share);
    return text;
}

TEST_F(ShareTest, RecordsAreFoundWithoutCase) {
    addShare("Music",
             "valid users = alice, @users\ninvalid users = bob\nwrite list = \"DOM\\carl x\"\nbrowseable = no\n"
             "vexo:restriction = 0x5\nVexo : Encrypted = yes\nvexo:ftp = 2\nvexo:acl = 1\nvexo:synced = true\n");
    addShare("plain", "vexo:index = on\n");
    EXPECT_EQ(textOf("mUSIC"), "Music no bob| rw DOM\\carl x| ro alice|@users| 3 5 2 1 1 0");
    EXPECT_EQ(textOf("plain"), "plain no  rw  ro *| 0 0 0 0 0 1");
    EXPECT_EQ(rootOf("music"), shareRoot("Music"));
    SDK::Share* loaded = SDK::Share::LoadShare("mUSIC");
    ASSERT_NE(loaded, nullptr);
    EXPECT_TRUE(loaded->GetStatus() == 3 && loaded->GetFTPPrivilege() == 2 && loaded->GetACLEnable());
    SDK::Share::Release(loaded);
    EXPECT_EQ(VEXOS2SIsSyncedShare("music"), 1);
    for (const char* name : {"plain", "none"}) EXPECT_EQ(VEXOS2SIsSyncedShare(name), 0);
}

TEST_F(ShareTest, FailuresSayWhy) {
    for (const char* name : {"none", "", "photo/x"}) {
        EXPECT_EQ(rootOf(name), "");
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_SHARE_MISSING) << name;
        EXPECT_EQ(SDK::Share::LoadShare(name), nullptr);
    }
    // Every list of a record that can fail to be made, fails once.
    for (int nth = 1; nth <= 5; ++nth) {
        const char* operation = nth <= 3 ? "VLIBCSzListAlloc" : "VLIBCSzListPush";
        vexo::gate::fail(operation, VEXO_ERR_GENERAL, ENOMEM, nth <= 3 ? nth : nth - 3);
        EXPECT_EQ(rootOf("photo"), "") << nth;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    }
    fs::remove(systemRoot() + kDefinitions);
    EXPECT_EQ(rootOf("photo"), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_EQ(allNames(), "no database");
    EXPECT_LT(VEXOShareIsShareRecycle("/v/photo/#recycle"), 0);
}

TEST_F(ShareTest, MalformedSectionsDoNotHideTheOthers) {
    define(
        "[a]\npath = /v//a/\n[no path]\nread only = no\n[deep]\npath = /v/../deep\n[a/b]\npath = /v/b\n"
        "[mask]\npath = /v/m\nvexo:restriction = 0x\n[off]\navailable = no\n[z\x07]\n[z\nx\n"
        "[global]\nnonsense\n[b]\npath = /v/b\n");
    announceLog("share [no path] is left out: no path");
    announceLog("share [deep] is left out: the path \"/v/../deep\" is not that of a folder below \"/\"");
    announceLog("share [a/b] is left out: no name for a share");
    announceLog("share [mask] is left out: \"0x\" is no number or too large");
    announceLog("share [z\\x07] is left out: no name for a share");
    announceLog("share definitions: line 15: a section without a name");
    announceLog("share definitions: line 18: neither a section nor an option");
    EXPECT_EQ(allNames(), "a|b|");
    EXPECT_EQ(rootOf("a"), "/v/a") << "and said once";
}

// No access beats read-write beats read-only.
TEST_F(ShareTest, RightsFromLists) {
    addUser("erin", 20030, kUsersGid);
    addGroup("Editors", 20130, {"erin"});
    for (const auto& [options, alice, bob, erin] : Rows<const char*, int, int, int>{
             row("", 1, 1, 1), row("read only = no\n", 2, 2, 2),
             row("valid users = ALICE, @editors\nwrite list = bob\n", 1, 2, 1),
             row("valid users = +Editors\nread list = alice\nread only = no\n", 1, 0, 2),
             row("valid users = &Editors\ninvalid users = +users\n", 0, 0, 0),
             row("invalid users = bob @none\nwrite list = bob @Editors\nread only = yes\n", 1, 0, 2),
             row("valid users = \"\"\nread only = no\n", 0, 0, 0),
             row("write list = erin\nread list = erin alice\nvalid users = @users\ninvalid users = @\"no such\"\n", 1,
                 1, 2)}) {
        addShare("music", options);
        SDK::Share* share = SDK::Share::LoadShare("music");
        ASSERT_NE(share, nullptr);
        for (const auto& [user, right] :
             Rows<const char*, int>{row("alice", alice), row("bob", bob), row("erin", erin), row("", 0)})
            EXPECT_EQ(share->GetAccessRight(user), right) << options << user;
        SDK::Share::Release(share);
    }
}

// The files are read once, and again when one of them, an included one too, is another.
TEST_F(ShareTest, ChangesAreSeen) {
    writeRootFile("/etc/vexo/more.conf", "[b]\npath = /v/b\n");
    define("[a]\npath = /v/a\n[global]\ninclude = /etc/vexo/more.conf\n");
    EXPECT_EQ(allNames(), "a|b|");
    writeFile(systemRoot() + "/etc/vexo/more.conf", "[d]\npath = /v/d\n");
    EXPECT_EQ(allNames(), "a|d|") << "same inode and size, within one tick of the clock";
    define("[e]\npath = /v/e\n[global]\ninclude = later.conf\n");
    fs::last_write_time(systemRoot() + kDefinitions, fs::file_time_type::clock::now() - std::chrono::hours(1));
    announceLog("share definitions: line 4: the included file cannot be read");
    EXPECT_EQ(allNames(), "e|");
    EXPECT_EQ(allNames(), "e|");
    writeRootFile("/etc/vexo/later.conf", "[f]\npath = /v/f\n");
    EXPECT_EQ(allNames(), "e|f|") << "a relative name lies beside the definitions";
    // A cursor keeps what it began, and reuses its record.
    const PVEXOSHAREDB db = VEXOShareDBOpen();
    PVEXOSHARE share = nullptr;
    ASSERT_EQ(VEXOShareDBCursorGet(db, &share), 0);
    const PVEXOSHARE first = share;
    writeRootFile("/etc/other.conf", "[g]\npath = /v/g\n");
    setSetting("share_definitions", "/etc/other.conf");
    EXPECT_EQ(allNames(), "g|");
    ASSERT_EQ(VEXOShareDBCursorGet(db, &share), 0);
    EXPECT_EQ(share, first);
    EXPECT_STREQ(share->szName, "f");
    VEXOShareFree(share);
    VEXOShareDBClose(db);
}

TEST_F(ShareTest, RootsWithVariablesFollowTheUser) {
    addUser("DOM\\dora", 20031, kUsersGid);
    addUser("..", 20032, kUsersGid);
    define("[own]\npath = /v/%U\n[all]\npath = /v/%S.%g.%u\n[dom]\npath = /%D/%U\n");
    for (const auto& [user, own, all, dom, names] :
         Rows<const char*, const char*, const char*, const char*, const char*>{
             row("alice", "/v/alice", "/v/all.users.alice", "", "own|all|"),
             row("DOM\\dora", "/v/dora", "/v/all.users.DOM\\dora", "/DOM/dora", "own|all|dom|"),
             row("..", "", "/v/all.users...", "", "all|"), row("nobody known", "", "/v/all..", "", "all|")}) {
        setenv("REMOTE_USER", user, 1);
        EXPECT_EQ(rootOf("own"), own) << user;
        EXPECT_EQ(rootOf("all"), all) << user;
        EXPECT_EQ(rootOf("dom"), dom) << user;
        EXPECT_EQ(allNames(), names) << user;
        EXPECT_EQ(VEXOShareIsShareRecycle("/v/alice/#recycle"), std::string(user) == "alice");
    }
    unsetenv("REMOTE_USER");
    EXPECT_EQ(rootOf("own"), geteuid() == 0 ? "/v/root" : "") << "without a request, the effective user";
    define("[photo]\npath = /v/photo\n");
    EXPECT_EQ(VEXOShareIsShareRecycle("/v/photo/#recycle"), 1);
    for (const char* path : {"/v/photo/#recycle/", "/v/photo/x/#recycle", "/v/photo/#Recycle"})
        EXPECT_EQ(VEXOShareIsShareRecycle(path), 0) << path;
}

TEST_F(ShareTest, Homes) {
    const std::string home = shareRoot("homes") + "/alice";
    char path[4096];
    const auto ask = [&](const char* user, size_t size = sizeof path) {
        return VEXOServiceHomePathGet(user, path, static_cast<int>(size)) == 0 ? 0 : VLIBCErrGet();
    };
    EXPECT_EQ(ask("alice"), VEXO_ERR_MISSING);
    EXPECT_FALSE(fs::exists(home)) << "asking makes nothing";
    writeFile(home, "");
    EXPECT_EQ(ask("alice"), VEXO_ERR_MISSING);
    fs::remove(home);
    makeFolder(home);
    EXPECT_EQ(ask("alice"), 0);
    EXPECT_EQ(path, home);
    EXPECT_EQ(ask("alice", home.size()), VEXO_ERR_GENERAL) << "never cut";
    EXPECT_STREQ(path, "");
    for (const char* user : {"nobody known", "..", "", "alice/../bob"}) EXPECT_EQ(ask(user), VEXO_ERR_USER_MISSING);
    for (const char* value : {"YES", "yes", "no", ""}) {
        setSetting("userhome_enable", value);
        EXPECT_EQ(VEXOServiceUserHomeIsEnabled(AUTH_DOMAIN, 0) == 1, strlen(value) == 3) << value;
        EXPECT_EQ(ask("alice") == 0, strlen(value) == 3);
    }
    setSetting("userhome_enable", "yes");
    define("[photo]\npath = /v/photo\n");
    EXPECT_EQ(VEXOServiceUserHomeIsEnabled(AUTH_LOCAL, kAliceUid), 0) << "without the share";
}

}  // namespace
