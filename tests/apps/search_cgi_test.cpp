// The program search, run as a web server runs it, and what it finds by walking and from indexes.
//
// ORVEL_SEARCH_ENTRIES: how many entries the generated tree has, 2,000 without it.
#include <json/value.h>
#include <sys/resource.h>

#include <csignal>
#include <map>
#include <set>

#include "apps/program.h"
#include "support/gate.h"
#include "support/testing.h"
#include "text.h"
#include "vexo/task.h"

using orvel::cgi::percentEncode;

namespace {

constexpr const char* kIndexed = "read only = no\nvexo:index = yes\n";
constexpr const char* kProperties = "additional=size,owner,time,perm,type,real_path";

class SearchCgi : public ApplianceTest {
 protected:
    static CgiReply post(const std::string& program, const std::string& user, const std::string& form,
                         Variables more = {}) {
        more["CONTENT_TYPE"] = "application/x-www-form-urlencoded";
        return CgiReply(runCgi(program, user, "POST", "", form, more));
    }
    static CgiReply ask(const std::string& user, const std::string& form, const Variables& more = {}) {
        return post(PROGRAM_SEARCH, user, form, more);
    }
    static int code(const CgiReply& reply) { return reply.json["error"]["code"].asInt(); }
    static std::string start(const std::string& user, const std::string& form, const Variables& more = {}) {
        const CgiReply reply = ask(user, "action=start&" + form, more);
        EXPECT_TRUE(reply.json["success"].asBool()) << form << reply.body;
        started().emplace_back(user, reply.json["data"]["taskid"].asString());
        return started().back().second;
    }
    static CgiReply list(const std::string& user, const std::string& id, const std::string& more = "") {
        return CgiReply(runCgi(PROGRAM_SEARCH, user, "GET", "action=list&" + more + "&limit=10000&taskid=" + id));
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
        std::vector<size_t> rows;     // hashes of all that is told of each, in order
        std::set<std::string> ways;
    };
    // Everything that a search finds, but the times of access: they are the walk's own doing.
    static Found found(const std::string& user, const std::string& form) {
        const std::string id = start(user, form);
        Json::Value data = finished(user, id).json["data"];
        EXPECT_FALSE(data["failed"].asBool()) << form;
        Found result;
        for (const Json::Value& way : data["shares"]) result.ways.insert(way.asString());
        const size_t total = data["total"].asUInt();
        while (!data["items"].empty()) {
            for (Json::Value& item : data["items"]) {
                item["additional"]["time"].removeMember("atime");
                const bool raw = item.isMember("path_raw");
                result.paths.insert(raw ? item["path_raw"].asString() : percentEncode(item["path"].asString()));
                result.rows.push_back(std::hash<std::string>()(item.toStyledString()));
            }
            data = list(user, id, kProperties + ("&offset=" + std::to_string(result.rows.size()))).json["data"];
        }
        EXPECT_EQ(result.rows.size(), total) << form;
        EXPECT_TRUE(ask(user, "action=clean&taskid=" + id).json["success"].asBool());
        return result;
    }
    static void index(const std::string& action, const std::string& share) {
        EXPECT_EQ(runProgram({ORVELCTL, "index", action, share}).status, 0) << action << share;
    }
    static std::unique_ptr<KTR::Task> record(const std::string& user, const std::string& id) {
        return std::unique_ptr<KTR::Task>(KTR::TaskMgr(user.c_str()).getTask(("Quorvane_Search_" + id).c_str()));
    }
    static std::string database(const std::string& user, const std::string& id) {
        return "/tmp/@tmp/orvel/PXSearch/" + user + "/" + id;
    }
    void TearDown() override {
        for (const auto& [user, id] : started()) fs::remove_all(database(user, id));
        started().clear();
        ApplianceTest::TearDown();
    }

 private:
    static std::vector<std::pair<std::string, std::string>>& started() {
        static std::vector<std::pair<std::string, std::string>> searches;  // user and id
        return searches;
    }
};

// A tree of files of every kind of name, owner, size and time, the same each time.
void generate(const std::string& root, int entries) {
    static constexpr std::pair<const char*, const char*> kNames[] = {
        {"Alpha ", ".txt"}, {"beta_", ".JPG"},     {"rep*ort ", ".md"}, {"straße", ".txt"},
        {"\xFF", ".bin"},   {"no extension ", ""}, {"r", ".tar.gz"},    {"it's \"", "\".jpg"}};
    static constexpr uid_t kOwners[] = {kAliceUid, kBobUid, 0, 65000};
    std::vector<std::string> folders = {root};
    for (int i = 0; i < entries; ++i) {
        const auto& [front, back] = kNames[i % 8];
        const std::string name = front + std::to_string(i) + back;
        const std::string path = folders[static_cast<size_t>(i) * 7 % folders.size()] + "/" + name;
        if (i % 12 == 0) {
            fs::create_directory(path);
            folders.push_back(path);
        } else {
            writeFile(path, "");
            EXPECT_EQ(truncate(path.c_str(), i % 5 == 0 ? 4096 : i * 37), 0);
        }
        EXPECT_EQ(chown(path.c_str(), kOwners[i % 4], i % 3 == 0 ? gid_t{kUsersGid} : 0), 0);
        const timespec times[] = {{i % 2 == 0 ? 5000 : 50, 0}, {1000000 + i * 10, 0}};
        EXPECT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
    }
    makeFolder(root + "/@tmp/inside alpha.txt");
    fs::create_symlink("/etc", root + "/alpha.link");
    EXPECT_EQ(mkfifo((root + "/alpha.fifo").c_str(), 0666), 0);
}

struct File {
    std::string path, name;  // share-relative
    struct stat status;
    [[nodiscard]] bool isFolder() const { return S_ISDIR(status.st_mode); }
    [[nodiscard]] long long size() const { return isFolder() ? 0 : status.st_size; }
    [[nodiscard]] bool contains(const char* part) const { return strcasestr(name.c_str(), part) != nullptr; }
    [[nodiscard]] bool endsWith(const char* end) const {
        return name.size() >= strlen(end) && strcasecmp(name.c_str() + name.size() - strlen(end), end) == 0;
    }
};

std::vector<File> filesOf(const std::string& root, const std::string& shown) {
    std::vector<File> files;
    for (fs::recursive_directory_iterator at(root), end; at != end; ++at) {
        const std::string real = at->path(), name = at->path().filename();
        struct stat status = {};
        EXPECT_EQ(lstat(real.c_str(), &status), 0) << real;
        const bool hidden = name == "@tmp" || real == root + "/#recycle";
        if (hidden) at.disable_recursion_pending();
        if (hidden || !(S_ISREG(status.st_mode) || S_ISDIR(status.st_mode))) continue;
        files.push_back({shown + real.substr(root.size()), name, status});
    }
    return files;
}

struct Query {
    std::string form;
    std::function<bool(const File&)> matches;
};

std::vector<Query> singleQueries() {
    return {
        {"name=ALPHA", [](const File& f) { return f.contains("alpha"); }},
        {"name=" + percentEncode("*.jpg, \"rep\\*ort\""),
         [](const File& f) { return f.endsWith(".jpg") || f.contains("rep*ort"); }},
        {"name=" + percentEncode("STRAẞE,?%\"*,beta_1?.*"),
         [](const File& f) { return f.name.starts_with("straße") || (f.contains("beta_1") && f.name.size() == 11); }},
        {"type=dir", [](const File& f) { return f.isFolder(); }},
        {"extension=txt,%20GZ",
         [](const File& f) { return !f.isFolder() && (f.endsWith(".txt") || f.endsWith(".gz")); }},
        {"owner=alice", [](const File& f) { return f.status.st_uid == kAliceUid; }},
        {"group=users", [](const File& f) { return f.status.st_gid == kUsersGid; }},
        {"mtime_from=1004000", [](const File& f) { return f.status.st_mtime >= 1004000; }},
        {"mtime_to=1010000&mtime_from=1002000",
         [](const File& f) { return f.status.st_mtime < 1010000 && f.status.st_mtime >= 1002000; }},
        {"crtime_from=1&crtime_to=99999999999", [](const File&) { return true; }},
        // Folders were read just now.
        {"atime_from=1000", [](const File& f) { return f.isFolder() || f.status.st_atime >= 1000; }},
        {"size_equal=4096", [](const File& f) { return f.size() >= 3892 && f.size() < 4300; }},
        {"size_less=900", [](const File& f) { return f.size() < 900; }},
        {"size_greater=20000", [](const File& f) { return f.size() > 20000; }},
    };
}

// Each alone, each with another, and each with a list of names.
std::vector<Query> queries() {
    const std::vector<Query> singles = singleQueries();
    std::vector<Query> all = singles;
    const auto both = [](const Query& a, const Query& b) {
        return Query{a.form + "&" + b.form, [a, b](const File& f) { return a.matches(f) && b.matches(f); }};
    };
    for (size_t i = 3; i < singles.size(); ++i) {
        all.push_back(both(singles[1], singles[i]));
        all.push_back(both(singles[5], singles[i]));
        all.push_back(both(singles[i], singles[i + 4 < singles.size() ? i + 4 : 0]));
    }
    return all;
}

TEST_F(SearchCgi, WalkAndIndexFindWhatAModelFinds) {
    SKIP_WITHOUT_ROOT();
    const char* wanted = getenv("ORVEL_SEARCH_ENTRIES");
    const int entries = wanted != nullptr ? std::stoi(wanted) : 2000;
    const std::string root = addShare("photo", kIndexed), home = shareRoot("homes") + "/alice";
    addShare("homes", kIndexed);
    const std::string first = root + "/one/Alpha's", second = root + "/two";
    for (const std::string& folder : {first, second, home}) makeFolder(folder);
    makeFolder(root + "/#recycle/alpha/folder");
    generate(first, entries / 2);
    generate(second, entries / 4);
    generate(home, entries / 4);
    ASSERT_EQ(chown(home.c_str(), kAliceUid, kUsersGid), 0);

    struct Scope {
        std::string form;
        std::vector<File> files;
    };
    std::vector<Scope> scopes = {{"path=/photo", filesOf(root, "/photo")},
                                 {"path=/photo/one/Alpha's&path=/PHOTO//two/./", {}},
                                 {"path=/home", filesOf(home, "/home")},
                                 {"path=/photo/two&path=/home/&recursive=false", {}}};
    for (const File& file : scopes[0].files) {
        if (file.path.starts_with("/photo/one/Alpha's/") || file.path.starts_with("/photo/two/"))
            scopes[1].files.push_back(file);
        if (fs::path(file.path).parent_path() == "/photo/two") scopes[3].files.push_back(file);
    }
    for (const File& file : scopes[2].files) {
        if (fs::path(file.path).parent_path() == "/home") scopes[3].files.push_back(file);
    }

    const std::vector<Query> all = queries();
    std::vector<std::vector<size_t>> walked;
    const auto formOf = [&](size_t i) { return scopes[i % 4].form + "&" + all[i].form; };
    size_t total = 0;
    for (size_t i = 0; i < all.size(); ++i) {
        const Found data = found("alice", formOf(i));
        std::set<std::string> expected;
        for (const File& file : scopes[i % 4].files) {
            if (all[i].matches(file)) expected.insert(percentEncode(file.path));
        }
        EXPECT_EQ(data.paths, expected) << formOf(i);
        EXPECT_EQ(data.ways, std::set<std::string>{"walk"});
        walked.push_back(data.rows);
        total += expected.size();
    }
    EXPECT_GT(total, all.size());
    index("build", "photo");
    index("build", "homes");
    for (size_t i = 0; i < all.size(); ++i) {
        const Found indexed = found("alice", formOf(i));
        EXPECT_EQ(indexed.rows, walked[i]) << formOf(i);
        EXPECT_EQ(indexed.ways, std::set<std::string>{"index"});
    }
}

TEST_F(SearchCgi, NobodySeesNamesOutOfHisSight) {
    SKIP_WITHOUT_ROOT();
    const std::string root = addShare("photo", kIndexed);
    addShare("closed", std::string(kIndexed) + "invalid users = bob\n");
    struct {
        const char* path;
        mode_t mode;
    } const folders[] = {{"/open", 0755}, {"/open/secret", 0700}, {"/open/drop", 0733}, {"/open/blind", 0744}};
    for (const auto& [path, mode] : folders) {
        makeFolder(root + path + "/below");
        writeFile(root + path + "/f", "x");
        writeFile(root + path + "/below/f", "x");
    }
    for (const auto& [path, mode] : folders) makeFolder(root + path, mode);
    writeFile(shareRoot("closed") + "/f", "x");
    const std::set<std::string> seen = {"/photo/open",         "/photo/open/f",    "/photo/open/below",
                                        "/photo/open/below/f", "/photo/open/drop", "/photo/open/secret",
                                        "/photo/open/blind"};
    for (const bool indexed : {false, true}) {
        if (indexed) index("build", "photo");
        EXPECT_EQ(found("bob", "path=/photo&path=/closed&name=*").paths, seen) << indexed;
        // Below a folder that he cannot pass, chosen directly.
        EXPECT_EQ(code(ask("bob", "action=start&name=*&path=/photo/open/secret/below")), 407) << indexed;
        EXPECT_EQ(found("carol", "path=/photo&path=/closed&name=*").paths.size(), 17U) << "an administrator";
    }
}

// Rows are older than what stands at their paths by now: rights are those of a file in its folder, not of what a link
// there leads to.
TEST_F(SearchCgi, RightsAreAskedWithoutLinks) {
    const std::string root = shareRoot("photo");
    for (const char* path : {"/kept/f", "/file/f", "/above/f"}) writeFile(root + path, "x", 0666);
    const std::string temporary = "/tmp/@tmp/orvel";
    makeFolder(temporary, 0777);
    const std::string id = start("alice", "path=/photo&name=f&type=file");
    finished("alice", id);
    EXPECT_TRUE(geteuid() != 0 || (statusOf(temporary).st_mode & S_ISVTX) != 0) << "nobody takes results away";
    fs::remove(root + "/file/f");
    fs::create_symlink("../kept/f", root + "/file/f");
    fs::rename(root + "/above", root + "/was");
    fs::create_symlink("kept", root + "/above");
    std::map<std::string, bool> readable;
    const CgiReply reply = list("alice", id, "additional=perm");
    for (const Json::Value& item : reply.json["data"]["items"]) {
        readable[item["path"].asString()] = item["additional"]["perm"]["acl"]["read"].asBool();
    }
    EXPECT_EQ(readable, (std::map<std::string, bool>{
                            {"/photo/above/f", false}, {"/photo/file/f", false}, {"/photo/kept/f", true}}));
}

TEST_F(SearchCgi, RequestsAreTakenStrictly) {
    writeFile(shareRoot("photo") + "/file", "x");
    fs::create_symlink("/etc", shareRoot("photo") + "/outside");
    makeFolder(shareRoot("photo") + "/#recycle/folder");
    const std::string longPattern(491, 'a');
    std::string manyPatterns = "a", manyFolders;
    for (int i = 0; i < 100; ++i) manyPatterns += ",a";
    for (int i = 0; i < 501; ++i) manyFolders += "&path=/photo";
    struct {
        std::string form;
        int status, code;
        std::string parameter;
    } const cases[] = {
        {"", 400, 400, ""},
        {"action=burn", 400, 400, ""},
        {"action=start&path=/photo", 400, 400, ""},
        {"action=start&path=/photo&name=&type=all", 400, 400, ""},
        {"action=start&name=a", 400, 400, ""},
        {"action=start&name=a" + manyFolders, 400, 400, ""},
        {"action=start&name=a&path_raw=/photo/%25zz", 400, 400, ""},
        {"action=start&name=a&path=/photo&recursive=maybe", 400, 400, ""},
        {"action=start&path=/photo&name=%20,%20", 400, 400, "name"},
        {"action=start&path=/photo&name=" + longPattern, 400, 400, "name"},
        {"action=start&path=/photo&name=" + std::string(10000, '*'), 400, 400, "name"},
        {"action=start&path=/photo&name=" + manyPatterns, 400, 400, "name"},
        {"action=start&path=/photo&type=link", 400, 400, "type"},
        {"action=start&path=/photo&extension=,", 400, 400, "extension"},
        {"action=start&path=/photo&owner=nobody%20here", 200, 403, "owner"},
        {"action=start&path=/photo&group=*", 200, 404, "group"},
        {"action=start&path=/photo&mtime_from=yesterday", 400, 400, "mtime_from"},
        {"action=start&path=/photo&crtime_to=-1", 400, 400, "crtime_to"},
        {"action=start&path=/photo&atime_to=1e9", 400, 400, "atime_to"},
        {"action=start&path=/photo&size_less=10%20MB", 400, 400, "size_less"},
        {"action=start&path=/photo&size_equal=99999999999999999999", 400, 400, "size_equal"},
        {"action=start&name=a&path=", 200, 400, ""},
        {"action=start&name=a&path=/", 200, 401, ""},
        {"action=start&name=a&path=/nowhere", 200, 408, ""},
        {"action=start&name=a&path=/photo&path=/photo/missing", 200, 408, ""},
        {"action=start&name=a&path=/photo/file", 200, 408, ""},
        {"action=start&name=a&path=/photo/outside", 200, 407, ""},
        {"action=start&name=a&path=/photo/%23recycle", 200, 407, ""},
        {"action=start&name=a&path=/photo/../..", 200, 407, ""},
        {"action=list&taskid=../alice", 400, 400, ""},
        {"action=list&taskid=", 400, 400, ""},
        {"action=stop&taskid=5a1f", 400, 400, ""},
        {"action=clean&taskid=../../../../etc/passwd", 400, 400, ""},
        {"action=clean&taskid=" + std::string(17, 'A'), 400, 400, ""},
        {"action=list&taskid=5A1F", 200, 408, ""},
        {"action=stop&taskid=5A1F", 200, 408, ""},
        {"action=clean&taskid=5A1F", 200, 408, ""},
    };
    for (const auto& broken : cases) {
        const CgiReply reply = ask("alice", broken.form);
        EXPECT_EQ(reply.status, broken.status) << broken.form;
        EXPECT_EQ(code(reply), broken.code) << broken.form;
        EXPECT_EQ(reply.json["data"]["parameter"], broken.parameter.empty() ? Json::Value() : broken.parameter)
            << broken.form;
    }
    EXPECT_EQ(ask("", "action=list&taskid=5A1F").status, 401);
    for (const std::string action : {"start", "stop", "clean"}) {
        const std::string query = "action=" + action + "&path=/photo&name=a&taskid=5A1F";
        EXPECT_EQ(CgiReply(runCgi(PROGRAM_SEARCH, "alice", "GET", query)).status, 400) << action;
    }
}

// Held before its fourth match.
TEST_F(SearchCgi, ARunningSearchIsReadStoppedKilledAndCleaned) {
    SKIP_WITHOUT_ROOT();
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

TEST_F(SearchCgi, SearchesOfTheDayBeforeYesterdayAreSweptAway) {
    SKIP_WITHOUT_ROOT();
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
    SKIP_WITHOUT_ROOT();
    generate(shareRoot("photo"), 3000);
    for (const bool indexed : {false, true}) {
        if (indexed) addShare("photo", kIndexed);
        if (indexed) index("build", "photo");
        inChild([&] {
            const rlimit small = {500000, 500000};
            EXPECT_TRUE(signal(SIGXFSZ, SIG_IGN) != SIG_ERR && setrlimit(RLIMIT_FSIZE, &small) == 0);
            const std::string id = start("carol", "path=/photo&size_greater=-1");
            const Json::Value data = finished("carol", id).json["data"];
            EXPECT_TRUE(data["failed"].asBool()) << data.toStyledString().substr(0, 500);
            EXPECT_LT(data["total"].asInt(), 3000);
            EXPECT_TRUE(ask("carol", "action=clean&taskid=" + id).json["success"].asBool());
            return 0;
        });
    }
}

TEST_F(SearchCgi, WhatAnIndexCannotHoldIsSaid) {
    SKIP_WITHOUT_ROOT();
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

TEST_F(SearchCgi, ADatabaseThatIsNoneIsRefused) {
    SKIP_WITHOUT_ROOT();
    for (int i = 0; i < 500; ++i) writeFile(shareRoot("photo") + "/" + std::to_string(i), "");
    const std::string victim = systemRoot() + "/victim";
    writeFile(victim, "victim", 0666);
    const std::pair<const char*, std::function<void(const std::string&)>> cases[] = {
        {"garbage", [](const std::string& file) { writeFile(file, std::string(9000, 'x')); }},
        {"empty", [](const std::string& file) { writeFile(file, ""); }},
        {"truncated",
         [](const std::string& file) {
             EXPECT_EQ(truncate(file.c_str(), static_cast<off_t>(fs::file_size(file) / 2)), 0);
         }},
        {"link", [&](const std::string& file) { fs::remove(file), fs::create_symlink(victim, file); }},
        {"second name", [&](const std::string& file) { fs::create_hard_link(file, file + "x"); }},
        {"fifo", [](const std::string& file) { fs::remove(file), mkfifo(file.c_str(), 0666); }},
        {"folder", [](const std::string& file) { fs::remove(file), fs::create_directory(file); }},
        {"of another", [](const std::string& file) { EXPECT_EQ(chown(file.c_str(), kBobUid, 0), 0); }},
        {"gone", [](const std::string& file) { fs::remove(file); }},
    };
    for (const auto& [what, spoil] : cases) {
        const std::string id = start("alice", "path=/photo&type=file");
        EXPECT_EQ(finished("alice", id).json["data"]["total"].asUInt(), 500U);
        spoil(database("alice", id));
        const CgiReply reply = list("alice", id);
        EXPECT_TRUE(code(reply) != 0 || reply.json["data"]["items"].empty()) << what << reply.body.substr(0, 300);
        const CgiReply renamed =
            post(PROGRAM_OPERATION, "alice", "action=mkdir&path=/photo/" + percentEncode(what) + "&taskid=" + id);
        EXPECT_TRUE(renamed.json["success"].asBool()) << "the operation itself is done: " << what;
        EXPECT_TRUE(ask("alice", "action=clean&taskid=" + id).json["success"].asBool()) << what;
    }
    EXPECT_EQ(readFile(victim), "victim");
}

TEST_F(SearchCgi, ResultsFollowTheOperations) {
    SKIP_WITHOUT_ROOT();
    const std::string root = addShare("photo", "read only = no\n"), folder = root + "/_50%*'\"",
                      twin = root + "/x50%*'\"";
    fs::create_directory_symlink("_50%*'\"", root + "/link");
    for (int i = 0; i < 1000; ++i) writeFile(folder + "/deep/" + std::to_string(i) + ".txt", "abc");
    writeFile(twin + "/deep/stays.txt", "abc");
    EXPECT_EQ(runProgram({"/bin/chown", "-R", "20001:20100", root}).status, 0);
    const std::string id = start("alice", "path=/photo&extension=txt");
    EXPECT_EQ(finished("alice", id).json["data"]["total"].asUInt(), 1001U);
    const auto operation = [&](const std::string& form) {
        EXPECT_EQ(code(post(PROGRAM_OPERATION, "alice", form + "&taskid=" + id)), 0) << form;
    };
    // Through a link, as a page may show it: the rows have the paths without.
    operation("action=rename&path=/photo/link/deep&name=new%20place");
    operation("action=rename&path=/photo/" + percentEncode("_50%*'\"") + "&name=" + percentEncode("%_ renamed"));
    operation("action=rename&path=/photo/" + percentEncode("%_ renamed") + "/new%20place/7.txt&name=zzz.TXT");
    operation("action=mkdir&path=/photo/made.txt");
    for (const std::string size : {"12345", "1234567"}) {
        const std::string query = "overwrite=overwrite&path=/photo/up.txt&taskid=" + id;
        EXPECT_EQ(code(CgiReply(runCgi(PROGRAM_UPLOAD, "alice", "PUT", query, size))), 0);
    }
    const Json::Value data = list("alice", id, "additional=size&sort_by=name&sort_direction=desc").json["data"];
    const std::string moved = "/photo/%_ renamed/new place/";
    EXPECT_EQ(data["total"].asUInt(), 1003U);
    EXPECT_EQ(data["items"][0]["path"], moved + "zzz.TXT");
    EXPECT_EQ(data["items"][1]["path"], "/photo/up.txt");
    EXPECT_EQ(data["items"][1]["additional"]["size"], 7.0);
    EXPECT_EQ(data["items"][2]["path"], "/photo/x50%*'\"/deep/stays.txt");
    EXPECT_EQ(data["items"][3]["path"], "/photo/made.txt");
    for (Json::ArrayIndex i = 4; i < data["items"].size(); ++i) {
        EXPECT_TRUE(data["items"][i]["path"].asString().starts_with(moved)) << data["items"][i];
    }
    EXPECT_EQ(list("alice", id, "filetype=dir").json["data"]["items"][0]["name"], "made.txt");
    EXPECT_EQ(list("alice", id, "filter=ZZ").json["data"]["total"].asUInt(), 1U);
    EXPECT_EQ(list("alice", id, "limit=0").status, 400);
    EXPECT_EQ(post(PROGRAM_OPERATION, "alice", "action=mkdir&path=/photo/q&taskid=../x").status, 400);
}

}  // namespace
