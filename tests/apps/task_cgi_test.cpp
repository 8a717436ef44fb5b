// Background operations as whoever started them sees them: progress, cancelling, lists, the search on screen.
#include <chrono>
#include <csignal>
#include <thread>

#include "apps/task_fixture.h"
#include "support/gate.h"

namespace {

// An operation on four files that is held before the copy of each.
class HeldTask : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        for (const char* file : {"/tree/a/1", "/tree/a/2", "/tree/b/3", "/tree/b/4"}) writeFile(photo_ + file, file);
    }
    // Starts the copy; it is held before its third file.
    static std::string startHeld(support::Gate& gate) {
        const std::string id = start("alice", "action=copy" + about({"/photo/tree"}, "/video"), {gate.order()});
        for (int passed = 0; passed < 2 && gate.holds(); ++passed) gate.next();
        EXPECT_TRUE(gate.holds());
        return id;
    }
    // The record of a task that must exist.
    static Json::Value recordedNow(const std::string& id) {
        const std::unique_ptr<KTR::Task> task(KTR::TaskMgr("alice").getTask(id.c_str()));
        if (task == nullptr) return {};
        Json::Value record = task->getProperty("data");
        record["progress"] = task->getProperty("progress");
        return record;
    }
    std::string file_ = systemRoot() + "/gate";
};

TEST_F(HeldTask, ProgressIsNeverOutOfStep) {
    SKIP_WITHOUT_ROOT();
    support::Gate gate("VEXOFileCopy", file_);
    const std::string id = start("alice", "action=copy" + about({"/photo/tree"}, "/video"), {gate.order()});
    for (int copied = 0; copied < 4; ++copied) {
        ASSERT_TRUE(gate.holds());
        const Json::Value record = recordedNow(id);
        EXPECT_EQ(record["state"], "running");
        EXPECT_EQ(record["items_total"], 7);
        EXPECT_EQ(record["bytes_total"], 4 * 9);
        EXPECT_NEAR(record["progress"].asDouble(), record["bytes_done"].asInt() / 36.0, 1e-6);
        EXPECT_LE(record["bytes_done"].asInt(), copied * 9);
        EXPECT_GE(record["bytes_done"].asInt(), copied * 9 - 9) << "told in between";
        // So long that the next writing of the record is due.
        std::this_thread::sleep_for(std::chrono::milliseconds(250));
        gate.next();
    }
    gate.open();
    const Json::Value end = ended("alice", id);
    EXPECT_EQ(end["state"], "done");
    EXPECT_EQ(end["items_done"], 7);
    EXPECT_EQ(end["progress"], 1.0);
}

TEST_F(HeldTask, WorkThatDidNotBeginIsRefused) {
    SKIP_WITHOUT_ROOT();
    for (const bool killed : {false, true}) {
        SCOPED_TRACE(killed ? "its process was killed" : "it could not be recorded");
        support::Gate gate("KTR::Task::attach", file_);
        std::string output;
        std::thread asking([&] {
            const support::Variables more = {gate.order(), {"CONTENT_TYPE", "application/x-www-form-urlencoded"}};
            output = support::finishCgi(PROGRAM_OPERATION, "alice", "POST", "",
                                        "action=copy" + about({"/photo/tree"}, "/video"), more)
                         .output;
        });
        const bool held = gate.holds();
        if (held && killed) kill(std::stoi(readFile(file_)), SIGKILL);
        if (!killed) fs::remove_all(recordOf(""));
        gate.open();
        asking.join();
        ASSERT_TRUE(held);
        const CgiReply reply(output);
        EXPECT_EQ(code(reply), killed ? 401 : 408) << reply.body;
        EXPECT_TRUE(reply.json["data"]["taskid"].isNull());
        EXPECT_EQ(CgiReply(support::runCgi(PROGRAM_OPERATION, "alice", "GET", "action=status")).json["data"]["tasks"],
                  Json::Value(Json::arrayValue))
            << "no record is left of it";
        EXPECT_FALSE(fs::exists(video_ + "/tree"));
    }
}

TEST_F(HeldTask, CancelledOrKilledItLeavesWholeFilesOnly) {
    SKIP_WITHOUT_ROOT();
    for (const bool killed : {false, true}) {
        SCOPED_TRACE(killed ? "killed" : "cancelled");
        support::Gate gate("VEXOFileCopy", file_);
        const std::string id = startHeld(gate);
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
        gate.open();
        const Json::Value task = ended("alice", id);
        EXPECT_EQ(task["state"], killed ? "failed" : "cancelled");
        EXPECT_TRUE(task["finished"].asBool());
        EXPECT_LT(task["progress"].asDouble(), 1.0);
        int found = 0;
        for (const auto& entry : fs::recursive_directory_iterator(video_)) {
            if (!entry.is_regular_file()) continue;
            ++found;
            EXPECT_EQ(readFile(entry.path()), entry.path().string().substr(video_.size()));
        }
        EXPECT_EQ(found, 2);
        EXPECT_EQ(code(ask("alice", "action=cancel&taskid=" + id)), 0) << "nothing left to do is no failure";
        EXPECT_EQ(ask("alice", "action=clear").json["data"]["cleared"], 1);
        EXPECT_EQ(code(ask("alice", "action=cancel&taskid=" + id)), 408);
        fs::remove_all(video_ + "/tree");
    }
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
        support::waitUntil("the end of the search", [&] {
            page = search("GET", "action=list&taskid=" + id);
            return page["finished"].asBool();
        });
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
