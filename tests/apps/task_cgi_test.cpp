// Background operations as whoever started them sees them: progress, cancelling, lists, the search on screen.
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
    std::string file_ = systemRoot() + "/gate";
};

TEST_F(HeldTask, ProgressIsNeverOutOfStep) {
    Gate gate("VEXOFileCopy", file_);
    const std::string id = start("alice", "action=copy" + about({"/photo/tree"}, "/video"), {gate.order()});
    for (int copied = 0; copied < 4; ++copied) {
        ASSERT_TRUE(gate.holds());
        const std::unique_ptr<KTR::Task> task(KTR::TaskMgr("alice").getTask(id.c_str()));
        ASSERT_NE(task, nullptr);
        Json::Value record = task->getProperty("data");
        record["progress"] = task->getProperty("progress");
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
    for (const bool killed : {false, true}) {
        SCOPED_TRACE(killed ? "killed" : "cancelled");
        Gate gate("VEXOFileCopy", file_);
        const std::string id = start("alice", "action=copy" + about({"/photo/tree"}, "/video"), {gate.order()});
        for (int passed = 0; passed < 2 && gate.holds(); ++passed) gate.next();
        ASSERT_TRUE(gate.holds());  // before the third file
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
        const std::string found = filesOf(video_);
        EXPECT_EQ(std::count(found.begin(), found.end(), '='), 2) << found;
        for (const char* file : {"tree/a/1", "tree/a/2", "tree/b/3", "tree/b/4"})
            EXPECT_TRUE(!fs::exists(video_ + "/" + file) || readFile(video_ + "/" + file) == std::string("/") + file);
        EXPECT_EQ(code(ask("alice", "action=cancel&taskid=" + id)), 0) << "nothing left to do is no failure";
        EXPECT_EQ(ask("alice", "action=clear").json["data"]["cleared"], 1);
        EXPECT_EQ(code(ask("alice", "action=cancel&taskid=" + id)), 408);
        fs::remove_all(video_ + "/tree");
    }
}

TEST_F(TaskCgi, TheSearchOnScreenFollows) {
    for (const char* file :
         {"/s/found1", "/s/found2", "/s/d/found3", "/t/found4", "/t/roots/found5", "/m/found6", "/m/roots/found7"})
        writeFile(photo_ + file, "x", 0666);
    openFolder(photo_ + "/#recycle");
    for (const char* folder : {"/s", "/s/d", "/t", "/m"}) give(photo_ + folder);
    const std::string id =
        post(PROGRAM_SEARCH, "alice", "action=start&path=/photo&name=found").json["data"]["taskid"].asString();
    const auto found = [&] {
        std::string all;
        for (const std::string& path : each(searched("alice", id)["items"], "path")) all += path + " ";
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
    EXPECT_NE(transferLog().find("/photo/t"), std::string::npos);
    EXPECT_EQ(errors(perform("alice", "action=move" + with + about({"/photo/s/d"}, "/video"))), "");
    EXPECT_EQ(found(), "/photo/s/found2 /video/d/found3 /photo/t/roots/found5 " + mine);
    EXPECT_EQ(
        errors(perform("alice", "action=copy&conflict=keep_both" + with + about({"/photo/s/found2"}, "/photo/s"))), "");
    EXPECT_EQ(found(), "/photo/s/found2 /photo/s/found2 (2) /video/d/found3 /photo/t/roots/found5 " + mine);
    openFolder(video_ + "/m");
    EXPECT_NE(errors(perform("alice", "action=move&conflict=overwrite" + with + about({"/photo/m"}, "/video"))), "");
    mine = "/video/m/found6 /photo/m/roots/found7 ";
    EXPECT_EQ(found(), "/photo/s/found2 /photo/s/found2 (2) /video/d/found3 /photo/t/roots/found5 " + mine)
        << "half of it moved";
}

TEST_F(TaskCgi, OnlyOnesOwnOperationsAreShown) {
    writeFile(photo_ + "/f", "x", 0666);
    const std::string id = perform("alice", "action=copy" + about({"/photo/f"}, "/video"))["taskid"].asString();
    const std::unique_ptr<KTR::Task> search(KTR::TaskMgr("alice").createTask("Quorvane_Search_1A"));
    writeFile(recordOf("Quorvane_torn"), "{\"created\":1", 0600);
    const auto list = [](const std::string& user) {
        return get(PROGRAM_OPERATION, user, "action=status").json["data"]["tasks"];
    };
    const Json::Value tasks = list("alice");
    ASSERT_EQ(tasks.size(), 2U);
    EXPECT_EQ(tasks[0]["taskid"], id);
    EXPECT_EQ(tasks[0]["action"], "copy");
    EXPECT_EQ(tasks[1]["state"], "failed") << "whatever it was";
    EXPECT_EQ(list("bob").size(), 0U);
    for (const std::string& bad : {std::string("x"), "../" + id, "Quorvane_../" + id, std::string("Quorvane_"),
                                   std::string("Quorvane_Search_1A")})
        EXPECT_EQ(code(ask("alice", "action=status&taskid=" + percentEncode(bad))), 408) << bad;
    EXPECT_EQ(code(ask("bob", "action=clear&taskid=" + id)), 408);
    EXPECT_EQ(code(get(PROGRAM_OPERATION, "alice", "action=clear")), 400) << "not posted";
    EXPECT_EQ(ask("alice", "action=clear").json["data"]["cleared"], 2);
    EXPECT_EQ(list("alice").size(), 0U);
    EXPECT_TRUE(fs::exists(recordOf("Quorvane_Search_1A")));
}

}  // namespace
