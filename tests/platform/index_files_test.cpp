// The files of the index: what others put in their place, writers that die, and the central store.
#include <fcntl.h>
#include <sys/mount.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstring>
#include <filesystem>
#include <functional>
#include <random>
#include <thread>

#include "platform/index_fixture.h"
#include "platform/private_mounts.h"
#include "vexo/error.h"

namespace {

namespace fs = std::filesystem;
using index_tests::Cond;
using index_tests::Data;
using index_tests::insert;
using index_tests::kEverything;
using index_tests::node;
using index_tests::Record;
using index_tests::Rows;
using index_tests::select;
using index_tests::sorted;
using support::kAliceUid;
using support::kUsersGid;

class IndexFilesTest : public index_tests::IndexTest {
 protected:
    // The error of asking for a count, 0 when that works.
    static int countError(const std::string& db) {
        const FIQUERY all = {{}, 0, nullptr, 0, kEverything};
        unsigned long long count = 0;
        VLIBCErrSetEx(0, "", 0);
        return FILEIDXCountGet(db.c_str(), &all, &count) < 0 ? VLIBCErrGet() : 0;
    }
    unsigned long long count() {
        const FIQUERY all = {{}, 0, nullptr, 0, kEverything};
        unsigned long long found = 0;
        EXPECT_EQ(FILEIDXCountGet(db_.c_str(), &all, &found), 0);
        return found;
    }
    void run(const char* sql) {
        sqlite3* db = nullptr;
        ASSERT_EQ(sqlite3_open(db_.c_str(), &db), SQLITE_OK);
        ASSERT_EQ(sqlite3_exec(db, sql, nullptr, nullptr, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
        sqlite3_close(db);
    }
    std::string store_ = systemRoot() + "/var/lib/vexo/index/";
};

Rows searched(const std::string& out, const Cond* cond) {
    EXPECT_EQ(FILEIDXDBCreate(out.c_str()), 0);
    EXPECT_EQ(
        FILEIDXResultGetAndTableGen("photo", nullptr, cond, out.c_str(), nullptr, nullptr, nullptr, nullptr, nullptr),
        0);
    Rows rows = sorted(select(out));
    unlink(out.c_str());
    return rows;
}

TEST_F(IndexFilesTest, WhatIsNoDatabaseOfOursIsRefused) {
    ASSERT_EQ(insert(db_, {"x"}), 0);
    vexo::fileindex::closeDatabases();
    const std::string good = support::readFile(db_);
    const auto patched = [&](size_t at, const char* bytes) {
        return good.substr(0, at) + bytes + good.substr(at + strlen(bytes));
    };
    const std::string elsewhere = folder_ + "/elsewhere";
    const std::string journal = db_ + "-journal";
    struct Case {
        const char* what;
        int code;
        std::function<void()> make;  // in place of the database, which is gone
    };
    const auto write = [&](const std::string& text) { return [this, text] { support::writeFile(db_, text, 0600); }; };
    const auto also = [&](const std::function<void()>& more) {
        return [this, good, more] {
            support::writeFile(db_, good, 0600);
            more();
        };
    };
    const std::vector<Case> cases = {
        {"missing", VEXO_ERR_FILE, [] {}},
        {"empty", VEXO_ERR_GENERAL, write("")},
        {"text", VEXO_ERR_GENERAL, write(std::string(9000, 'x'))},
        {"cut in the header", VEXO_ERR_GENERAL, write(good.substr(0, 50))},
        {"cut behind the header", VEXO_ERR_GENERAL, write(good.substr(0, 8192))},
        {"a write-ahead log", VEXO_ERR_GENERAL, write(patched(18, "\2\2"))},
        {"another application's", VEXO_ERR_GENERAL, write(patched(68, "none"))},
        {"garbage pages", VEXO_ERR_GENERAL, write(good.substr(0, 100) + std::string(good.size() - 100, '\xA5'))},
        {"a folder", VEXO_ERR_FILE, [this] { fs::create_directory(db_); }},
        {"a pipe", VEXO_ERR_FILE, [this] { ASSERT_EQ(mkfifo(db_.c_str(), 0600), 0); }},
        {"a link", VEXO_ERR_FILE,
         [&] {
             support::writeFile(elsewhere, good, 0600);
             fs::create_symlink(elsewhere, db_);
         }},
        {"two names", VEXO_ERR_FILE, also([&] { fs::create_hard_link(db_, elsewhere); })},
        {"writable by all", VEXO_ERR_FILE, also([&] { chmod(db_.c_str(), 0666); })},
        {"of somebody else", VEXO_ERR_FILE, also([&] {
             if (geteuid() == 0)
                 chown(db_.c_str(), kAliceUid, kUsersGid);
             else
                 chmod(db_.c_str(), 0666);
         })},
        {"another table", VEXO_ERR_GENERAL, also([&] { run("CREATE TABLE more(x)"); })},
        {"a view", VEXO_ERR_GENERAL,
         also([&] { run("ALTER TABLE record RENAME TO r;CREATE VIEW record AS SELECT * FROM r"); })},
        {"a trigger", VEXO_ERR_GENERAL,
         also([&] { run("CREATE TRIGGER t AFTER INSERT ON record BEGIN DELETE FROM state;END"); })},
        {"a piped journal", VEXO_ERR_FILE, also([&] { ASSERT_EQ(mkfifo(journal.c_str(), 0666), 0); })},
        {"a linked journal", VEXO_ERR_FILE, also([&] { fs::create_symlink(elsewhere, journal); })},
        {"somebody's journal", VEXO_ERR_FILE, also([&] { support::writeFile(journal, std::string(600, '\1'), 0666); })},
        {"somebody's log", 0, also([&] { support::writeFile(db_ + "-wal", std::string(600, '\1'), 0666); })},
        {"as it was", 0, also([] {})},
    };
    for (const Case& test : cases) {
        for (const std::string& path : {db_, elsewhere, journal, db_ + "-wal"}) fs::remove_all(path);
        test.make();
        EXPECT_EQ(countError(db_), test.code) << test.what;
        EXPECT_EQ(insert(db_, {"y"}) >= 0, test.code == 0) << test.what;
        vexo::fileindex::closeDatabases();
    }
    EXPECT_LT(FILEIDXDBCreate(db_.c_str()), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_EXISTS);
    EXPECT_LT(FILEIDXDBCreate((folder_ + "/none/x").c_str()), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    fs::create_symlink(folder_ + "/new", elsewhere);
    EXPECT_LT(FILEIDXDBCreate(elsewhere.c_str()), 0);
    EXPECT_FALSE(fs::exists(folder_ + "/new"));
}

// Bytes changed anywhere, as a bad disk or a bad neighbour would: an answer or an error, and the process lives.
TEST_F(IndexFilesTest, DamagedDatabasesDoNoHarm) {
    for (int i = 0; i < 300; ++i)
        ASSERT_EQ(insert(db_, {.path = "f" + std::to_string(i % 9) + "/n" + std::to_string(i)}), 0);
    vexo::fileindex::closeDatabases();
    const std::string good = support::readFile(db_);
    std::mt19937 random(5);
    Cond name = node(FI_COL_NAME, FI_OP_WILDCARD, "*1*");
    int refused = 0;
    for (int round = 0; round < 200; ++round) {
        std::string bad = good;
        for (int i = 0; i < 8; ++i) bad[100 + random() % (bad.size() - 100)] = static_cast<char>(random());
        support::writeFile(db_, bad, 0600);
        const FIQUERY query = {{{FI_COL_NAME, 0}, {}}, 1, &name, 0, 50};
        Rows rows;
        const bool read = FILEIDXDBSelect(db_.c_str(), &query, index_tests::collect, &rows) >= 0;
        const bool written =
            insert(db_, {"new"}) >= 0 && FILEIDXDBDel(db_.c_str(), &name) >= 0 && FILEIDXDBFlush(db_.c_str()) >= 0;
        refused += read && written ? 0 : 1;
        vexo::fileindex::closeDatabases();
    }
    EXPECT_GT(refused, 0);
}

TEST_F(IndexFilesTest, ResultsAreSeenWhileTheSearchRunsAndAfterItDies) {
    int ready[2];
    ASSERT_EQ(pipe2(ready, O_CLOEXEC), 0);
    const pid_t child = fork();
    if (child == 0) {
        // A burst, then nothing for long.
        for (int i = 0; i < 1000; ++i) insert(db_, {.path = "a" + std::to_string(i)});
        const bool told = write(ready[1], "x", 1) == 1;
        std::this_thread::sleep_for(std::chrono::milliseconds(1500));
        const bool again = write(ready[1], "x", 1) == 1;
        for (int i = 0; told && again && i < 100000000; ++i) insert(db_, {.path = "b" + std::to_string(i)});
        _exit(0);
    }
    char byte = 0;
    ASSERT_EQ(read(ready[0], &byte, 1), 1);
    std::this_thread::sleep_for(std::chrono::milliseconds(1000));
    EXPECT_EQ(count(), 1000U);
    ASSERT_EQ(read(ready[0], &byte, 1), 1);
    unsigned long long last = 0;
    for (int i = 0; i < 20; ++i) {
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
        EXPECT_GE(count(), last);
        last = count();
    }
    EXPECT_GT(last, 1000U);
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
    close(ready[0]);
    close(ready[1]);
    vexo::fileindex::closeDatabases();
    EXPECT_EQ(select(db_).size(), count());
    EXPECT_EQ(ask("SELECT count(*) FROM pragma_integrity_check WHERE integrity_check='ok'"), 1);
}

// Kills writers at any moment, in the middle of a commit too: of results, and of an index that is searched meanwhile.
TEST_F(IndexFilesTest, KilledWritersLeaveADatabaseThatReads) {
    build({{"x"}});
    std::mt19937 random(11);
    for (const bool ofShare : {false, true}) {
        unsigned long long before = 0;
        for (int round = 0; round < 25; ++round) {
            const pid_t child = fork();
            if (child == 0) {
                char path[4096];
                if (ofShare) FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path, sizeof path);
                const std::string db = ofShare ? path : db_;
                for (int i = 0;; ++i) {
                    insert(db, {.path = std::to_string(round) + "/" + std::to_string(random()) + "/n"});
                    if (i % 50 == 0) FILEIDXDBFlush(db.c_str());
                }
            }
            std::this_thread::sleep_for(std::chrono::milliseconds(5 + random() % 40));
            kill(child, SIGKILL);
            waitpid(child, nullptr, 0);
            const auto now = ofShare ? searched(folder_ + "/out", nullptr).size() : count();
            EXPECT_GE(now, before);
            EXPECT_TRUE(ofShare || select(db_).size() == now);
            before = now;
        }
        EXPECT_GT(before, 1U);
    }
    Cond name = node(FI_COL_NAME, FI_OP_WILDCARD, "n");
    char path[4096];
    ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path, sizeof path), 0);
    EXPECT_EQ(select(path, &name).size() + 1, searched(folder_ + "/out", nullptr).size());
    EXPECT_EQ(FILEIDXIndexEnd("photo", 1), 0);
}

// A writer that dies half-way through a large commit: its journal is played back, by readers of a share's index too.
TEST_F(IndexFilesTest, HalfACommitIsTakenBack) {
    std::vector<Record> records(3000, {.path = "", .size = 1});
    for (size_t i = 0; i < records.size(); ++i) records[i].path = "n" + std::to_string(i);
    build(records);
    for (const Record& record : records) ASSERT_EQ(insert(db_, record), 0);
    vexo::fileindex::closeDatabases();
    for (const std::string& file : {db_, store_ + "photo.db"}) {
        support::inChild([&] {
            sqlite3* db = nullptr;
            EXPECT_EQ(sqlite3_open(file.c_str(), &db), SQLITE_OK);
            constexpr const char* half = "PRAGMA cache_size=1;BEGIN;UPDATE record SET size=2";
            EXPECT_EQ(sqlite3_exec(db, half, nullptr, nullptr, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
            return 0;
        });
        EXPECT_TRUE(fs::exists(file + "-journal"));
    }
    const Cond changed = node(FI_COL_SIZE, FI_OP_EQUAL, "2");
    EXPECT_EQ(select(db_, &changed), Rows());
    EXPECT_EQ(searched(folder_ + "/out", &changed), Rows());
    EXPECT_EQ(searched(folder_ + "/out", nullptr).size(), records.size());
    for (const std::string& file : {db_, store_ + "photo.db"}) EXPECT_FALSE(fs::exists(file + "-journal"));
}

TEST_F(IndexFilesTest, AForkedChildHasConnectionsOfItsOwn) {
    ASSERT_EQ(insert(db_, {"parent"}), 0);
    EXPECT_EQ(support::inChild([&] {
                  const bool done = select(db_).size() == 1 && insert(db_, {"child"}) == 0;
                  exit(done ? 5 : 1);  // through the handlers of exit
                  return 0;
              }),
              5);
    ASSERT_EQ(insert(db_, {"parent again"}), 0);
    EXPECT_EQ(sorted(select(db_)), (Rows{"photo:child", "photo:parent", "photo:parent again"}));
}

TEST_F(IndexFilesTest, AFullDiskTakesTheBatchBackAndNothingElse) {
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        const std::string small = folder_ + "/small";
        support::makeFolder(small);
        if (mount("none", small.c_str(), "tmpfs", 0, "size=2m") != 0) return support::kNoPrivateMounts;
        const std::string db = small + "/db";
        EXPECT_EQ(FILEIDXDBCreate(db.c_str()), 0);
        EXPECT_EQ(insert(db, {"first"}), 0);
        EXPECT_EQ(FILEIDXDBFlush(db.c_str()), 0);
        bool full = false;
        for (int i = 0; i < 40000 && !full; ++i) {
            full =
                insert(db, {.path = "p" + std::to_string(i)}) < 0 || (i % 1000 == 0 && FILEIDXDBFlush(db.c_str()) < 0);
        }
        EXPECT_TRUE(full);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
        EXPECT_EQ(errno, ENOSPC);
        const Rows rows = select(db);
        EXPECT_GE(rows.size(), 1U);
        EXPECT_EQ(rows[0], "photo:first");
        return 0;
    }));
}

int nothingElse(const std::string& path) {
    int files = 0;
    for (const auto& entry : fs::directory_iterator(path)) files += entry.path().extension() == ".lock" ? 0 : 1;
    return files;
}

TEST_F(IndexFilesTest, AnIndexIsReplacedAsAWholeByOneAtATime) {
    char path[4096];
    FIINDEXSTATUS status{};
    EXPECT_EQ(FILEIDXIsIndexEnable("photo"), 0);
    EXPECT_LT(FILEIDXIndexStatus("photo", &status), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_MISSING);
    EXPECT_LT(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path, sizeof path), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_MISSING);
    EXPECT_LT(FILEIDXIndexBegin("nosuch", FI_INDEX_BUILD, path, sizeof path), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_SHARE_MISSING);
    EXPECT_LT(FILEIDXIndexBegin("photo", FI_INDEX_BUILD, path, 20), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    EXPECT_LT(FILEIDXIndexEnd("photo", 1), 0);

    build({{"old"}, {.path = "dir", .isDir = true}});
    EXPECT_EQ(FILEIDXIsIndexEnable("PHOTO"), 1);
    ASSERT_EQ(FILEIDXIndexStatus("photo", &status), 0);
    EXPECT_EQ(status.records, 2U);
    EXPECT_EQ(status.folders, 1U);
    EXPECT_GT(status.bytes, 0);
    EXPECT_NEAR(static_cast<double>(status.built), static_cast<double>(time(nullptr)), 5.0);
    // Another process cannot begin meanwhile; one that dies leaves what the next one clears away.
    EXPECT_EQ(support::inChild([&] {
                  const bool begun = FILEIDXIndexBegin("photo", FI_INDEX_BUILD, path, sizeof path) == 0;
                  const bool refused =
                      support::inChild([&] {
                          return static_cast<int>(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path, sizeof path) < 0 &&
                                                  VLIBCErrGet() == VEXO_ERR_EXISTS && FILEIDXIndexDrop("photo") < 0);
                      }) == 1;
                  return static_cast<int>(begun && refused && insert(path, {"half"}) == 0 && FILEIDXDBFlush(path) == 0);
              }),
              1);
    EXPECT_EQ(nothingElse(store_), 2);
    ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_BUILD, path, sizeof path), 0);
    ASSERT_EQ(insert(path, {"given up"}), 0);
    ASSERT_EQ(FILEIDXIndexEnd("photo", 0), 0);
    EXPECT_EQ(nothingElse(store_), 1);
    ASSERT_EQ(FILEIDXIndexStatus("photo", &status), 0);
    EXPECT_EQ(status.records, 2U);
    EXPECT_EQ(FILEIDXIndexDrop("photo"), 0);
    EXPECT_EQ(FILEIDXIndexDrop("photo"), 0);
    EXPECT_EQ(FILEIDXIsIndexEnable("photo"), 0);
    EXPECT_EQ(nothingElse(store_), 0);
    struct stat folder {};
    ASSERT_EQ(stat(store_.c_str(), &folder), 0);
    EXPECT_EQ(folder.st_mode & 0777, 0700U);
}

TEST_F(IndexFilesTest, AnUpdateKeepsNamesFindable) {
    build({{"a/Holiday.jpg"}, {"a/work.txt"}, {"b/holiday.png"}});
    char path[4096];
    ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path, sizeof path), 0);
    ASSERT_EQ(insert(path, {"c/HOLIDAY.gif"}), 0);
    Cond where = node(FI_COL_PATH, FI_OP_EQUAL, "a/work.txt");
    Cond parent = node(FI_COL_PARENT, FI_OP_EQUAL, "a");
    Cond name = node(FI_COL_NAME, FI_OP_EQUAL, "my holiday", &parent);
    Cond set = node(FI_COL_PATH, FI_OP_EQUAL, "a/my holiday", &name);
    ASSERT_EQ(FILEIDXDBUpdate(path, &set, &where), 0);
    Cond gone = node(FI_COL_PATH, FI_OP_EQUAL, "b/holiday.png");
    ASSERT_EQ(FILEIDXDBDel(path, &gone), 0);
    // What is not complete is there for searches nevertheless, and stays when the indexer dies.
    ASSERT_EQ(FILEIDXDBFlush(path), 0);
    Cond holiday = node(FI_COL_NAME, FI_OP_WILDCARD, "*oliday*");
    const Rows now = {"photo:a/Holiday.jpg", "photo:a/my holiday", "photo:c/HOLIDAY.gif"};
    EXPECT_EQ(searched(folder_ + "/out", &holiday), now);
    Cond work = node(FI_COL_NAME, FI_OP_WILDCARD, "*work*");
    EXPECT_EQ(searched(folder_ + "/out", &work), Rows());
    ASSERT_EQ(FILEIDXIndexEnd("photo", 1), 0);
    EXPECT_EQ(searched(folder_ + "/out", &holiday), now);
}

struct Asked {
    uid_t user;
    Rows folders, files;
    int* cancel;
};

BOOL seesFolder(const char* folder, void* argument) {
    auto* asked = static_cast<Asked*>(argument);
    asked->folders.push_back(folder);
    return geteuid() == asked->user && strcmp(folder, "secret") != 0 ? 1 : 0;
}

BOOL wasRead(Data* data, void* argument) {
    auto* asked = static_cast<Asked*>(argument);
    asked->files.push_back(data->szPath);
    data->accessed = 77;
    if (asked->cancel != nullptr && strcmp(data->szName, "stop") == 0) *asked->cancel = 1;
    return geteuid() == asked->user ? 1 : 0;
}

TEST_F(IndexFilesTest, ASearchAsksWithTheCallersIdentity) {
    SKIP_WITHOUT_ROOT();
    build({{"open/a"}, {"open/b"}, {"secret/c"}, {"stop"}});
    EXPECT_EQ(support::inChild([&] {
                  if (setegid(kUsersGid) != 0 || seteuid(kAliceUid) != 0) return 97;
                  const std::string out = folder_ + "/alice";
                  int cancel = 0;
                  Asked asked{kAliceUid, {}, {}, &cancel};
                  Cond read = node(FI_COL_ACCESS_TIME, FI_OP_LESS, "0");
                  EXPECT_EQ(FILEIDXDBCreate(out.c_str()), 0);
                  EXPECT_EQ(FILEIDXIsIndexEnable("photo"), 1);
                  EXPECT_EQ(FILEIDXResultGetAndTableGen("photo", nullptr, &read, out.c_str(), wasRead, &asked, &cancel,
                                                        seesFolder, &asked),
                            0);
                  EXPECT_EQ(asked.folders, (Rows{"open", "open", "secret", ""}));
                  EXPECT_EQ(asked.files, (Rows{"open/a", "open/b", "stop"}));
                  EXPECT_EQ(sorted(select(out)), (Rows{"photo:open/a", "photo:open/b", "photo:stop"}));
                  Cond seen = node(FI_COL_ACCESS_TIME, FI_OP_EQUAL, "77");
                  EXPECT_EQ(select(out, &seen).size(), 3U);
                  EXPECT_EQ(FILEIDXResultGetAndTableGen("photo", nullptr, nullptr, out.c_str(), wasRead, &asked,
                                                        &cancel, seesFolder, &asked),
                            0)
                      << "a search that was stopped succeeds";
                  EXPECT_EQ(asked.files.size(), 3U);
                  EXPECT_EQ(geteuid(), kAliceUid);
                  struct stat status {};
                  EXPECT_EQ(stat(out.c_str(), &status), 0);
                  EXPECT_EQ(status.st_uid, kAliceUid);
                  return 0;
              }),
              0);
}

}  // namespace
