// Task records: documents of every kind, updates that meet each other, and workers that come to an end.
#include "vexo/task.h"

#include <json/writer.h>

#include <cmath>

#include "platform/trust.h"
#include "tasks/task_document.h"
#include "tasks/task_name.h"
#include "tasks/task_worker.h"

namespace {

using Record = std::unique_ptr<KTR::Task>;

TEST(TaskName, StandsForOneFileThatIsNeverHidden) {
    const std::string longest(200, 'x');
    for (const auto& [name, file] : Rows<std::string, std::string>{
             row("Quorvane_1", "Quorvane_1"), row("a/../b", "a%2F..%2Fb"), row("...", "%2E.."), row("50%2F", "50%252F"),
             row("DOM\\al\xFF\n", "DOM\\al\xFF\n"), row(longest, longest)}) {
        EXPECT_EQ(vexo::fileNameOfTask(name), file);
        EXPECT_EQ(vexo::taskNameOfFile(file), name);
    }
    for (const std::string& name : {std::string(), std::string("."), std::string(".."), longest + "x"})
        EXPECT_FALSE(vexo::fileNameOfTask(name)) << name;
    for (const char* file : {"", ".new-a", "a%", "a%2", "a%2f", "a%41", "%zz"})
        EXPECT_FALSE(vexo::taskNameOfFile(file)) << file;
}

TEST(TaskWorker, IsKnownByNumberStartAndBoot) {
    const std::string rest = " 1 2 3 4 5 6 7 8 9 10 11 12 13 14 15 16 17 18 777 20\n";
    EXPECT_EQ(vexo::startTimeOf("12 (a) b) (c) S" + rest), 777U) << "a name of any kind";
    for (const std::string& line : {std::string(), "12 (z) Z" + rest, std::string("12 (s) S 1 2")})
        EXPECT_FALSE(vexo::startTimeOf(line)) << line;
    const vexo::Worker self = vexo::thisProcess();
    EXPECT_EQ(vexo::isRunning(self), true);
    EXPECT_EQ(vexo::isRunning({self.pid, self.start + 1, self.boot}), false);
    EXPECT_EQ(vexo::isRunning({self.pid, self.start, "another"}), false);
}

class Tasks : public ApplianceTest {
 protected:
    static std::string folder() { return systemRoot() + "/var/lib/vexo/tasks/alice"; }
    static std::string fileOf(const std::string& name) { return folder() + "/" + name; }
    static Record get(const std::string& name) { return Record(KTR::TaskMgr("alice").getTask(name.c_str())); }
    static Record make(const std::string& name) { return Record(KTR::TaskMgr("alice").createTask(name.c_str())); }
    // A document with one property "p", worked on by this process.
    static std::string document() {
        vexo::TaskDocument document;
        document.created = 1000;
        document.worker = vexo::thisProcess();
        document.properties["p"] = 1;
        return *vexo::buildTaskDocument(document);
    }
    static pid_t fork(const std::function<int()>& body) {
        const pid_t child = ::fork();
        if (child == 0) _exit(body());
        return child;
    }
};

TEST_F(Tasks, LiveFromCreationToRemoval) {
    KTR::TaskMgr manager("alice");
    Json::Value names;
    EXPECT_TRUE(manager.getAllTaskId("", names)) << "nothing yet";
    const Record made(manager.createTask("Quorvane_a/b"));
    ASSERT_NE(made, nullptr);
    EXPECT_EQ(manager.createTask("Quorvane_a/b"), nullptr);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_EXISTS);
    const Record read = get("Quorvane_a/b");
    ASSERT_NE(read, nullptr);
    EXPECT_FALSE(made->endUpdate()) << "none is open";
    EXPECT_TRUE(made->beginUpdate() && !made->beginUpdate());
    EXPECT_TRUE(made->setProperty("a", 1) && made->setProperty("b", "\xC3\xA9\n"));
    EXPECT_TRUE(made->reload()) << "keeps what was set";
    EXPECT_TRUE(read->reload());
    EXPECT_TRUE(read->getProperty("a").isNull()) << "not before the end";
    EXPECT_TRUE(made->endUpdate());
    EXPECT_TRUE(read->setProperty("c", 3)) << "by itself, without losing what another wrote";
    EXPECT_TRUE(made->reload());
    EXPECT_TRUE(made->getProperty("a") == 1 && read->getProperty("b") == "\xC3\xA9\n" && made->getProperty("c") == 3);

    for (const char* name : {"other", "Quorvane_1", "Quorvane_0"}) ASSERT_NE(make(name), nullptr);
    writeFile(fileOf(".new-x"), "");
    EXPECT_TRUE(manager.getAllTaskId("Quorvane_", names));
    Json::Value expected;
    for (const char* name : {"Quorvane_0", "Quorvane_1", "Quorvane_a/b"}) expected.append(name);
    EXPECT_EQ(names, expected);
    EXPECT_TRUE(read->finish());
    EXPECT_TRUE(!made->isFinished() && made->reload() && made->isFinished() && !made->hasFailed());
    EXPECT_TRUE(made->remove() && made->remove() && read->remove());
    EXPECT_FALSE(manager.hasTask("Quorvane_a/b"));
    EXPECT_FALSE(read->setProperty("d", 1) || read->reload());
    EXPECT_EQ(read->getProperty("a"), 1) << "what was read stays";
    for (const char* user : {"", ".", "..", "bob", "../alice", static_cast<const char*>(nullptr)})
        EXPECT_FALSE(KTR::TaskMgr(user).hasTask("other"));
    for (const char* name : {"", "..", static_cast<const char*>(nullptr)}) {
        EXPECT_EQ(manager.createTask(name), nullptr);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    }
}

TEST_F(Tasks, DocumentsThatMakeNoSenseHaveNoProperties) {
    ASSERT_NE(make("x"), nullptr);
    const std::string good = document();
    const auto nested = [&](size_t levels) {
        std::string text = good;
        const std::string value = std::string(levels, '[') + std::string(levels, ']');
        return text.replace(text.find("\"p\":1") + 4, 1, value);
    };
    const auto padded = [&](size_t size) { return good + std::string(size - good.size(), ' '); };
    for (const auto& [what, text, readable] : Rows<const char*, std::string, bool>{
             {"good", good, true},
             {"deep", nested(62), true},
             {"long", padded(1 << 20), true},
             {"too deep", nested(63), false},
             {"bottomless", nested(300000), false},
             {"too long", padded((1 << 20) + 1), false},
             {"empty", "", false},
             {"torn", good.substr(0, good.size() / 2), false},
             {"more behind", good + "{}", false},
             {"no object", "[1]", false},
             {"binary", std::string("\0\x01\xFF\x7F{}", 6), false},
             {"other kinds", R"({"created":[],"finished":{},"worker":[1],"properties":7})", false},
             {"wild numbers", R"({"created":1e99,"worker":{"pid":1e30,"start":-1,"boot":3}})", false}}) {
        SCOPED_TRACE(what);
        writeFile(fileOf("x"), text, 0600);
        const Record task = get("x");
        ASSERT_NE(task, nullptr);
        EXPECT_EQ(task->getProperty("p").isNull(), !readable);
        EXPECT_EQ(task->hasFailed(), !readable);
        EXPECT_EQ(task->getWorker(), readable ? getpid() : 0);
        const bool dated = text.find("created") != std::string::npos;
        EXPECT_TRUE(readable ? task->getCreateTime() == 1000 : dated || time(nullptr) - task->getCreateTime() < 5);
        EXPECT_TRUE(task->setProperty("q", 1)) << "usable again";
        EXPECT_EQ(get("x")->getProperty("q"), 1);
    }
}

TEST_F(Tasks, WhatCouldNotBeReadAgainIsNotWritten) {
    const Record task = make("x");
    ASSERT_NE(task, nullptr);
    Json::Value deep(1);
    for (int level = 0; level < 61; ++level) {
        const Json::Value inner = std::exchange(deep, Json::Value());
        deep.append(inner);
    }
    EXPECT_TRUE(task->setProperty("p", deep));
    Json::Value tooDeep;
    tooDeep.append(deep);
    for (const Json::Value& value : {tooDeep, Json::Value(std::string(1 << 20, 'x')), Json::Value(HUGE_VAL)}) {
        EXPECT_FALSE(task->setProperty("p", value));
        EXPECT_EQ(task->getProperty("p"), deep);
        EXPECT_EQ(get("x")->getProperty("p"), deep);
    }
}

TEST_F(Tasks, AFileThatOthersCouldHaveMadeIsNoTask) {
    ASSERT_NE(make("good"), nullptr);
    const auto refused = [](const char* name) {
        EXPECT_FALSE(KTR::TaskMgr("alice").hasTask(name));
        EXPECT_EQ(get(name), nullptr);
    };
    plantEach(
        fileOf("planted"), [&] { refused("planted"); }, document());
    ASSERT_EQ(chmod(folder().c_str(), 0777), 0);
    refused("good");
    EXPECT_EQ(make("new"), nullptr);
    ASSERT_EQ(chmod(folder().c_str(), 0700), 0);
    fs::rename(folder(), folder() + "2");
    fs::create_directory_symlink("alice2", folder());
    refused("good");
}

TEST_F(Tasks, NoUpdateIsLostAndNoneIsSeenByHalves) {
    const Record task = make("x");
    ASSERT_NE(task, nullptr);
    ASSERT_TRUE(task->setProperty("a", 0) && task->setProperty("b", 0));
    const auto updates = [] {
        const Record own = get("x"), seen = get("x");
        for (int update = 0; update < 150; ++update) {
            if (!own->beginUpdate()) return false;
            const int next = own->getProperty("a").asInt() + 1;
            own->setProperty("a", next);
            own->setProperty("b", next);
            if (!own->endUpdate() || !seen->reload()) return false;
            if (seen->getProperty("a") != seen->getProperty("b") || seen->getProperty("a").asInt() < next) return false;
        }
        return true;
    };
    EXPECT_EQ(countAtOnce(4, updates), 4);
    EXPECT_EQ(get("x")->getProperty("a"), 4 * 150);
}

TEST_F(Tasks, WhatAKilledWriterLeftIsInNobodysWay) {
    const Record task = make("x");
    ASSERT_NE(task, nullptr);
    expectKilled([] { return get("x")->beginUpdate() ? raise(SIGKILL) : 0; });
    for (const bool last : {false, true}) {
        writeFile(fileOf(".new-x"), "half a docu");
        EXPECT_TRUE(last ? task->remove() : task->setProperty("a", 1));
    }
    EXPECT_TRUE(fs::is_empty(folder()));
}

TEST_F(Tasks, AnEndWithoutAWordIsAFailure) {
    ASSERT_NE(make("x"), nullptr);
    for (const bool finishing : {false, true}) {
        const pid_t worker = fork([&] { return get("x")->attach() ? pause() : 1; });
        Record task;
        EXPECT_TRUE(waitUntil("the worker", [&] { return (task = get("x"))->getWorker() == worker; }));
        EXPECT_FALSE(task->isFinished());
        // The document in hand still says that it runs when the end comes.
        if (finishing) {
            EXPECT_TRUE(get("x")->finish());
        }
        kill(worker, SIGKILL);
        siginfo_t ended;
        EXPECT_EQ(waitid(P_PID, static_cast<id_t>(worker), &ended, WEXITED | WNOWAIT), 0);
        EXPECT_EQ(task->getWorker(), 0) << "a zombie works no more";
        EXPECT_TRUE(task->isFinished());
        EXPECT_EQ(task->hasFailed(), !finishing);
        waitpid(worker, nullptr, 0);
    }
    const Record running = make("y");
    ASSERT_TRUE(running != nullptr && running->getWorker() == getpid());
    inChild([&] {
        EXPECT_TRUE(refuseCalls({{SYS_openat, EMFILE}}));
        EXPECT_FALSE(running->isFinished() || running->hasFailed()) << "what cannot be determined is no end";
        EXPECT_EQ(running->getWorker(), 0) << "nor a process to be killed";
    });
}

TEST_F(Tasks, TheStoreIsRootsAndReachedAfterTheSwitch) {
    SKIP_WITHOUT_ROOT();
    actingForAlice([] {
        const Record task = make("x");
        EXPECT_TRUE(task->beginUpdate() && task->setProperty("p", 2) && task->endUpdate() && task->finish());
        EXPECT_EQ(make("x"), nullptr);
    });
    for (const auto& [path, mode] : Rows<std::string, mode_t>{
             {fileOf("x"), S_IFREG | 0600}, {folder(), S_IFDIR | 0700}, {folder() + "/..", S_IFDIR | 0700}}) {
        EXPECT_EQ(statusOf(path).st_mode, mode) << path;
        EXPECT_EQ(statusOf(path).st_uid + statusOf(path).st_gid, 0U) << path;
    }
    asUser(kBobUid, kUsersGid, [] {
        EXPECT_EQ(get("x"), nullptr) << "closed to a mere user";
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED);
    });
}

}  // namespace
