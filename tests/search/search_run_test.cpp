// How a search begins, fails, is stopped and dies.
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <string>

#include "fault_gate.h"
#include "orvel/identity.h"
#include "orvel/search_walker.h"
#include "search/search_fixture.h"
#include "support/log_texts.h"
#include "vexo/error.h"

using namespace FileSearch;
using namespace support;
namespace fs = std::filesystem;

namespace {

class SearchRunTest : public SearchFixture {
 protected:
    static std::string only(const std::string& text) { return "orvelsearch:# " + text; }
};

// Matches everything; what happens at each file is the test's business.
class Probe : public FindComp {
 public:
    explicit Probe(std::function<void(int)> at) : at_(std::move(at)) {
        setSqlCond(*primary_, FI_COL_SIZE, FI_OP_GREATER_EQUAL, 0ULL, nullptr, nullptr);
    }
    const std::vector<FindComp*> alone{this};  // what a search with this criterion gets
    bool operator()(const char*, const _tag_VEXOSTAT_&) override {
        at_(++seen);
        return true;
    }
    using FindComp::operator();
    int seen = 0;

 private:
    std::function<void(int)> at_;
};

TEST_F(SearchRunTest, WhatInitRefuses) {
    makeFolder(shareRoot("photo") + "/#recycle");
    makeFolder(shareRoot("homes") + "/alice/sub");
    inOwnProcess([&] {
        FindTypeComp files(false);
        const std::vector<FindComp*> all{&files}, none;
        struct Case {
            const char *user, *folder;
            const std::vector<FindComp*>& criteria;
            int error;
        };
        const Case cases[] = {
            {"alice", "/photo", none, VEXO_ERR_PARAMETER},      {"nobody-here", "/home", all, VEXO_ERR_PATH},
            {"alice", "/photo/#recycle", all, VEXO_ERR_DENIED}, {"eve", "/photo", all, VEXO_ERR_DENIED},
            {"alice", "/photo/none", all, VEXO_ERR_DENIED},
        };
        addUser("eve", 20009, kUsersGid);
        for (const Case& test : cases) {
            SCOPED_TRACE(std::string(test.user) + test.folder);
            OneSearch run(test.user, {test.folder}, test.criteria);
            EXPECT_FALSE(run.ready);
            EXPECT_EQ(VLIBCErrGet(), test.error);
            const auto log = takeLogTexts();
            const bool logged = !log.empty() && log.back() == only("Fail to find any directory");
            EXPECT_EQ(logged, test.error == VEXO_ERR_DENIED);
            VLIBCErrSetEx(0, "", 0);
            EXPECT_FALSE(run.walker.Walk({}));
            EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
        }
        vexo::gate::fail("FILEIDXDBCreate", VEXO_ERR_NO_SPACE, ENOSPC);
        OneSearch run("alice", {"/photo"}, all);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
        const auto log = takeLogTexts();
        EXPECT_TRUE(log.size() == 1 && log[0].starts_with(only("Fail to ceate DB /tmp/@tmp/orvel/PXSearch/alice/")));
        EXPECT_FALSE(run.ready || run.walker.Walk({}));

        // What is refused silently does not hinder the others; a home is what it is on disk.
        SearchShareDirMap map;
        for (const char* folder : {"/photo/#recycle", "/photo/x/../", "/home/sub/", "/photo", "/photo/none"}) {
            EXPECT_TRUE(map.insertDir("alice", nullptr, folder));
        }
        takeLog();
        ASSERT_TRUE(map.findShare("home") == nullptr && map.findShare("photo")->size() == 1);
        const PathInfo& home = map.findShare("homes")->at(0);
        EXPECT_EQ(home.path + home.realPath, "/homes/alice/sub" + shareRoot("homes") + "/alice/sub");
        EXPECT_EQ(home.shareName + home.shareRoot + home.volumePath, "homes" + shareRoot("homes") + "/tmp");
    });
}

TEST_F(SearchRunTest, WhatAWalkMeets) {
    SKIP_WITHOUT_ROOT();
    const std::string folder = shareRoot("photo") + "/chosen";
    const auto replace = [](const std::string& path) { fs::remove_all(path), writeFile(path, ""); };
    struct Case {
        int error;  // 0: the search succeeds
        std::function<void()> change;
    };
    const Case cases[] = {
        {VEXO_ERR_MISSING, [&] { fs::remove(folder); }},
        {VEXO_ERR_DENIED, [&] { chmod(shareRoot("photo").c_str(), 0700); }},
        {VEXO_ERR_GENERAL, [&] { replace(shareRoot("photo")); }},
        {0, [&] { replace(folder); }},
        {0, [&] { fs::remove(folder), fs::create_symlink("/tmp", folder); }},
    };
    FindTypeComp files(false);
    const std::vector<FindComp*> all{&files};
    for (const Case& test : cases) {
        SCOPED_TRACE(test.error);
        makeFolder(folder, 0755);
        inOwnProcess([&] {
            EXPECT_EQ(OrvLibUGIDSet(nullptr, "bob"), 0);
            OneSearch run("bob", {"/photo/chosen"}, all);
            EXPECT_TRUE(run.ready && seteuid(0) == 0);
            test.change();
            EXPECT_EQ(seteuid(kBobUid), 0);
            VLIBCErrSetEx(0, "", 0);
            EXPECT_EQ(run.walker.Walk({}), test.error == 0);
            EXPECT_EQ(VLIBCErrGet(), test.error);
            const auto log = takeLogTexts();
            EXPECT_EQ(log.empty(), test.error != VEXO_ERR_GENERAL);
            EXPECT_TRUE(log.empty() || log[0] == only("Fail to Stat " + folder + ", Not a directory"));
        });
        fs::remove_all(shareRoot("photo"));
        addShare("photo", "read only = no\nvalid users = alice\nread list = bob\nvexo:index = yes\n");
    }

    // Without a flag the walk ends, as failed, with its first entry; a failing index fails the search.
    for (const char* name : {"/a", "/b"}) writeFile(shareRoot("photo") + name, "");
    inOwnProcess([&] {
        OneSearch run("alice", {"/photo"}, all, false);
        EXPECT_FALSE(run.walker.Walk({}));
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PATH);
        EXPECT_EQ(takeLogTexts(), std::vector<std::string>{only("Fail to walk " + shareRoot("photo"))});
        EXPECT_EQ(rowsOf(run.task).size(), 1U);
        buildIndex({"photo"});
        vexo::gate::fail("FILEIDXResultGetAndTableGen", VEXO_ERR_GENERAL, EIO);
        EXPECT_FALSE(run.walker.Walk({}));
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    });
}

TEST_F(SearchRunTest, CancelLeavesTheResultsSoFar) {
    for (const char* name : {"/a", "/b/c", "/d"}) writeFile(shareRoot("photo") + name, "");
    for (const char* name : {"/a", "/b"}) writeFile(shareRoot("docs") + name, "");
    struct Case {
        int raisedAt, value;
        int seen;  // entries that were looked at
    };
    // 1 ends the walk at once; any other value ends the search behind the folder that is being walked.
    const Case cases[] = {{0, 1, 0}, {0, 7, 0}, {1, 1, 1}, {1, 2, 2}, {3, 2, 3}, {4, 1, 4}, {4, 2, 7}, {99, 1, 7}};
    inOwnProcess([&] {
        for (const Case& test : cases) {
            SCOPED_TRACE(std::to_string(test.raisedAt) + ":" + std::to_string(test.value));
            int* flag = nullptr;
            Probe probe([&](int seen) { *flag = seen == test.raisedAt ? test.value : *flag; });
            OneSearch run("alice", {"/photo/b", "/photo", "/docs"}, probe.alone);
            flag = &run.flag;
            if (test.raisedAt == 0) run.flag = test.value;
            EXPECT_TRUE(run.walker.Walk({}));
            EXPECT_EQ(probe.seen, test.seen);
            EXPECT_EQ(rowsOf(run.task).size(), std::min<size_t>(probe.seen, 6)) << "one of them was met twice";
        }
    });
}

TEST_F(SearchRunTest, LostRecordsAreToldAtTheEnd) {
    for (const char* name : {"/a", "/b", "/c"}) writeFile(shareRoot("photo") + name, "");
    inOwnProcess([&] {
        Probe probe([](int) { VLIBCErrSetEx(VEXO_ERR_MISSING, "", 0); });  // as what vanishes during a walk
        OneSearch run("alice", {"/photo"}, probe.alone);
        vexo::gate::fail("FILEIDXOutputDBInsert", VEXO_ERR_NO_SPACE, ENOSPC, 1);
        EXPECT_TRUE(run.walker.Walk({}));
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
        EXPECT_EQ(takeLogTexts().size(), 1U);
        EXPECT_EQ(rowsOf(run.task).size(), 2U);
    });
}

TEST_F(SearchRunTest, ResultsOutliveTheSearchThatWasKilled) {
    for (int i = 0; i < 300; ++i) writeFile(shareRoot("photo") + "/" + std::to_string(i), "");
    for (const int killedAt : {2, 300}) {
        SCOPED_TRACE(killedAt);
        char* taskId = static_cast<char*>(mmap(nullptr, 64, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
        const pid_t child = fork();
        if (child == 0) {
            const Probe probe([&](int seen) { seen == killedAt ? raise(SIGKILL) : usleep(5000); });
            OneSearch run("alice", {"/photo"}, probe.alone);
            strncpy(taskId, run.walker.getDBTaskId(), 63);
            run.walker.Walk({});
            _exit(1);
        }
        int status = 0;
        waitpid(child, &status, 0);
        EXPECT_TRUE(WIFSIGNALED(status));
        inOwnProcess([&] {
            OrvSearchDBTask task("/tmp", "alice", taskId);
            const size_t rows = rowsOf(task).size();
            EXPECT_LT(rows, static_cast<size_t>(killedAt));
            EXPECT_TRUE(killedAt < 300 || rows > 50U) << "what is older than a second is there";
            EXPECT_TRUE(task.remove());
        });
        munmap(taskId, 64);
    }
}

TEST_F(SearchRunTest, EveryFaultOfThePlatform) {
    SKIP_WITHOUT_ROOT();
    for (const char* name : {"/a", "/b/c", "/d"}) writeFile(shareRoot("photo") + name, "");
    writeFile(shareRoot("docs") + "/e", "");
    inOwnProcess([&] {
        buildIndex({"docs"});
        const Query query{{"/photo", "/docs", "/home"}, {{0, nullptr, "*"}, {8, "less", "100"}, {7, "since", "1"}}};
        const Rows all = search("alice", query);
        EXPECT_EQ(all.size(), 5U);
        EXPECT_EQ(seteuid(kAliceUid), 0);
        const Criteria criteria(query.asks);
        const int before = openDescriptors();
        int faults = 0;
        for (bool met = true; met; ++faults) {
            SCOPED_TRACE("call " + std::to_string(faults + 1) + " fails");
            vexo::gate::reset();
            vexo::gate::fail("*", VEXO_ERR_GENERAL, EIO, faults + 1);
            OneSearch run("alice", query.folders, criteria.all);
            const bool done = run.ready && run.walker.Walk(criteria.accessTimes);
            met = vexo::gate::calls("*") > faults;
            vexo::gate::reset();
            takeLog();
            EXPECT_EQ(geteuid(), static_cast<uid_t>(kAliceUid));
            EXPECT_TRUE(met || done);
            if (!run.ready) continue;
            const Rows rows = rowsOf(run.task);
            for (const auto& [key, row] : rows) EXPECT_TRUE(all.contains(key) && (met || all.at(key) == row)) << key;
            EXPECT_TRUE(met || rows.size() == all.size());
        }
        EXPECT_LE(openDescriptors(), before + 16) << "a few databases at most";
        EXPECT_GT(faults, 20);
    });
}

}  // namespace
