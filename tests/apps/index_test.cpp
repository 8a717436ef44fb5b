// orvelctl index: what an update makes of an index, and what breaks one off.
#include <spawn.h>

#include <array>
#include <chrono>
#include <fstream>
#include <thread>

#include "apps/program.h"
#include "index/folder_state.h"
#include "index/indexer.h"
#include "index/share_files.h"
#include "support/gate.h"
#include "support/testing.h"
#include "vexo/index.h"

using namespace orvel::ctl;

namespace {

TEST(FolderState, WhatTheTimesSay) {
    struct {
        FolderTimes stored, found;
        bool parentChanged;
        FolderState state;
    } const cases[] = {
        {{10, 10, 5}, {10, 10, 5}, true, FolderState::kSame},
        {{10, 10, 5}, {11, 11, 5}, false, FolderState::kChanged},
        {{10, 10, 5}, {11, 11, 5}, true, FolderState::kChanged},
        {{10, 10, 5}, {9, 12, 5}, true, FolderState::kChanged},
        {{10, 10, 5}, {10, 12, 5}, false, FolderState::kChanged},
        {{10, 10, 5}, {10, 12, 5}, true, FolderState::kReplaced},  // moved here
        {{10, 10, 5}, {10, 10, 6}, false, FolderState::kReplaced},
        {{10, 10, 5}, {20, 21, 6}, false, FolderState::kReplaced},
        {{10, 10, 10}, {20, 20, 20}, false, FolderState::kChanged},  // no times of creation
    };
    for (const auto& folder : cases)
        EXPECT_EQ(judgeFolder(folder.stored, folder.found, folder.parentChanged), folder.state)
            << folder.found.modified << ' ' << folder.found.changed << ' ' << folder.found.created;
    const std::pair<FolderTimes, bool> recent[] = {{{90, 98, 1}, false}, {{90, 99, 1}, true},   {{99, 90, 1}, true},
                                                   {{90, 102, 1}, true}, {{900, 90, 1}, false}, {{1, 900, 1}, false}};
    for (const auto& [times, unseen] : recent) EXPECT_EQ(mayChangeUnseen(times, 100), unseen) << times.changed;
}

class Index : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        SKIP_WITHOUT_ROOT();
        addShare("photo", "read only = no\nvexo:index = yes\n");
    }
    static std::string update(const std::string& more = "") {
        std::vector<std::string> words = {"index", "update", "photo"};
        if (!more.empty()) words.push_back(more);
        const Finished finished = orvelctl(words);
        EXPECT_EQ(finished.status, 0);
        return finished.output.substr(std::min(finished.output.find("compared"), finished.output.size()));
    }
    static std::string search() {
        return orvelctl({"search", "/photo", "--user", "carol", "--name", "*", "--json", "--sort", "ppath",
                         "--additional", "size,owner,perm,type"})
            .output;
    }
    // What the index says, and what a walk says.
    void expectTruth(const std::string& when) {
        const std::string indexed = search();
        addShare("photo", "read only = no\n");
        const std::string walked = search();
        addShare("photo", "read only = no\nvexo:index = yes\n");
        EXPECT_EQ(indexed, walked) << when;
    }
    void file(const std::string& path) { writeFile(photo_ + path, path); }
    void move(const std::string& from, const std::string& to) { fs::rename(photo_ + from, photo_ + to); }
    // Starts the command and ends it with a signal when it is about to call `operation` for the `nth` time.
    static void broken(const std::vector<std::string>& words, int signal, const std::string& operation, int nth) {
        Gate gate(operation, systemRoot() + "/gate");
        const auto [name, order] = gate.order();
        std::vector<std::string> texts = {"/usr/bin/env", name + "=" + order, ORVELCTL};
        texts.insert(texts.end(), words.begin(), words.end());
        std::vector<char*> list(texts.size() + 1);
        std::transform(texts.begin(), texts.end(), list.begin(), [](std::string& text) { return text.data(); });
        pid_t child = 0;
        ASSERT_EQ(posix_spawn(&child, list[0], nullptr, nullptr, list.data(), environ), 0);
        while (--nth > 0 && gate.holds()) gate.next();
        EXPECT_TRUE(gate.holds());
        kill(child, signal);
        waitpid(child, nullptr, 0);
    }
};

TEST_F(Index, AnUpdateMakesWhatABuildWouldMake) {
    for (const std::string folder :
         {"/same", "/a", "/b", "/swap1", "/swap2", "/gone", "/kind", "/moved/from", "/in/*"}) {
        for (const std::string path : {"/sub/deep/f", "/sub/g", "/h"}) file(folder + path + folder.substr(1, 1));
    }
    EXPECT_EQ(orvelctl({"index", "update", "photo"}).status, 1) << "no index yet";
    EXPECT_EQ(orvelctl({"index", "build", "photo"}).status, 0);
    expectTruth("built");
    EXPECT_EQ(update(), "compared 1; 0 entries added, 0 changed, 0 removed\n");

    file("/a/sub/new");
    file("/new/tree/of/files");
    file("/in/*/made/later");
    fs::remove_all(photo_ + "/gone");
    fs::remove(photo_ + "/b/hb");
    move("/b/sub", "/b/renamed_%");
    move("/swap1", "/swap");
    move("/swap2", "/swap1");
    move("/swap", "/swap2");
    fs::remove_all(photo_ + "/kind/sub");
    file("/kind/sub");
    fs::remove(photo_ + "/kind/hk");
    file("/kind/hk/now a folder");
    move("/moved/from/sub", "/moved/sub");
    chmod((photo_ + "/same/sub").c_str(), 0700);
    fs::create_symlink("a", photo_ + "/link");
    EXPECT_NE(update().find(" added"), std::string::npos);
    expectTruth("updated");
    EXPECT_EQ(update(), "compared 1; 0 entries added, 0 changed, 0 removed\n");

    writeFile(photo_ + "/same/hs", "longer than it was");
    EXPECT_EQ(update(), "compared 1; 0 entries added, 0 changed, 0 removed\n") << "its folder does not tell";
    EXPECT_NE(update("--full").find("0 entries added, 1 changed, 0 removed"), std::string::npos);
    expectTruth("compared in full");
}

TEST_F(Index, OneThatCannotBeUsedIsBuiltAnew) {
    file("/in/f");
    EXPECT_EQ(orvelctl({"index", "build", "photo"}).status, 0);
    const std::string store = systemRoot() + "/var/lib/vexo/index/photo.db";
    const std::string good = readFile(store);
    std::string other = good;  // of a version that called a column otherwise
    other.replace(other.find(",highest "), 9, ",hiqhest ");
    for (const std::string& bad : {other, std::string("text"), good.substr(0, 8192), std::string()}) {
        writeFile(store, bad, 0600);
        expectTruth("walked");
        EXPECT_NE(orvelctl({"index", "update", "photo"}).output.find("is built anew"), std::string::npos) << bad.size();
        EXPECT_EQ(update(), "compared 1; 0 entries added, 0 changed, 0 removed\n") << bad.size();
    }
}

TEST_F(Index, NetworkMountsStayOut) {
    file("/local/f");
    file("/nfs/far/f");
    EXPECT_EQ(orvelctl({"index", "build", "photo"}).status, 0);
    EXPECT_NE(search().find("/photo/nfs/far/f"), std::string::npos);
    addMount(photo_ + "/nfs", "nfs");
    EXPECT_NE(update().find(" 3 removed"), std::string::npos);
    EXPECT_EQ(search().find("nfs"), std::string::npos);
    EXPECT_EQ(orvelctl({"index", "build", "photo"}).status, 0);
    EXPECT_EQ(search().find("nfs"), std::string::npos);
    EXPECT_NE(search().find("/photo/local/f"), std::string::npos);
    addMount(photo_, "cifs");
    EXPECT_EQ(orvelctl({"index", "update", "photo"}).status, 1);
    EXPECT_EQ(orvelctl({"index", "build", "photo"}).status, 1);
    EXPECT_EQ(asUser(kAliceUid, kUsersGid, [] { return orvelctl({"index", "build", "photo"}).status; }), 1);
}

// A user may put a link where the indexer, as root, saw a folder a moment before.
TEST_F(Index, NoLinkIsFollowed) {
    file("/in/deep/f");
    fs::create_symlink("in", photo_ + "/link");
    int stop = 0;
    const ShareFiles files(photo_, &stop);
    for (const char* folder : {"", "in", "in/deep", "link", "link/deep"}) {
        const size_t expected = *folder == '\0' || *folder == 'i' ? 1 : 0;
        EXPECT_EQ(files.list(folder).size(), expected) << folder;
    }
    for (const auto& [path, presence] : std::map<std::string, Presence>{{"", Presence::kThere},
                                                                        {"in", Presence::kThere},
                                                                        {"in/deep/f", Presence::kThere},
                                                                        {"in/none", Presence::kGone},
                                                                        {"link", Presence::kGone},
                                                                        {"link/deep/f", Presence::kGone}}) {
        _tag_VEXOSTAT_ status;
        EXPECT_EQ(files.status(path, status), presence) << path;
    }
}

// An index that was built before holds names that are kept out now.
TEST_F(Index, NamesThatAreKeptOutAreNotFound) {
    file("/a/x.no");
    file("/a/y");
    EXPECT_EQ(orvelctl({"index", "build", "photo"}).status, 0);
    EXPECT_NE(search().find("x.no"), std::string::npos);
    addShare("photo", "read only = no\nvexo:index = yes\nveto files = /*.NO/\n");
    EXPECT_EQ(search().find("x.no"), std::string::npos);
    EXPECT_EQ(orvelctl({"index", "update", "photo"}).status, 0);
    const std::string found = search();
    EXPECT_EQ(found.find("x.no"), std::string::npos);
    EXPECT_NE(found.find("/photo/a/y"), std::string::npos);
}

TEST_F(Index, OnlyWhatIsGoneIsPassedOver) {
    file("/in/f");
    int stop = 0;
    const ShareFiles files(photo_, &stop);
    for (const int error : {ENOENT, ENOTDIR, EACCES, EIO}) {
        vexo::gate::fail("VLIBCFileLStatAt", VEXO_ERR_GENERAL, error);
        if (error == ENOENT || error == ENOTDIR) {
            EXPECT_TRUE(files.list("in").empty()) << error;
        } else {
            EXPECT_THROW(static_cast<void>(files.list("in")), Unreadable) << error;
        }
        vexo::gate::reset();
    }
}

// A folder that is gone when its name is looked at, and there again when its files are.
TEST_F(Index, NothingIsAddedToAFolderThatWasTakenOut) {
    file("/in/f");
    EXPECT_EQ(orvelctl({"index", "build", "photo"}).status, 0);
    char path[4096];
    ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path, sizeof path), 0);
    IndexRows rows(photo_, "photo", path);
    int stop = 0;
    const ShareFiles files(photo_, &stop);
    Indexer indexer(files, rows, &stop);
    file("/in/new");
    vexo::gate::fail("VLIBCFileLStatAt", VEXO_ERR_GENERAL, ENOENT, 1);
    indexer.follow({{"", {{"in", true}}}, {"in", {{"new", false}}}});
    vexo::gate::reset();
    for (const char* gone : {"in", "in/f", "in/new"}) EXPECT_FALSE(rows.at(gone)) << gone;
    indexer.follow({{"", {{"in", true}}}});
    for (const char* there : {"in", "in/f", "in/new"}) EXPECT_TRUE(rows.at(there)) << there;
    EXPECT_EQ(FILEIDXIndexEnd("photo", 1), 0);
}

TEST_F(Index, WorkThatIsBrokenOffLosesNothing) {
    file("/before");
    EXPECT_EQ(orvelctl({"index", "build", "photo"}).status, 0);
    const std::string before = search();
    for (const char* folder : {"/1", "/2", "/3", "/4"}) {
        for (const char* name : {"/a/f", "/a/g", "/b/f"}) file(std::string(folder) + name);
    }
    for (const int signal : {SIGTERM, SIGINT, SIGKILL}) {
        broken({"index", "build", "photo"}, signal, "FILEIDXDBInsert", 5);
        EXPECT_EQ(search(), before) << "the old index stays: " << signal;
    }
    broken({"index", "build", "photo"}, SIGKILL, "FILEIDXIndexEnd", 1);
    EXPECT_EQ(search(), before);
    struct {
        int signal;
        const char* operation;
        int nth;
        const char* gone;  // before the next update
    } const updates[] = {{SIGKILL, "FILEIDXDBInsert", 1, "/1"},
                         {SIGKILL, "FILEIDXDBInsert", 4, "/2"},
                         {SIGTERM, "FILEIDXDBInsert", 2, "/3"},
                         {SIGKILL, "FILEIDXIndexEnd", 1, "/4/a"}};
    for (const auto& [signal, operation, nth, gone] : updates) {
        broken({"index", "update", "photo"}, signal, operation, nth);
        fs::remove_all(photo_ + gone);
    }
    update();
    expectTruth("after updates that were killed");
    fs::rename(photo_, photo_ + "-away");
    EXPECT_EQ(orvelctl({"index", "update", "photo"}).status, 1) << "a volume that is not there has lost nothing";
    fs::rename(photo_ + "-away", photo_);
    expectTruth("there again");
    EXPECT_EQ(orvelctl({"index", "drop", "photo"}).status, 0);
    EXPECT_EQ(orvelctl({"index", "status", "photo"}).status, 1);
}

class WatchedIndex : public Index {
 protected:
    ~WatchedIndex() override { end(SIGKILL); }
    void watch(const std::vector<Refusal>& refusals = {}) {
        watcher_ = fork();
        if (watcher_ != 0) return;
        if (!refusals.empty() && !refuseCalls(refusals)) _exit(3);
        execl(ORVELCTL, ORVELCTL, "index", "watch", "photo", "--every", "1", nullptr);
        _exit(127);
    }
    void watchUntilLive() {
        watch();
        EXPECT_TRUE(waitUntil("a live index", isLive));
    }
    int end(int signal) {
        if (watcher_ <= 0) return 0;
        kill(watcher_, signal);
        return waitForEnd(std::exchange(watcher_, 0), "the watcher");
    }
    static bool isLive() {
        int64_t updated = 0;
        int live = 0;
        return FILEIDXIndexAsOf("photo", &updated, &live) == 0 && live == 1;
    }
    // The index comes to say what a walk says. Walks leave out the index alone, whose search does not say it is live.
    void expectTruthSoon(const std::string& when) {
        addShare("photo", "read only = no\n");
        const std::string walked = search();
        addShare("photo", "read only = no\nvexo:index = yes\n");
        std::string indexed;
        const bool same = waitUntil(when, [&] { return (indexed = search()) == walked; });
        EXPECT_TRUE(same) << indexed << "\ninstead of\n" << walked;
    }

 private:
    pid_t watcher_ = 0;
};

TEST_F(WatchedIndex, WhateverChangesIsFound) {
    for (const std::string folder : {"/a", "/b", "/in/deep", "/swap1", "/swap2", "/gone"}) {
        for (const std::string path : {"/sub/f", "/g"}) file(folder + path + folder.substr(1, 1));
    }
    const std::string outside = systemRoot() + "/outside";
    writeFile(outside + "/tree/x/y", "");
    watchUntilLive();  // builds it as well
    expectTruthSoon("at its start");
    EXPECT_EQ(orvelctl({"index", "update", "photo"}).status, 1) << "one writer at a time";

    file("/new/tree/of/files");
    file("/a/sub/new");
    writeFile(photo_ + "/a/ga", "longer than it was");
    fs::remove_all(photo_ + "/gone");
    move("/b/sub", "/b/renamed");
    move("/swap1", "/swap");
    move("/swap2", "/swap1");
    move("/swap", "/swap2");
    move("/in/deep", "/a/deep");
    fs::rename(outside + "/tree", photo_ + "/tree");
    fs::rename(photo_ + "/in", outside + "/in");
    chmod((photo_ + "/a/sub").c_str(), 0700);
    EXPECT_EQ(chown((photo_ + "/b/gb").c_str(), kAliceUid, kUsersGid), 0);
    fs::create_symlink("a", photo_ + "/link");
    file("/@eaDir/hidden/f");
    for (int i = 0; i < 300; ++i) file("/many/" + std::to_string(i));
    expectTruthSoon("after changes");
    EXPECT_TRUE(isLive());

    end(SIGKILL);
    EXPECT_FALSE(isLive());
    file("/while/nobody/watched");
    fs::remove(photo_ + "/many/7");
    watchUntilLive();
    expectTruthSoon("watched again");
    fs::rename(photo_, photo_ + "-away");
    fs::create_directory(photo_);
    file("/another");
    EXPECT_TRUE(waitUntil("the watcher's end", [] { return !isLive(); })) << "its folder is another one";
    EXPECT_NE(end(SIGTERM), 0);
    fs::remove_all(photo_);
    fs::rename(photo_ + "-away", photo_);
    watchUntilLive();
    expectTruthSoon("there again");
    EXPECT_EQ(end(SIGTERM), 0);
    EXPECT_EQ(update(), "compared 1; 0 entries added, 0 changed, 0 removed\n");
}

// Where the kernel reports nothing.
TEST_F(WatchedIndex, WithoutEventsItIsUpdatedNowAndThen) {
    file("/f");
    watch({{SYS_fanotify_init, EPERM}});
    EXPECT_TRUE(waitUntil("an index", [] {
        FIINDEXSTATUS status = {};
        return FILEIDXIndexStatus("photo", &status) == 0;
    }));
    for (const char* name : {"/g", "/h/i"}) {
        file(name);
        expectTruthSoon(name);
        EXPECT_FALSE(isLive());
    }
    EXPECT_EQ(end(SIGTERM), 0);
}

// Changes below one of the folders, and moves between them: `steps`, or for so many seconds.
void changeAtRandom(const std::array<std::string, 2>& roots, unsigned seed, int steps, std::chrono::seconds time) {
    std::mt19937 random(seed);
    const auto path = [&] {
        std::string made = roots[random() % 8 == 0 ? 1 : 0];
        for (unsigned depth = random() % 4;; --depth) {
            made += "/" + std::string(1, static_cast<char>('a' + random() % 4));
            if (depth == 0) return made;
        }
    };
    std::error_code ignored;
    const auto end = std::chrono::steady_clock::now() + time;
    for (int i = 0; i < steps || std::chrono::steady_clock::now() < end; ++i) {
        if (time.count() > 0 && i % 128 == 0) std::this_thread::sleep_for(std::chrono::milliseconds(random() % 500));
        const std::string one = path(), other = path();
        switch (random() % 10) {
            case 0:
            case 1:
                fs::create_directories(one, ignored);
                break;
            case 2:
            case 3:
                std::ofstream(one) << std::string(random() % 50, 'x');
                break;
            case 4:
                fs::rename(one, other, ignored);
                break;
            case 5:
                if (random() % 3 == 0) fs::remove_all(one, ignored);
                break;
            case 6:
                fs::remove(one, ignored);
                break;
            case 7:
                std::ofstream(one, std::ios::in | std::ios::app) << std::string(random() % 50, 'y');
                break;
            case 8:
                static_cast<void>(!lchown(one.c_str(), kAliceUid + random() % 2, kUsersGid));
                break;
            default:
                fs::permissions(one, static_cast<fs::perms>(0700 + random() % 0100), ignored);
        }
    }
}

// In the long mode each of twenty seeds takes a minute.
TEST_F(WatchedIndex, ManyAtOnceChangeAtRandom) {
    const bool isLong = getenv("ORVEL_TEST_LONG") != nullptr;
    const std::string other = systemRoot() + "/other-share";
    fs::create_directory(other);
    for (unsigned seed = 1; seed <= (isLong ? 20 : 2); ++seed) {
        watchUntilLive();
        std::vector<pid_t> children;
        for (unsigned i = 0; i < 8; ++i) {
            children.push_back(fork());
            if (children.back() == 0) {
                changeAtRandom({photo_, other}, seed * 100 + i, 100, std::chrono::seconds(isLong ? 60 : 0));
                _exit(0);
            }
        }
        const bool isKilled = seed % 2 == 0;
        for (int kills = 0; isKilled && kills < (isLong ? 5 : 1); ++kills) {
            if (kills > 0) std::this_thread::sleep_for(std::chrono::seconds(5));
            end(SIGKILL);
            watch();
        }
        for (const pid_t child : children) EXPECT_EQ(waitForEnd(child, "changes at random"), 0);
        if (isKilled) {  // what changed within files meanwhile does not show on their folders
            end(SIGTERM);
            update("--full");
            watchUntilLive();
        }
        expectTruthSoon("seed " + std::to_string(seed));
        EXPECT_EQ(end(SIGTERM), 0);
    }
}

}  // namespace
