// The program operation, run as a web server runs it.
#include "apps/program.h"
#include "support/testing.h"
#include "text.h"

using orvel::cgi::percentEncode;

namespace {

class OperationCgi : public ApplianceTest {
 protected:
    static CgiReply ask(const std::string& user, const std::string& form, const std::string& method = "POST") {
        if (method == "GET") return CgiReply(runCgi(PROGRAM_OPERATION, user, method, form));
        return CgiReply(
            runCgi(PROGRAM_OPERATION, user, method, "", form, {{"CONTENT_TYPE", "application/x-www-form-urlencoded"}}));
    }
    static int code(const CgiReply& reply) { return reply.json["error"]["code"].asInt(); }
    static int mkdir(const std::string& user, const std::string& path, const std::string& more = "") {
        return code(ask(user, "action=mkdir&path=" + percentEncode(path) + more));
    }
    static int rename(const std::string& user, const std::string& path, const std::string& name) {
        return code(ask(user, "action=rename&path=" + percentEncode(path) + "&name=" + percentEncode(name)));
    }
};

TEST_F(OperationCgi, RequestsAreTakenStrictly) {
    EXPECT_EQ(ask("", "action=mkdir&path=/photo/x").status, 401);
    for (const char* form : {"", "action=burn&path=/photo/x", "action=mkdir&path_raw=/photo/%25zz"}) {
        EXPECT_EQ(ask("alice", form).status, 400) << form;
    }
    EXPECT_EQ(ask("alice", "action=mkdir&path=/photo/x", "GET").status, 400) << "a link must change nothing";
    EXPECT_FALSE(fs::exists(shareRoot("photo") + "/x"));
    // However late a parameter shows to be wrong.
    for (const char* form :
         {"action=mkdir&path=", "action=rename&path=/photo", "action=copy&path=/photo/x&target=/photo&conflict=x"}) {
        const CgiReply reply = ask("alice", form);
        EXPECT_TRUE(reply.status == 400 && code(reply) == 400) << form;
    }
}

TEST_F(OperationCgi, FoldersAreMadeAsTheUser) {
    SKIP_WITHOUT_ROOT();
    const std::string root = addShare("photo", "read only = no\nvalid users = alice, carol\nread list = bob\n");
    const std::string fat = addShare("usb", "read only = no\n");
    addMount(fat, "vfat");
    makeFolder(root + "/root's", 0755);
    makeFolder(root + "/old/@tmp", 0777);
    fs::create_symlink("/tmp", root + "/outside");
    for (const auto& [user, path, more, code] :
         Rows<std::string, std::string, std::string, int>{row("alice", "/photo/a", "", 0),
                                                          row("alice", "/photo/a/", "", 414),
                                                          row("alice", "/photo/p/q/r", "", 408),
                                                          row("alice", "/photo/p/q/._r", "&parents=true", 418),
                                                          row("alice", "/photo/p/q/r", "&parents=true", 0),
                                                          row("carol", "/photo/c", "", 0),
                                                          row("bob", "/photo/b", "", 407),
                                                          row("bob", "/home/b", "", 0),
                                                          row("alice", "/photo/root's/x", "", 407),
                                                          row("alice", "/photo/outside/x", "", 407),
                                                          row("alice", "/photo/@tmp", "", 418),
                                                          row("alice", "/photo/p/@tmp/x", "&parents=true", 418),
                                                          row("alice", "/photo/old/@tmp/x", "", 418),
                                                          row("alice", "/photo/.vexo-part-x", "", 418),
                                                          row("alice", "/photo", "", 400),
                                                          row("alice", "/photo/a/..", "", 418),
                                                          row("alice", "/photo/a:b", "", 418),
                                                          row("alice", "/nowhere/x", "", 408),
                                                          row("alice", "/usb/a|b", "", 419),
                                                          row("alice", "/photo/" + std::string(256, 'n'), "", 412)}) {
        EXPECT_EQ(mkdir(user, path, more), code) << path << more;
    }
    const std::pair<std::string, unsigned> made[] = {{root + "/a", kAliceUid},
                                                     {root + "/p", kAliceUid},
                                                     {root + "/p/q/r", kAliceUid},
                                                     {root + "/c", kCarolUid},
                                                     {shareRoot("homes") + "/bob/b", kBobUid}};
    for (const auto& [path, owner] : made) {
        const struct stat status = statusOf(path);
        EXPECT_TRUE(status.st_uid == owner && status.st_gid == kUsersGid) << path;
        EXPECT_EQ(status.st_mode & 07777, 0755U) << path;
    }
}

TEST_F(OperationCgi, RenamingReplacesNothing) {
    SKIP_WITHOUT_ROOT();
    const std::string root = shareRoot("photo");
    const std::string fat = addShare("usb", "read only = no\n");
    addShare("archive", "read only = no\nvexo:restriction = 2\n");
    addMount(fat, "vfat");
    makeFolder(root + "/folder", 0777);
    makeFolder(root + "/folder/empty", 0777);
    makeFolder(root + "/root's", 0755);
    for (const std::string file : {"/one", "/two", "/root's/f", "/folder/f", "/hidden/@tmp/x"})
        writeFile(root + file, file);
    writeFile(fat + "/f", "x");
    writeFile(shareRoot("archive") + "/f", "x");
    fs::create_symlink("folder", root + "/inside");
    fs::create_symlink("/etc", root + "/outside");
    for (const auto& [user, path, name, code] :
         Rows<std::string, std::string, std::string, int>{row("alice", "/photo/one", "two", 414),
                                                          row("alice", "/photo/folder", "one", 414),
                                                          row("alice", "/photo/one", "one", 0),
                                                          row("alice", "/photo/folder", "folder", 0),
                                                          row("alice", "/photo/one", "", 400),
                                                          row("alice", "/photo/one", "folder/one", 418),
                                                          row("alice", "/photo/one", "@tmp", 418),
                                                          row("alice", "/photo/hidden/@tmp/x", "y", 408),
                                                          row("alice", "/photo/hidden/@tmp", "y", 408),
                                                          row("alice", "/photo/one", ".vexo-part-x", 418),
                                                          row("alice", "/photo/one", "a:b", 418),
                                                          row("alice", "/photo/one", std::string(256, 'n'), 412),
                                                          row("alice", "/photo/missing", "x", 408),
                                                          row("alice", "/photo", "x", 400),
                                                          row("alice", "/photo/folder/..", "x", 418),
                                                          row("alice", "/photo/root's/f", "x", 407),
                                                          row("alice", "/photo/outside/passwd", "x", 407),
                                                          row("bob", "/photo/one", "x", 407),
                                                          row("alice", "/archive/f", "x", 407),
                                                          row("alice", "/usb/f", "a?", 419),
                                                          row("alice", "/photo/inside/f", "g\nh", 0),
                                                          row("alice", "/photo/outside", "link", 0),
                                                          row("alice", "/photo/one", "ONE", 0)}) {
        EXPECT_EQ(rename(user, path, name), code) << path << " to " << name;
    }
    EXPECT_EQ(readFile(root + "/ONE"), "/one");
    EXPECT_EQ(ask("alice", "action=rename&path=/photo/ONE&name=two").json["error"]["path"], "/photo/two");
    EXPECT_EQ(code(ask("alice", "action=subfolders&path=/photo/hidden/@tmp", "GET")), 408);
    EXPECT_EQ(readFile(root + "/two"), "/two");
    EXPECT_EQ(readFile(root + "/folder/g\nh"), "/folder/f");
    EXPECT_EQ(fs::read_symlink(root + "/link"), "/etc");
    const CgiReply raw = ask("alice", "action=rename&path=/photo/two&name_raw=%25FF");
    EXPECT_EQ(raw.json["data"]["path_raw"], "/photo/%FF");
    EXPECT_TRUE(fs::exists(root + "/\xFF"));
}

TEST_F(OperationCgi, SubFoldersOfAFolder) {
    const std::string root = shareRoot("photo");
    for (const char* name : {"/b", "/a", "/a/deep", "/@tmp", "/\xFF"}) makeFolder(root + name);
    writeFile(root + "/file", "x");
    fs::create_symlink("/etc", root + "/outside");
    const CgiReply reply = ask("bob", "action=subfolders&path=/photo", "GET");
    std::vector<std::string> names;
    for (const Json::Value& item : reply.json["data"]["items"]) names.push_back(item["path"].asString());
    EXPECT_EQ(names, (std::vector<std::string>{"/photo/a", "/photo/b", "/photo/\uFFFD"}));
    EXPECT_EQ(reply.json["data"]["items"][2]["name_raw"], "%FF");
    EXPECT_EQ(reply.json["data"]["items"][2]["path_raw"], "/photo/%FF");

    addShare("closed", "read only = no\nvalid users = alice\ninvalid users = bob\n");
    addShare("sealed", "read only = no\nvexo:restriction = 1\n");
    const Rows<const char*, int> rows = {{"/closed", 407},        {"/sealed", 407},        {"/nowhere", 408},
                                         {"/photo/missing", 408}, {"/photo/outside", 407}, {"/photo/../..", 407},
                                         {"/photo/file", 408}};
    for (const auto& [path, expected] : rows) {
        const std::string query = std::string("action=subfolders&path=") + path;
        EXPECT_EQ(code(ask("bob", query, "GET")), expected) << path;
    }
}

TEST_F(OperationCgi, TheTransferLogTellsWhatChanged) {
    const std::string log = systemRoot() + "/var/log/vexo/xfer.log";
    mkdir("alice", "/photo/silent");
    EXPECT_FALSE(fs::exists(log));
    setSetting("pexlanderxferlog", "yes");
    mkdir("alice", "/photo/a");
    mkdir("alice", "/photo/a");
    rename("alice", "/photo/a", "b");
    rename("alice", "/photo/a", "b");
    ask("alice", "action=subfolders&path=/photo", "GET");
    const std::string text = readFile(log);
    EXPECT_EQ(std::count(text.begin(), text.end(), '\n'), 2) << text;
    EXPECT_LT(text.find("\"mkdir\""), text.find("\"rename\"")) << text;
    EXPECT_EQ(text.find("\"flag\":false"), std::string::npos) << "both are folders" << text;
}

TEST_F(OperationCgi, NamesThatAreTakenAreToldInOneQuestion) {
    SKIP_WITHOUT_ROOT();
    const std::string root = shareRoot("photo");
    makeFolder(root + "/in", 0755);
    makeFolder(root + "/in/folder", 0755);
    writeFile(root + "/in/f\xFF", "four");
    fs::create_symlink("/etc/passwd", root + "/in/link");
    makeFolder(root + "/shut", 0700);
    const auto present = [](const std::string& path, const std::string& names) {
        return ask("alice", "action=present&path=" + path + "&names_raw=" + percentEncode(names));
    };
    const Json::Value items =
        present("/photo/in", "nothing\nf%FF\nfolder\r\nlink\n" + std::string(300, 'n')).json["data"]["items"];
    ASSERT_EQ(items.size(), 3U) << items;
    EXPECT_EQ(items[0]["name_raw"], "f%FF");
    EXPECT_EQ(items[0]["size"], 4);
    EXPECT_TRUE(items[1]["isdir"].asBool());
    EXPECT_EQ(items[2]["size"], 11) << "of the link itself";
    EXPECT_EQ(present("/photo/in", "").json["data"]["items"].size(), 0U);
    for (const auto& [path, names, refused] : Rows<std::string, std::string, int>{
             row("/photo/in", "..", 400), row("/photo/in", "folder%2Fx", 400), row("/photo/in", "a\n%zz", 400),
             row("/photo/none", "a", 408), row("/photo/in/link", "a", 407), row("/photo/shut", "a", 407)}) {
        EXPECT_EQ(code(present(path, names)), refused) << path << " " << names;
    }
}

}  // namespace
