// Shares at any depth, from one end to the other: listed, filled, changed, searched, published and emptied.

#include "apps/task_fixture.h"
#include "platform/private_mounts.h"

namespace {

class RootsCgi : public TaskCgi {
 protected:
    static CgiReply get(const char* program, const std::string& query) { return CgiTest::get(program, "alice", query); }
    static CgiReply post(const char* program, const std::string& form) { return CgiTest::post(program, "alice", form); }
    static std::string pathsIn(const Json::Value& data) {
        Names paths = each(data["items"], "path");
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
    static std::string rows(const std::string& id) { return pathsIn(searched("alice", id)); }
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
    EXPECT_EQ(support::orvelctl({"index", "build", name}).status, 0);
    EXPECT_EQ(rows(search(top)), top + "/a/b/one.txt " + top + "/two.txt ") << "from the index";
    EXPECT_EQ(support::orvelctl({"index", "drop", name}).status, 0);
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
                                                          {PROGRAM_OPERATION, "action=subfolders&path="}})
        EXPECT_EQ(code(get(program, query + percentEncode(path))), 408) << program;
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

// What was begun in a share while it was open leads nowhere once an option closes it.
TEST_F(RootsCgi, AClosedShareIsClosedToAllThatWasBegunInIt) {
    support::makeFolder(shareRoot("photo"), 0777);
    const auto define = [this](const std::string& option) {
        addShare("photo", "read only = no\nvexo:index = yes\n" + option);
    };
    define("");
    EXPECT_EQ(upload("/photo/one.txt") + upload("/photo/a/two.txt"), 0);
    EXPECT_EQ(support::orvelctl({"index", "build", "photo"}).status, 0);
    EXPECT_EQ(rows(search("/photo")), "/photo/a/two.txt /photo/one.txt ");
    const std::string found = search("/photo");
    const std::string kept = get(PROGRAM_LIST, "action=folder&keep=1&path=/photo/a").json["data"]["listing"].asString();
    const std::string link = post(PROGRAM_LINK, "action=create&path=/photo/a").json["data"]["id"].asString();
    const std::string undo =
        ask("alice", "action=rename&name=3.txt&path=/photo/one.txt").json["data"]["undo"].asString();
    const auto all = [&] {
        const Names replies = {
            get(PROGRAM_LIST, "action=folder&path=/photo/a").body,
            get(PROGRAM_LIST, "action=page&listing=" + kept).body,
            get(PROGRAM_SEARCH, "action=list&taskid=" + found).body,
            support::runCgi(PROGRAM_DOWNLOAD, "alice", "GET", "path=/photo/a/two.txt"),
            support::runCgi(PROGRAM_SHARE, "", "GET", "FOLDER_SHARING=" + link + "&action=download&path=two.txt"),
            support::orvelctl({"search", "/photo", "--user", "alice", "--name", "two*"}).output};
        std::string open;
        for (const std::string& reply : replies)
            open += reply.empty() || reply.find("\"success\":false") != std::string::npos ? "0" : "1";
        return open;
    };
    EXPECT_EQ(all(), "111111");
    define("hosts allow = 10.\n");
    EXPECT_EQ(all(), "000000");
    EXPECT_NE(errors(ended("alice", start("alice", "action=undo&taskid=" + undo))), "");
    EXPECT_TRUE(fs::exists(shareRoot("photo") + "/3.txt")) << "nothing is undone there";
}

TEST_F(RootsCgi, EverythingWorksAtAnyDepth) {
    const std::string deep = photo_ + "/srv/samba/team", options = "read only = no\nvexo:index = yes\npath = ";
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

// What the doctor says of a share, and its exit status. The findings of other shares are left out.
TEST_F(RootsCgi, TheDoctorNamesTheLine) {
    const auto ask = [](const std::string& share, int status) {
        const support::Finished finished = support::orvelctl({"doctor", "shares", "--json"});
        EXPECT_EQ(finished.status, status) << finished.output;
        const Json::Value report = support::jsonOf(finished.output);
        EXPECT_EQ(report["problems"].asInt() == 0, status == 0);
        std::string all;
        for (const Json::Value& finding : report["findings"]) {
            if (finding["share"].asString() != share) continue;
            all += finding["severity"].asString() + "|" + std::to_string(finding["line"].asInt()) + "|" +
                   finding["text"].asString() + "|" + finding["advice"].asString() + "\n";
        }
        return all;
    };
    const std::string conf = "/etc/samba/smb.conf";
    setSetting("share_definitions", conf);
    EXPECT_NE(ask("", 1).find("there are no share definitions"), std::string::npos);
    writeRootFile("/etc/samba/more.conf", "\nforce user = x\n");
    writeRootFile(conf, "[global]\nconfig backend = file\nnonsense\n[good]\npath = " + photo_ +
                            "\n[closed]\npath = /v/c\nhosts allow = 10.\ninclude = more.conf\n[torn]\nvalid users\n"
                            "[tmp]\npath = /tmp\nveto files = /@tmp/\n[bare]\npath = /tmp\n[p]\nprintable = yes\n");
    EXPECT_EQ(ask("good", 1), "good|4|[good] at " + photo_ + "|\n");
    EXPECT_EQ(ask("closed", 1),
              "problem|2|[closed] is closed by \"force user = x\": everybody would be that user there|\n"
              "problem|8|[closed] is closed by \"hosts allow = 10.\": who may enter by network address is not decided "
              "here|to open it here all the same, add to [closed]: vexo:ignore = force user, hosts allow\n");
    EXPECT_EQ(
        ask("torn", 1),
        "problem|11|[torn] is left out: neither a section nor an option|mend the line; \"testparm -s\" shows what "
        "Samba makes of it\n");
    EXPECT_EQ(ask("tmp", 1), "good|12|[tmp] at /tmp|\n");
    EXPECT_EQ(ask("bare", 1),
              "good|15|[bare] at /tmp|\nproblem|15|[bare] holds the folder @tmp for temporary files, which "
              "Samba shows there|add to [bare]: veto files = /@tmp/\n");
    EXPECT_EQ(ask("p", 1), "note|17|[p] is not a share here: a printer|\n");
    EXPECT_NE(ask("", 1).find("problem|3|neither a section nor an option"), std::string::npos);
    writeRootFile(conf, "[global]\nconfig backend = registry\n");
    EXPECT_NE(ask("", 1).find("problem|2|config backend = registry: Samba reads its shares elsewhere"),
              std::string::npos);
}

TEST_F(RootsCgi, VolumesHaveTheirTemporaryFolders) {
    writeRootFile("/etc/vexo/shares.conf", "[data]\npath = /mnt\nveto files = /@tmp/\nread only = no\n");
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        EXPECT_EQ(mount("none", "/mnt", "tmpfs", 0, "mode=0777"), 0);
        const auto run = [](const std::vector<std::string>& words) { return support::orvelctl(words).status; };
        const std::string everybodys = "0 " + std::to_string(01777), search = "/mnt/@tmp/orvel/PXSearch";
        EXPECT_EQ(run({"doctor", "shares", "volumes"}), 1);
        EXPECT_EQ(run({"volumes"}), 0);
        EXPECT_EQ(run({"doctor", "shares", "volumes"}), 0);
        for (const std::string& path : {std::string("/mnt/@tmp"), std::string("/mnt/@tmp/orvel"), search})
            EXPECT_EQ(modeOf(path), everybodys) << path;
        EXPECT_EQ(chmod("/mnt/@tmp", 0777), 0);
        support::makeFolder(search + "/alice", 0777);
        EXPECT_EQ(run({"volumes", "--user", "alice"}), 0);
        EXPECT_EQ(modeOf("/mnt/@tmp"), everybodys);
        EXPECT_EQ(modeOf(search + "/alice"), std::to_string(support::kAliceUid) + " " + std::to_string(0700));
        writeFile("/mnt/x.txt", "");
        EXPECT_EQ(rows(RootsCgi::search("/data")), "/data/x.txt ") << "results are kept there";
        EXPECT_EQ(run({"volumes", "--user", "nobody-here"}), 1);
        // What is not root's is not used, nor is a link followed.
        fs::remove_all(search);
        fs::create_directory_symlink("/tmp", search);
        EXPECT_EQ(run({"volumes"}), 1);
        fs::remove(search);
        support::makeFolder(search, 0777);
        give(search);
        EXPECT_EQ(run({"volumes"}), 1);
        EXPECT_EQ(modeOf(search), std::to_string(support::kAliceUid) + " " + std::to_string(0777));
        return 0;
    }));
}

}  // namespace
