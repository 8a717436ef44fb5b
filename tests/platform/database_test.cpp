// Reading a database that a program writes and that anybody may have broken.
#include "vexo/database.h"

#include "platform/trust.h"
#include "support/sqlite.h"

namespace {

constexpr const char* kFile = "/usr/links.db";

class DatabaseTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        makeFolder(systemRoot() + "/usr");
        sql(file_,
            "CREATE TABLE l(linkID TEXT, n INTEGER, b BLOB);"
            "INSERT INTO l VALUES('it''s', 42, NULL), ('', -1, x'4100')");
    }
    // The code of a failed question, 0 for one whose first field is "expected".
    static int ask(const std::string& question, const char* expected = nullptr) {
        PVEXODB db = VEXODBConnect(kFile);
        PVEXODBRESULT result = nullptr;
        const bool done = db != nullptr && VEXODBExecute(db, question.c_str(), &result) == 0;
        EXPECT_EQ(result != nullptr, done);
        EXPECT_TRUE(db == nullptr || (*VEXODBErrorGet(db) == '\0') == done) << question.substr(0, 80);
        VEXODBClose(db);
        if (!done) return VLIBCErrGet();
        int row = 0;
        EXPECT_EQ(VEXODBFetchRow(result, &row), expected == nullptr ? -1 : 0);
        EXPECT_STREQ(VEXODBFetchField(result, row, "answer"), expected);
        VEXODBFreeResult(result);
        return 0;
    }
    // A child that executes this and is killed after `during`.
    void whileWriting(const char* statements, const std::function<void()>& during) {
        const std::string flag = systemRoot() + "/usr/ready";
        const pid_t child = fork();
        if (child == 0) {
            sql(file_, statements, true);
            writeFile(flag, "");
            pause();
        }
        EXPECT_TRUE(waitUntil("the writer", [&] { return fs::exists(flag); }));
        fs::remove(flag);
        during();
        kill(child, SIGKILL);
        waitpid(child, nullptr, 0);
    }
    std::string file_ = systemRoot() + kFile;
};

TEST_F(DatabaseTest, RowsOutliveTheConnection) {
    PVEXODB db = VEXODBConnect(kFile);
    PVEXODBRESULT result = nullptr;
    errno = EDOM;
    ASSERT_EQ(VEXODBExecute(db, "SELECT * FROM l ORDER BY n DESC LIMIT 5; ", &result), 0) << VEXODBErrorGet(db);
    EXPECT_EQ(errno, EDOM);
    VEXODBClose(db);
    EXPECT_EQ(VEXODBFetchField(result, 2, "n"), nullptr);
    int row = 7;
    for (const auto& [id, number, blob] :
         Rows<const char*, const char*, const char*>{{"it's", "42", nullptr}, {"", "-1", "A"}}) {
        EXPECT_EQ(VEXODBFetchRow(result, &row), 0);
        EXPECT_STREQ(VEXODBFetchField(result, row, "LINKid"), id);
        EXPECT_STREQ(VEXODBFetchField(result, row, "n"), number);
        EXPECT_STREQ(VEXODBFetchField(result, row, "b"), blob);
        EXPECT_EQ(VEXODBFetchField(result, row, "none"), nullptr);
    }
    EXPECT_EQ(VEXODBFetchRow(result, &row), -1);
    EXPECT_EQ(row, -1);
    EXPECT_EQ(VEXODBFetchField(result, row, "n"), nullptr);
    VEXODBFreeResult(result);
}

TEST_F(DatabaseTest, OnlyReadingAndNotForEver) {
    sql(file_, "CREATE VIEW v AS SELECT load_extension('x') AS a");
    const std::string before = readFile(file_);
    const std::string copy = systemRoot() + "/usr/copy.db";
    const std::string count = "WITH RECURSIVE c(x) AS (SELECT 1 UNION ALL SELECT x + 1 FROM c) SELECT ";
    for (const auto& [question, code] : Rows<std::string, int>{
             row("INSERT INTO l VALUES('a', 2, 3)", VEXO_ERR_GENERAL), row("DROP TABLE l", VEXO_ERR_GENERAL),
             row("ATTACH '" + copy + "' AS c", VEXO_ERR_GENERAL), row("VACUUM INTO '" + copy + "'", VEXO_ERR_GENERAL),
             row("SELECT nothing FROM l", VEXO_ERR_GENERAL), row("SELECT a FROM v", VEXO_ERR_GENERAL),
             row(count + "hex(zeroblob(1000000)) FROM c", VEXO_ERR_GENERAL),
             row("SELECT n FROM l; SELECT n FROM l", VEXO_ERR_PARAMETER), row("", VEXO_ERR_PARAMETER),
             row("SELECT n FROM l WHERE linkID = '" + std::string(4 << 20, '\'') + "'", 0)})
        EXPECT_EQ(ask(question), code) << question.substr(0, 80);
    EXPECT_EQ(ask(count + "count(*) FROM c"), VEXO_ERR_GENERAL) << "after its time";
    EXPECT_TRUE(readFile(file_) == before);
    EXPECT_FALSE(fs::exists(copy));
}

TEST_F(DatabaseTest, MissingBrokenAndPlantedFiles) {
    for (const std::string& broken : {std::string(8192, 'x'), std::string(), readFile(file_).substr(0, 4096)}) {
        writeFile(file_, broken);
        EXPECT_EQ(ask("SELECT n FROM l"), VEXO_ERR_GENERAL) << broken.size();
    }
    plantEach(file_, [] { EXPECT_EQ(ask("SELECT n FROM l"), VEXO_ERR_DENIED); });
    EXPECT_EQ(ask("SELECT n FROM l"), VEXO_ERR_FILE);
    EXPECT_FALSE(fs::exists(file_)) << "never made";
}

TEST_F(DatabaseTest, AWriterThatHoldsItAndOneThatDied) {
    sql(file_,
        "WITH RECURSIVE c(x) AS (SELECT 1 UNION ALL SELECT x + 1 FROM c LIMIT 5000)"
        "INSERT INTO l SELECT hex(randomblob(100)), x, NULL FROM c");
    whileWriting("BEGIN EXCLUSIVE", [&] { EXPECT_EQ(ask("SELECT n FROM l"), VEXO_ERR_GENERAL) << "after its time"; });
    // A tiny cache makes the change spill into the file; the killed writer's journal stays behind.
    whileWriting("PRAGMA cache_size=5; BEGIN; UPDATE l SET linkID = 'half'", [] {});
    ASSERT_TRUE(fs::exists(file_ + "-journal"));
    EXPECT_EQ(ask("SELECT count(*) AS answer FROM l WHERE linkID = 'half'", "0"), 0)
        << "what was not committed is not read";
}

}  // namespace
