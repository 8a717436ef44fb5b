// Everything that writes, killed before each call that changes something, and with each of its calls failing: nothing
// is lost, torn or left behind for all to see, and nothing unfinished is reported as done.
//   ORVEL_TEST_CALLS=all    every call, with every error; =kills: every kill; without it a few for each, and every kill
//                           of an upload
//   ORVEL_TEST_WORK=NAME    only what has this name
#include <crypt.h>
#include <json/reader.h>
#include <sys/mman.h>
#include <sys/prctl.h>

#include "apps/task_fixture.h"
#include "orvel/sharing_settings.h"
#include "platform/private_mounts.h"
#include "support/calls.h"
#include "vexo/filesystem.h"
#include "vexo/index.h"
#include "vexo/link_store.h"
#include "vexo/settings.h"

namespace {

// Path and content of what users see; and what else there is, by a name without "/".
using Tree = std::map<std::string, std::string>;

// What is done. "LINK", "SEARCH" and "DELETED" stand for the ids of the link, the search and the deletion that are
// there, where `given` names one; orvelctl has no method. A form without a type is the usual one.
struct Work {
    const char *name, *program, *user, *method, *query, *body;
    const char* given = "";
    bool again = true;  // whether it can be repeated after a failure
    const char* type = "";
};

const std::vector<Work>& works() {
    static const auto rows = recordsOf<Work, const char*, const char*, const char*, const char*, const char*,
                                       const char*, const char*, bool, const char*>("apps/works");
    return rows;
}

bool isHidden(const std::string& name) {
    return name == "@tmp" || name == "@vexoea" || name.starts_with(VEXO_PART_PREFIX);
}

class Unfinished : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        SKIP_WITHOUT_ROOT();
        other_ = addShare("other", "read only = no\n");
        support::makeFolder(systemRoot() + "/tmp", 01777);
    }
    // Moves the appliance into memory, where nothing has to be waited for, in a mount namespace of its own. False where
    // the machine does not allow that.
    bool moveToMemory() {
        if (std::string(TEST_CALLS).starts_with("/tmp/")) return false;  // would be hidden
        const std::string memory = systemRoot() + "/memory";
        support::makeFolder(memory);
        if (mount("none", memory.c_str(), "tmpfs", 0, "mode=1777") != 0) return false;
        std::vector<std::string> words = {"/bin/cp", "-ax"};
        for (const std::string& root : {systemRoot(), photo_, video_, other_}) words.push_back(root);
        words.push_back(memory);
        EXPECT_EQ(support::runProgram(words).status, 0);
        return mount(memory.c_str(), "/tmp", nullptr, MS_MOVE, nullptr) == 0 &&
               mount("none", other_.c_str(), "tmpfs", 0, "mode=0777") == 0;
    }
    void share() {
        const std::string name = systemRoot() + "/calls";
        const orvel::Descriptor file(open(name.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666));
        ASSERT_EQ(fchmod(file.get(), 0666) + ftruncate(file.get(), sizeof(Calls)), 0);
        void* shared = mmap(nullptr, sizeof(Calls), PROT_READ | PROT_WRITE, MAP_SHARED, file.get(), 0);
        ASSERT_NE(shared, MAP_FAILED);
        shared_ = static_cast<Calls*>(shared);
    }
    // What takes work to make is made once.
    void prepare() {
        lay({});
        EXPECT_TRUE(run({"", "operation", "alice", "POST", "", "action=compress&path=/photo/d&target=/video/z"}));
        zip_ = readFile(video_ + "/z");
        VEXO::Link link;
        link.owner = "alice";
        link.uid = support::kAliceUid;
        link.path = "/photo/d";
        link.passwordHash = crypt("word", "$5$rounds=1000$salt$");
        EXPECT_TRUE(VEXO::LinkStore().add(link));
        link_ = link.id;
        links_ = readFile(linkDatabase_);
        lay({});
        EXPECT_TRUE(run({"", "orvelctl", "", nullptr, "index build photo", ""}));
        index_ = readFile(systemRoot() + kIndexFile);
    }
    // Everything as it is before the work.
    void lay(const Work& work) {
        for (const std::string& root : {photo_, video_, other_}) {
            for (const auto& entry : fs::directory_iterator(root)) fs::remove_all(entry.path());
        }
        for (const char* folder : {"/var", "/usr/vexo", "/run", "/tmp"}) {
            if (!fs::exists(systemRoot() + folder)) continue;
            for (const auto& entry : fs::directory_iterator(systemRoot() + folder)) fs::remove_all(entry.path());
        }
        for (const char* file : {"/old", "/d/1", "/d/sub/2", "/d/sub/3", "/#recycle/gone/f", "/#recycle/gone/g"})
            writeFile(photo_ + file, std::string("content of ") + file, 0666);
        writeFile(video_ + "/old", "the one before", 0666);
        if (!zip_.empty()) writeFile(photo_ + "/a.zip", zip_, 0666);
        support::makeFolder(photo_ + "/gone", 0777);
        for (const auto& entry : fs::recursive_directory_iterator(photo_)) {
            chmod(entry.path().c_str(), entry.is_directory() ? 0777 : 0666);
            give(entry.path());
            const timespec times[] = {{1000000000, 0}, {1000000000, 0}};
            utimensat(AT_FDCWD, entry.path().c_str(), times, 0);
        }
        laySystem(work.given);
    }
    void laySystem(const std::string& given) {
        for (const char* rest : {".pending", ".pending.new"}) fs::remove(systemRoot() + kSettings + rest);
        setSetting("PX_SHARING_SETTING", "anybody");
        writeRootFile("/usr/vexo/etc/vexosharing.conf", std::to_string(support::kBobUid) + "=\"true\"\n");
        writeRootFile("/tmp/foldersharing.current.users", "10.0.0.9,alice,abcdefghijk,1,1,1,1,other\n");
        if (given == "link") writeFile(linkDatabase_, links_, 0600);
        if (given == "index") {
            support::makeFolder(fs::path(systemRoot() + kIndexFile).parent_path(), 0700);
            writeFile(systemRoot() + kIndexFile, index_, 0600);
            writeFile(photo_ + "/d/since", "since the index was built", 0666);
        }
        const std::unique_ptr<KTR::Task> task(KTR::TaskMgr("alice").createTask(kEnded));
        EXPECT_TRUE(task != nullptr && task->finish());
        search_.clear();
        found_.clear();
        if (given == "deletion") {
            run({"", "operation", "alice", "POST", "", "action=delete&path=/photo/d&path=/photo/old"});
            Json::Value names(Json::arrayValue);
            EXPECT_TRUE(KTR::TaskMgr("alice").getAllTaskId("Quorvane_delete_", names) && names.size() == 1);
            deleted_ = names[0].asString();
        }
        if (given == "search") run({"", "search", "alice", "POST", "", "action=start&path=/photo/d&type=file"});
    }
    [[nodiscard]] Tree seen() const {
        Tree tree;
        for (const std::string share : {"photo", "video", "other"}) {
            const std::string root = shareRoot(share);
            for (auto at = fs::recursive_directory_iterator(root); at != fs::recursive_directory_iterator(); ++at) {
                if (isHidden(at->path().filename())) {
                    at.disable_recursion_pending();
                    continue;
                }
                tree["/" + share + at->path().string().substr(root.size())] =
                    at->is_directory() ? "folder" : readFile(at->path());
            }
        }
        addFacts(tree);
        return tree;
    }
    void addFacts(Tree& tree) const {
        std::vector<VEXO::Link> links;
        VEXO::LinkStore store;
        EXPECT_TRUE(store.list("", links)) << store.error();
        for (const VEXO::Link& link : links) tree["links"] += link.path + "\n";
        char setting[64] = {};
        VLIBCFileGetKeyValue(kSettings, "PX_SHARING_SETTING", setting, sizeof setting, 0);
        tree["setting"] = setting;
        for (const auto& [uid, chosen] : OrvelSharing::SharingManager().getPrivileges())
            tree["choices"] += std::to_string(uid) + (chosen ? " yes\n" : " no\n");
        std::istringstream records(readFile(systemRoot() + "/tmp/foldersharing.current.users"));
        for (std::string line; std::getline(records, line);) {
            const bool whole = !records.eof() && std::count(line.begin(), line.end(), ',') == 7;
            tree["log-ins"] += whole ? line.substr(line.rfind(',')) : "torn: " + line;
        }
        FIINDEXSTATUS status = {};
        const bool indexed = FILEIDXIndexStatus("photo", &status) == 0;
        tree["index"] = !indexed ? "" : status.built > 0 ? "whole" : "unfinished";
        if (indexed) tree["index"] += std::to_string(status.records);
        const auto isThere = [](const std::string& task) { return KTR::TaskMgr("alice").hasTask(task.c_str()); };
        tree["ended"] = isThere(kEnded) ? "there" : "";
        tree["search"] = !search_.empty() && isThere("Quorvane_Search_" + search_) ? "there" : "";
        tree["found"] = found_;
    }
    // What is there and nobody sees: of users, and of the system. What was to replace a task's record goes with that.
    [[nodiscard]] std::set<std::string> leftovers() const {
        std::set<std::string> names;
        for (const std::string& root : {photo_, video_, other_, systemRoot()}) {
            for (const auto& entry : fs::recursive_directory_iterator(root)) {
                const std::string name = entry.path().filename();
                const bool part = name.starts_with(VEXO_PART_PREFIX) || name.starts_with("part-");
                const bool system = name.ends_with(".new") || name.ends_with(".pending") || name.ends_with(".tmp") ||
                                    name.ends_with("-journal");
                if (part || system) names.insert(entry.path().parent_path().string() + "/" + name.substr(0, 11));
            }
        }
        return names;
    }
    [[nodiscard]] support::Finished call(const Work& work, support::Variables variables) {
        const auto filled = [&](std::string text) {
            for (const auto& [word, id] :
                 {std::pair("LINK", &link_), std::pair("SEARCH", &search_), std::pair("DELETED", &deleted_)}) {
                const size_t at = text.find(word);
                if (at != std::string::npos) text.replace(at, strlen(word), *id);
            }
            return text;
        };
        if (work.method == nullptr) {
            std::istringstream text(work.query);
            std::vector<std::string> words = {ORVELCTL};
            for (std::string word; text >> word;) words.push_back(word);
            return support::runProgram(words, variables);
        }
        variables["CONTENT_TYPE"] = *work.type == 0 ? "application/x-www-form-urlencoded" : work.type;
        variables["HTTP_FOLDER_SHARING"] = link_;
        variables["VEXO_GATE_MILLISECONDS"] = std::to_string(time_ += 1000000);  // nobody has to wait for a turn
        return support::finishCgi(std::string(PROGRAMS) + "/" + work.program, work.user, work.method, work.query,
                                  filled(work.body), variables);
    }
    // Strikes the n-th call that changes something (without an error), or the n-th of all.
    void order(long nth, int error) {
        memset(shared_, 0, sizeof *shared_);
        shared_->target = nth;
        shared_->error = error;
        shared_->changesOnly = error == 0 ? 1 : 0;
        shared_->work = work_;
        snprintf(shared_->only, sizeof shared_->only, "%s", error == 0 ? "" : only_);
    }
    // Whether it reports success once it and its children have ended.
    bool run(const Work& work, bool struck = false) {
        if (!struck) order(0, shared_->error);
        const support::Finished finished =
            call(work, {{"LD_PRELOAD", TEST_CALLS}, {"ORVEL_CALLS", systemRoot() + "/calls"}});
        while (wait(nullptr) > 0 || errno == EINTR) {
        }
        EXPECT_TRUE(finished.status == 0 || finished.status == 128 + SIGKILL || finished.status == 1)
            << finished.status;
        if (work.method == nullptr) return finished.status == 0;
        const size_t body = finished.output.find("\r\n\r\n");
        Json::Value reply;
        if (body == std::string::npos || !Json::Reader().parse(finished.output.substr(body + 4), reply)) return false;
        if (!reply["success"].asBool()) return false;
        for (const Json::Value& file : reply["data"]["files"]) {
            if (file.isMember("error")) return false;
        }
        const std::string id = reply["data"]["taskid"].asString();
        if (id.empty()) return true;
        return id.starts_with("Quorvane_") ? isDone(id, struck) : hasFound(id);
    }
    static bool isDone(const std::string& id, bool struck) {
        const std::unique_ptr<KTR::Task> task(KTR::TaskMgr("alice").getTask(id.c_str()));
        if (task == nullptr) return false;
        EXPECT_TRUE(task->isFinished()) << "it ended";
        const Json::Value data = task->getProperty("data");
        return !task->hasFailed() && data["state"] == "done" && data["errors"].empty() &&
               data["errors_left_out"].asInt() == 0 && (!struck || data["items_skipped"].asInt() == 0);
    }
    bool hasFound(const std::string& id) {
        const Json::Value data =
            CgiReply(support::runCgi(PROGRAM_SEARCH, "alice", "GET", "action=list&taskid=" + id)).json["data"];
        EXPECT_TRUE(data["finished"].asBool()) << "it ended";
        if (data["failed"].asBool() || data["stopped"].asBool()) return false;
        search_ = id;
        // Whatever cannot be read is passed over, as by an index.
        found_ = shared_->error == 0 ? data["total"].asString() : "";
        return true;
    }
    // One run with one call struck: what is there then is of before or after, and all of it is there.
    void judge(const Work& work, bool kills, bool success, const Tree& before, const Tree& after) {
        const Tree now = seen();
        for (const auto& [path, content] : now) {
            // An archive whose members could not all be read says so itself.
            if (!success && content.find("_not_included.txt") != std::string::npos) return;
            const auto was = before.find(path), is = after.find(path);
            EXPECT_TRUE((was != before.end() && was->second == content) || (is != after.end() && is->second == content))
                << "torn or left behind: " << path << " = " << content.substr(0, 60);
        }
        for (const auto& [path, content] : before) {
            if (content == "folder" || path[0] != '/') continue;
            const auto holds = [&text = content](const auto& entry) { return entry.second == text; };
            if (std::none_of(after.begin(), after.end(), holds)) continue;
            EXPECT_TRUE(std::any_of(now.begin(), now.end(), holds)) << "lost: " << path;
        }
        if (success) {
            EXPECT_EQ(now, after) << "success of unfinished work";
        }
        const std::set<std::string> left = leftovers();
        hidden_ += left.empty() ? 0 : 1;
        if (now == after && left.empty()) return;
        // What was met like this before needs no second look.
        if (!kills && !met_.emplace(now, left).second) return;
        const bool done = run(work);
        const std::set<std::string> still = leftovers();
        stays_.insert(still.begin(), still.end());
        if (!work.again || now == after) return;
        EXPECT_TRUE(done) << "it cannot be done again";
        EXPECT_EQ(seen(), after) << "done again";
        EXPECT_TRUE(still.empty()) << "stays: " << *still.begin();
    }
    // Strikes the n-th call. False when there is no such call.
    bool strike(const Work& work, long nth, int error, const Tree& before, const Tree& after) {
        const bool kills = error == 0;
        lay(work);
        order(nth, error);
        const bool success = run(work, true);
        SCOPED_TRACE(std::string(work.name) + ", call " + std::to_string(nth) + " (" + shared_->struck + ") " +
                     (kills ? "is the last" : strerror(error)));
        if (shared_->struck[0] == 0) {
            EXPECT_TRUE(success);
            EXPECT_EQ(seen(), after);
            return false;
        }
        ++points_;
        judge(work, kills, success, before, after);
        return true;
    }
    // Each call, or `few` of them; with a name only calls of that.
    void sweep(const Work& work, int error, int few, const char* only = "") {
        SCOPED_TRACE(work.name);
        only_ = only;
        work_ = &work - works().data();
        order(0, error);
        lay(work);
        const Tree before = seen();
        order(0, error);
        EXPECT_TRUE(run(work, true));
        const Tree after = seen();
        EXPECT_TRUE(before != after || error != 0) << "it does something";
        const long calls = shared_->count;
        EXPECT_GT(calls, 0) << "no calls were seen";
        const std::vector<unsigned long long> trace(shared_->trace,
                                                    shared_->trace + std::min<long>(calls + 1, kMostCalls));
        met_.clear();
        points_ = hidden_ = 0;
        for (int i = 0; i < few; ++i) strike(work, 1 + calls * (2 * i + 1) / (2 * few), error, before, after);
        const auto isKnown = [&](size_t nth) {
            return error != 0 && nth < trace.size() && !struck_.emplace(work.program, error, trace[nth]).second;
        };
        for (long nth = 1; few == 0 && (isKnown(static_cast<size_t>(nth)) || strike(work, nth, error, before, after));)
            ++nth;
        printf("%s, %s: %ld points, something hidden after %ld\n", work.name, error == 0 ? "killed" : strerror(error),
               points_, hidden_);
        for (const std::string& name : stays_) printf("    stayed: %s\n", name.c_str());
        fflush(stdout);
        stays_.clear();
        allPoints_ += points_;
    }
    static constexpr const char* kSettings = "/etc/vexoinfo.conf";
    static constexpr const char* kIndexFile = "/var/lib/vexo/index/photo.db";
    static constexpr const char* kEnded = "Quorvane_copy_0";
    Calls* shared_ = nullptr;
    const char* only_ = "";
    long work_ = 0;
    std::string other_, zip_, links_, index_, link_, search_, found_, deleted_;
    std::string linkDatabase_ = systemRoot() + VEXO::kLinkDatabase;
    std::set<std::pair<Tree, std::set<std::string>>> met_;
    std::set<std::string> stays_;
    // What a program does before it knows what is asked is struck once: program, error, trace up to the call.
    std::set<std::tuple<std::string, int, unsigned long long>> struck_;
    long points_ = 0, hidden_ = 0, allPoints_ = 0;
    long long time_ = 1000000;
};

TEST_F(Unfinished, IsNeverLostTornOrCalledDone) {
#ifdef __SANITIZE_ADDRESS__
    GTEST_SKIP() << "the sanitizer's own library must be the first that is loaded";
#endif
    const char* wanted = getenv("ORVEL_TEST_CALLS");
    const char* only = getenv("ORVEL_TEST_WORK");
    const std::string extent = wanted != nullptr ? wanted : "few";
    const std::map<std::string, std::vector<int>> extents = {
        {"few", {EIO, 0}}, {"kills", {0}}, {"all", {EIO, ENOSPC, EACCES, EMFILE, EINTR, 0}}};
    ASSERT_EQ(extents.count(extent), 1U) << extent;
    const int few = extent == "few" ? 3 : 0;
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        if (!moveToMemory()) return support::kNoPrivateMounts;
        share();
        prctl(PR_SET_CHILD_SUBREAPER, 1);
        prepare();
        for (const int error : extents.at(extent)) {
            for (const Work& work : works()) {
                const bool whole = error == 0 && std::string(work.name).starts_with("upload");
                if (only == nullptr || std::string(only) == work.name) sweep(work, error, whole ? 0 : few);
            }
            printf("%ld points so far\n", allPoints_);
        }
        // Where something lies decides whether it is thrown away, and where it comes back to; an archive that cannot be
        // begun is not one without members.
        for (const Work& work : works()) {
            const std::string name = work.name;
            if (few > 0 && (name == "delete" || name == "restore")) sweep(work, EIO, 0, "readlink");
            if (few > 0 && name == "compress") sweep(work, EIO, 0, "fstat");
            if (few > 0 && name == "index build") sweep(work, EACCES, 0, "readdir");
            if (few > 0 && name == "index update") sweep(work, EIO, 0, "readdir");
        }
        return 0;
    }));
}

}  // namespace
