// The program operation, run as a web server runs it.
#include "apps/cgi_test.h"

namespace {

class OperationCgi : public CgiTest {
 protected:
    static CgiReply ask(const std::string& user, const std::string& form) {
        return post(PROGRAM_OPERATION, user, form);
    }
    static CgiReply look(const std::string& user, const std::string& query) {
        return get(PROGRAM_OPERATION, user, query);
    }
    static int mkdir(const std::string& user, const std::string& path, const std::string& more = "") {
        return code(ask(user, "action=mkdir&path=" + percentEncode(path) + more));
    }
    static int rename(const std::string& user, const std::string& path, const std::string& name) {
        return code(ask(user, "action=rename&path=" + percentEncode(path) + "&name=" + percentEncode(name)));
    }
};

TEST_F(OperationCgi, RequestsAreTakenStrictly) {
    EXPECT_EQ(look("alice", "action=mkdir&path=/photo/x").status, 400) << "a link must change nothing";
    EXPECT_FALSE(fs::exists(shareRoot("photo") + "/x"));
    for (const char* form : {"", "action=burn&path=/photo/x", "action=mkdir&path_raw=/photo/%25zz",
                             "action=mkdir&path=", "action=rename&path=/photo"}) {
        const CgiReply reply = ask("alice", form);
        EXPECT_TRUE(reply.status == 400 && code(reply) == 400) << form;
    }
}

TEST_F(OperationCgi, FoldersAreMadeAsTheUser) {
    SKIP_WITHOUT_ROOT();
    const std::string root = addShare("photo", "read only = no\nvalid users = alice, bob, carol\nread list = bob\n");
    const std::string fat = addShare("usb", "read only = no\n");
    addMount(fat, "vfat");
    makeFolder(root + "/root's", 0755);
    makeFolder(root + "/old/@tmp", 0777);
    fs::create_symlink("/tmp", root + "/outside");
    for (const auto& [user, expected, paths] : rowsOf<std::string, int, Names>("apps/made_folders")) {
        for (const std::string& path : paths) EXPECT_EQ(mkdir(user, path), expected) << path;
    }
    EXPECT_EQ(mkdir("alice", "/photo/p/q/._r", "&parents=true"), 418);
    EXPECT_EQ(mkdir("alice", "/photo/p/q/r", "&parents=true"), 0);
    const std::pair<std::string, unsigned> made[] = {{root + "/a", kAliceUid},
                                                     {root + "/p", kAliceUid},
                                                     {root + "/p/q/r", kAliceUid},
                                                     {root + "/c", kCarolUid},
                                                     {shareRoot("homes") + "/bob/b", kBobUid}};
    for (const auto& [path, owner] : made) expectOwned(path, owner, 0755);
}

TEST_F(OperationCgi, RenamingReplacesNothing) {
    SKIP_WITHOUT_ROOT();
    const std::string fat = addShare("usb", "read only = no\n");
    addShare("archive", "read only = no\nvexo:restriction = 2\n");
    addMount(fat, "vfat");
    makeFolder(photo_ + "/folder", 0777);
    makeFolder(photo_ + "/folder/empty", 0777);
    makeFolder(photo_ + "/root's", 0755);
    for (const std::string file : {"/one", "/two", "/root's/f", "/folder/f", "/hidden/@tmp/x"})
        writeFile(photo_ + file, file);
    writeFile(fat + "/f", "x");
    writeFile(shareRoot("archive") + "/f", "x");
    fs::create_symlink("folder", photo_ + "/inside");
    fs::create_symlink("/etc", photo_ + "/outside");
    for (const auto& [path, name, expected] : rowsOf<std::string, std::string, int>("apps/renamings"))
        EXPECT_EQ(rename("alice", path, name), expected) << path << " to " << name;
    EXPECT_EQ(rename("bob", "/photo/two", "x"), 407);
    EXPECT_EQ(readFile(photo_ + "/ONE"), "/one");
    EXPECT_EQ(ask("alice", "action=rename&path=/photo/ONE&name=two").json["error"]["path"], "/photo/two");
    EXPECT_EQ(code(look("alice", "action=subfolders&path=/photo/hidden/@tmp")), 408);
    EXPECT_EQ(readFile(photo_ + "/two"), "/two");
    EXPECT_EQ(readFile(photo_ + "/folder/g\nh"), "/folder/f");
    EXPECT_EQ(fs::read_symlink(photo_ + "/link"), "/etc");
    const CgiReply raw = ask("alice", "action=rename&path=/photo/two&name_raw=%25FF");
    EXPECT_EQ(raw.json["data"]["path_raw"], "/photo/%FF");
    EXPECT_TRUE(fs::exists(photo_ + "/\xFF"));
}

TEST_F(OperationCgi, SubFoldersOfAFolder) {
    for (const char* name : {"/b", "/a", "/a/deep", "/@tmp", "/\xFF"}) makeFolder(photo_ + name);
    writeFile(photo_ + "/file", "x");
    fs::create_symlink("/etc", photo_ + "/outside");
    const CgiReply reply = look("bob", "action=subfolders&path=/photo");
    EXPECT_EQ(each(reply.json["data"]["items"], "path"), (Names{"/photo/a", "/photo/b", "/photo/\uFFFD"}));
    EXPECT_EQ(reply.json["data"]["items"][2]["name_raw"], "%FF");
    EXPECT_EQ(reply.json["data"]["items"][2]["path_raw"], "/photo/%FF");

    addShare("closed", "read only = no\nvalid users = alice\ninvalid users = bob\n");
    addShare("sealed", "read only = no\nvexo:restriction = 1\n");
    const Rows<const char*, int> rows = {{"/closed", 407},        {"/sealed", 407},        {"/nowhere", 408},
                                         {"/photo/missing", 408}, {"/photo/outside", 407}, {"/photo/../..", 407},
                                         {"/photo/file", 408}};
    for (const auto& [path, expected] : rows)
        EXPECT_EQ(code(look("bob", std::string("action=subfolders&path=") + path)), expected) << path;
}

// Of all programs that change or fetch files, as far as something happened.
TEST_F(OperationCgi, TheTransferLogTellsWhatWasDone) {
    SKIP_WITHOUT_ROOT();
    writeFile(shareRoot("photo") + "/f", "0123456789", 0644);
    const auto upload = [](const std::string& mode) {
        runCgi(PROGRAM_UPLOAD, "alice", "PUT", "path=/photo/new&overwrite=" + mode, "data");
    };
    const auto download = [](const std::string& query, const Variables& more = {}, const std::string& method = "GET") {
        runCgi(PROGRAM_DOWNLOAD, "alice", method, query, "", more);
    };
    mkdir("alice", "/photo/silent");
    download("path=/photo/f");
    EXPECT_EQ(transferLog(), "");
    setSetting("pexlanderxferlog", "yes");
    for (int i = 0; i < 2; ++i) mkdir("alice", "/photo/a");
    for (int i = 0; i < 2; ++i) rename("alice", "/photo/a", "b");
    look("alice", "action=subfolders&path=/photo");
    for (const char* mode : {"error", "error", "skip"}) upload(mode);
    download("path=/photo/f", {{"HTTP_RANGE", "bytes=2-4"}});
    download("path=/photo/f", {}, "HEAD");
    download("path=/photo/missing");
    download("path=/photo/f&path=/photo/b");
    std::string log = transferLog();
    EXPECT_EQ(std::count(log.begin(), log.end(), '\n'), 6) << log;
    for (const char* part : {R"("action":"mkdir","size":0,"path":"/photo/a","flag":true)", R"("action":"rename")",
                             R"("action":"upload","size":4,"path":"/photo/new","flag":false)",
                             R"("action":"download","size":3,"path":"/photo/f")", "\"alice\"", "127.0.0.1"}) {
        const size_t at = log.find(part);
        EXPECT_NE(at, std::string::npos) << part << log;
        log.erase(0, std::min(at, log.size()));  // in this order
    }
}

TEST_F(OperationCgi, NamesThatAreTakenAreToldInOneQuestion) {
    SKIP_WITHOUT_ROOT();
    makeFolder(photo_ + "/in", 0755);
    makeFolder(photo_ + "/in/folder", 0755);
    writeFile(photo_ + "/in/f\xFF", "four");
    fs::create_symlink("/etc/passwd", photo_ + "/in/link");
    makeFolder(photo_ + "/shut", 0700);
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
             row("/photo/none", "a", 408), row("/photo/in/link", "a", 407), row("/photo/shut", "a", 407)})
        EXPECT_EQ(code(present(path, names)), refused) << path << " " << names;
}

}  // namespace
