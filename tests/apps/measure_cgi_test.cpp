// What "measure" counts, and what it says of the rest.
#include <sys/mount.h>

#include "apps/task_fixture.h"
#include "operation/size_report.h"
#include "platform/private_mounts.h"
#include "support/gate.h"

namespace {

using orvel::cgi::LinkedFiles;

class MeasureCgi : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        SKIP_WITHOUT_ROOT();
        lay("/t/a.bin", 1000);
        lay("/t/sub/b.bin", 500);
        lay("/t/sub/deep/c.bin", 200);
        lay("/t/sub/\xff", 7);
        fs::create_hard_link(photo_ + "/t/a.bin", photo_ + "/t/sub/again");
        fs::create_symlink("..", photo_ + "/t/sub/up");
        fs::create_symlink(video_, photo_ + "/t/out");
        lay("/t/@vexoea/hidden", 4000);
        lay("/t/closed/secret", 8000);
        lay("/t/named/unseen", 16000);
        EXPECT_EQ(chmod((photo_ + "/t/closed").c_str(), 0700), 0);
        EXPECT_EQ(chmod((photo_ + "/t/named").c_str(), 0744), 0);
    }
    void lay(const std::string& path, size_t size) { writeFile(photo_ + path, std::string(size, 'x'), 0644); }
    static Json::Value measured(const std::vector<std::string>& paths) {
        return perform("alice", "action=measure" + about(paths))["measured"];
    }
    // Size, files, folders, others, then what else was found.
    static std::string sums(const Json::Value& found) {
        std::string text;
        for (const char* member : {"size", "files", "folders", "others"}) text += found[member].asString() + " ";
        for (const char* member : {"unreadable", "mounts", "linked"}) {
            if (found[member] != 0) text += std::string(member) + " " + found[member].asString() + " ";
        }
        return text;
    }
    // "path size" of each.
    static std::string sizes(const Json::Value& list) {
        std::string text;
        for (const Json::Value& one : list) {
            text +=
                one[one.isMember("path_raw") ? "path_raw" : "path"].asString() + " " + one["size"].asString() + ", ";
        }
        return text;
    }
};

TEST_F(MeasureCgi, CountsWhatTheUserSees) {
    for (const auto& [what, paths, sum, listed] :
         rowsOf<const char*, std::vector<std::string>, std::string, std::string>("apps/measured")) {
        SCOPED_TRACE(what);
        const Json::Value found = measured(paths);
        EXPECT_EQ(sums(found), sum);
        // Which name of a file is met first is the file system's affair.
        const std::string parts = sizes(found["parts"]);
        const bool other = parts.starts_with("/photo/t/a.bin 1000, /photo/t/sub 707, ");
        EXPECT_TRUE(parts == listed || other) << parts;
        EXPECT_EQ(found["rest"]["count"], 0);
    }
}

TEST_F(MeasureCgi, SaysWhatIsLargestAndWhatItLacks) {
    fs::remove(photo_ + "/t/sub/again");
    const Json::Value found = measured({"/photo/t"});
    EXPECT_EQ(found["path"], "/photo/t");
    EXPECT_EQ(sizes(found["largest_files"]),
              "/photo/t/a.bin 1000, /photo/t/sub/b.bin 500, /photo/t/sub/deep/c.bin 200, /photo/t/sub/%FF 7, ");
    EXPECT_EQ(sizes(found["largest_folders"]), "/photo/t/sub 707, /photo/t/sub/deep 200, ");
    EXPECT_GE(found["disk"].asInt64(), 4 * 512);
    Names unreadable = each(found["unreadable_first"], "path");
    std::sort(unreadable.begin(), unreadable.end());
    EXPECT_EQ(unreadable, (Names{"/photo/t/closed", "/photo/t/named/unseen"}));
    EXPECT_EQ(found["unreadable_first"][0]["code"], 407);
    addShare("secret", "read only = no\nvalid users = bob\n");
    const Json::Value missing =
        perform("alice", "action=measure" + about({"/photo/t/none", "/nosuch", "/photo/t/closed", "/secret"}));
    EXPECT_EQ(errors(missing), "/photo/t/none 408\n/nosuch 408\n/photo/t/closed 407\n/secret 407\n");
    EXPECT_EQ(sums(missing["measured"]), "0 0 0 0 ");
    for (int i = 0; i < 1002; ++i) lay("/many/" + std::to_string(i), static_cast<size_t>(i));
    const Json::Value many = measured({"/photo/many"});
    EXPECT_EQ(many["parts"].size(), 1000U);
    EXPECT_EQ(many["rest"]["count"], 2);
    EXPECT_EQ(many["rest"]["size"], 0 + 1);
    EXPECT_EQ(many["largest_files"].size(), 100U);
    EXPECT_EQ(many["largest_files"][99]["size"], 902);
}

TEST_F(MeasureCgi, EntersNoOtherFileSystemBelow) {
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        openFolder(photo_ + "/t/sub/disk");
        if (mount("none", (photo_ + "/t/sub/disk").c_str(), "tmpfs", 0, "mode=0777") != 0) {
            return support::kNoPrivateMounts;
        }
        lay("/t/sub/disk/far", 50);
        EXPECT_EQ(sums(measured({"/photo/t/sub"})), "1707 4 2 1 mounts 1 ");
        EXPECT_EQ(sums(measured({"/photo/t/sub/disk"})), "50 1 1 0 ") << "chosen itself it is entered";
        return HasFailure() ? 1 : 0;
    }));
}

TEST_F(MeasureCgi, EndsAtOnceWithWhatItHas) {
    for (const bool killed : {false, true}) {
        SCOPED_TRACE(killed ? "killed" : "cancelled");
        Gate gate("KTR::Task::beginUpdate", systemRoot() + "/gate");
        std::string id;
        std::thread asking([&] {
            id = start("alice", "action=measure" + about({"/photo/t/sub", "/photo/t/a.bin"}), {gate.order()});
        });
        const bool begins = gate.holds();
        gate.next();
        asking.join();
        ASSERT_TRUE(begins && gate.holds());  // in the first folder
        const std::unique_ptr<KTR::Task> task(KTR::TaskMgr("alice").getTask(id.c_str()));
        ASSERT_TRUE(task != nullptr && task->getWorker() > 1);
        if (killed) {
            EXPECT_EQ(kill(task->getWorker(), SIGKILL), 0);
        } else {
            EXPECT_EQ(code(ask("alice", "action=cancel&taskid=" + id)), 0);
        }
        gate.open();
        const Json::Value ended = TaskCgi::ended("alice", id);
        EXPECT_EQ(ended["state"], killed ? "failed" : "cancelled");
        EXPECT_EQ(ended["items_done"], 0);
        if (!killed) {
            EXPECT_EQ(sums(ended["measured"]), "0 0 1 0 ");
        }
        const Json::Value all = get(PROGRAM_OPERATION, "alice", "action=status").json["data"]["tasks"];
        EXPECT_FALSE(all[0]["measured"].isMember("parts")) << "whoever asks for all tasks gets no lists";
        ask("alice", "action=clear&taskid=" + id);
    }
}

TEST(SizeReportTest, FitsIntoARecordWhateverThePathsAre) {
    for (const char byte : {'\x01', '\xff', '"', 'x'}) {
        for (const size_t length : {1, 200, 4000}) {
            orvel::cgi::SizeReport report;
            for (int i = 0; i < 1100; ++i) {
                const std::string path = "/" + std::string(length, byte) + std::to_string(i);
                orvel::cgi::Amount amount;
                amount.size = i + 1;
                report.part({path, orvel::cgi::SizeKind::kFile, amount});
                report.largest({path, orvel::cgi::SizeKind::kFile, amount});
                report.unreadable(path, EACCES);
            }
            const Json::Value all = report.json(true);
            EXPECT_LT(Json::writeString(Json::StreamWriterBuilder(), all).size(), size_t{640} * 1024);
            EXPECT_EQ(all["parts"].size() + all["rest"]["count"].asUInt(), 1100U) << "what is not listed is summed";
        }
    }
}

TEST(LinkedFilesTest, RemembersAsManyAsThereIsRoomFor) {
    LinkedFiles files(2);
    using Met = LinkedFiles::Met;
    EXPECT_EQ(files.meet(1, 1, 2), Met::kFirst);
    EXPECT_EQ(files.meet(1, 2, 3), Met::kFirst);
    EXPECT_EQ(files.meet(2, 1, 2), Met::kUnknown);
    EXPECT_EQ(files.meet(1, 1, 2), Met::kAgain);  // all its names were met: there is room again
    EXPECT_EQ(files.meet(2, 1, 2), Met::kFirst);
    EXPECT_EQ(files.meet(1, 2, 3), Met::kAgain);
    EXPECT_EQ(files.meet(1, 2, 3), Met::kAgain);
}

}  // namespace
