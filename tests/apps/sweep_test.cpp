// orvelctl sweep: what is over goes, what is in use stays.
#include <utime.h>

#include "apps/orveld.h"
#include "apps/task_fixture.h"
#include "base/file.h"
#include "platform/private_mounts.h"
#include "vexo/filesystem.h"
#include "vexo/sweep.h"

namespace {

constexpr const char* kResults = "/mnt/@tmp/orvel/PXSearch";

class Sweep : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        writeRootFile("/etc/vexo/shares.conf", "[data]\npath = /mnt\nread only = no\n");
    }
    // A file that was last written three days ago, when `old`.
    static std::string file(const std::string& path, bool old, const std::string& text = "x") {
        writeFile(path, text, 0600);
        const utimbuf times = {0, time(nullptr) - 3L * 24 * 60 * 60};
        if (old && utime(path.c_str(), &times) != 0) ADD_FAILURE() << path;
        return path;
    }
    static std::string counts() {
        const Finished finished = orvelctl({"sweep", "--json"});
        const Json::Value report = jsonOf(finished.output);
        EXPECT_EQ(finished.status == 0, report["failures"].asInt() == 0);
        std::string all;
        for (const Json::Value& part : report["swept"]) {
            const std::string error = part["error"].asString();
            if (part["removed"].asInt() > 0 || !error.empty())
                all += part["name"].asString() + " " + part["removed"].asString() + (error.empty() ? "" : "!") + "\n";
        }
        return all;
    }
};

TEST_F(Sweep, RemovesWhatIsOverAndNothingElse) {
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        EXPECT_EQ(mount("none", "/mnt", "tmpfs", 0, "mode=0777"), 0);
        VEXOSWEEP last = {};
        EXPECT_EQ(VEXOSweepLast(&last), 0);
        EXPECT_EQ(counts(), "");
        EXPECT_EQ(VEXOSweepLast(&last), 1);
        EXPECT_EQ(last.failures, 0);
        EXPECT_GE(last.time, time(nullptr) - 60);

        const std::string old = std::string(32, 'a'), sessions = systemRoot() + "/run/vexo/sessions/";
        const std::string tasks = systemRoot() + "/var/lib/vexo/tasks/alice/", upload = "/mnt/@tmp/orvel/upload-20001/";
        support::makeFolder(systemRoot() + "/run/vexo/sessions", 0700);
        support::makeFolder(tasks, 0700);
        support::makeFolder(systemRoot() + "/var/lib/vexo/index", 0700);
        support::makeFolder(upload, 0700);
        const std::string undo = systemRoot() + "/var/lib/vexo/undo/20001/";
        support::makeFolder(undo, 0700);
        support::makeFolder(std::string(kResults) + "/alice", 0700);
        support::makeFolder("/mnt/elsewhere");
        fs::create_directory_symlink("/mnt/elsewhere", std::string(kResults) + "/bob");
        const std::string state = systemRoot() + "/var/lib/vexo/", part = VEXO_PART_PREFIX;
        const auto folder = [](const std::string& path) {
            support::makeFolder(path, 0700);
            return path;
        };
        const std::string ended = R"({"created":1000,"finished":true})", results = std::string(kResults) + "/alice/";
        const std::vector<std::string> gone = {
            file(sessions + old, true, "user=\"alice\"\n"),
            file(tasks + "Quorvane_copy_0", false, ended),
            file(tasks + "Quorvane_Search_0AB", false, ended),
            file(results + "0AB", true),
            file(results + "0CD", true),
            file(results + "0CD-journal", true),
            file(upload + "part-1", true),
            file(systemRoot() + "/var/lib/vexo/index/photo.new", false),
            file(undo + "Quorvane_move_0123456789abcdef", true),
            folder(state + part + "0-listings"),
            folder(state + "undo/" + part + "20002-20002"),
        };
        const std::string now = std::to_string(time(nullptr));
        const std::vector<std::string> kept = {
            file(sessions + std::string(32, 'b'), false, "user=\"alice\"\n"),
            file(tasks + "Quorvane_Search_0EF", false, "{\"created\":" + now + ",\"finished\":true}"),
            file(results + "0EF", true),
            file(results + "0DD", false),
            file(results + "other", true),
            file("/mnt/elsewhere/0AA", true),
            file(upload + "part-2", false),
            file(undo + "Quorvane_move_0123456789abcde0", false),
            folder(state + part + "0-at-work"),
            file(folder(state + part + "0-full") + "/x", true),
        };
        const orvel::Descriptor atWork = orvel::openFile(state + part + "0-at-work", O_RDONLY);
        EXPECT_TRUE(orvel::lockFile(atWork.get(), LOCK_EX | LOCK_NB));
        writeRootFile("/tmp/foldersharing.current.users", "10.0.0.5,alice,s1,1,1,1,0,L\n10.0.0.5,alice,s2,1,1,1,1,L\n");
        chmod((systemRoot() + "/tmp/foldersharing.current.users").c_str(), 0600);
        setSetting("session_timeout", "0");

        const int other = VEXOSweepBegin();
        EXPECT_GE(other, 0);
        EXPECT_EQ(orvelctl({"sweep", "--quiet"}).status, 0) << "another sweep is at work";
        for (const std::string& path : gone) EXPECT_TRUE(fs::exists(path)) << path;
        EXPECT_EQ(VEXOSweepEnd(other, 2), 0);
        EXPECT_EQ(VEXOSweepLast(&last), 1);
        EXPECT_EQ(last.failures, 2);

        EXPECT_EQ(counts(),
                  "sessions 1\nlink sessions 1\ntasks 2\nsearch results 2\nuploads 1\nindexes 1\nundo records 1\n"
                  "hidden folders 2\n");
        for (const std::string& path : gone) EXPECT_FALSE(fs::exists(path)) << path;
        for (const std::string& path : kept) EXPECT_TRUE(fs::exists(path)) << path;
        EXPECT_EQ(orvelctl({"sweep", "--quiet"}).output, "");

        // A part that fails is named, and the others go on.
        fs::remove_all("/mnt/@tmp");
        writeFile("/mnt/@tmp", "");
        file(sessions + old, true, "user=\"alice\"\n");
        EXPECT_EQ(counts(), "volumes 0!\nsessions 1\n");
        return 0;
    }));
}

TEST_F(Sweep, FoldersAreThereFromTheStartAndFromALogInOn) {
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        EXPECT_EQ(mount("none", "/mnt", "tmpfs", 0, "mode=0777"), 0);
        {
            const support::Orveld server;
            support::waitUntil("the volumes to be prepared",
                               [] { return modeOf(kResults) == "0 " + std::to_string(01777); });
        }
        EXPECT_EQ(modeOf(std::string(kResults) + "/bob"), "none");
        support::runCgi(PROGRAM_LIST, "bob", "GET", "action=shares");
        EXPECT_EQ(modeOf(std::string(kResults) + "/bob"),
                  std::to_string(support::kBobUid) + " " + std::to_string(0700));
        return 0;
    }));
}

}  // namespace
