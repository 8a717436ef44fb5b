// The program search, run as a web server runs it, and what it finds by walking and from indexes.
#include <sys/resource.h>

#include "apps/cgi_test.h"
#include "support/gate.h"
#include "vexo/task.h"

namespace {

constexpr const char* kIndexed = "read only = no\nvexo:index = yes\n";
constexpr const char* kProperties = "additional=size,owner,time,perm,type,real_path";

class SearchCgi : public CgiTest {
 protected:
    void SetUp() override {
        CgiTest::SetUp();
        SKIP_WITHOUT_ROOT();
    }
    static CgiReply ask(const std::string& user, const std::string& form, const Variables& more = {}) {
        return post(PROGRAM_SEARCH, user, form, more);
    }
    static std::string start(const std::string& user, const std::string& form, const Variables& more = {}) {
        const CgiReply reply = ask(user, "action=start&" + form, more);
        EXPECT_TRUE(reply.json["success"].asBool()) << form << reply.body;
        return reply.json["data"]["taskid"].asString();
    }
    static CgiReply list(const std::string& user, const std::string& id, const std::string& more = "") {
        return get(PROGRAM_SEARCH, user, "action=list&" + more + "&limit=10000&taskid=" + id);
    }
    // Waits until the state of a search satisfies `ready`.
    static CgiReply await(const std::string& user, const std::string& id,
                          const std::function<bool(const Json::Value&)>& ready) {
        CgiReply reply = list(user, id, kProperties);
        waitUntil("what is expected of " + id, [&] {
            reply = list(user, id, kProperties);
            EXPECT_TRUE(reply.json["success"].asBool()) << reply.body;
            return HasFailure() || ready(reply.json["data"]);
        });
        return reply;
    }
    static CgiReply finished(const std::string& user, const std::string& id) {
        return await(user, id, [](const Json::Value& data) { return data["finished"].asBool(); });
    }
    struct Found {
        std::set<std::string> paths;  // percent-encoded
        std::set<std::string> ways;
    };
    static Found found(const std::string& user, const std::string& form) {
        const std::string id = start(user, form);
        const Json::Value data = finished(user, id).json["data"];
        EXPECT_FALSE(data["failed"].asBool()) << form;
        Found result;
        for (const Json::Value& way : data["shares"]) result.ways.insert(way.asString());
        for (const Json::Value& item : data["items"]) {
            const bool raw = item.isMember("path_raw");
            result.paths.insert(raw ? item["path_raw"].asString() : percentEncode(item["path"].asString()));
        }
        EXPECT_EQ(result.paths.size(), data["total"].asUInt()) << form;
        EXPECT_TRUE(ask(user, "action=clean&taskid=" + id).json["success"].asBool());
        return result;
    }
    static void index(const std::string& action, const std::string& share) {
        EXPECT_EQ(orvelctl({"index", action, share}).status, 0) << action << share;
    }
    static std::unique_ptr<KTR::Task> record(const std::string& user, const std::string& id) {
        return std::unique_ptr<KTR::Task>(KTR::TaskMgr(user.c_str()).getTask(("Quorvane_Search_" + id).c_str()));
    }
    static std::string database(const std::string& user, const std::string& id) {
        return "/tmp/@tmp/orvel/PXSearch/" + user + "/" + id;
    }
};

// Every parameter, by walking and from an index. What criteria mean, and that both ways agree on any tree, is tested
// where they are made.
TEST_F(SearchCgi, EachParameterFindsWhatItSays) {
    const std::string root = addShare("photo", kIndexed);
    const struct {
        const char* path;
        uid_t owner;
        gid_t group;
        off_t size;
        time_t modified, accessed;
    } files[] = {{"/a.txt", kAliceUid, kUsersGid, 100, 1000, 4000000000},
                 {"/B.JPG", kBobUid, kUsersGid, 5000, 2000, 1},
                 {"/c.tar.gz", 0, 0, 0, 3000, 1},
                 {"/in/rep*ort.md", kAliceUid, 0, 4096, 4000, 1},
                 {"/in/stra\xC3\x9F\x65.txt", 65000, 0, 10, 5000, 1},
                 {"/in/\xFF \"x", kBobUid, 0, 3900, 6000, 1}};
    for (const auto& file : files) {
        const std::string path = root + file.path;
        writeFile(path, "");
        ASSERT_EQ(truncate(path.c_str(), file.size) + chown(path.c_str(), file.owner, file.group), 0);
        const timespec times[] = {{file.accessed, 0}, {file.modified, 0}};
        ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
    }
    fs::create_symlink("/etc", root + "/a.link");
    using Paths = std::set<std::string>;
    for (const bool indexed : {false, true}) {
        if (indexed) index("build", "photo");
        for (const auto& [form, paths] : rowsOf<std::string, std::vector<std::string>>("apps/search_parameters")) {
            const Found data = found("carol", "path=/photo&" + form);
            EXPECT_EQ(data.paths, Paths(paths.begin(), paths.end())) << form;
            EXPECT_EQ(data.ways, Paths{indexed ? "index" : "walk"});
        }
    }
}

// Rows are older than what stands at their paths by now: rights are those of a file in its folder, not of what a link
// there leads to.
TEST_F(SearchCgi, RightsAreAskedWithoutLinks) {
    for (const char* path : {"/kept/f", "/file/f", "/above/f"}) writeFile(photo_ + path, "x", 0666);
    const std::string temporary = "/tmp/@tmp/orvel";
    makeFolder(temporary, 0777);
    const std::string id = start("alice", "path=/photo&name=f&type=file");
    finished("alice", id);
    EXPECT_TRUE(geteuid() != 0 || (statusOf(temporary).st_mode & S_ISVTX) != 0) << "nobody takes results away";
    fs::remove(photo_ + "/file/f");
    fs::create_symlink("../kept/f", photo_ + "/file/f");
    fs::rename(photo_ + "/above", photo_ + "/was");
    fs::create_symlink("kept", photo_ + "/above");
    std::map<std::string, bool> readable;
    const CgiReply reply = list("alice", id, "additional=perm");
    for (const Json::Value& item : reply.json["data"]["items"])
        readable[item["path"].asString()] = item["additional"]["perm"]["acl"]["read"].asBool();
    EXPECT_EQ(readable, (std::map<std::string, bool>{
                            {"/photo/above/f", false}, {"/photo/file/f", false}, {"/photo/kept/f", true}}));
}

TEST_F(SearchCgi, RequestsAreTakenStrictly) {
    writeFile(shareRoot("photo") + "/file", "x");
    fs::create_symlink("/etc", shareRoot("photo") + "/outside");
    makeFolder(shareRoot("photo") + "/#recycle/folder");
    std::string manyPatterns = "a", manyFolders = "action=start&name=a";
    for (int i = 0; i < 100; ++i) manyPatterns += ",a";
    for (int i = 0; i < 501; ++i) manyFolders += "&path=/photo";
    auto rows = rowsOf<std::string, std::string>("apps/search_malformed");
    rows.emplace_back("", manyFolders);
    for (const std::string& pattern : {std::string(491, 'a'), std::string(10000, '*'), manyPatterns})
        rows.emplace_back("name", "action=start&path=/photo&name=" + pattern);
    for (const auto& [parameter, form] : rows) {
        const CgiReply reply = ask("alice", form);
        EXPECT_TRUE(reply.status == 400 && code(reply) == 400) << form;
        EXPECT_EQ(reply.json["data"]["parameter"], parameter.empty() ? Json::Value() : parameter) << form;
    }
    for (const auto& [refusal, form] : rowsOf<int, std::string>("apps/search_refusals")) {
        const CgiReply reply = ask("alice", form);
        EXPECT_TRUE(reply.status == 200 && code(reply) == refusal) << form << code(reply);
    }
    EXPECT_EQ(ask("", "action=list&taskid=5A1F").status, 401);
    for (const std::string action : {"start", "stop", "clean"}) {
        const std::string query = "action=" + action + "&path=/photo&name=a&taskid=5A1F";
        EXPECT_EQ(get(PROGRAM_SEARCH, "alice", query).status, 400) << action;
    }
}

// Held before its fourth match.
TEST_F(SearchCgi, ARunningSearchIsReadStoppedKilledAndCleaned) {
    for (int i = 0; i < 6; ++i) writeFile(shareRoot("photo") + "/many/a" + std::to_string(i), "");
    Gate gate("FILEIDXOutputDBInsert", systemRoot() + "/gate");
    std::string id;
    pid_t worker = 0;
    const auto begin = [&] {
        gate.next();
        id = start("alice", "path=/photo&type=file&name=a", {gate.order()});
        for (int passed = 0; passed < 3 && gate.holds(); ++passed) gate.next();
        ASSERT_TRUE(gate.holds());
        const auto three = [](const Json::Value& data) { return data["total"].asUInt() == 3; };
        EXPECT_FALSE(await("alice", id, three).json["data"]["finished"].asBool());
        worker = record("alice", id)->getWorker();
        ASSERT_GT(worker, 0);
    };

    begin();
    for (const std::string action : {"list", "stop", "clean"}) {
        std::string form = "action=" + action;
        EXPECT_EQ(code(ask("bob", form += "&taskid=" + id)), 408) << "of another user";
    }
    EXPECT_TRUE(ask("alice", "action=stop&taskid=" + id).json["data"]["finished"].asBool());
    EXPECT_EQ(record("alice", id)->getWorker(), 0);
    Json::Value after = list("alice", id, "offset=1").json["data"];
    EXPECT_TRUE(after["finished"].asBool() && after["stopped"].asBool() && !after["failed"].asBool());
    EXPECT_GE(after["total"].asUInt(), 3U);
    EXPECT_EQ(after["items"].size(), after["total"].asUInt() - 1);
    EXPECT_TRUE(ask("alice", "action=stop&taskid=" + id).json["data"]["finished"].asBool()) << "again";

    begin();
    EXPECT_EQ(kill(worker, SIGKILL), 0);
    after = finished("alice", id).json["data"];
    EXPECT_EQ(after["failure"]["code"], 401);
    EXPECT_EQ(after["total"].asUInt(), 3U);
    EXPECT_EQ(after["items"].size(), after["total"].asUInt());

    begin();
    EXPECT_TRUE(ask("alice", "action=clean&taskid=" + id).json["success"].asBool());
    EXPECT_FALSE(fs::exists("/proc/" + std::to_string(worker) + "/exe"));
    EXPECT_FALSE(fs::exists(database("alice", id)) || fs::exists(database("alice", id + "-journal")));
    EXPECT_EQ(record("alice", id), nullptr);
}

TEST_F(SearchCgi, TheReplyThatStartsASearchShowsItsFirstRows) {
    const std::string root = addShare("photo", kIndexed);
    for (const char* name : {"/b.txt", "/a.txt", "/in/c.txt"}) writeFile(root + name, "");
    index("build", "photo");
    const std::string form = "action=start&path=/photo&name=*.txt&limit=2&sort_by=name&sort_direction=desc";
    Json::Value data;
    // It does not wait long, and on a busy machine not long enough.
    waitUntil("rows in the reply", [&] {
        data = ask("alice", form).json["data"];
        const std::string id = data["taskid"].asString();
        const Json::Value all = finished("alice", id).json["data"];
        EXPECT_TRUE(ask("alice", "action=clean&taskid=" + id).json["success"].asBool());
        EXPECT_GT(all["indexes"]["photo"]["updated"].asInt64(), 0);
        EXPECT_EQ(all["indexes"]["photo"]["live"], false);
        return HasFailure() || data.isMember("first");
    });
    EXPECT_EQ(data["first"]["total"], 3);
    EXPECT_EQ(each(data["first"]["items"], "name"), (Names{"c.txt", "b.txt"}));
    for (const char* wrong : {"&limit=0", "&limit=x", "&limit=10001", "&limit=2&sort_direction=up"})
        EXPECT_EQ(ask("alice", std::string("action=start&path=/photo&name=a") + wrong).status, 400) << wrong;
    Gate gate("FILEIDXResultGetAndTableGen", systemRoot() + "/gate");
    const std::string id = start("alice", form.substr(form.find("path")), {gate.order()});
    EXPECT_TRUE(gate.holds()) << "the reply came without a row";
    gate.open();
    finished("alice", id);
}

TEST_F(SearchCgi, SearchesOfTheDayBeforeYesterdayAreSweptAway) {
    const std::string old = start("alice", "path=/photo&name=a"), recent = start("alice", "path=/photo&name=a");
    finished("alice", old);
    finished("alice", recent);
    for (const auto& entry : fs::recursive_directory_iterator(systemRoot())) {
        if (entry.path().filename().string().find(old) == std::string::npos) continue;
        std::string text = readFile(entry.path());
        const size_t created = text.find("\"created\":");
        ASSERT_NE(created, std::string::npos);
        text.replace(created, 11, "\"created\":0");
        writeFile(entry.path(), text, 0600);
    }
    EXPECT_EQ(code(list("alice", old)), 0) << "as long as nobody searches";
    finished("alice", start("alice", "path=/photo&name=a"));
    EXPECT_EQ(code(list("alice", old)), 408);
    EXPECT_FALSE(fs::exists(database("alice", old)));
    EXPECT_EQ(code(list("alice", recent)), 0);

    // Nor does one user keep any number of them, at work or ended.
    std::vector<std::unique_ptr<KTR::Task>> others;
    for (int i = 0; i < 210; ++i) {
        if (i == 32) {
            EXPECT_EQ(code(ask("alice", "action=start&path=/photo&name=a")), 420);
            for (const auto& task : others) EXPECT_TRUE(task->finish());
        }
        others.emplace_back(KTR::TaskMgr("alice").createTask(("Quorvane_copy_" + std::to_string(i)).c_str()));
        EXPECT_TRUE(i < 32 || others.back()->finish());
    }
    finished("alice", start("alice", "path=/photo&name=a"));
    Json::Value names(Json::arrayValue);
    EXPECT_TRUE(KTR::TaskMgr("alice").getAllTaskId("Quorvane_", names));
    EXPECT_EQ(names.size(), 200U);
    EXPECT_EQ(code(list("alice", recent)), 408) << "the oldest";
    EXPECT_FALSE(fs::exists(database("alice", recent)));
}

TEST_F(SearchCgi, ASearchThatCouldNotStoreAllHasFailed) {
    for (int i = 0; i < 1000; ++i) writeFile(shareRoot("photo") + "/" + std::to_string(i), "");
    for (const bool indexed : {false, true}) {
        addShare("photo", indexed ? kIndexed : "read only = no\n");
        if (indexed) index("build", "photo");
        inChild([&] {
            const rlimit small = {100000, 100000};
            EXPECT_TRUE(signal(SIGXFSZ, SIG_IGN) != SIG_ERR && setrlimit(RLIMIT_FSIZE, &small) == 0);
            const std::string id = start("carol", "path=/photo&type=file");
            const Json::Value data = finished("carol", id).json["data"];
            EXPECT_TRUE(data["failed"].asBool()) << data.toStyledString().substr(0, 500);
            EXPECT_LT(data["total"].asInt(), 1000);
            EXPECT_TRUE(ask("carol", "action=clean&taskid=" + id).json["success"].asBool());
        });
    }
}

TEST_F(SearchCgi, ResultsAreBoundedOnAVolume) {
    setSetting("search_results_mib", "1");
    const std::string root = addShare("photo", "read only = no\n");
    for (int i = 0; i < 2000; ++i) writeFile(root + "/" + std::string(200, 'n') + std::to_string(i), "");
    std::string former;
    for (int time = 0; time < 2; ++time) {
        const std::string id = start("carol", "path=/photo&type=file");
        const Json::Value data = finished("carol", id).json["data"];
        EXPECT_EQ(data["failure"]["code"], 416) << data.toStyledString().substr(0, 300);
        EXPECT_TRUE(data["total"].asInt() > 100 && data["total"].asInt() < 2000) << data["total"];
        if (time > 0) {
            EXPECT_EQ(code(ask("carol", "action=clean&taskid=" + former)), 408) << "it made room";
        }
        former = id;
    }
    const Json::Value few = finished("carol", start("carol", "path=/photo&name=n*77")).json["data"];
    EXPECT_TRUE(!few["failed"].asBool() && few["total"].asInt() == 20) << few["total"];
}

TEST_F(SearchCgi, WhatAnIndexCannotHoldIsSaid) {
    const std::string root = addShare("photo", kIndexed);
    for (const char* folder : {"/a/nas", "/b"}) makeFolder(root + folder);
    addMount(root + "/a/nas", "nfs4");
    index("build", "photo");
    for (const auto& [folder, said] :
         Rows<const char*, bool>{{"/photo", true}, {"/photo/a", true}, {"/photo/b", false}, {"/photo/a/nas", false}}) {
        const Json::Value data =
            finished("carol", start("carol", std::string("path=") + folder + "&name=x")).json["data"];
        EXPECT_EQ(data.isMember("left_out"), said) << folder;
        EXPECT_TRUE(!said || (data["left_out"].size() == 1 && data["left_out"][0] == folder));
    }
}

TEST_F(SearchCgi, ResultsFollowTheOperations) {
    const std::string root = addShare("photo", "read only = no\n");
    fs::create_directory_symlink("_50%*'\"", root + "/link");
    for (const char* file : {"/_50%*'\"/deep/7.txt", "/_50%*'\"/deep/8.txt", "/x50%*'\"/deep/stays.txt"})
        writeFile(root + file, "abc");
    EXPECT_EQ(runProgram({"/bin/chown", "-R", "20001:20100", root}).status, 0);
    const std::string id = start("alice", "path=/photo&extension=txt");
    EXPECT_EQ(finished("alice", id).json["data"]["total"].asUInt(), 3U);
    const auto operation = [&](const std::string& form) {
        EXPECT_EQ(code(post(PROGRAM_OPERATION, "alice", form + "&taskid=" + id)), 0) << form;
    };
    // Through a link, as a page may show it: the rows have the paths without.
    operation("action=rename&path=/photo/link/deep&name=new%20place");
    operation("action=rename&path=/photo/" + percentEncode("_50%*'\"") + "&name=" + percentEncode("%_ renamed"));
    operation("action=mkdir&path=/photo/made.txt");
    for (const std::string size : {"12345", "1234567"}) {
        const std::string query = "overwrite=overwrite&path=/photo/up.txt&taskid=" + id;
        EXPECT_EQ(code(CgiReply(runCgi(PROGRAM_UPLOAD, "alice", "PUT", query, size))), 0);
    }
    const Json::Value data = list("alice", id, "additional=size&sort_by=name&sort_direction=desc").json["data"];
    const std::string moved = "/photo/%_ renamed/new place/";
    EXPECT_EQ(each(data["items"], "path"), (Names{"/photo/up.txt", "/photo/x50%*'\"/deep/stays.txt", "/photo/made.txt",
                                                  moved + "8.txt", moved + "7.txt"}));
    EXPECT_EQ(data["items"][0]["additional"]["size"], 7.0);
    EXPECT_EQ(list("alice", id, "filetype=dir").json["data"]["items"][0]["name"], "made.txt");
    EXPECT_EQ(list("alice", id, "filter=8.T").json["data"]["total"].asUInt(), 1U);
    EXPECT_EQ(list("alice", id, "limit=0").status, 400);
    EXPECT_EQ(post(PROGRAM_OPERATION, "alice", "action=mkdir&path=/photo/q&taskid=../x").status, 400);
}

}  // namespace
