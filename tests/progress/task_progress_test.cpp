// Progress records as the exported functions see them. Pauses are counted here instead of being slept.
#include "orvel/task_progress.h"

#include <json/value.h>
#include <json/writer.h>
#include <syslog.h>

#include <cmath>

#include "support/fault_sweep.h"
#include "support/testing.h"
#include "tasks/task_document.h"

namespace {

int pauses = 0;
std::function<void()> duringPause;
time_t stoppedClock = 0;

}  // namespace

extern "C" int nanosleep(const timespec* rest, timespec*) {
    EXPECT_EQ(rest->tv_sec, 0);
    EXPECT_EQ(rest->tv_nsec, 100000000);
    ++pauses;
    if (duringPause) duringPause();
    return 0;
}

extern "C" time_t time(time_t* out) {
    timespec now{stoppedClock, 0};
    if (stoppedClock == 0) clock_gettime(CLOCK_REALTIME, &now);
    if (out != nullptr) *out = now.tv_sec;
    return now.tv_sec;
}

namespace {

class TaskProgress : public support::ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        pauses = 0;
        duringPause = nullptr;
        stoppedClock = 0;
    }
    static std::unique_ptr<KTR::Task> make(const std::string& name) {
        return std::unique_ptr<KTR::Task>(KTR::TaskMgr("alice").createTask(name.c_str()));
    }
    static std::unique_ptr<KTR::Task> get(const std::string& name) {
        return std::unique_ptr<KTR::Task>(KTR::TaskMgr("alice").getTask(name.c_str()));
    }
    // Makes `change` once the wait has paused `count` times.
    static void afterPauses(int count, const std::function<void()>& change) {
        duringPause = [count, change] {
            if (pauses == count) change();
        };
    }
};

TEST_F(TaskProgress, WaitsAreCounted) {
    const auto task = make("x");
    ASSERT_NE(task, nullptr);
    // The limit, after how many pauses (-1: never) it is ready, whether that is seen, checks and pauses.
    const std::tuple<unsigned, int, bool, int, int> cases[] = {
        {0, 0, false, 0, 0},   {10, -1, false, 1, 1}, {10, 0, true, 1, 0},  {10, 1, false, 1, 1},
        {25, -1, false, 3, 3}, {25, 2, true, 3, 2},   {25, 3, false, 3, 3}, {1, -1, false, 1, 1}};
    const std::function<bool(unsigned)> waits[] = {
        [&](unsigned limit) { return WaitForTaskDataReady(task.get(), "data", limit); },
        [&](unsigned limit) { return WaitForTaskDataKeyReady(task.get(), "data", "key", limit); }};
    for (const auto& wait : waits) {
        for (const auto& [limit, readyAfter, ready, checks, expected] : cases) {
            SCOPED_TRACE(std::to_string(limit) + " ready after " + std::to_string(readyAfter));
            const auto setReady = [] { get("x")->setProperty("data", 1); };
            task->setProperty("data", Json::Value());
            afterPauses(readyAfter, setReady);
            if (readyAfter == 0) setReady();
            pauses = 0;
            vexo::gate::reset();
            EXPECT_EQ(wait(limit), ready);
            EXPECT_EQ(vexo::gate::calls("KTR::Task::reload"), checks);
            EXPECT_EQ(pauses, expected);
        }
    }
    for (const Json::Value& value : {Json::Value("text"), Json::Value(false), Json::Value(Json::arrayValue)}) {
        task->setProperty("data", value);
        EXPECT_TRUE(WaitForTaskDataKeyReady(task.get(), "data", "key", 10)) << "any value will do";
    }
    EXPECT_FALSE(WaitForTaskDataKeyReady(task.get(), "none", nullptr, 10));
    EXPECT_FALSE(WaitForTaskDataReady(nullptr, "data", 10));
}

TEST_F(TaskProgress, TheWaitForATaskStartsAnew) {
    KTR::TaskMgr manager("alice");
    pauses = 0;
    EXPECT_FALSE(WaitForMgrTaskDataReady(&manager, "x", "data", 25));
    EXPECT_EQ(pauses, 3);
    EXPECT_EQ(vexo::gate::calls("KTR::TaskMgr::hasTask"), 3);
    pauses = 0;
    EXPECT_FALSE(WaitForMgrTaskDataReady(nullptr, "x", "data", 20));
    EXPECT_EQ(pauses, 2) << "a missing manager waits as well";
    EXPECT_FALSE(WaitForMgrTaskDataReady(&manager, "x", "data", 0));
    EXPECT_EQ(pauses, 2);
    pauses = 0;
    afterPauses(2, [] { make("x"); });
    EXPECT_FALSE(WaitForMgrTaskDataReady(&manager, "x", "data", 30));
    EXPECT_EQ(pauses, 2 + 3) << "the full limit for the data";
    pauses = 0;
    afterPauses(4, [] { get("x")->setProperty("data", 1); });
    EXPECT_FALSE(WaitForMgrTaskDataReady(&manager, "x", "data", 40));
    EXPECT_EQ(pauses, 4) << "no last look";
    EXPECT_TRUE(WaitForMgrTaskDataReady(&manager, "x", "data", 10));
}

TEST_F(TaskProgress, PublishingIsOneUpdate) {
    const auto task = make("x");
    Json::Value data;
    data["current"] = "/photo/a";
    EXPECT_TRUE(SaveTaskData(task.get(), data, 0.1F));
    EXPECT_EQ(get("x")->getProperty("progress").asDouble(), static_cast<double>(0.1F)) << "a float made wider";
    EXPECT_EQ(get("x")->getProperty("data"), data);
    const auto failing = [&](float progress) {
        EXPECT_FALSE(SaveTaskData(task.get(), "new", progress));
        const auto lines = support::takeLog();
        ASSERT_EQ(lines.size(), 1U);
        EXPECT_EQ(lines[0].text, "Failed to write progress.");
        EXPECT_EQ(lines[0].priority, LOG_ERR);
        EXPECT_EQ(get("x")->getProperty("data"), data);
        EXPECT_EQ(task->getProperty("data"), data);
    };
    failing(INFINITY);
    for (const char* operation : {"KTR::Task::beginUpdate", "KTR::Task::setProperty", "KTR::Task::endUpdate"}) {
        vexo::gate::fail(operation, VEXO_ERR_GENERAL, EIO, 1);
        failing(1);
    }
    EXPECT_TRUE(task->beginUpdate());
    failing(1);
    EXPECT_TRUE(task->setProperty("more", 2));
    EXPECT_TRUE(get("x")->getProperty("more").isNull()) << "the caller's own update goes on";
    EXPECT_TRUE(task->endUpdate());
    EXPECT_TRUE(task->remove());
    support::announceLog("Failed to write progress.");
    EXPECT_FALSE(SaveTaskData(task.get(), data, 1));
    EXPECT_FALSE(SaveTaskData(nullptr, data, 1));
}

TEST_F(TaskProgress, OldRecordsThatAreFinishedAreSwept) {
    constexpr long long kFar = 9223372036854775807;
    const long long now = stoppedClock = time(nullptr);
    struct {
        const char* name;
        long long created;
        bool finished, stays;
    } const cases[] = {{"Quorvane_young", now - 172799, true, true},    {"Quorvane_old", now - 172800, true, false},
                       {"Quorvane_soon", now + 172799, true, true},     {"Quorvane_future", now + 172800, true, false},
                       {"Quorvane_running", now - 999999, false, true}, {"other", now - 999999, true, true},
                       {"Quorvane_first", -kFar - 1, true, false},      {"Quorvane_last", kFar, true, false}};
    const std::string folder = systemRoot() + "/var/lib/vexo/tasks/alice/";
    const auto fill = [&] {
        for (const auto& task : cases) {
            vexo::TaskDocument document;
            document.created = task.created;
            document.finished = task.finished;
            document.worker = vexo::thisProcess();
            make(task.name);
            support::writeFile(folder + task.name, *vexo::buildTaskDocument(document), 0600);
        }
        make("Quorvane_torn");
        support::writeFile(folder + "Quorvane_torn", "{", 0600);
    };
    fill();
    CleanTimeOutTasks("alice");
    for (const auto& task : cases) EXPECT_EQ(get(task.name) != nullptr, task.stays) << task.name;
    EXPECT_NE(get("Quorvane_torn"), nullptr) << "failed a moment ago";
    CleanTimeOutTasks("nobody");
    CleanTimeOutTasks(nullptr);
    support::sweepFaults(VEXO_ERR_GENERAL, [&](int nth) {
        if (nth == 1) fill();
        CleanTimeOutTasks("alice");
        for (const auto& task : cases) {
            const bool there = access((folder + task.name).c_str(), F_OK) == 0;
            EXPECT_TRUE(there || !task.stays) << task.name;
        }
    });
    EXPECT_EQ(get("Quorvane_old"), nullptr);
}

TEST_F(TaskProgress, OnlyAProcessThatIsThereIsStopped) {
    for (const int pid : {0, -5, -2147483647 - 1}) {
        support::announceLog("invalid process id");
        EXPECT_FALSE(DoKill(pid));
    }
    const pid_t child = fork();
    if (child == 0) {
        pause();
        _exit(0);
    }
    EXPECT_TRUE(DoKill(child));
    const int status = support::waitForEnd(child, "the killed one");
    EXPECT_TRUE(WIFSIGNALED(status) && WTERMSIG(status) == SIGTERM);
    EXPECT_FALSE(DoKill(child)) << "gone: no message";
    SKIP_WITHOUT_ROOT();
    const pid_t ours = getpid();
    support::asUser(support::kAliceUid, support::kUsersGid, [ours] {
        support::announceLog("Failed to kill " + std::to_string(ours) + ", reason=Operation not permitted(1)");
        EXPECT_FALSE(DoKill(ours));
    });
}

}  // namespace
