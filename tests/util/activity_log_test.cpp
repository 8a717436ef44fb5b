#include "orvel/activity_log.h"

#include <json/json.h>
#include <syslog.h>

#include "support/testing.h"

namespace {

class ActivityLog : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        setenv("REMOTE_ADDR", "192.0.2.7", 1);
    }
    // The entry that was written since the last question; null without any.
    static Json::Value entry() {
        const std::string file = systemRoot() + "/var/log/vexo/xfer.log";
        Json::Value entry;
        if (std::istringstream log(readFile(file)); !log.str().empty()) log >> entry;
        fs::remove(file);
        return entry;
    }
};

TEST_F(ActivityLog, Entries) {
    const char* texts[] = {nullptr, "download",     "upload", "delete",        "rename", "copy",
                           "move",  "property set", "mkdir",  "download test", nullptr};
    for (int action = 0; action <= 10; ++action) {
        const bool flag = action % 2 == 0;
        EXPECT_EQ(
            OrvLibDoPexlanderLog("DOM\\al", "/photo/%s%n\n", 5000000000LL, static_cast<ORVEL_ACTIONS>(action), flag),
            texts[action] != nullptr);
        const Json::Value line = entry();
        ASSERT_EQ(line.isNull(), texts[action] == nullptr);
        if (line.isNull()) continue;
        EXPECT_TRUE(line["action"] == texts[action] && line["flag"] == flag) << line;
        EXPECT_TRUE(line["user"] == "DOM\\al" && line["address"] == "192.0.2.7") << line;
        EXPECT_TRUE(line["path"] == "/photo/%s%n\n" && line["size"].asInt64() == 5000000000LL) << line;
    }
}

TEST_F(ActivityLog, Switch) {
    EXPECT_FALSE(OrvLibDoLog("", "", 0, ORVEL_ACTION_DELETE, false)) << "off: the arguments are not even looked at";
    for (const auto& [value, on] : Rows<const char*, bool>{row("no", false), row("yes ", false), row("", false),
                                                           row("yes", true), row("YES", true)}) {
        setSetting("pexlanderxferlog", value);
        EXPECT_EQ(OrvLibDoLog("alice", "/photo/a", 0, ORVEL_ACTION_DELETE, false), on) << value;
        EXPECT_EQ(entry().isNull(), !on);
    }
}

TEST_F(ActivityLog, FailuresAreLogged) {
    vexo::gate::fail("VEXOLogKTRFMXferLog", 0x8100);
    EXPECT_FALSE(OrvLibDoPexlanderLog("alice", "/photo/a\nb", 0, ORVEL_ACTION_MKDIR, true));
    const auto lines = takeLog();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].priority, LOG_ERR);
    EXPECT_TRUE(lines[0].text.starts_with("orvelmisc:")) << lines[0].text;
    EXPECT_TRUE(lines[0].text.ends_with(" Failed to add the Pexlander log for /photo/a\\x0Ab")) << lines[0].text;
    for (const auto& [user, path, client] : Rows<const char*, const char*, const char*>{
             {"", "/photo/a", "192.0.2.7"}, {"alice", "", "192.0.2.7"}, {"alice", "/photo/a", ""}}) {
        setenv("REMOTE_ADDR", client, 1);
        announceLog(" Bad parameters.");
        EXPECT_FALSE(OrvLibDoPexlanderLog(user, path, 0, ORVEL_ACTION_DELETE, false));
        EXPECT_TRUE(entry().isNull());
    }
}

}  // namespace
