// The auto-block service: its rules, its store, its neighbours.
#include "vexo/auto_block.h"

#include "platform/trust.h"
#include "support/sqlite.h"
#include "web/auto_block_rules.h"

namespace {

constexpr const char* kTag = "FOLDER_SHARING";
constexpr const char* kAddress = "192.0.2.7";

TEST(AutoBlockRules, SettingsAndAddresses) {
    for (const auto& [enable, number, expected] :
         rowsOf<const char*, const char*, std::vector<long long>>("platform/block_rules")) {
        const auto rules = vexo::parseAutoBlockRules(enable, number, number, number);
        EXPECT_EQ((std::vector<long long>{rules.enabled, rules.attempts, rules.window, rules.duration}), expected);
    }
    EXPECT_EQ(vexo::normaliseAddress(kAddress), kAddress);
    EXPECT_EQ(vexo::normaliseAddress("::ffff:192.0.2.7"), kAddress);
    EXPECT_EQ(vexo::normaliseAddress("2001:DB8:0:0::0001"), "2001:db8::1");
    for (const char* none : {"", "localhost", "1.2.3.4:80", "[::1]", "1.2.3.4 ", "' OR 1=1 --"})
        EXPECT_FALSE(vexo::normaliseAddress(none)) << none;
}

class AutoBlockTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        setSetting("autoblock_attempts", "3");
    }
    static void failTimes(const char* address, int times, const char* tag = kTag) {
        for (int i = 0; i < times; ++i) EXPECT_EQ(AutoBlockFailLoginSet(address, tag), 0) << VLIBCErrGet();
    }
    std::string store(const std::string& statements) { return sql(file_, statements); }
    std::string file_ = systemRoot() + "/var/lib/vexo/autoblock.db";
};

TEST_F(AutoBlockTest, FailuresWithinTheWindowDeny) {
    EXPECT_EQ(VexoCgiIsDeniedIP(kAddress), 0);
    EXPECT_EQ(VEXOAutoBlockResetByIP(kAddress), 0);
    EXPECT_FALSE(fs::exists(file_)) << "a question makes no store";
    failTimes(kAddress, 2);
    failTimes(kAddress, 2, "OTHER");
    EXPECT_EQ(VexoCgiIsDeniedIP(kAddress), 0) << "two of each service";
    EXPECT_EQ(VEXOAutoBlockResetByIP(kAddress), 0);
    failTimes(kAddress, 2);
    store("UPDATE failures SET since = since - 300");
    failTimes(kAddress, 2);
    EXPECT_EQ(VexoCgiIsDeniedIP(kAddress), 0) << "the first two are too long ago";
    failTimes("::ffff:192.0.2.7", 1);
    EXPECT_EQ(VexoCgiIsDeniedIP(kAddress), 1);
    EXPECT_EQ(VexoCgiIsDeniedIP("192.0.2.8"), 0);
    store("UPDATE failures SET denied = denied - 86395");
    EXPECT_EQ(VexoCgiIsDeniedIP(kAddress), 1);
    store("UPDATE failures SET denied = denied - 5");
    EXPECT_EQ(VexoCgiIsDeniedIP(kAddress), 0) << "a day is over";
    setSetting("autoblock_expire_minutes", "0");
    EXPECT_EQ(VexoCgiIsDeniedIP(kAddress), 1) << "for good";
    setSetting("autoblock_enable", "no");
    EXPECT_EQ(VexoCgiIsDeniedIP(kAddress), 0);
    failTimes("192.0.2.9", 1);
    EXPECT_EQ(store("SELECT count(*) FROM failures WHERE address = '192.0.2.9'"), "0");
    setSetting("autoblock_enable", "yes");
    EXPECT_EQ(VEXOAutoBlockResetByIP("::ffff:192.0.2.7"), 0);
    EXPECT_EQ(VexoCgiIsDeniedIP(kAddress), 0);
    EXPECT_FAILS(AutoBlockFailLoginSet(kAddress, "a\nb"), EINVAL, VEXO_ERR_PARAMETER);
    EXPECT_FAILS(VexoCgiIsDeniedIP("unknown, 192.0.2.7"), EINVAL, VEXO_ERR_PARAMETER);
}

TEST_F(AutoBlockTest, TheStoreIsBoundedAndTrustedOrAnError) {
    failTimes(kAddress, 3);
    store(
        "WITH RECURSIVE c(x) AS (SELECT 1 UNION ALL SELECT x + 1 FROM c LIMIT 12000) INSERT INTO failures"
        " SELECT 'a' || x, 't', 1, strftime('%s') - 100, 0 FROM c");
    failTimes("192.0.2.8", 1);
    EXPECT_EQ(store("SELECT count(*) FROM failures"), "10000");
    EXPECT_EQ(VexoCgiIsDeniedIP(kAddress), 1) << "counts go before denials";
    EXPECT_EQ(store("SELECT count FROM failures WHERE address = '192.0.2.8'"), "1");
    plantEach(file_, [] {
        EXPECT_REFUSED(VexoCgiIsDeniedIP(kAddress));
        EXPECT_REFUSED(AutoBlockFailLoginSet(kAddress, kTag));
    });
    writeFile(file_, std::string(8192, 'x'), 0600);
    EXPECT_FAILS(VexoCgiIsDeniedIP(kAddress), EIO, VEXO_ERR_GENERAL);
}

TEST_F(AutoBlockTest, ManyAtOnceAndWhoActsForAUser) {
    SKIP_WITHOUT_ROOT();
    setSetting("autoblock_attempts", "48");
    const auto failSixTimes = [] {
        if (setegid(kUsersGid) != 0 || seteuid(kAliceUid) != 0) return false;
        failTimes("2001:db8::1", 6);
        return !HasFailure() && geteuid() == kAliceUid;
    };
    EXPECT_EQ(countAtOnce(8, failSixTimes), 8);
    EXPECT_EQ(VexoCgiIsDeniedIP("2001:DB8::1"), 1) << "none of 48 was lost";
    EXPECT_TRUE(statusOf(file_).st_uid == 0 && (statusOf(file_).st_mode & 0777) == 0600);
}

}  // namespace
