#include "orvel/activity_log.h"

#include <json/json.h>
#include <syslog.h>

#include <sstream>

#include "support/testing.h"

namespace {

class ActivityLog : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        setenv("REMOTE_ADDR", "192.0.2.7", 1);
    }
    void TearDown() override {
        unsetenv("REMOTE_ADDR");
        ApplianceTest::TearDown();
    }

    // The entries written so far.
    static std::vector<Json::Value> entries() {
        std::vector<Json::Value> result;
        std::istringstream log(readFile(systemRoot() + "/var/log/vexo/xfer.log"));
        for (std::string line; std::getline(log, line);) {
            Json::Value entry;
            std::istringstream(line) >> entry;
            result.push_back(entry);
        }
        return result;
    }
};

TEST_F(ActivityLog, TextsOfTheActions) {
    const char* texts[] = {nullptr, "download",     "upload", "delete",        "rename", "copy",
                           "move",  "property set", "mkdir",  "download test", nullptr};
    for (int action = -1; action <= 10; ++action) {
        SCOPED_TRACE(action);
        const char* text = action < 0 ? nullptr : texts[action];
        const std::size_t before = entries().size();
        EXPECT_EQ(OrvLibDoPexlanderLog("alice", "/photo/a", 1, static_cast<ORVEL_ACTIONS>(action), false),
                  text != nullptr);
        ASSERT_EQ(entries().size(), before + (text == nullptr ? 0 : 1));
        if (text != nullptr) {
            EXPECT_EQ(entries().back()["action"], text);
        }
    }
    EXPECT_EQ(ORVEL_ACTION_COPY, 5);
    EXPECT_EQ(ORVEL_ACTION_MOVE, 6);
}

TEST_F(ActivityLog, Entry) {
    for (const bool flag : {true, false}) {
        ASSERT_TRUE(OrvLibDoPexlanderLog("DOM\\al", "/photo/%s%n\n", 5000000000LL, ORVEL_ACTION_UPLOAD, flag));
        const Json::Value entry = entries().back();
        EXPECT_EQ(entry["address"], "192.0.2.7");
        EXPECT_EQ(entry["user"], "DOM\\al");
        EXPECT_EQ(entry["path"], "/photo/%s%n\n");
        EXPECT_EQ(entry["size"].asInt64(), 5000000000LL);
        EXPECT_EQ(entry["flag"].asBool(), flag);
    }
}

TEST_F(ActivityLog, Switch) {
    const Rows<const char*, bool> rows = {{nullptr, false}, {"no", false}, {"yes ", false}, {"", false},
                                          {"yes", true},    {"Yes", true}, {"YES", true}};
    for (const auto& [value, on] : rows) {
        writeRootFile("/etc/vexoinfo.conf",
                      value == nullptr ? "" : "pexlanderxferlog=\"" + std::string(value) + "\"\n");
        const std::size_t before = entries().size();
        EXPECT_EQ(OrvLibDoLog("alice", "/photo/a", 0, ORVEL_ACTION_DELETE, false), on) << (value ? value : "unset");
        EXPECT_EQ(entries().size(), before + (on ? 1 : 0));
    }
    // Off: the arguments are not even looked at.
    writeRootFile("/etc/vexoinfo.conf", "");
    EXPECT_FALSE(OrvLibDoLog("", "", 0, ORVEL_ACTION_DELETE, false));
}

TEST_F(ActivityLog, Refusals) {
    const auto refused = [](const char* user, const char* path, const char* client, int action) {
        if (client == nullptr) {
            unsetenv("REMOTE_ADDR");
        } else {
            setenv("REMOTE_ADDR", client, 1);
        }
        announceLog(" Bad parameters.");
        EXPECT_FALSE(OrvLibDoPexlanderLog(user, path, 0, static_cast<ORVEL_ACTIONS>(action), false));
    };
    refused("", "/photo/a", "192.0.2.7", 1);
    refused("alice", "", "192.0.2.7", 1);
    refused("alice", "/photo/a", "", 1);
    refused("alice", "/photo/a", nullptr, 1);
    refused("alice", "", "192.0.2.7", 10);  // asked before the action
    EXPECT_TRUE(entries().empty());
}

TEST_F(ActivityLog, FailureOfTheLog) {
    vexo::gate::fail("VEXOLogKTRFMXferLog", 0x8100);
    EXPECT_FALSE(OrvLibDoPexlanderLog("alice", "/photo/a\nb", 0, ORVEL_ACTION_MKDIR, true));
    const auto lines = takeLog();
    ASSERT_EQ(lines.size(), 1U);
    EXPECT_EQ(lines[0].priority, LOG_ERR);
    EXPECT_TRUE(lines[0].text.starts_with("orvelmisc:")) << lines[0].text;
    EXPECT_TRUE(lines[0].text.ends_with(" Failed to add the Pexlander log for /photo/a\\x0Ab")) << lines[0].text;
}

}  // namespace
