// Background operations, from the request that starts them to what they leave behind.
#include <archive.h>
#include <archive_entry.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <thread>

#include "apps/program.h"
#include "operation/conflict.h"
#include "operation/member_path.h"
#include "operation/recycle.h"
#include "platform/private_mounts.h"
#include "support/appliance.h"
#include "text.h"
#include "vexo/task.h"

namespace fs = std::filesystem;
using orvel::cgi::percentEncode;
using support::CgiReply;
using support::readFile;
using support::writeFile;

namespace {

TEST(OperationNames, AreNumberedBeforeTheirEnding) {
    struct {
        std::string name, numbered;
        bool isFolder;
    } const cases[] = {{"a.txt", "a (2).txt", false},
                       {"a.b", "a.b (2)", true},
                       {".profile", ".profile (2)", false},
                       {"a", "a (2)", false},
                       {std::string(255, 'x') + ".txt", std::string(247, 'x') + " (2).txt", false},
                       {"a." + std::string(40, 'x'), "a." + std::string(40, 'x') + " (2)", false}};
    for (const auto& [name, numbered, isFolder] : cases) {
        EXPECT_EQ(orvel::cgi::numberedName(name, 2, isFolder), numbered);
    }
    std::string wide;
    while (wide.size() < 255) wide += "\xE2\x82\xAC";
    EXPECT_TRUE(orvel::cgi::isUtf8(orvel::cgi::numberedName(wide, 10, true))) << "no character is cut";
}

TEST(OperationNames, OfTheBinLeadBack) {
    EXPECT_EQ(orvel::cgi::binName("a.txt", 1), "a.txt");
    EXPECT_EQ(orvel::cgi::binName("a.txt", 2), "a (#2).txt");
    for (const char* name : {"a", "a.txt", ".a", "a (#2).txt", "a (#2)", "a.b (#7)", "a (#3) (#1).b", "a (#).b", "(#1)",
                             " (#1)", "a (2).txt", "a.(#2)", "a (#2).b (#3)"}) {
        for (const int number : {1, 2, 77}) {
            const std::string inBin = orvel::cgi::binName(name, number);
            EXPECT_EQ(orvel::cgi::originalName(inBin), name) << inBin;
            EXPECT_EQ(orvel::cgi::originalName(orvel::cgi::nextBinName(inBin, 5, false)), name);
        }
    }
}

TEST(OperationNames, OfArchivesLeadDownOnly) {
    for (const char* name : {"", "/", "/etc/passwd", "..", "a/../b", "./..", "a/..", ".", "./"}) {
        EXPECT_FALSE(orvel::cgi::memberComponents(name)) << name;
    }
    EXPECT_EQ(*orvel::cgi::memberComponents("./a//b/."), (std::vector<std::string>{"a", "b"}));
    EXPECT_EQ(*orvel::cgi::memberComponents("...\\..\\x"), (std::vector<std::string>{"...\\..\\x"}));
    struct {
        const char* text;
        size_t depth;
        bool inside;
    } const links[] = {{"a", 0, true},        {"../a", 1, true},       {"../a", 0, false},
                       {"../../a", 1, false}, {"", 1, false},          {"/etc", 3, false},
                       {"a/..", 1, false},    {"../a/../b", 2, false}, {"./../b", 1, true}};
    for (const auto& [text, depth, inside] : links) EXPECT_EQ(orvel::cgi::staysInside(text, depth), inside) << text;
}

// "path=..&path=.." of these paths, and a target unless it is empty.
std::string about(const std::vector<std::string>& paths, const std::string& target = "") {
    std::string form;
    for (const std::string& path : paths) form += "&path=" + percentEncode(path);
    return target.empty() ? form : form + "&target=" + percentEncode(target);
}

// What lies below a folder: a line for each entry with its permissions, and a file's content or a link's text.
std::string treeOf(const std::string& root) {
    std::vector<std::string> lines;
    for (const auto& entry : fs::recursive_directory_iterator(root)) {
        struct stat status {};
        lstat(entry.path().c_str(), &status);
        std::string line = entry.path().string().substr(root.size()) + " " + std::to_string(status.st_mode);
        if (entry.is_symlink()) {
            line += " " + fs::read_symlink(entry.path()).string();
        } else if (entry.is_regular_file()) {
            line += " " + std::to_string(status.st_mtime) + " " + readFile(entry.path());
        }
        lines.push_back(line);
    }
    std::sort(lines.begin(), lines.end());
    std::string all;
    for (const std::string& line : lines) all += line + "\n";
    return all;
}

class TaskCgi : public support::ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        photo_ = addShare("photo", "read only = no\nvalid users = alice, carol\nread list = bob\n");
        video_ = addShare("video", "read only = no\n");
    }
    static CgiReply ask(const std::string& user, const std::string& form) {
        return CgiReply(support::runCgi(PROGRAM_OPERATION, user, "POST", "", form,
                                        {{"CONTENT_TYPE", "application/x-www-form-urlencoded"}}));
    }
    static int code(const CgiReply& reply) { return reply.json["error"]["code"].asInt(); }
    // Starts an operation. "" when it was refused.
    static std::string start(const std::string& user, const std::string& form) {
        const CgiReply reply = ask(user, form);
        EXPECT_EQ(reply.status, 200) << form;
        return reply.json["data"]["taskid"].asString();
    }
    static Json::Value status(const std::string& user, const std::string& id) {
        return CgiReply(support::runCgi(PROGRAM_OPERATION, user, "GET", "action=status&taskid=" + id)).json["data"];
    }
    static Json::Value ended(const std::string& user, const std::string& id) {
        const std::unique_ptr<KTR::Task> task(KTR::TaskMgr(user.c_str()).getTask(id.c_str()));
        for (int i = 0; task != nullptr && i < 3000 && !task->isFinished(); ++i) {
            usleep(10000);
            task->reload();
        }
        return status(user, id);
    }
    static Json::Value perform(const std::string& user, const std::string& form) {
        const std::string id = start(user, form);
        EXPECT_NE(id, "") << form;
        return ended(user, id);
    }
    // "path code" of each error.
    static std::string errors(const Json::Value& task) {
        std::string all;
        for (const Json::Value& error : task["errors"]) {
            all += error["path"].asString() + " " + std::to_string(error["code"].asInt()) + "\n";
        }
        return all;
    }
    static std::string recordOf(const std::string& id) { return systemRoot() + "/var/lib/vexo/tasks/alice/" + id; }
    static bool hasParts(const std::string& root) {
        for (const auto& entry : fs::recursive_directory_iterator(root)) {
            if (entry.path().filename().string().starts_with(".part-")) return true;
        }
        return false;
    }
    static void give(const std::string& path, uid_t owner = support::kAliceUid) {
        EXPECT_EQ(lchown(path.c_str(), owner, support::kUsersGid), 0) << path;
    }
    std::string photo_, video_;
};

TEST_F(TaskCgi, CopiesKeepWhatFilesAre) {
    SKIP_WITHOUT_ROOT();
    support::makeFolder(photo_ + "/a/b", 0777);
    writeFile(photo_ + "/a/private", "secret", 0600);
    writeFile(photo_ + "/a/b/tool", "#!", 0755);
    writeFile(photo_ + "/a/b/\xFFraw\n", "bytes");
    writeFile(photo_ + "/a/@vexoea/x", "hidden");
    for (const char* name : {"/a/private", "/a/b/tool", "/a/b", "/a"}) give(photo_ + name);
    ASSERT_EQ(chmod((photo_ + "/a/b").c_str(), 0750), 0);
    fs::create_symlink("/etc/passwd", photo_ + "/a/link");
    const timespec old[] = {{1000000000, 0}, {1000000000, 5}};
    ASSERT_EQ(utimensat(AT_FDCWD, (photo_ + "/a/b").c_str(), old, 0), 0);
    writeFile(photo_ + "/a/holes", "x");
    ASSERT_EQ(truncate((photo_ + "/a/holes").c_str(), 8 << 20), 0);

    const Json::Value task =
        perform("alice", "action=copy" + about({"/photo/a", "/photo/none", "/nowhere/x"}, "/video"));
    EXPECT_EQ(task["state"], "done");
    EXPECT_EQ(errors(task), "/photo/none 408\n/nowhere/x 408\n");
    EXPECT_EQ(task["items_done"], 7);
    EXPECT_EQ(task["items_failed"], 2);
    EXPECT_EQ(task["items_total"], 9);
    EXPECT_EQ(task["bytes_done"], task["bytes_total"]);
    EXPECT_EQ(task["progress"], 1.0);
    EXPECT_FALSE(fs::exists(video_ + "/a/@vexoea"));
    fs::remove_all(photo_ + "/a/@vexoea");
    EXPECT_TRUE(treeOf(photo_ + "/a") == treeOf(video_ + "/a"));
    struct stat copied {};
    ASSERT_EQ(stat((video_ + "/a/holes").c_str(), &copied), 0);
    EXPECT_LT(copied.st_blocks, 100) << "holes stay holes";
    EXPECT_EQ(copied.st_uid, support::kAliceUid);
    ASSERT_EQ(stat((video_ + "/a/b").c_str(), &copied), 0);
    EXPECT_EQ(copied.st_mtime, 1000000000);
}

TEST_F(TaskCgi, ConflictsAreSolvedAsAsked) {
    SKIP_WITHOUT_ROOT();
    struct {
        const char *policy, *errors, *tree;  // names and contents in the target
        int done, skipped;
    } const cases[] = {
        {"error", "/photo/a.txt 414\n/photo/d 414\n/photo/m 414\n", "a.txt=old d/x=old m/f=old", 0, 0},
        {"skip", "", "a.txt=old d/x=old d/y=new m/f=old", 2, 3},
        {"overwrite", "/photo/m 414\n", "a.txt=new d/x=new d/y=new m/f=old", 4, 0},
        {"keep_both", "", "a (2).txt=new a.txt=old d (2)/x=new d (2)/y=new d/x=old m (2)=new m/f=old", 5, 0}};
    for (const char* action : {"copy", "move"}) {
        for (const auto& [policy, refused, tree, done, skipped] : cases) {
            SCOPED_TRACE(std::string(action) + " " + policy);
            for (const std::string& root : {photo_, video_}) fs::remove_all(root), support::makeFolder(root, 0777);
            ASSERT_EQ(chmod(photo_.c_str(), 0777) + chmod(video_.c_str(), 0777), 0);
            for (const char* file : {"/a.txt", "/d/x", "/d/y", "/m"}) writeFile(photo_ + file, "new", 0666);
            for (const char* file : {"/a.txt", "/d/x", "/m/f"}) writeFile(video_ + file, "old", 0666);
            for (const std::string& folder : {photo_ + "/d", video_ + "/d", video_ + "/m"}) give(folder);
            const Json::Value task = perform("alice", "action=" + std::string(action) + "&conflict=" + policy +
                                                          about({"/photo/a.txt", "/photo/d", "/photo/m"}, "/video"));
            EXPECT_EQ(errors(task), refused);
            EXPECT_EQ(task["state"], "done");
            std::string found;
            std::vector<std::string> paths;
            for (const auto& entry : fs::recursive_directory_iterator(video_)) {
                if (entry.is_regular_file()) paths.push_back(entry.path());
            }
            std::sort(paths.begin(), paths.end());
            for (const std::string& path : paths) {
                found += (found.empty() ? "" : " ") + path.substr(video_.size() + 1) + "=" + readFile(path);
            }
            EXPECT_EQ(found, tree);
            if (std::string(action) == "copy") {
                EXPECT_EQ(task["items_done"], done);
                EXPECT_EQ(task["items_skipped"], skipped);
                EXPECT_EQ(readFile(photo_ + "/d/x"), "new") << "the source stays";
            } else {
                const bool moved = std::string(policy) == "overwrite" || std::string(policy) == "keep_both";
                EXPECT_EQ(fs::exists(photo_ + "/a.txt"), !moved);
                EXPECT_EQ(fs::exists(photo_ + "/d"), !moved) << "with what stayed in it";
            }
        }
    }
}

// A link that climbs far is harmless deep in a share alone.
TEST_F(TaskCgi, ALinkThatWouldLeadOutStaysWhereItIs) {
    SKIP_WITHOUT_ROOT();
    writeFile(photo_ + "/a/b/f", "x", 0666);
    for (const auto& [text, link] : std::map<std::string, std::string>{
             {"../f", "/a/b/c/near"}, {"../../../..", "/a/b/c/d/top"}, {"/etc", "/a/b/c/d/e/absolute"}}) {
        fs::create_directories(fs::path(photo_ + link).parent_path());
        fs::create_symlink(text, photo_ + link);
    }
    fs::create_directories(photo_ + "/a/b/c/deeper");
    for (const auto& entry : fs::recursive_directory_iterator(photo_)) give(entry.path());
    struct {
        const char *path, *target;
        bool passes;
    } const cases[] = {{"/photo/a/b/c/d", "/photo/a", false},
                       {"/photo/a/b/c/d", "/photo", false},
                       {"/photo/a/b/c/d/top", "/photo/a", false},
                       {"/photo/a/b", "/photo", false},
                       {"/photo/a/b/c/d", "/video", false},
                       {"/photo/a/b/c/d/e", "/photo", true},
                       {"/photo/a/b/c/near", "/photo/a", true},
                       {"/photo/a/near", "/video", false},
                       {"/photo/a/b/c/d", "/photo/a/b/c/deeper", true}};
    for (const char* action : {"copy", "move"}) {
        for (const auto& [path, target, passes] : cases) {
            if (action[0] == 'c' && !fs::exists(fs::symlink_status(shareRoot("photo") + (path + 6)))) continue;
            const auto task = perform("alice", std::string("action=") + action + about({path}, target));
            EXPECT_EQ(errors(task), passes ? "" : path + std::string(" 407\n")) << action << path << target;
            if (action[0] == 'c' && passes) {
                fs::remove_all(shareRoot("photo") + (target + 6) + "/" + fs::path(path).filename().string());
            }
        }
    }
}

TEST_F(TaskCgi, SourcesAndTargetsAreJudged) {
    SKIP_WITHOUT_ROOT();
    addShare("fixed", "read only = no\nvexo:restriction = 2\n");
    addShare("locked", "read only = no\nvexo:restriction = 4\n");
    const std::string fat = addShare("usb", "read only = no\n");
    addMount(fat, "vfat");
    for (const char* share : {"fixed", "locked"}) writeFile(shareRoot(share) + "/f", "x", 0666);
    writeFile(photo_ + "/a/b/f", "1", 0666);
    for (const char* name : {"/case/Name", "/case/name", "/case/q?"}) writeFile(photo_ + name, name, 0666);
    give(photo_ + "/a");
    give(photo_ + "/case");
    fs::create_symlink("/etc", photo_ + "/out");
    struct {
        const char *user, *form;
        int code;            // of the request
        const char* errors;  // of the task
    } const cases[] = {
        {"bob", "action=copy&path=/video/x&target=/photo", 407, ""},
        {"alice", "action=copy&path=/photo/a&target=/photo/out", 407, ""},
        {"alice", "action=copy&path=/photo/a&target=/photo/none", 408, ""},
        {"alice", "action=copy&path=/photo/a&target=/photo/a/b/f", 408, ""},
        {"alice", "action=copy&path=/photo/a&target=/video&conflict=maybe", 400, ""},
        {"alice", "action=copy&path=/photo/a&target=/photo/a/b", 0, "/photo/a 1005\n"},
        {"alice", "action=move&path=/photo/a&target=/photo/a", 0, "/photo/a 1005\n"},
        {"alice", "action=copy&path=/photo/a&target=/photo", 0, "/photo/a 414\n"},
        {"alice", "action=copy&path=/photo/a&target=/photo&conflict=overwrite", 0, "/photo/a 1005\n"},
        {"alice", "action=copy&path=/photo/a&target=/photo&conflict=keep_both", 0, ""},
        {"alice", "action=copy&path=/photo/out/passwd&target=/video", 0, "/photo/out/passwd 407\n"},
        {"alice", "action=copy&path=/photo&target=/video", 0, "/photo 400\n"},
        {"alice", "action=copy&path=/locked/f&target=/video", 0, "/locked/f 407\n"},
        {"alice", "action=copy&path=/fixed/f&target=/video", 0, ""},
        {"alice", "action=copy&path=/photo/a/&target=/home", 0, ""},
        {"carol", "action=copy&path=/photo/case/&path=/photo/out&target=/home", 0, ""},
        {"alice", "action=move&path=/fixed/f&target=/video", 0, "/fixed/f 407\n"},
        {"alice", "action=delete&path=/fixed/f", 0, "/fixed/f 407\n"},
        {"bob", "action=delete&path=/photo/a/b/f", 0, "/photo/a/b/f 407\n"},
        {"bob", "action=move&path=/photo/a&target=/video", 0, "/photo/a 407\n"},
        {"alice", "action=copy&path=/photo/case&target=/usb&conflict=overwrite", 0, "/photo/case/name 414\n"},
        {"alice", "action=copy&path=/photo/case/q?&target=/usb", 0, "/photo/case/q? 419\n"},
    };
    for (const auto& [user, form, refusal, expected] : cases) {
        SCOPED_TRACE(form);
        const CgiReply reply = ask(user, form);
        EXPECT_EQ(code(reply), refusal);
        if (refusal == 0) {
            EXPECT_EQ(errors(ended(user, reply.json["data"]["taskid"].asString())), expected);
        }
    }
    EXPECT_EQ(readFile(photo_ + "/a (2)/b/f"), "1");
    EXPECT_EQ(readFile(shareRoot("homes") + "/alice/a/b/f"), "1");
    for (const char* made : {"/case", "/case/name", "/out"}) {
        struct stat status {};
        EXPECT_EQ(lstat((shareRoot("homes") + "/carol" + made).c_str(), &status), 0);
        EXPECT_EQ(status.st_uid, support::kCarolUid) << made << ": not root's";
    }
    EXPECT_EQ(readFile(fat + "/case/Name"), "/case/Name");
    for (const char* form : {"action=copy&target=/video", "action=copy&path=/photo/a&target=/video&taskid=../x",
                             "action=copy&path_raw=%25zz&target=/video"}) {
        EXPECT_EQ(ask("alice", form).status, 400) << form;
    }
}

// A tree on which an operation takes some time, and an operation that is held in its middle: the next time it wants to
// publish, it finds its record locked.
class LongTask : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        const char* wanted = getenv("ORVEL_TEST_FILES");
        files_ = wanted != nullptr ? atoi(wanted) : 5000;
        support::makeFolder(photo_ + "/tree", 0777);
        for (int i = 0; i < files_; ++i) {
            const std::string folder = photo_ + "/tree/" + std::to_string(i / 200);
            if (i % 200 == 0) support::makeFolder(folder, 0755);
            const int fd = open((folder + "/" + std::to_string(i)).c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
            EXPECT_EQ(write(fd, photo_.data(), photo_.size()), static_cast<ssize_t>(photo_.size()));
            close(fd);
        }
    }
    // Starts the copy and holds it; the record's lock.
    int hold(std::string& id) {
        id = start("alice", "action=copy" + about({"/photo/tree"}, "/video"));
        const int lock = open(recordOf(id).c_str(), O_RDONLY | O_CLOEXEC);
        EXPECT_EQ(flock(lock, LOCK_EX), 0);
        struct stat locked {
        }, now{};
        EXPECT_EQ(fstat(lock, &locked) + stat(recordOf(id).c_str(), &now), 0);
        if (locked.st_ino != now.st_ino) {  // replaced meanwhile
            close(lock);
            return -1;
        }
        usleep(600000);
        return lock;
    }
    // Every file in the target is whole.
    void expectWhole() const {
        int found = 0;
        for (const auto& entry : fs::recursive_directory_iterator(video_)) {
            if (!entry.is_regular_file()) continue;
            ++found;
            EXPECT_EQ(readFile(entry.path()), photo_) << entry.path();
        }
        EXPECT_GT(found, 0);
        EXPECT_LT(found, files_);
        EXPECT_FALSE(hasParts(video_));
    }
    int files_ = 0;
};

TEST_F(LongTask, ProgressIsNeverOutOfStep) {
    SKIP_WITHOUT_ROOT();
    const std::string id = start("alice", "action=copy" + about({"/photo/tree"}, "/video"));
    const std::unique_ptr<KTR::Task> task(KTR::TaskMgr("alice").getTask(id.c_str()));
    ASSERT_NE(task, nullptr);
    double last = 0;
    int steps = 0;
    for (bool finished = false; !finished; usleep(50000)) {
        finished = task->isFinished();
        ASSERT_TRUE(task->reload());
        const Json::Value data = task->getProperty("data");
        const double progress = task->getProperty("progress").asDouble(), total = data["bytes_total"].asDouble();
        if (data["state"] == "running" && total > 0) {
            EXPECT_NEAR(progress, data["bytes_done"].asDouble() / total, 1e-6);
        }
        EXPECT_GE(progress + 1e-6, data["items_done"].asInt() > 0 ? last : 0);
        if (progress > last) ++steps;
        last = progress;
    }
    EXPECT_GE(steps, 2) << "told in between";
    const Json::Value end = status("alice", id);
    EXPECT_EQ(end["state"], "done");
    EXPECT_EQ(end["items_done"], files_ + (files_ + 199) / 200 + 1);
    EXPECT_EQ(end["items_done"], end["items_total"]);
    EXPECT_EQ(end["progress"], 1.0);
}

TEST_F(LongTask, CancelledOrKilledItLeavesWholeFilesOnly) {
    SKIP_WITHOUT_ROOT();
    for (const bool killed : {false, true}) {
        SCOPED_TRACE(killed ? "killed" : "cancelled");
        std::string id;
        const int lock = hold(id);
        if (lock < 0) GTEST_SKIP() << "the record was replaced while it was locked";
        EXPECT_EQ(status("alice", id)["state"], "running");
        EXPECT_EQ(code(ask("alice", "action=clear&taskid=" + id)), 420);
        EXPECT_EQ(code(ask("bob", "action=cancel&taskid=" + id)), 408) << "another's";
        if (killed) {
            const std::unique_ptr<KTR::Task> task(KTR::TaskMgr("alice").getTask(id.c_str()));
            ASSERT_GT(task->getWorker(), 1);
            EXPECT_EQ(kill(task->getWorker(), SIGKILL), 0);
        } else {
            EXPECT_EQ(code(ask("alice", "action=cancel&taskid=" + id)), 0);
        }
        close(lock);
        const Json::Value task = ended("alice", id);
        EXPECT_EQ(task["state"], killed ? "failed" : "cancelled");
        EXPECT_TRUE(task["finished"].asBool());
        EXPECT_LT(task["progress"].asDouble(), 1.0);
        expectWhole();
        EXPECT_EQ(code(ask("alice", "action=cancel&taskid=" + id)), 0) << "nothing left to do is no failure";
        EXPECT_EQ(ask("alice", "action=clear").json["data"]["cleared"], 1);
        EXPECT_EQ(code(ask("alice", "action=cancel&taskid=" + id)), 408);
        fs::remove_all(video_ + "/tree");
    }
}

TEST_F(TaskCgi, AFullDiskFailsItsItemAndTheRestGoesOn) {
    SKIP_WITHOUT_ROOT();
    const std::string small = addShare("small", "read only = no\n");
    writeFile(photo_ + "/t/1", "one", 0666);
    writeFile(photo_ + "/t/2big", std::string(3 << 20, 'x'), 0666);
    writeFile(photo_ + "/t/3", "three", 0666);
    give(photo_ + "/t");
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        if (mount("none", small.c_str(), "tmpfs", 0, "size=1m,mode=0777") != 0) return support::kNoPrivateMounts;
        const Json::Value task = perform("alice", "action=copy" + about({"/photo/t"}, "/small"));
        EXPECT_EQ(errors(task), "/photo/t/2big 416\n");
        EXPECT_EQ(task["state"], "done");
        EXPECT_EQ(readFile(small + "/t/3"), "three");
        EXPECT_FALSE(fs::exists(small + "/t/2big"));
        EXPECT_FALSE(hasParts(small));
        const Json::Value zip = perform("alice", "action=compress" + about({"/video"}, "/small/t.zip"));
        EXPECT_EQ(errors(zip), "/video 400\n");
        return 0;
    }));
}

TEST_F(TaskCgi, MovesAreRenamesOrCopiesThatGo) {
    SKIP_WITHOUT_ROOT();
    const std::string other = addShare("other", "read only = no\n");
    for (const char* file : {"/d/x", "/e/sub/y", "/stuck/z"}) writeFile(photo_ + file, file, 0666);
    writeFile(photo_ + "/e/@vexoea/meta", "", 0666);
    for (const char* folder : {"/d", "/e", "/e/sub", "/e/@vexoea"}) give(photo_ + folder);
    struct stat before {
    }, after{};
    ASSERT_EQ(stat((photo_ + "/d/x").c_str(), &before), 0);
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        if (mount("none", other.c_str(), "tmpfs", 0, "mode=0777") != 0) return support::kNoPrivateMounts;
        Json::Value task = perform("alice", "action=move" + about({"/photo/d"}, "/video"));
        EXPECT_EQ(task["items_done"], 1);
        EXPECT_EQ(task["bytes_total"], 0);
        EXPECT_EQ(stat((video_ + "/d/x").c_str(), &after), 0);
        EXPECT_EQ(before.st_ino, after.st_ino);
        task = perform("alice", "action=move" + about({"/photo/e", "/photo/stuck/z"}, "/other"));
        EXPECT_EQ(errors(task), "/photo/stuck/z 407\n");
        EXPECT_EQ(task["items_done"], 3);
        EXPECT_EQ(task["items_total"], 4);
        EXPECT_EQ(readFile(other + "/e/sub/y"), "/e/sub/y");
        EXPECT_FALSE(fs::exists(photo_ + "/e")) << "with what is never shown";
        EXPECT_EQ(readFile(other + "/z") + readFile(photo_ + "/stuck/z"), "/stuck/z/stuck/z") << "lost nowhere";
        if (mount("none", (video_ + "/d").c_str(), "tmpfs", 0, "mode=0777") != 0) return support::kNoPrivateMounts;
        writeFile(video_ + "/d/theirs", "x", 0666);
        EXPECT_EQ(errors(perform("alice", "action=delete" + about({"/video/d"}))), "/video/d 421\n");
        EXPECT_EQ(readFile(video_ + "/d/theirs"), "x") << "mounted ones stay";
        return 0;
    }));
}

TEST_F(TaskCgi, WhatIsDeletedCanBePutBack) {
    SKIP_WITHOUT_ROOT();
    setSetting("pexlanderxferlog", "yes");
    const std::string bin = photo_ + "/#recycle";
    const auto fill = [&](const std::string& content) {
        for (const char* file : {"/a/b/f.txt", "/a/b/f (#2).txt", "/a/g"}) writeFile(photo_ + file, content, 0600);
        for (const char* path : {"/a", "/a/b", "/a/b/f.txt", "/a/b/f (#2).txt", "/a/g"}) give(photo_ + path);
        ASSERT_EQ(chmod((photo_ + "/a/b").c_str(), 0700), 0);
    };
    const auto remove = [](const std::vector<std::string>& paths, const std::string& more = "") {
        return errors(perform("alice", "action=delete" + more + about(paths)));
    };
    fill("1");
    EXPECT_EQ(remove({"/photo/a/b/f.txt"}), "");
    EXPECT_FALSE(fs::exists(photo_ + "/a/b/f.txt")) << "no bin: for good";
    support::makeFolder(bin, 0777);
    fill("1");
    EXPECT_EQ(remove({"/photo/a/b/f.txt", "/photo/a/b/f (#2).txt"}), "");
    fill("2");
    EXPECT_EQ(remove({"/photo/a/b/f.txt", "/photo/a/none"}), "/photo/a/none 408\n");
    EXPECT_EQ(readFile(bin + "/a/b/f.txt") + readFile(bin + "/a/b/f (#2).txt"), "12");
    EXPECT_EQ(readFile(bin + "/a/b/f (#2) (#1).txt"), "1");
    struct stat status {};
    ASSERT_EQ(stat((bin + "/a/b").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0700U) << "no more open than it was";
    EXPECT_EQ(status.st_uid, support::kAliceUid);
    EXPECT_EQ(remove({"/photo/a"}), "");
    EXPECT_EQ(readFile(bin + "/a (#2)/g"), "2");

    const auto restore = [](const std::vector<std::string>& paths, const std::string& more = "") {
        return errors(perform("alice", "action=restore" + more + about(paths)));
    };
    EXPECT_EQ(restore({"/photo/#recycle/a (#2)"}), "");
    EXPECT_EQ(restore({"/photo/#recycle/a/b/f.txt", "/photo/a/g", "/photo/#recycle"}),
              "/photo/a/g 400\n/photo/#recycle 400\n");
    EXPECT_EQ(readFile(photo_ + "/a/b/f.txt"), "1");
    EXPECT_EQ(restore({"/photo/#recycle/a/b/f (#2).txt"}), "/photo/#recycle/a/b/f (#2).txt 414\n");
    EXPECT_EQ(restore({"/photo/#recycle/a/b/f (#2).txt"}, "&conflict=keep_both"), "");
    EXPECT_EQ(readFile(photo_ + "/a/b/f (2).txt"), "2");
    EXPECT_EQ(restore({"/photo/#recycle/a/b/f (#2) (#1).txt"}, "&conflict=overwrite"), "");
    EXPECT_EQ(readFile(photo_ + "/a/b/f (#2).txt"), "1");
    EXPECT_TRUE(fs::is_empty(bin)) << "folders go with the last that was in them";

    EXPECT_EQ(remove({"/photo/a/b/f.txt", "/photo/a/g"}), "");
    EXPECT_EQ(remove({"/photo/#recycle/a/g"}), "") << "what is in the bin goes for good";
    EXPECT_EQ(remove({"/photo/#recycle"}), "/photo/#recycle 407\n");
    EXPECT_EQ(remove({"/photo/a"}, "&permanent=true"), "");
    EXPECT_FALSE(fs::exists(photo_ + "/a") || fs::exists(bin + "/a/g"));
    ASSERT_EQ(chmod(bin.c_str(), 0700), 0);
    writeFile(photo_ + "/kept", "x", 0666);
    EXPECT_EQ(remove({"/photo/kept"}), "/photo/kept 407\n") << "a bin that is closed is a bin";
    EXPECT_EQ(readFile(photo_ + "/kept"), "x");
    ASSERT_EQ(chmod(bin.c_str(), 0777), 0);
    writeFile(bin + "/@tmp (#2)", "x", 0666);
    EXPECT_EQ(restore({"/photo/#recycle/@tmp (#2)"}), "/photo/#recycle/@tmp (#2) 418\n");
    fs::remove(bin + "/@tmp (#2)");
    writeFile(bin + "/root's/f", "x");
    EXPECT_EQ(code(ask("bob", "action=empty&path=/photo")), 407);
    const Json::Value emptied = perform("alice", "action=empty&path=/photo");
    EXPECT_EQ(errors(emptied), "/photo/#recycle/root's/f 407\n");
    EXPECT_EQ(emptied["items_skipped"], 1) << "the folder that stays with it";
    EXPECT_FALSE(fs::exists(bin + "/a"));
    EXPECT_EQ(code(ask("alice", "action=empty&path=/video")), 408) << "no bin";
    const std::string log = readFile(systemRoot() + "/var/log/vexo/xfer.log");
    EXPECT_EQ(std::count(log.begin(), log.end(), '\n'), 14) << log;
    EXPECT_NE(log.find(R"("action":"delete","size":0,"path":"/photo/a/b/f.txt")"), std::string::npos);
}

// One member of an archive made for a test.
struct Packed {
    const char* name;
    unsigned type;     // AE_IF...
    std::string text;  // content, or where a link leads
    bool hard = false;
};

void pack(const std::string& path, const char* format, const char* filter, const std::vector<Packed>& members,
          const char* password = nullptr) {
    archive* out = archive_write_new();
    ASSERT_EQ(archive_write_set_format_by_name(out, format), ARCHIVE_OK);
    if (filter != nullptr) {
        ASSERT_EQ(archive_write_add_filter_by_name(out, filter), ARCHIVE_OK);
    }
    if (password != nullptr) {
        ASSERT_EQ(archive_write_set_options(out, "zip:encryption=zipcrypt"), ARCHIVE_OK);
        ASSERT_EQ(archive_write_set_passphrase(out, password), ARCHIVE_OK);
    }
    ASSERT_EQ(archive_write_open_filename(out, path.c_str()), ARCHIVE_OK);
    for (const Packed& member : members) {
        archive_entry* entry = archive_entry_new();
        archive_entry_copy_pathname(entry, member.name);
        archive_entry_set_filetype(entry, member.type);
        archive_entry_set_perm(entry, 04777);
        archive_entry_set_mtime(entry, 1000000000, 0);
        if (member.hard) archive_entry_copy_hardlink(entry, member.text.c_str());
        if (member.type == AE_IFLNK) archive_entry_copy_symlink(entry, member.text.c_str());
        if (member.type == AE_IFCHR) archive_entry_set_rdev(entry, makedev(1, 3));
        archive_entry_set_size(
            entry, member.type == AE_IFREG && !member.hard ? static_cast<la_int64_t>(member.text.size()) : 0);
        EXPECT_GE(archive_write_header(out, entry), ARCHIVE_WARN) << member.name << archive_error_string(out);
        if (member.type == AE_IFREG && !member.hard) archive_write_data(out, member.text.data(), member.text.size());
        archive_entry_free(entry);
    }
    archive_write_close(out);
    archive_write_free(out);
}

TEST_F(TaskCgi, HostileArchivesReachNothingOutside) {
    SKIP_WITHOUT_ROOT();
    const std::vector<Packed> members = {{"good/a", AE_IFREG, "1"},
                                         {"/abs", AE_IFREG, "x"},
                                         {"../up", AE_IFREG, "x"},
                                         {"good/../../up", AE_IFREG, "x"},
                                         {"good/out", AE_IFLNK, "/etc"},
                                         {"good/up", AE_IFLNK, "../../x"},
                                         {"good/in", AE_IFLNK, "../good/a"},
                                         {"door", AE_IFLNK, "good"},
                                         {"door/through", AE_IFREG, "x"},
                                         {"planted/x", AE_IFREG, "x"},
                                         {"good/a", AE_IFREG, "2"},
                                         {"good/hard", AE_IFREG, "good/a", true},
                                         {"good/stolen", AE_IFREG, "../../../etc/passwd", true},
                                         {"good/stolen2", AE_IFREG, "planted/passwd", true},
                                         {"device", AE_IFCHR, ""},
                                         {"pipe", AE_IFIFO, ""},
                                         {"good/\xFFraw", AE_IFREG, "3"},
                                         {"@vexoea/x", AE_IFREG, "x"},
                                         {"@tmp/x", AE_IFREG, "x"},
                                         {"a:b", AE_IFREG, "x"},
                                         {"./", AE_IFDIR, ""},
                                         {"folder/", AE_IFDIR, ""},
                                         {"last", AE_IFREG, "4"}};
    pack(video_ + "/h.tar.gz", "pax", "gzip", members);
    support::makeFolder(photo_ + "/t", 0777);
    ASSERT_EQ(chmod((photo_ + "/t").c_str(), 0777), 0);
    fs::create_symlink("/etc", photo_ + "/t/planted");
    support::makeFolder(photo_ + "/t/@tmp", 0777);
    ASSERT_EQ(chmod((photo_ + "/t/@tmp").c_str(), 0777), 0);
    const Json::Value task =
        perform("alice", "action=extract&conflict=keep_both" + about({"/video/h.tar.gz"}, "/photo/t"));
    EXPECT_EQ(errors(task),
              "/photo/t//abs 1006\n/photo/t/../up 1006\n/photo/t/good/../../up 1006\n/photo/t/good/out 407\n"
              "/photo/t/good/up 407\n/photo/t/door/through 407\n/photo/t/planted/x 407\n/photo/t/good/stolen 1006\n"
              "/photo/t/good/stolen2 407\n/photo/t/device 407\n/photo/t/pipe 407\n/photo/t/@vexoea/x 418\n"
              "/photo/t/@tmp/x 418\n"
              "/photo/t/a:b 418\n");
    EXPECT_EQ(task["state"], "done");
    EXPECT_EQ(readFile(photo_ + "/t/good/a") + readFile(photo_ + "/t/good/a (2)"), "12");
    EXPECT_EQ(readFile(photo_ + "/t/good/hard"), "1");
    EXPECT_EQ(readFile(photo_ + "/t/good/\xFFraw") + readFile(photo_ + "/t/last"), "34") << "names are bytes";
    EXPECT_EQ(fs::read_symlink(photo_ + "/t/good/in"), "../good/a");
    EXPECT_FALSE(fs::exists(photo_ + "/up") || fs::exists(photo_ + "/t/abs") || fs::exists("/etc/x"));
    struct stat status {};
    ASSERT_EQ(stat((photo_ + "/t/last").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0755U) << "no set-id bit, nothing that others could write";
    EXPECT_EQ(status.st_mtime, 1000000000);
    EXPECT_EQ(status.st_uid, support::kAliceUid);
}

TEST_F(TaskCgi, FurtherNamesAreOfWhatWasUnpacked) {
    SKIP_WITHOUT_ROOT();
    pack(video_ + "/h.tar", "ustar", nullptr,
         {{"a", AE_IFREG, "new"},
          {"a", AE_IFREG, "a", true},
          {"b", AE_IFREG, "a", true},
          {"c", AE_IFREG, "a", true},
          {"d", AE_IFREG, "mine", true}});
    struct {
        const char *policy, *errors, *tree;
    } const cases[] = {{"error", "/photo/t/a 414\n/photo/t/a 408\n/photo/t/b 408\n/photo/t/c 408\n/photo/t/d 408\n",
                        "a=old b=old mine=mine"},
                       {"skip", "/photo/t/c 408\n/photo/t/d 408\n", "a=old b=old mine=mine"},
                       {"overwrite", "/photo/t/d 408\n", "a=new b=new c=new mine=mine"},
                       {"keep_both", "/photo/t/d 408\n", "a (2)=new a (3)=new a=old b (2)=new b=old c=new mine=mine"}};
    for (const auto& [policy, refused, tree] : cases) {
        SCOPED_TRACE(policy);
        fs::remove_all(photo_ + "/t");
        for (const char* file : {"/t/a", "/t/b"}) writeFile(photo_ + file, "old", 0666);
        writeFile(photo_ + "/t/mine", "mine", 0666);
        for (const char* name : {"/t", "/t/a", "/t/b", "/t/mine"}) give(photo_ + name);
        const Json::Value task =
            perform("alice", "action=extract&conflict=" + std::string(policy) + about({"/video/h.tar"}, "/photo/t"));
        EXPECT_EQ(errors(task), refused);
        std::vector<std::string> found;
        for (const auto& entry : fs::directory_iterator(photo_ + "/t")) {
            found.push_back(entry.path().filename().string() + "=" + readFile(entry.path()));
        }
        std::sort(found.begin(), found.end());
        std::string all;
        for (const std::string& line : found) all += (all.empty() ? "" : " ") + line;
        EXPECT_EQ(all, tree);
    }
}

TEST_F(TaskCgi, ArchivesAreBoundedAndMayBeBroken) {
    SKIP_WITHOUT_ROOT();
    setSetting("extract_max_ratio", "20");
    setSetting("extract_max_members", "20");
    support::makeFolder(video_ + "/t", 0777);
    ASSERT_EQ(chmod((video_ + "/t").c_str(), 0777), 0);
    const std::string zeros(70 << 20, '\0');
    pack(video_ + "/bomb.zip", "zip", nullptr,
         {{"small", AE_IFREG, "1"}, {"zeros", AE_IFREG, zeros}, {"more", AE_IFREG, "1"}});
    pack(video_ + "/bomb.tar.zst", "ustar", "zstd", {{"small2", AE_IFREG, "1"}, {"zeros", AE_IFREG, zeros}});
    pack(video_ + "/good.zip", "zip", nullptr, {{"\xFFz", AE_IFREG, "5"}, {"\xC3\xA9", AE_IFREG, "6"}});
    pack(video_ + "/torn.tar.xz", "ustar", "xz",
         {{"whole", AE_IFREG, "1"}, {"half", AE_IFREG, std::string(1 << 20, 'h')}});
    const std::string random = readFile(PROGRAM_OPERATION).substr(0, 300000);
    pack(video_ + "/cut.zip", "zip", nullptr, {{"first", AE_IFREG, "1"}, {"cut", AE_IFREG, random}});
    for (const char* name : {"/torn.tar.xz", "/cut.zip"}) {
        ASSERT_EQ(truncate((video_ + name).c_str(), static_cast<off_t>(fs::file_size(video_ + name) * 3 / 4)), 0);
    }
    pack(video_ + "/secret.zip", "zip", nullptr, {{"hidden", AE_IFREG, "1"}}, "password");
    writeFile(video_ + "/none.zip", "no archive at all");
    writeFile(video_ + "/empty.zip", "");
    const auto extract = [](const std::string& name) {
        return errors(perform("alice", "action=extract" + about({"/video/" + name}, "/video/t")));
    };
    EXPECT_EQ(extract("bomb.zip"), "/video/t/zeros 1007\n/video/bomb.zip 1007\n");
    EXPECT_EQ(extract("bomb.tar.zst"), "/video/t/zeros 1007\n/video/bomb.tar.zst 1007\n");
    if (const char* huge = getenv("ORVEL_TEST_BOMB")) {  // a zip with gigabytes in "zeros", by hand
        fs::copy(huge, video_ + "/huge.zip");
        EXPECT_EQ(extract("huge.zip"), "/video/t/zeros 1007\n/video/huge.zip 1007\n");
    }
    std::string deep = "deep";
    while (deep.size() < 60) deep += "/d";
    pack(video_ + "/deep.tar", "ustar", nullptr, {{(deep + "/x").c_str(), AE_IFREG, "1"}});
    EXPECT_EQ(extract("deep.tar"), "/video/t/" + deep + "/x 1007\n/video/deep.tar 1007\n");
    EXPECT_EQ(extract("good.zip"), "");
    EXPECT_EQ(extract("secret.zip"), "/video/t/hidden 1403\n");
    EXPECT_EQ(extract("none.zip"), "/video/none.zip 1401\n");
    EXPECT_EQ(extract("empty.zip"), "/video/empty.zip 1401\n");
    EXPECT_NE(extract("torn.tar.xz").find("/video/torn.tar.xz 1402"), std::string::npos);
    EXPECT_NE(extract("cut.zip"), "");
    for (const char* name : {"/zeros", "/more", "/half", "/cut"})
        EXPECT_FALSE(fs::exists(video_ + "/t" + name)) << name;
    EXPECT_EQ(readFile(video_ + "/t/\xFFz") + readFile(video_ + "/t/\xC3\xA9") + readFile(video_ + "/t/small"), "561");
    EXPECT_FALSE(hasParts(video_));
}

TEST_F(TaskCgi, WhatWasCompressedComesBackTheSame) {
    SKIP_WITHOUT_ROOT();
    for (const char* file : {"/c/a", "/c/d/\xC3\xA9", "/c/d/b"}) writeFile(photo_ + file, file, 0640);
    for (const char* path : {"/c/a", "/c/d/\xC3\xA9", "/c/d/b", "/c/d", "/c"}) give(photo_ + path);
    support::makeFolder(photo_ + "/c/closed", 0700);
    const Json::Value task =
        perform("alice", "action=compress" + about({"/photo/c", "/photo/c/a", "/photo/c/d"}, "/video/c.zip"));
    EXPECT_EQ(errors(task), "/photo/c/closed 407\n");
    EXPECT_EQ(task["state"], "done");
    EXPECT_EQ(code(ask("alice", "action=compress" + about({"/photo/c"}, "/video/c.zip"))), 414);
    fs::remove(photo_ + "/c/closed");
    EXPECT_EQ(errors(perform("alice", "action=compress&conflict=keep_both" + about({"/photo/c"}, "/video/c.zip"))), "");
    EXPECT_EQ(errors(perform("alice", "action=extract" + about({"/video/c (2).zip"}, "/video"))), "");
    EXPECT_EQ(treeOf(photo_ + "/c"), treeOf(video_ + "/c"));
    EXPECT_FALSE(hasParts(video_));
}

TEST_F(TaskCgi, TheSearchOnScreenFollows) {
    SKIP_WITHOUT_ROOT();
    for (const char* file :
         {"/s/found1", "/s/found2", "/s/d/found3", "/t/found4", "/t/roots/found5", "/m/found6", "/m/roots/found7"}) {
        writeFile(photo_ + file, "x", 0666);
    }
    support::makeFolder(photo_ + "/#recycle", 0777);
    ASSERT_EQ(chmod((photo_ + "/#recycle").c_str(), 0777), 0);
    for (const char* folder : {"/s", "/s/d", "/t", "/m"}) give(photo_ + folder);
    const auto search = [](const std::string& method, const std::string& form) {
        return CgiReply(support::runCgi(PROGRAM_SEARCH, "alice", method, method == "GET" ? form : "",
                                        method == "GET" ? "" : form,
                                        {{"CONTENT_TYPE", "application/x-www-form-urlencoded"}}))
            .json["data"];
    };
    const std::string id = search("POST", "action=start&path=/photo&name=found")["taskid"].asString();
    const auto found = [&] {
        Json::Value page;
        for (int i = 0; i < 500 && !page["finished"].asBool(); ++i) {
            page = search("GET", "action=list&taskid=" + id);
            usleep(10000);
        }
        std::string all;
        for (const Json::Value& item : page["items"]) all += item["path"].asString() + " ";
        return all;
    };
    std::string mine = "/photo/m/found6 /photo/m/roots/found7 ";
    ASSERT_EQ(found(),
              "/photo/s/found1 /photo/s/found2 /photo/s/d/found3 /photo/t/found4 /photo/t/roots/found5 " + mine);
    const auto with = "&taskid=" + id;
    EXPECT_EQ(errors(perform("alice", "action=delete" + with + about({"/photo/s/found1"}))), "");
    setSetting("pexlanderxferlog", "yes");
    EXPECT_NE(errors(perform("alice", "action=delete&permanent=true" + with + about({"/photo/t"}))), "");
    EXPECT_EQ(found(), "/photo/s/found2 /photo/s/d/found3 /photo/t/roots/found5 " + mine)
        << "what could not be deleted stays";
    EXPECT_NE(readFile(systemRoot() + "/var/log/vexo/xfer.log").find("/photo/t"), std::string::npos);
    EXPECT_EQ(errors(perform("alice", "action=move" + with + about({"/photo/s/d"}, "/video"))), "");
    EXPECT_EQ(found(), "/photo/s/found2 /video/d/found3 /photo/t/roots/found5 " + mine);
    EXPECT_EQ(
        errors(perform("alice", "action=copy&conflict=keep_both" + with + about({"/photo/s/found2"}, "/photo/s"))), "");
    EXPECT_EQ(found(), "/photo/s/found2 /photo/s/found2 (2) /video/d/found3 /photo/t/roots/found5 " + mine);
    support::makeFolder(video_ + "/m", 0777);
    ASSERT_EQ(chmod((video_ + "/m").c_str(), 0777), 0);
    EXPECT_NE(errors(perform("alice", "action=move&conflict=overwrite" + with + about({"/photo/m"}, "/video"))), "");
    mine = "/video/m/found6 /photo/m/roots/found7 ";
    EXPECT_EQ(found(), "/photo/s/found2 /photo/s/found2 (2) /video/d/found3 /photo/t/roots/found5 " + mine)
        << "half of it moved";
}

TEST_F(TaskCgi, OnlyOnesOwnOperationsAreShown) {
    SKIP_WITHOUT_ROOT();
    writeFile(photo_ + "/f", "x", 0666);
    const std::string id = start("alice", "action=copy" + about({"/photo/f"}, "/video"));
    ended("alice", id);
    const std::unique_ptr<KTR::Task> search(KTR::TaskMgr("alice").createTask("Quorvane_Search_1A"));
    writeFile(recordOf("Quorvane_torn"), "{\"created\":1", 0600);
    const auto list = [](const std::string& user) {
        return CgiReply(support::runCgi(PROGRAM_OPERATION, user, "GET", "action=status")).json["data"]["tasks"];
    };
    const Json::Value tasks = list("alice");
    ASSERT_EQ(tasks.size(), 2U);
    EXPECT_EQ(tasks[0]["taskid"], id);
    EXPECT_EQ(tasks[0]["action"], "copy");
    EXPECT_EQ(tasks[1]["state"], "failed") << "whatever it was";
    EXPECT_EQ(list("bob").size(), 0U);
    for (const std::string& bad : {std::string("x"), "../" + id, "Quorvane_../" + id, std::string("Quorvane_"),
                                   std::string("Quorvane_Search_1A")}) {
        EXPECT_EQ(code(ask("alice", "action=status&taskid=" + percentEncode(bad))), 408) << bad;
    }
    EXPECT_EQ(code(ask("bob", "action=clear&taskid=" + id)), 408);
    EXPECT_EQ(code(CgiReply(support::runCgi(PROGRAM_OPERATION, "alice", "GET", "action=clear"))), 400) << "not posted";
    EXPECT_EQ(ask("alice", "action=clear").json["data"]["cleared"], 2);
    EXPECT_EQ(list("alice").size(), 0U);
    EXPECT_TRUE(fs::exists(recordOf("Quorvane_Search_1A")));
}

}  // namespace
