// Settings files: the format, and the operations that read it.
#include "vexo/settings.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <ctime>
#include <string>

#include "fault_gate.h"
#include "settings_text.h"
#include "support/appliance.h"
#include "vexo/error.h"

namespace {

TEST(SettingsFormat, Lines) {
    struct Case {
        std::string_view line, key, value;
    };
    using namespace std::string_view_literals;
    const Case cases[] = {
        {"a=\"b\"", "a", "b"},
        {"a=b", "a", "b"},
        {" a\t= \"b c\" \r", "a", "b c"},
        {"a= b c ", "a", "b c"},
        {"a=", "a", ""},
        {"a=\"\"", "a", ""},
        {"a=\" b \"", "a", " b "},
        {"a=\"b\" # why", "a", "b"},
        {"a=\"say \"hi\"\"", "a", "say \"hi\""},
        {"a=\"torn", "a", "\"torn"},
        {"a=\"", "a", "\""},
        {"a=b=c", "a", "b=c"},
        {"a b=c", "a b", "c"},
        {"", "", ""},
        {"just text", "", ""},
        {"=b", "", ""},
        {"# a=b", "", ""},
        {"a=b\0c"sv, "", ""},
    };
    for (const auto& [line, key, value] : cases) {
        const auto setting = vexo::parseSettingLine(line, "=");
        ASSERT_EQ(setting.has_value(), !key.empty()) << line;
        if (!setting) continue;
        EXPECT_EQ(setting->key, key) << line;
        EXPECT_EQ(setting->value, value) << line;
    }
    EXPECT_EQ(vexo::parseSettingLine("a := b", ":=")->value, "b");
    EXPECT_FALSE(vexo::parseSettingLine("a=b", ""));
    const auto settings = vexo::parseSettings("\n\na=1\r\nrubbish\nb=2\na=3", "=");
    ASSERT_EQ(settings.size(), 3U);
    EXPECT_EQ(vexo::findSetting(settings, "a"), "1");
    EXPECT_FALSE(vexo::findSetting(settings, "c"));
}

class Settings : public support::ApplianceTest {};

TEST_F(Settings, GetKeyValue) {
    writeRootFile("/etc/x.conf", "a=\"hello\"\na=\"second\"\nempty=\"\"\n");
    char value[8];
    struct Case {
        const char* key;
        int size, expected;
        const char* text;
    };
    const Case cases[] = {{"a", 8, 1, "hello"}, {"a", 6, 1, "hello"}, {"a", 4, 1, "hel"},
                          {"a", 1, 1, ""},      {"empty", 8, 1, ""},  {"A", 8, 0, ""}};
    for (const auto& [key, size, expected, text] : cases) {
        value[0] = '?';
        EXPECT_EQ(VLIBCFileGetKeyValue("/etc/x.conf", key, value, size, 0), expected) << key << size;
        EXPECT_STREQ(value, text) << key << size;
    }
    VLIBCErrSetEx(0, "", 0);
    EXPECT_EQ(VLIBCFileGetKeyValue("/etc/x.conf", "b", value, 8, 0), 0);
    EXPECT_EQ(VLIBCErrGet(), 0) << "a missing key is no failure";
    EXPECT_EQ(VLIBCFileGetKeyValue("/etc/none.conf", "a", value, 8, 0), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_EQ(VLIBCFileGetKeyValue("/etc/x.conf/below", "a", value, 8, 0), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    EXPECT_EQ(VLIBCFileGetKeyValue("/etc", "a", value, 8, 0), -1) << "a folder";
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    EXPECT_EQ(VLIBCFileGetKeyValue("/etc/x.conf", "a", value, 0, 0), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    EXPECT_EQ(VLIBCFileGetKeyValue(nullptr, "a", value, 8, 0), -1);
    EXPECT_EQ(VLIBCFileGetKeyValue("/etc/x.conf", "a", nullptr, 8, 0), -1);
}

TEST_F(Settings, AFileThatMayNotBeReadIsDenied) {
    SKIP_WITHOUT_ROOT();
    support::writeFile(systemRoot() + "/etc/secret.conf", "a=1\n", 0600);
    support::asUser(support::kAliceUid, support::kUsersGid, [] {
        char value[8];
        EXPECT_EQ(VLIBCFileGetKeyValue("/etc/secret.conf", "a", value, 8, 0), -1);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED);
        return 0;
    });
}

TEST_F(Settings, AFileBeyondTheLimitIsNoSettingsFile) {
    writeRootFile("/etc/huge.conf", "a=1\n");
    ASSERT_EQ(truncate((systemRoot() + "/etc/huge.conf").c_str(), (16 << 20) + 1), 0);
    char value[8];
    EXPECT_EQ(VLIBCFileGetKeyValue("/etc/huge.conf", "a", value, 8, 0), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
}

TEST_F(Settings, AFileIsReadAgainOnlyWhenItChanged) {
    const std::string file = systemRoot() + "/etc/x.conf";
    const timespec hourAgo[] = {{time(nullptr) - 3600, 0}, {time(nullptr) - 3600, 0}};
    const auto answer = [] {
        char value[8] = "none";
        VLIBCFileGetKeyValue("/etc/x.conf", "a", value, 8, 0);
        return std::string(value);
    };
    support::writeFile(file, "a=1\n");
    ASSERT_EQ(utimensat(AT_FDCWD, file.c_str(), hourAgo, 0), 0);
    EXPECT_EQ(answer(), "1");
    // The same inode, size and time: what was parsed is still believed, so it was not read again.
    support::writeFile(file, "a=2\n");
    ASSERT_EQ(utimensat(AT_FDCWD, file.c_str(), hourAgo, 0), 0);
    EXPECT_EQ(answer(), "1");
    // Written twice within one tick of the clock: both are seen.
    support::writeFile(file, "a=3\n");
    EXPECT_EQ(answer(), "3");
    support::writeFile(file, "a=4\n");
    EXPECT_EQ(answer(), "4");
    writeRootFile("/etc/x.conf", "a=5\n");
    EXPECT_EQ(answer(), "5");
    ASSERT_EQ(unlink(file.c_str()), 0);
    EXPECT_EQ(answer(), "") << "nothing is answered for a file that is gone";
}

TEST_F(Settings, CheckKeyValue) {
    writeRootFile("/etc/x.conf", "a=\"Yes\"\nname=\"\xC3\x89T\xC3\x89\"\n");
    EXPECT_EQ(VLIBCFileCheckKeyValue("/etc/x.conf", "a", "Yes", 0), 1);
    EXPECT_EQ(VLIBCFileCheckKeyValue("/etc/x.conf", "a", "yes", 0), 0);
    EXPECT_EQ(VLIBCFileCheckKeyValue("/etc/x.conf", "a", "yes", 1), 1);
    EXPECT_EQ(VLIBCFileCheckKeyValue("/etc/x.conf", "name", "\xC3\xA9t\xC3\xA9", 1), 1);
    EXPECT_EQ(VLIBCFileCheckKeyValue("/etc/x.conf", "b", "", 0), 0) << "absent is not empty";
    EXPECT_EQ(VLIBCFileCheckKeyValue("/etc/none.conf", "a", "Yes", 0), 0);
    EXPECT_EQ(VLIBCFileCheckKeyValue("/etc/x.conf", "a", nullptr, 0), 0);
}

TEST_F(Settings, GetKeysFillsTheCallersHashOrANewOne) {
    writeRootFile("/etc/x.conf", "20001=\"true\"\n20002=\"false\"\n20001=\"false\"\n");
    PVLIBCSZHASH hash = VLIBCSzHashAlloc(2048);
    const PVLIBCSZHASH callers = hash;
    EXPECT_EQ(VLIBCFileGetKeys("/etc/x.conf", &hash, "="), 3);
    EXPECT_EQ(hash, callers);
    EXPECT_STREQ(VLIBCSzHashGetValue(hash, "20001"), "true");
    EXPECT_STREQ(VLIBCSzHashGetValue(hash, "20002"), "false");
    VLIBCSzHashFree(hash);

    hash = nullptr;
    EXPECT_EQ(VLIBCFileGetKeys("/etc/none.conf", &hash, "="), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    vexo::gate::fail("VLIBCSzHashSetValue", VEXO_ERR_GENERAL, 0, 2);
    EXPECT_EQ(VLIBCFileGetKeys("/etc/x.conf", &hash, "="), -1);
    EXPECT_EQ(hash, nullptr);
    EXPECT_EQ(VLIBCFileGetKeys("/etc/x.conf", &hash, ""), -1);
    writeRootFile("/etc/empty.conf", "# nothing\n");
    EXPECT_EQ(VLIBCFileGetKeys("/etc/empty.conf", &hash, "="), 0);
    EXPECT_NE(hash, nullptr);
    VLIBCSzHashFree(hash);
}

TEST_F(Settings, TheApplianceOwnFiles) {
    VLIBCErrSetEx(0, "", 0);
    EXPECT_EQ(VLIBCConfGetKTRTimeout(), -1);
    EXPECT_EQ(VLIBCSupportGet("support_s2s"), 0);
    EXPECT_EQ(VexoConf::Info().Get("pexlanderxferlog", "no"), "no");
    EXPECT_EQ(VLIBCErrGet(), 0);
    setDefaultSetting("support_s2s", "yes");
    setDefaultSetting("support_other", "YES");
    setSetting("pexlanderxferlog", "Yes");
    EXPECT_EQ(VLIBCSupportGet("support_s2s"), 1);
    EXPECT_EQ(VLIBCSupportGet("support_other"), 0);
    EXPECT_EQ(VexoConf::Info().Get("pexlanderxferlog", "no"), "Yes");
    struct Case {
        const char* value;
        int minutes;
    };
    for (const auto& [value, minutes] : {Case{"30", 30}, Case{"0", 0}, Case{"-3", -3}, Case{"30 minutes", -1},
                                         Case{"", -1}, Case{"99999999999", -1}}) {
        writeRootFile("/etc/vexoinfo.conf", "session_timeout=\"" + std::string(value) + "\"\n");
        EXPECT_EQ(VLIBCConfGetKTRTimeout(), minutes) << value;
    }
    ASSERT_EQ(unlink((systemRoot() + "/etc/vexoinfo.conf").c_str()), 0);
    EXPECT_EQ(VexoConf::Info().Get("pexlanderxferlog", "no"), "no");
}

}  // namespace
