// The auto-block service: its rules, its store, its neighbours.
#include "vexo/auto_block.h"

#include <sqlite3.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <filesystem>
#include <string>
#include <vector>

#include "auto_block_rules.h"
#include "support/appliance.h"
#include "vexo/error.h"

namespace {

constexpr const char* kTag = "FOLDER_SHARING";

TEST(AutoBlockRules, SettingsAndAddresses) {
    struct Case {
        const char *enable, *attempts, *minutes, *expire;
        bool enabled;
        int expectedAttempts;
        long long window, duration;
    };
    for (const auto& [enable, attempts, minutes, expire, enabled, expectedAttempts, window, duration] :
         {Case{"", "", "", "", true, 10, 300, 86400}, Case{"no", "3", "1", "0", false, 3, 60, 0},
          Case{"yes", "0", "-1", "-1", true, 10, 300, 86400},
          Case{"x", "3x", " 1", "99999999", true, 10, 300, 86400}}) {
        const auto rules = vexo::parseAutoBlockRules(enable, attempts, minutes, expire);
        EXPECT_EQ(rules.enabled, enabled) << enable;
        EXPECT_EQ(rules.attempts, expectedAttempts) << attempts;
        EXPECT_EQ(rules.window, window) << minutes;
        EXPECT_EQ(rules.duration, duration) << expire;
    }
    EXPECT_EQ(vexo::normaliseAddress("192.0.2.7"), "192.0.2.7");
    EXPECT_EQ(vexo::normaliseAddress("::ffff:192.0.2.7"), "192.0.2.7");
    EXPECT_EQ(vexo::normaliseAddress("2001:DB8:0:0::0001"), "2001:db8::1");
    for (const char* none : {"", "localhost", "1.2.3", "1.2.3.4:80", "[::1]", "1.2.3.4 ", "' OR 1=1 --"}) {
        EXPECT_FALSE(vexo::normaliseAddress(none)) << none;
    }
}

class AutoBlockTest : public support::ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        setSetting("autoblock_attempts", "3");
    }
    static void failTimes(const char* address, int times, const char* tag = kTag) {
        for (int i = 0; i < times; ++i) EXPECT_EQ(AutoBlockFailLoginSet(address, tag), 0) << VLIBCErrGet();
    }
    // Runs SQL on the store; the first value of its rows, -1 without any.
    long long store(const std::string& sql) {
        sqlite3* db = nullptr;
        sqlite3_stmt* statement = nullptr;
        EXPECT_EQ(sqlite3_open(file_.c_str(), &db), SQLITE_OK);
        EXPECT_EQ(sqlite3_prepare_v2(db, sql.c_str(), -1, &statement, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
        const long long value = sqlite3_step(statement) == SQLITE_ROW ? sqlite3_column_int64(statement, 0) : -1;
        sqlite3_finalize(statement);
        sqlite3_close(db);
        return value;
    }
    void shift(const char* column, long long seconds) {
        store(std::string("UPDATE failures SET ") + column + " = " + column + " + " + std::to_string(seconds));
    }
    std::string file_ = systemRoot() + "/var/lib/vexo/autoblock.db";
};

TEST_F(AutoBlockTest, FailuresWithinTheWindowDeny) {
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), 0);
    EXPECT_EQ(VEXOAutoBlockResetByIP("192.0.2.7"), 0);
    EXPECT_FALSE(std::filesystem::exists(file_)) << "a question makes no store";
    failTimes("192.0.2.7", 2);
    failTimes("192.0.2.7", 2, "OTHER");
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), 0) << "two of each service";
    EXPECT_EQ(VEXOAutoBlockResetByIP("192.0.2.7"), 0);
    failTimes("192.0.2.7", 2);
    shift("since", -300);
    failTimes("192.0.2.7", 2);
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), 0) << "the first two are too long ago";
    failTimes("::ffff:192.0.2.7", 1);
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), 1);
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.8"), 0);
    shift("denied", -86400 + 5);
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), 1);
    shift("denied", -5);
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), 0) << "a day is over";
    setSetting("autoblock_expire_minutes", "0");
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), 1) << "for good";
    setSetting("autoblock_enable", "no");
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), 0);
    EXPECT_EQ(AutoBlockFailLoginSet("192.0.2.9", kTag), 0);
    EXPECT_EQ(store("SELECT count(*) FROM failures WHERE address = '192.0.2.9'"), 0);
    setSetting("autoblock_enable", "yes");
    EXPECT_EQ(VEXOAutoBlockResetByIP("::ffff:192.0.2.7"), 0);
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), 0);
    for (const char* tag : {"", "a\nb", static_cast<const char*>(nullptr)}) {
        EXPECT_EQ(AutoBlockFailLoginSet("192.0.2.7", tag), -1);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    }
    EXPECT_EQ(VexoCgiIsDeniedIP("unknown, 192.0.2.7"), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
}

TEST_F(AutoBlockTest, TheStoreIsBounded) {
    failTimes("192.0.2.7", 3);
    store(
        "WITH RECURSIVE c(x) AS (SELECT 1 UNION ALL SELECT x + 1 FROM c LIMIT 12000) INSERT INTO failures"
        " SELECT 'a' || x, 't', 1, strftime('%s') - 100, 0 FROM c");
    failTimes("192.0.2.8", 1);
    EXPECT_EQ(store("SELECT count(*) FROM failures"), 10000);
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), 1) << "counts go before denials";
    EXPECT_EQ(store("SELECT count FROM failures WHERE address = '192.0.2.8'"), 1);
}

TEST_F(AutoBlockTest, ManyAtOnceAndWhoActsForAUser) {
    SKIP_WITHOUT_ROOT();
    setSetting("autoblock_attempts", "160");
    std::vector<pid_t> children;
    for (int i = 0; i < 8; ++i) {
        children.push_back(fork());
        if (children.back() != 0) continue;
        int failures = setegid(support::kUsersGid) | seteuid(support::kAliceUid);
        for (int k = 0; k < 20; ++k) failures += AutoBlockFailLoginSet("2001:db8::1", kTag) != 0;
        _exit(failures + (geteuid() != support::kAliceUid));
    }
    for (const pid_t child : children) {
        int status = 0;
        waitpid(child, &status, 0);
        EXPECT_EQ(status, 0);
    }
    EXPECT_EQ(VexoCgiIsDeniedIP("2001:DB8::1"), 1) << "none of 160 was lost";
    struct stat status {};
    ASSERT_EQ(stat(file_.c_str(), &status), 0);
    EXPECT_EQ(status.st_uid, 0U);
    EXPECT_EQ(status.st_mode & 0777, 0600U);
}

TEST_F(AutoBlockTest, AStoreThatIsNoneIsAnError) {
    std::filesystem::create_directories(systemRoot() + "/var/lib/vexo");
    const auto expect = [&](int code, const char* what) {
        EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.7"), -1) << what;
        EXPECT_EQ(VLIBCErrGet(), code) << what;
        EXPECT_EQ(AutoBlockFailLoginSet("192.0.2.7", kTag), -1) << what;
        EXPECT_EQ(VLIBCErrGet(), code) << what;
        std::filesystem::remove(file_);
    };
    support::writeFile(file_, std::string(8192, 'x'), 0600);
    expect(VEXO_ERR_GENERAL, "no database");
    ASSERT_EQ(mkfifo(file_.c_str(), 0600), 0);
    expect(VEXO_ERR_DENIED, "a pipe");
    std::filesystem::create_symlink("elsewhere", file_);
    expect(VEXO_ERR_DENIED, "a link");
}

}  // namespace
