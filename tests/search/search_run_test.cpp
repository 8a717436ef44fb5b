// How a search begins, fails, is stopped and dies.
#include "search/search_fixture.h"

using namespace FileSearch;

namespace {

using SearchRunTest = SearchFixture;

std::string only(const std::string& text) {
    return "orvelsearch:# " + text;
}

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
    inChild([&] {
        FindTypeComp files(false);
        const std::vector<FindComp*> all{&files}, none;
        addUser("eve", 20009, kUsersGid);
        for (const auto& [user, folder, criteria, error] : Rows<const char*, const char*, std::vector<FindComp*>, int>{
                 row("alice", "/photo", none, VEXO_ERR_PARAMETER), row("nobody-here", "/home", all, VEXO_ERR_PATH),
                 row("alice", "/photo/#recycle", all, VEXO_ERR_DENIED), row("eve", "/photo", all, VEXO_ERR_DENIED),
                 row("alice", "/photo/none", all, VEXO_ERR_DENIED)}) {
            SCOPED_TRACE(std::string(user) + folder);
            OneSearch run(user, {folder}, criteria);
            EXPECT_FALSE(run.ready);
            EXPECT_EQ(VLIBCErrGet(), error);
            const auto log = takeLogTexts();
            EXPECT_EQ(!log.empty() && log.back() == only("Fail to find any directory"), error == VEXO_ERR_DENIED);
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

        // What lies outside the share, or is reached that way, cannot be chosen.
        fs::create_symlink(shareRoot("docs"), shareRoot("photo") + "/out");
        makeFolder(shareRoot("photo") + "/in");
        SearchShareDirMap confined;
        for (const char* folder : {"/photo/out", "/photo/in/../../", "/home/../bob", "/photo/in"})
            EXPECT_TRUE(confined.insertDir("alice", nullptr, folder));
        EXPECT_EQ(takeLogTexts().size(), 3U);
        ASSERT_EQ(confined.shares().size(), 1U);
        EXPECT_EQ(confined.findShare("photo")->size(), 1U);

        // What is refused silently does not hinder the others; a home is what it is on disk.
        for (const char* folder : {"/photo/#recycle", "/photo/x/../", "/home/sub/", "/photo/none"})
            EXPECT_TRUE(confined.insertDir("alice", nullptr, folder));
        takeLog();
        EXPECT_TRUE(confined.findShare("home") == nullptr && confined.findShare("photo")->size() == 1);
        const PathInfo& home = confined.findShare("homes")->at(0);
        EXPECT_EQ(home.path + home.realPath, "/homes/alice/sub" + shareRoot("homes") + "/alice/sub");
        EXPECT_EQ(home.shareName + home.shareRoot + home.volumePath, "homes" + shareRoot("homes") + "/tmp");
    });
}

TEST_F(SearchRunTest, WhatAWalkMeets) {
    SKIP_WITHOUT_ROOT();
    const std::string up = shareRoot("photo") + "/up", folder = up + "/chosen";
    const std::string elsewhere = fs::path(shareRoot("docs")).filename();
    makeFolder(shareRoot("docs") + "/chosen", 0755);
    const auto replace = [](const std::string& path) { fs::remove_all(path), writeFile(path, ""); };
    const auto lead = [](const std::string& path, const std::string& target) {
        fs::rename(path, path + "-away"), fs::create_symlink(target, path);
    };
    FindTypeComp files(false);
    const std::vector<FindComp*> all{&files};
    for (const auto& [error, change] : Rows<int, std::function<void()>>{
             // 0: the search succeeds
             {VEXO_ERR_MISSING, [&] { fs::remove(folder); }},
             {VEXO_ERR_DENIED, [&] { chmod(shareRoot("photo").c_str(), 0700); }},
             {VEXO_ERR_GENERAL, [&] { replace(shareRoot("photo")); }},
             {0, [&] { replace(folder); }},
             {0, [&] { lead(folder, "/tmp"); }},
             // Only what was chosen is walked, and no way that leads out of the share leads there.
             {VEXO_ERR_MISSING, [&] { fs::rename(folder, folder + "-away"), makeFolder(folder, 0755); }},
             {VEXO_ERR_MISSING, [&] { lead(up, shareRoot("docs")); }},
             {VEXO_ERR_MISSING, [&] { lead(up, "../" + elsewhere); }},
             {0, [&] { lead(up, "up-away"); }},
         }) {
        SCOPED_TRACE(error);
        makeFolder(folder, 0755);
        inChild([&, expected = error, change = change] {
            EXPECT_EQ(OrvLibUGIDSet(nullptr, "bob"), 0);
            OneSearch run("bob", {"/photo/up/chosen"}, all);
            EXPECT_TRUE(run.ready && seteuid(0) == 0);
            change();
            EXPECT_EQ(seteuid(kBobUid), 0);
            VLIBCErrSetEx(0, "", 0);
            EXPECT_EQ(run.walker.Walk({}), expected == 0);
            EXPECT_EQ(VLIBCErrGet(), expected);
            EXPECT_EQ(takeLogText(),
                      expected != VEXO_ERR_GENERAL ? "" : only("Fail to Stat " + folder + ", Not a directory"));
        });
        fs::remove_all(shareRoot("photo"));
        addShare("photo", "read only = no\nvalid users = alice, bob\nread list = bob\nvexo:index = yes\n");
    }

    // Without a flag the walk ends, as failed, with its first entry; a failing index fails the search.
    for (const char* name : {"/a", "/b"}) writeFile(shareRoot("photo") + name, "");
    inChild([&] {
        OneSearch run("alice", {"/photo"}, all, false);
        EXPECT_FALSE(run.walker.Walk({}));
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PATH);
        EXPECT_EQ(takeLogText(), only("Fail to walk " + shareRoot("photo")));
        EXPECT_EQ(rowsOf(run.task).size(), 1U);
        buildIndex({"photo"});
        vexo::gate::fail("FILEIDXResultGetAndTableGen", VEXO_ERR_GENERAL, EIO);
        EXPECT_FALSE(run.walker.Walk({}));
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    });
}

// Chosen folders are opened when their turn comes.
TEST_F(SearchRunTest, ManyFoldersTakeFewDescriptors) {
    std::vector<std::string> folders;
    for (int i = 0; i < 500; ++i) {
        folders.push_back("/photo/" + std::to_string(i));
        writeFile(shareRoot("photo") + "/" + std::to_string(i) + "/f", "");
    }
    inChild([&] {
        const int before = openDescriptors();
        int most = 0;
        Probe probe([&](int) { most = std::max(most, openDescriptors()); });
        OneSearch run("alice", folders, probe.alone);
        EXPECT_TRUE(run.ready && run.walker.Walk({}));
        EXPECT_EQ(probe.seen, 500);
        EXPECT_LE(most, before + 8);
    });
}

TEST_F(SearchRunTest, CancelLeavesTheResultsSoFar) {
    for (const char* name : {"/a", "/b/c", "/d"}) writeFile(shareRoot("photo") + name, "");
    for (const char* name : {"/a", "/b"}) writeFile(shareRoot("docs") + name, "");
    // 1 ends the walk at once; any other value ends the search behind the folder that is being walked.
    inChild([&] {
        for (const auto& [raisedAt, value, seen] : Rows<int, int, int>{
                 row(0, 1, 0), row(0, 7, 0), row(1, 1, 1), row(1, 2, 2), row(3, 2, 3), row(4, 1, 4), row(4, 2, 7)}) {
            SCOPED_TRACE(std::to_string(raisedAt) + ":" + std::to_string(value));
            int* flag = nullptr;
            Probe probe([&, at = raisedAt, to = value](int met) { *flag = met == at ? to : *flag; });
            OneSearch run("alice", {"/photo/b", "/photo", "/docs"}, probe.alone);
            flag = &run.flag;
            if (raisedAt == 0) run.flag = value;
            EXPECT_TRUE(run.walker.Walk({}));
            EXPECT_EQ(probe.seen, seen);
            const std::string file = run.task.getDBTaskFilePath(), id = run.task.getDBTaskId();
            fs::copy_file(file, file + "copy");  // as another process finds them
            OrvSearchDBTask copy("/tmp", "alice", (id + "copy").c_str());
            EXPECT_EQ(rowsOf(copy).size(), std::min<size_t>(probe.seen, 6)) << "one of them was met twice";
            EXPECT_TRUE(copy.remove());
        }
    });
}

TEST_F(SearchRunTest, LostRecordsAreToldAtTheEnd) {
    for (const char* name : {"/a", "/b", "/c"}) writeFile(shareRoot("photo") + name, "");
    inChild([&] {
        Probe probe([](int) { VLIBCErrSetEx(VEXO_ERR_MISSING, "", 0); });  // as what vanishes during a walk
        for (const auto& [call, code, left] :
             Rows<const char*, int, size_t>{{"FILEIDXOutputDBInsert", VEXO_ERR_NO_SPACE, 2},
                                            {"FILEIDXDBFlush", VEXO_ERR_GENERAL, 3},
                                            {"", 0, 3}}) {
            vexo::gate::reset();
            OneSearch run("alice", {"/photo"}, probe.alone);
            if (code != 0) vexo::gate::fail(call, code, EIO, 1);
            EXPECT_TRUE(run.walker.Walk({}));
            EXPECT_EQ(VLIBCErrGet(), code) << call;
            EXPECT_EQ(takeLogTexts().size(), code == 0 ? 0U : 1U);
            EXPECT_EQ(rowsOf(run.task).size(), left);
        }
        // Where nothing is found nothing can be lost.
        FindTypeComp folders(true);
        const std::vector<FindComp*> alone{&folders};
        OneSearch nothing("alice", {"/photo"}, alone);
        EXPECT_TRUE(nothing.task.remove() && nothing.walker.Walk({}));
        EXPECT_TRUE(VLIBCErrGet() == 0 && takeLog().empty());
    });
}

TEST_F(SearchRunTest, EveryFaultOfThePlatform) {
    SKIP_WITHOUT_ROOT();
    for (const char* name : {"/a", "/b/c", "/d"}) writeFile(shareRoot("photo") + name, "");
    writeFile(shareRoot("docs") + "/e", "");
    inChild([&] {
        buildIndex({"docs"});
        const Query query{{"/photo", "/docs", "/home"}, {{0, nullptr, "*"}, {8, "less", "100"}, {7, "since", "1"}}};
        const Found all = search("alice", query);
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
            const Found rows = rowsOf(run.task);
            for (const auto& [key, row] : rows) EXPECT_TRUE(all.contains(key) && (met || all.at(key) == row)) << key;
            EXPECT_TRUE(met || rows.size() == all.size());
        }
        EXPECT_LE(openDescriptors(), before + 16) << "a few databases at most";
        EXPECT_GT(faults, 20);
    });
}

}  // namespace
