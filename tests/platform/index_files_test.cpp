// The files of the index: what others put in their place, writers that die, and the central store.

#include "platform/index_fixture.h"
#include "platform/private_mounts.h"
#include "platform/trust.h"

namespace {

using namespace index_tests;
using vexo::fileindex::closeDatabases;

class IndexFilesTest : public IndexTest {
 protected:
    std::string store_ = systemRoot() + "/var/lib/vexo/index/";
};

TEST_F(IndexFilesTest, WhatIsNoDatabaseOfOursIsRefused) {
    ASSERT_EQ(insert(db_, {"x"}), 0);
    closeDatabases();
    const std::string good = readFile(db_);
    const auto check = [&](int code) {
        EXPECT_EQ(countError(db_), code);
        EXPECT_EQ(insert(db_, {"y"}) >= 0, code == 0);
        closeDatabases();
    };
    const auto patched = [&](size_t at, const char* bytes) {
        return good.substr(0, at) + bytes + good.substr(at + strlen(bytes));
    };
    for (const auto& [what, content] : Rows<const char*, std::string>{
             row("empty", ""), row("text", std::string(9000, 'x')), row("cut in the header", good.substr(0, 50)),
             row("cut behind the header", good.substr(0, 8192)), row("a write-ahead log", patched(18, "\2\2")),
             row("another application's", patched(68, "none")),
             row("garbage pages", good.substr(0, 100) + std::string(good.size() - 100, '\xA5'))}) {
        SCOPED_TRACE(what);
        writeFile(db_, content, 0600);
        check(VEXO_ERR_GENERAL);
    }
    for (const char* sql :
         {"CREATE TABLE more(x)", "CREATE TRIGGER t AFTER INSERT ON record BEGIN DELETE FROM state;END",
          "ALTER TABLE record RENAME TO r;CREATE VIEW record AS SELECT * FROM r"}) {
        SCOPED_TRACE(sql);
        writeFile(db_, good, 0600);
        ask(sql);
        check(VEXO_ERR_GENERAL);
    }
    plantEach(
        db_, [&] { check(VEXO_ERR_FILE); }, good);
    check(VEXO_ERR_FILE);  // missing
    writeFile(db_, good, 0600);
    plantEach(db_ + "-journal", [&] { check(VEXO_ERR_FILE); });
    writeFile(db_ + "-wal", std::string(600, '\1'), 0666);
    check(0);
    EXPECT_FAILS(FILEIDXDBCreate(db_.c_str()), EEXIST, VEXO_ERR_EXISTS);
    EXPECT_FAILS(FILEIDXDBCreate((folder_ + "/none/x").c_str()), ENOENT, VEXO_ERR_FILE);
    fs::create_symlink("new", folder_ + "/link");
    EXPECT_LT(FILEIDXDBCreate((folder_ + "/link").c_str()), 0);
    EXPECT_FALSE(fs::exists(folder_ + "/new"));
}

// Bytes changed anywhere, as a bad disk or a bad neighbour would: an answer or an error, and the process lives.
TEST_F(IndexFilesTest, DamagedDatabasesDoNoHarm) {
    for (int i = 0; i < 300; ++i)
        ASSERT_EQ(insert(db_, {.path = "f" + std::to_string(i % 9) + "/n" + std::to_string(i)}), 0);
    closeDatabases();
    const std::string good = readFile(db_);
    std::mt19937 random(5);
    Cond name = node(FI_COL_NAME, FI_OP_WILDCARD, "*1*");
    int refused = 0;
    for (int round = 0; round < 200; ++round) {
        std::string bad = good;
        for (int i = 0; i < 8; ++i) bad[100 + random() % (bad.size() - 100)] = static_cast<char>(random());
        writeFile(db_, bad, 0600);
        const FIQUERY query = {{{FI_COL_NAME, 0}, {}}, 1, &name, 0, 50};
        Addresses found;
        const bool read = FILEIDXDBSelect(db_.c_str(), &query, collect, &found) >= 0;
        const bool written =
            insert(db_, {"new"}) >= 0 && FILEIDXDBDel(db_.c_str(), &name) >= 0 && FILEIDXDBFlush(db_.c_str()) >= 0;
        refused += read && written ? 0 : 1;
        closeDatabases();
    }
    EXPECT_GT(refused, 0);
}

// A writer that dies half-way through a large commit: its journal is played back, by readers of a share's index too.
TEST_F(IndexFilesTest, HalfACommitIsTakenBack) {
    std::vector<Record> records(3000, {.path = "", .size = 1});
    for (size_t i = 0; i < records.size(); ++i) records[i].path = "n" + std::to_string(i);
    build(records);
    for (const Record& record : records) ASSERT_EQ(insert(db_, record), 0);
    closeDatabases();
    for (const std::string& file : {db_, store_ + "photo.db"}) {
        inChild([&] {
            sqlite3* db = nullptr;
            EXPECT_EQ(sqlite3_open(file.c_str(), &db), SQLITE_OK);
            constexpr const char* half = "PRAGMA cache_size=1;BEGIN;UPDATE record SET size=2";
            EXPECT_EQ(sqlite3_exec(db, half, nullptr, nullptr, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
        });
        EXPECT_TRUE(fs::exists(file + "-journal"));
    }
    const Cond changed = node(FI_COL_SIZE, FI_OP_EQUAL, "2");
    EXPECT_EQ(select(db_, &changed), Addresses());
    EXPECT_EQ(searched(&changed), Addresses());
    EXPECT_EQ(searched(nullptr).size(), records.size());
    for (const std::string& file : {db_, store_ + "photo.db"}) EXPECT_FALSE(fs::exists(file + "-journal"));
}

TEST_F(IndexFilesTest, AForkedChildHasConnectionsOfItsOwn) {
    ASSERT_EQ(insert(db_, {"parent"}), 0);
    EXPECT_EQ(inChild([&] {
                  const bool done = select(db_).size() == 1 && insert(db_, {"child"}) == 0;
                  exit(done ? 5 : 1);  // through the handlers of exit
              }),
              5);
    ASSERT_EQ(insert(db_, {"parent again"}), 0);
    EXPECT_EQ(select(db_), (Addresses{"photo:child", "photo:parent", "photo:parent again"}));
}

TEST_F(IndexFilesTest, AFullDiskTakesTheBatchBackAndNothingElse) {
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        if (mount("none", folder_.c_str(), "tmpfs", 0, "size=2m") != 0) return kNoPrivateMounts;
        const std::string db = folder_ + "/small";
        EXPECT_TRUE(FILEIDXDBCreate(db.c_str()) == 0 && insert(db, {"first"}) == 0 && FILEIDXDBFlush(db.c_str()) == 0);
        int added = 0;
        while (added < 40000 && insert(db, {.path = "p" + std::to_string(added)}) == 0 &&
               (++added % 1000 != 0 || FILEIDXDBFlush(db.c_str()) == 0)) {
        }
        EXPECT_LT(added, 40000);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
        EXPECT_EQ(errno, ENOSPC);
        const Addresses left = select(db);
        EXPECT_EQ(std::count(left.begin(), left.end(), "photo:first"), 1);

        // A batch that nobody asks about before other databases take its place.
        bool reported = false;
        for (int i = 0; i < 4000; ++i) reported = insert(db, {.path = "q" + std::to_string(i)}) != 0 || reported;
        for (int i = 0; i < 9; ++i) {
            const std::string other = systemRoot() + "/other" + std::to_string(i);
            EXPECT_TRUE(FILEIDXDBCreate(other.c_str()) == 0 && select(other).empty());
        }
        EXPECT_TRUE(FILEIDXDBFlush(db.c_str()) < 0 || reported);
        return 0;
    }));
}

TEST_F(IndexFilesTest, AnIndexIsReplacedAsAWholeByOneAtATime) {
    FIINDEXSTATUS status{};
    EXPECT_FAILS(FILEIDXIndexStatus("photo", &status), ENOENT, VEXO_ERR_MISSING);
    EXPECT_FAILS(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path_, sizeof path_), ENOENT, VEXO_ERR_MISSING);
    EXPECT_FAILS(FILEIDXIndexBegin("photo", FI_INDEX_BUILD, path_, 20), EINVAL, VEXO_ERR_PARAMETER);
    build({{"old"}, {.path = "dir", .isDir = true}});
    EXPECT_EQ(FILEIDXIsIndexEnable("PHOTO"), 1);
    const auto files = [this] {
        return std::count_if(fs::directory_iterator(store_), {},
                             [](const auto& entry) { return entry.path().extension() != ".lock"; });
    };
    // Another process cannot begin meanwhile; one that dies leaves what the next one clears away.
    inChild([&] {
        EXPECT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_BUILD, path_, sizeof path_), 0);
        inChild([&] {
            EXPECT_LT(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path_, sizeof path_), 0);
            EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_EXISTS);
            EXPECT_LT(FILEIDXIndexDrop("photo"), 0);
        });
        EXPECT_TRUE(insert(path_, {"half"}) == 0 && FILEIDXDBFlush(path_) == 0);
    });
    EXPECT_EQ(files(), 3);
    ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_BUILD, path_, sizeof path_), 0);
    ASSERT_EQ(insert(path_, {"given up"}), 0);
    ASSERT_EQ(FILEIDXIndexEnd("photo", 0), 0);
    EXPECT_EQ(files(), 2);
    ASSERT_EQ(FILEIDXIndexStatus("photo", &status), 0);
    EXPECT_TRUE(status.records == 2 && status.folders == 1 && status.bytes > 0);
    EXPECT_NEAR(static_cast<double>(status.built), static_cast<double>(time(nullptr)), 3600.0);
    for (int time = 0; time < 2; ++time) EXPECT_EQ(FILEIDXIndexDrop("photo"), 0);
    EXPECT_EQ(FILEIDXIsIndexEnable("photo"), 0);
    EXPECT_EQ(files(), 0);
    EXPECT_EQ(statusOf(store_).st_mode & 0777, 0700U);
}

// Who removes a record to write it anew may be killed at any time.
TEST_F(IndexFilesTest, ABatchDoesNotEndBehindARemoval) {
    build({{"a"}});
    ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path_, sizeof path_), 0);
    for (int i = 0; i < 15; ++i) ASSERT_EQ(insert(path_, {"b" + std::to_string(i)}), 0);
    usleep(350000);  // a batch ends once it is 300 ms old; older changes nothing
    Cond where = node(FI_COL_PATH, FI_OP_EQUAL, "a");
    ASSERT_EQ(FILEIDXDBDel(path_, &where), 0);
    const std::string index = path_;
    EXPECT_EQ(ask(index, "SELECT count(*) FROM record WHERE path='a'"), 1);
    ASSERT_EQ(FILEIDXIndexEnd("photo", 1), 0);
    EXPECT_EQ(ask(index, "SELECT count(*) FROM record WHERE path='a'"), 0);
}

TEST_F(IndexFilesTest, AnUpdateKeepsNamesFindable) {
    build({{"a/Holiday.jpg"}, {"a/work.txt"}, {"b/holiday.png"}});
    ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path_, sizeof path_), 0);
    ASSERT_EQ(insert(path_, {"c/\"HOLIDAY\".gif"}), 0);
    Cond where = node(FI_COL_PATH, FI_OP_EQUAL, "a/work.txt");
    Cond name = node(FI_COL_NAME, FI_OP_EQUAL, "my holiday");
    Cond set = node(FI_COL_PATH, FI_OP_EQUAL, "a/my holiday", &name);
    ASSERT_EQ(FILEIDXDBUpdate(path_, &set, &where), 0);
    Cond gone = node(FI_COL_PATH, FI_OP_EQUAL, "b/holiday.png");
    ASSERT_EQ(FILEIDXDBDel(path_, &gone), 0);
    // What is not complete is there for searches nevertheless, and stays when the indexer dies.
    ASSERT_EQ(FILEIDXDBFlush(path_), 0);
    Cond holiday = node(FI_COL_NAME, FI_OP_WILDCARD, "*oliday*");
    Cond work = node(FI_COL_NAME, FI_OP_WILDCARD, "*work*");
    EXPECT_EQ(searched(&holiday), (Addresses{"photo:a/Holiday.jpg", "photo:a/my holiday", "photo:c/\"HOLIDAY\".gif"}));
    EXPECT_EQ(searched(&work), Addresses());
    Cond quoted = node(FI_COL_NAME, FI_OP_WILDCARD, "*\"holiday\"*");
    EXPECT_EQ(searched(&quoted), Addresses{"photo:c/\"HOLIDAY\".gif"});
    ASSERT_EQ(FILEIDXIndexEnd("photo", 1), 0);
}

}  // namespace
