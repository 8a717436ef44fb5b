// Every operation that writes, killed before each call that changes something, and with each of its calls failing:
// nothing is lost, torn or left behind for all to see, and nothing unfinished is reported as done.
//   ORVEL_TEST_CALLS=all   every call, with every error; without it a choice of a few for each operation
#include <json/reader.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>

#include <cerrno>
#include <csignal>
#include <cstring>
#include <map>

#include "apps/task_fixture.h"
#include "platform/private_mounts.h"
#include "support/calls.h"
#include "vexo/filesystem.h"

namespace {

using Tree = std::map<std::string, std::string>;  // path and content of what users see; further facts by name

struct Work {
    const char *name, *program, *user, *method, *query, *body;
    bool again = true;  // whether it can be repeated after a failure
    const char* type = "application/x-www-form-urlencoded";
};

constexpr const char* kForm =
    "--b\r\nContent-Disposition: form-data; name=\"file\"; filename=\"formed\"\r\n\r\nby form\r\n--b--\r\n";

const Work kWorks[] = {
    {"upload", PROGRAM_UPLOAD, "alice", "PUT", "path=/photo/new", "uploaded"},
    {"upload over", PROGRAM_UPLOAD, "alice", "PUT", "path=/photo/old&overwrite=overwrite", "replaced"},
    {"upload form", PROGRAM_UPLOAD, "alice", "POST", "path=/photo", kForm, true, "multipart/form-data; boundary=b"},
    {"mkdir", PROGRAM_OPERATION, "alice", "POST", "", "action=mkdir&path=/photo/made"},
    {"rename", PROGRAM_OPERATION, "alice", "POST", "", "action=rename&path=/photo/old&name=other"},
    {"copy", PROGRAM_OPERATION, "alice", "POST", "", "action=copy&conflict=skip&path=/photo/d&target=/video"},
    {"copy over", PROGRAM_OPERATION, "alice", "POST", "",
     "action=copy&conflict=overwrite&path=/photo/old&target=/video"},
    {"move", PROGRAM_OPERATION, "alice", "POST", "", "action=move&path=/photo/d&target=/video", false},
    {"move over", PROGRAM_OPERATION, "alice", "POST", "",
     "action=move&conflict=overwrite&path=/photo/old&target=/video", false},
    {"move afar", PROGRAM_OPERATION, "alice", "POST", "", "action=move&conflict=skip&path=/photo/d&target=/other",
     false},
    {"delete", PROGRAM_OPERATION, "alice", "POST", "", "action=delete&path=/photo/d&path=/photo/old", false},
    {"delete for good", PROGRAM_OPERATION, "alice", "POST", "", "action=delete&permanent=true&path=/photo/d", false},
    {"restore", PROGRAM_OPERATION, "alice", "POST", "", "action=restore&path=/photo/%23recycle/gone/f", false},
    {"empty", PROGRAM_OPERATION, "alice", "POST", "", "action=empty&path=/photo", false},
    {"compress", PROGRAM_OPERATION, "alice", "POST", "", "action=compress&path=/photo/d&target=/video/d.zip"},
    {"extract", PROGRAM_OPERATION, "alice", "POST", "", "action=extract&conflict=skip&path=/photo/a.zip&target=/video"},
    {"link", PROGRAM_LINK, "alice", "POST", "", "action=create&path=/photo/d", false},
};

class Unfinished : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        other_ = addShare("other", "read only = no\n");
        const int file = open(sharedFile_.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666);
        ASSERT_EQ(fchmod(file, 0666) + ftruncate(file, sizeof(Calls)), 0);
        shared_ = static_cast<Calls*>(mmap(nullptr, sizeof(Calls), PROT_READ | PROT_WRITE, MAP_SHARED, file, 0));
        close(file);
        ASSERT_NE(shared_, MAP_FAILED);
        ASSERT_EQ(prctl(PR_SET_CHILD_SUBREAPER, 1), 0);
    }
    void TearDown() override {
        munmap(shared_, sizeof(Calls));
        prctl(PR_SET_CHILD_SUBREAPER, 0);
        TaskCgi::TearDown();
    }
    // Everything as it is before an operation.
    void lay() {
        for (const std::string& root : {photo_, video_, other_}) {
            for (const auto& entry : fs::directory_iterator(root)) fs::remove_all(entry.path());
        }
        fs::remove_all(systemRoot() + "/var");
        fs::remove_all(systemRoot() + "/usr");
        for (const char* file : {"/old", "/d/1", "/d/sub/2", "/d/sub/3", "/#recycle/gone/f", "/#recycle/gone/g"}) {
            writeFile(photo_ + file, std::string("content of ") + file, 0666);
        }
        writeFile(video_ + "/old", "the one before", 0666);
        if (!zip_.empty()) writeFile(photo_ + "/a.zip", zip_, 0666);
        support::makeFolder(photo_ + "/gone", 0777);
        for (const auto& entry : fs::recursive_directory_iterator(photo_)) {
            chmod(entry.path().c_str(), entry.is_directory() ? 0777 : 0666);
            give(entry.path());
            const timespec times[] = {{1000000000, 0}, {1000000000, 0}};
            utimensat(AT_FDCWD, entry.path().c_str(), times, 0);
        }
    }
    [[nodiscard]] Tree seen() const {
        Tree tree;
        for (const std::string share : {"photo", "video", "other"}) {
            const std::string root = shareRoot(share);
            for (auto at = fs::recursive_directory_iterator(root); at != fs::recursive_directory_iterator(); ++at) {
                const std::string name = at->path().filename();
                if (isHidden(name)) {
                    at.disable_recursion_pending();
                    continue;
                }
                tree["/" + share + at->path().string().substr(root.size())] =
                    at->is_directory() ? "folder" : readFile(at->path());
            }
        }
        const CgiReply links(support::runCgi(PROGRAM_LINK, "alice", "GET", "action=list"));
        tree["links"] = std::to_string(links.json["data"]["items"].size());
        return tree;
    }
    static bool isHidden(const std::string& name) {
        return name == "@tmp" || name == "@vexoea" || name.starts_with(VEXO_PART_PREFIX);
    }
    // Whether it reports success once it and its children have ended.
    bool run(const Work& work, bool struck) {
        support::Variables variables = {{"CONTENT_TYPE", work.type}};
        if (struck) {
            variables["LD_PRELOAD"] = TEST_CALLS;
            variables["ORVEL_CALLS"] = sharedFile_;
        }
        const support::Finished finished =
            support::finishCgi(work.program, work.user, work.method, work.query, work.body, variables);
        while (wait(nullptr) > 0 || errno == EINTR) {
        }
        EXPECT_TRUE(finished.status == 0 || finished.status == 128 + SIGKILL || finished.status == 1)
            << finished.status;
        const size_t body = finished.output.find("\r\n\r\n");
        Json::Value reply;
        if (body == std::string::npos || !Json::Reader().parse(finished.output.substr(body + 4), reply)) return false;
        if (!reply["success"].asBool()) return false;
        for (const Json::Value& file : reply["data"]["files"]) {
            if (file.isMember("error")) return false;
        }
        if (!reply["data"].isMember("taskid")) return true;
        const Json::Value task = status("alice", reply["data"]["taskid"].asString());
        EXPECT_TRUE(task.isNull() || task["finished"].asBool()) << "it ended";
        return task["state"] == "done" && task["errors"].empty() && task["errors_left_out"].asInt() == 0 &&
               (!struck || task["items_skipped"].asInt() == 0);
    }
    // One run with one call struck: what is there then is of before or after, and all of it is there.
    void judge(const Work& work, bool success, const Tree& before, const Tree& after) {
        const Tree now = seen();
        for (const auto& [path, content] : now) {
            // An archive whose members could not all be read says so itself.
            if (!success && content.find("_not_included.txt") != std::string::npos) return;
            const auto was = before.find(path), is = after.find(path);
            EXPECT_TRUE((was != before.end() && was->second == content) || (is != after.end() && is->second == content))
                << "torn or left behind: " << path << " = " << content.substr(0, 60);
        }
        for (const auto& [path, content] : before) {
            if (content == "folder" || path == "links") continue;
            const auto holds = [&](const auto& entry) { return entry.second == content; };
            if (std::none_of(after.begin(), after.end(), holds)) continue;
            EXPECT_TRUE(std::any_of(now.begin(), now.end(), holds)) << "lost: " << path;
        }
        if (success) {
            EXPECT_EQ(now, after) << "success of unfinished work";
        }
        if (!work.again || now == after) return;
        EXPECT_TRUE(run(work, false)) << "it cannot be done again";
        EXPECT_EQ(seen(), after) << "done again";
    }
    void sweep(const Work& work, bool kills, const std::vector<int>& errors, long step) {
        lay();
        const Tree before = seen();
        EXPECT_TRUE(run(work, false));
        const Tree after = seen();
        EXPECT_NE(before, after) << "it does something";
        long points = 0;
        for (const int error : kills ? std::vector<int>{0} : errors) {
            for (long nth = 1;; nth += step) {
                lay();
                memset(shared_, 0, sizeof *shared_);
                shared_->target = nth;
                shared_->error = error;
                shared_->changesOnly = kills ? 1 : 0;
                const bool success = run(work, true);
                SCOPED_TRACE(std::string(work.name) + ", call " + std::to_string(nth) + " (" + shared_->struck + ") " +
                             (kills ? "is the last" : strerror(error)));
                if (shared_->struck[0] == 0) {
                    EXPECT_TRUE(success);
                    EXPECT_EQ(seen(), after);
                    EXPECT_GT(nth, 3) << "no calls were seen";
                    break;
                }
                ++points;
                judge(work, success, before, after);
            }
        }
        printf("%s: %ld points\n", work.name, points);
    }
    Calls* shared_ = nullptr;
    std::string other_, zip_, sharedFile_ = systemRoot() + "/calls";
};

TEST_F(Unfinished, IsNeverLostTornOrCalledDone) {
    SKIP_WITHOUT_ROOT();
#ifdef __SANITIZE_ADDRESS__
    GTEST_SKIP() << "the sanitizer's own library must be the first that is loaded";
#endif
    const char* wanted = getenv("ORVEL_TEST_CALLS");
    const char* only = getenv("ORVEL_TEST_WORK");
    const bool all = wanted != nullptr && std::string(wanted) == "all";
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        if (mount("none", other_.c_str(), "tmpfs", 0, "mode=0777") != 0) return support::kNoPrivateMounts;
        prctl(PR_SET_CHILD_SUBREAPER, 1);
        lay();
        EXPECT_TRUE(run(kWorks[14], false));
        zip_ = readFile(video_ + "/d.zip");
        long number = 0;
        for (const Work& work : kWorks) {
            if (only != nullptr && std::string(only) != work.name) continue;
            ++number;
            sweep(work, true, {}, all ? 1 : 9 + number % 5);
            sweep(work, false, all ? std::vector<int>{EIO, ENOSPC, EACCES, EMFILE, EINTR} : std::vector<int>{EIO},
                  all ? 1 : 60 + number * 7 % 30);
        }
        return 0;
    }));
}

}  // namespace
