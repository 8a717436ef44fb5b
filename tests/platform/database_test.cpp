// Reading a database that a program writes and that anybody may have broken.
#include "vexo/database.h"

#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <functional>
#include <string>
#include <string_view>

#include "sqlite_handle.h"
#include "support/appliance.h"
#include "vexo/error.h"

namespace {

using support::writeFile;

constexpr const char* kFile = "/usr/links.db";

class DatabaseTest : public support::ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        support::makeFolder(systemRoot() + "/usr", 0755);
    }
    void write(const std::string& sql) {
        sqlite3* db = nullptr;
        ASSERT_EQ(sqlite3_open(file_.c_str(), &db), SQLITE_OK);
        EXPECT_EQ(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
        sqlite3_close(db);
    }
    // The code of a statement; 0 when it succeeds.
    static int failureOf(const char* sql, std::string* why = nullptr) {
        PVEXODB db = VEXODBConnect(kFile);
        if (db == nullptr) return VLIBCErrGet();
        PVEXODBRESULT result = nullptr;
        const int outcome = VEXODBExecute(db, sql, &result);
        EXPECT_EQ(outcome == 0, result != nullptr);
        EXPECT_EQ(outcome == 0, std::string_view(VEXODBErrorGet(db)).empty()) << sql;
        if (why != nullptr) *why = VEXODBErrorGet(db);
        VEXODBClose(db);
        VEXODBFreeResult(result);
        return outcome == 0 ? 0 : VLIBCErrGet();
    }
    std::string file_ = systemRoot() + kFile;
};

TEST_F(DatabaseTest, RowsOutliveTheConnection) {
    write("CREATE TABLE l(linkID TEXT, n INTEGER, b BLOB); INSERT INTO l VALUES('it''s', 42, NULL), ('', -1, x'4100')");
    PVEXODB db = VEXODBConnect(kFile);
    ASSERT_NE(db, nullptr);
    PVEXODBRESULT result = nullptr;
    errno = EDOM;
    ASSERT_EQ(VEXODBExecute(db, "SELECT * FROM l ORDER BY n DESC LIMIT 5; ", &result), 0) << VEXODBErrorGet(db);
    EXPECT_EQ(errno, EDOM);
    VEXODBClose(db);
    int row = 7;
    EXPECT_EQ(VEXODBFetchField(result, 2, "n"), nullptr);
    EXPECT_EQ(VEXODBFetchRow(result, &row), 0);
    EXPECT_EQ(row, 0);
    EXPECT_STREQ(VEXODBFetchField(result, row, "LINKid"), "it's");
    EXPECT_STREQ(VEXODBFetchField(result, row, "n"), "42");
    EXPECT_EQ(VEXODBFetchField(result, row, "b"), nullptr);
    EXPECT_EQ(VEXODBFetchField(result, row, "none"), nullptr);
    EXPECT_EQ(VEXODBFetchRow(result, &row), 0);
    EXPECT_STREQ(VEXODBFetchField(result, row, "linkID"), "");
    EXPECT_STREQ(VEXODBFetchField(result, row, "b"), "A");
    EXPECT_EQ(VEXODBFetchRow(result, &row), -1);
    EXPECT_EQ(row, -1);
    EXPECT_EQ(VEXODBFetchField(result, row, "n"), nullptr);
    VEXODBFreeResult(result);
    VEXODBFreeResult(nullptr);
    VEXODBClose(nullptr);
}

TEST_F(DatabaseTest, OnlyReading) {
    write("CREATE TABLE l(a); INSERT INTO l VALUES(1); CREATE VIEW v AS SELECT load_extension('x') AS a");
    const std::string before = support::readFile(file_);
    const std::string copy = systemRoot() + "/usr/copy.db";
    const std::string endless =
        "WITH RECURSIVE c(x) AS (SELECT 1 UNION ALL SELECT x + 1 FROM c) SELECT count(*) FROM c";
    const std::string huge =
        "WITH RECURSIVE c(x) AS (SELECT 1 UNION ALL SELECT x + 1 FROM c) SELECT hex(zeroblob(1000000)) FROM c";
    const std::string quoted = "SELECT a FROM l WHERE a = '" + std::string(4 << 20, '\'') + "'";
    struct Case {
        std::string sql;
        int code;
    };
    const auto begin = std::chrono::steady_clock::now();
    const Case cases[] = {{"INSERT INTO l VALUES(2)", VEXO_ERR_GENERAL},
                          {"DROP TABLE l", VEXO_ERR_GENERAL},
                          {"ATTACH '" + copy + "' AS c", VEXO_ERR_GENERAL},
                          {"VACUUM INTO '" + copy + "'", VEXO_ERR_GENERAL},
                          {"SELECT a FROM l; SELECT a FROM l", VEXO_ERR_PARAMETER},
                          {"", VEXO_ERR_PARAMETER},
                          {"SELECT nothing FROM l", VEXO_ERR_GENERAL},
                          {"SELECT a FROM v", VEXO_ERR_GENERAL},
                          {endless, VEXO_ERR_GENERAL},
                          {huge, VEXO_ERR_GENERAL},
                          {quoted, 0}};
    for (const auto& [sql, code] : cases) EXPECT_EQ(failureOf(sql.c_str()), code) << sql.substr(0, 80);
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(20));
    EXPECT_TRUE(support::readFile(file_) == before);
    EXPECT_FALSE(std::filesystem::exists(copy));
}

TEST_F(DatabaseTest, MissingBrokenAndPlantedFiles) {
    EXPECT_EQ(failureOf("SELECT 1 FROM l"), VEXO_ERR_FILE);
    EXPECT_FALSE(std::filesystem::exists(file_)) << "never made";
    const std::string other = systemRoot() + "/usr/other.db";
    write("CREATE TABLE l(a); INSERT INTO l VALUES(1)");
    std::filesystem::rename(file_, other);
    const auto expect = [&](int code, const char* what) {
        EXPECT_EQ(failureOf("SELECT a FROM l"), code) << what;
        std::filesystem::remove(file_);
    };
    writeFile(file_, std::string(8192, 'x'));
    expect(VEXO_ERR_GENERAL, "no database");
    writeFile(file_, "");
    expect(VEXO_ERR_GENERAL, "empty");
    writeFile(file_, support::readFile(other).substr(0, 4096));
    expect(VEXO_ERR_GENERAL, "cut");
    std::filesystem::create_symlink(other, file_);
    expect(VEXO_ERR_DENIED, "a link");
    std::filesystem::create_hard_link(other, file_);
    expect(VEXO_ERR_DENIED, "a second name");
    ASSERT_EQ(mkfifo(file_.c_str(), 0644), 0);
    expect(VEXO_ERR_DENIED, "a pipe");
    if (geteuid() != 0) return;
    std::filesystem::copy_file(other, file_);
    ASSERT_EQ(chown(file_.c_str(), support::kBobUid, support::kUsersGid), 0);
    expect(VEXO_ERR_DENIED, "a foreign file");
}

// Runs `body` with an open database in a child that then waits to be killed; returns once it waits.
pid_t holdDatabase(const std::string& file, const std::function<void(sqlite3*)>& body) {
    int ready[2];
    if (pipe(ready) != 0) return -1;
    const pid_t child = fork();
    if (child == 0) {
        sqlite3* db = nullptr;
        sqlite3_open(file.c_str(), &db);
        body(db);
        if (::write(ready[1], "", 1) != 1) _exit(1);
        pause();
        _exit(0);
    }
    char byte = 0;
    EXPECT_EQ(read(ready[0], &byte, 1), 1);
    close(ready[0]);
    close(ready[1]);
    return child;
}

TEST_F(DatabaseTest, AWriterThatHoldsItAndOneThatDied) {
    write(
        "CREATE TABLE l(a); WITH RECURSIVE c(x) AS (SELECT 1 UNION ALL SELECT x + 1 FROM c LIMIT 5000) "
        "INSERT INTO l SELECT hex(randomblob(100)) FROM c");
    const pid_t holder =
        holdDatabase(file_, [](sqlite3* db) { sqlite3_exec(db, "BEGIN EXCLUSIVE", nullptr, nullptr, nullptr); });
    const auto begin = std::chrono::steady_clock::now();
    std::string why;
    EXPECT_EQ(failureOf("SELECT count(*) FROM l", &why), VEXO_ERR_GENERAL);
    EXPECT_EQ(why, "database is locked");
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(10));
    kill(holder, SIGKILL);
    waitpid(holder, nullptr, 0);
    EXPECT_EQ(failureOf("SELECT count(*) FROM l"), 0);

    // A tiny cache makes the change spill into the file; the killed writer's journal stays behind.
    const pid_t writer = holdDatabase(file_, [](sqlite3* db) {
        sqlite3_exec(db, "PRAGMA cache_size=5; BEGIN; UPDATE l SET a = 'half'", nullptr, nullptr, nullptr);
    });
    kill(writer, SIGKILL);
    waitpid(writer, nullptr, 0);
    ASSERT_TRUE(std::filesystem::exists(file_ + "-journal"));
    PVEXODB db = VEXODBConnect(kFile);
    PVEXODBRESULT result = nullptr;
    EXPECT_EQ(VEXODBExecute(db, "SELECT count(*) AS n FROM l WHERE a = 'half'", &result), 0) << VEXODBErrorGet(db);
    EXPECT_STREQ(VEXODBFetchField(result, 0, "n"), "0") << "what was not committed is not read";
    VEXODBClose(db);
    VEXODBFreeResult(result);
}

}  // namespace
