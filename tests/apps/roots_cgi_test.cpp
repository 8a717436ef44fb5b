// Shares at any depth, from one end to the other: listed, filled, changed, searched, published and emptied.
#include "apps/task_fixture.h"
#include "platform/private_mounts.h"

namespace {

class RootsCgi : public TaskCgi {
 protected:
    static CgiReply get(const char* program, const std::string& query) {
        return CgiReply(support::runCgi(program, "alice", "GET", query));
    }
    static CgiReply post(const char* program, const std::string& form) {
        return CgiReply(support::runCgi(program, "alice", "POST", "", form,
                                        {{"CONTENT_TYPE", "application/x-www-form-urlencoded"}}));
    }
    static std::string pathsIn(const Json::Value& data) {
        std::vector<std::string> paths;
        for (const Json::Value& item : data["items"]) paths.push_back(item["path"].asString());
        std::sort(paths.begin(), paths.end());
        std::string all;
        for (const std::string& path : paths) all += path + " ";
        return all;
    }
    static std::string listed(const std::string& path) {
        return pathsIn(get(PROGRAM_LIST, "action=folder&path=" + percentEncode(path)).json["data"]);
    }
    // Searches `folder` for files. What an operation does then shows in its rows, which `taskid` names.
    static std::string search(const std::string& folder) {
        const CgiReply reply = post(PROGRAM_SEARCH, "action=start&name=*.txt&path=" + percentEncode(folder));
        EXPECT_TRUE(reply.json["success"].asBool()) << reply.body;
        return reply.json["data"]["taskid"].asString();
    }
    static std::string rows(const std::string& id) {
        Json::Value data;
        support::waitUntil("the end of search " + id, [&] {
            data = get(PROGRAM_SEARCH, "action=list&taskid=" + id).json["data"];
            return data["finished"].asBool() || HasFailure();
        });
        return pathsIn(data);
    }
    static int upload(const std::string& path) {
        return code(CgiReply(support::runCgi(PROGRAM_UPLOAD, "alice", "PUT", "path=" + percentEncode(path), "data")));
    }
    // Everything that a user does in the share `name`, whose root is `root`.
    static void useShare(const std::string& name, const std::string& root);
    static void refuseTemporaryFolder(const std::string& top);
};

void RootsCgi::useShare(const std::string& name, const std::string& root) {
    SCOPED_TRACE(root);
    const std::string top = "/" + name;
    EXPECT_NE(get(PROGRAM_LIST, "action=shares").body.find("\"" + top + "\""), std::string::npos);
    EXPECT_EQ(upload(top + "/a/b/one.txt") + upload(top + "/two.txt"), 0);
    EXPECT_EQ(readFile(root + "/a/b/one.txt"), "data");
    EXPECT_EQ(listed(top), top + "/a " + top + "/two.txt ");
    EXPECT_EQ(listed(top + "/a/b"), top + "/a/b/one.txt ");

    const std::string id = search(top), shown = "&taskid=" + id;
    EXPECT_EQ(rows(id), top + "/a/b/one.txt " + top + "/two.txt ");
    EXPECT_EQ(code(ask("alice", "action=rename&name=c&path=" + top + "/a/b" + shown)), 0);
    EXPECT_EQ(rows(id), top + "/a/c/one.txt " + top + "/two.txt ");
    EXPECT_EQ(errors(perform("alice", "action=move" + shown + about({top + "/a/c"}, top))), "");
    EXPECT_EQ(rows(id), top + "/c/one.txt " + top + "/two.txt ");

    support::makeFolder(root + "/#recycle", 0777);
    EXPECT_EQ(errors(perform("alice", "action=delete" + shown + about({top + "/c"}))), "");
    EXPECT_EQ(rows(id), top + "/two.txt ");
    EXPECT_EQ(readFile(root + "/#recycle/c/one.txt"), "data");
    EXPECT_EQ(rows(search(top)), top + "/two.txt ") << "a bin is not searched";
    EXPECT_EQ(errors(perform("alice", "action=restore" + about({top + "/#recycle/c"}))), "");
    EXPECT_EQ(readFile(root + "/c/one.txt"), "data");

    const CgiReply link = post(PROGRAM_LINK, "action=create&path=" + top + "/c");
    const std::string share = "FOLDER_SHARING=" + link.json["data"]["id"].asString();
    EXPECT_EQ(
        support::RawReply(support::runCgi(PROGRAM_SHARE, "", "GET", share + "&action=download&path=one.txt")).body,
        "data")
        << link.body;
}

// It lies in the share itself where the root has one component, and is of another kind than what a user puts there.
void RootsCgi::refuseTemporaryFolder(const std::string& top) {
    const std::string path = top + "/@tmp", file = path + "/orvel";
    EXPECT_EQ(listed(top).find("@tmp"), std::string::npos);
    for (const auto& [program, query] :
         std::vector<std::pair<const char*, std::string>>{{PROGRAM_LIST, "action=folder&path="},
                                                          {PROGRAM_DOWNLOAD, "path="},
                                                          {PROGRAM_OPERATION, "action=subfolders&path="}}) {
        EXPECT_EQ(code(get(program, query + percentEncode(path))), 408) << program;
    }
    EXPECT_EQ(upload(file + "/x"), 418);
    EXPECT_EQ(code(ask("alice", "action=mkdir&path=" + percentEncode(file + "/x"))), 418);
    EXPECT_EQ(code(ask("alice", "action=rename&name=x&path=" + percentEncode(path))), 408);
    EXPECT_EQ(code(post(PROGRAM_LINK, "action=create&path=" + percentEncode(path))), 408);
    EXPECT_EQ(code(post(PROGRAM_SEARCH, "action=start&name=*&path=" + percentEncode(path))), 408);
    for (const std::string& form :
         {"action=delete&permanent=true" + about({path}), "action=copy" + about({path}, top),
          "action=move" + about({file}, top), "action=compress&name=x.zip" + about({path}, top),
          "action=copy" + about({top + "/two.txt"}, path)}) {
        const CgiReply reply = ask("alice", form);
        const int refused = code(reply);
        const std::string id = reply.json["data"]["taskid"].asString();
        EXPECT_TRUE(refused != 0 || !errors(ended("alice", id)).empty()) << form << reply.body;
    }
}

TEST_F(RootsCgi, EverythingWorksAtAnyDepth) {
    SKIP_WITHOUT_ROOT();
    const std::string deep = photo_ + "/srv/samba/team", options = "read only = no\nvalid users = alice\npath = ";
    addShare("team", options + deep + "\n");
    addShare("data", options + "/mnt\n");
    support::makeFolder(systemRoot() + "/usr/vexo/etc/pexlander");
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        EXPECT_EQ(mount("none", "/mnt", "tmpfs", 0, "mode=0777"), 0);
        support::makeFolder(deep, 0777);
        useShare("team", deep);
        useShare("data", "/mnt");
        EXPECT_TRUE(fs::exists("/mnt/@tmp/orvel"));
        refuseTemporaryFolder("/data");
        return 0;
    }));
}

}  // namespace
