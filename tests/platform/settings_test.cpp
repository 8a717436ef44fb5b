// Settings files: the format, and the operations that read it.
#include "vexo/settings.h"

#include "settings_text.h"
#include "support/testing.h"

namespace {

TEST(SettingsFormat, Lines) {
    using namespace std::string_view_literals;
    const Rows<std::string_view, std::string_view, std::string_view> rows = {
        {"a=b", "a", "b"},           {" a\t= \"b c\" \r", "a", "b c"},
        {"a= b c ", "a", "b c"},     {"a=", "a", ""},
        {"a=\"\"", "a", ""},         {"a=\" b \"", "a", " b "},
        {"a=\"b\" # why", "a", "b"}, {"a=\"say \"hi\"\"", "a", "say \"hi\""},
        {"a=\"torn", "a", "\"torn"}, {"a=\"", "a", "\""},
        {"a b=c=d", "a b", "c=d"},   {"", "", ""},
        {"just text", "", ""},       {"=b", "", ""},
        {"# a=b", "", ""},           {"a=b\0c"sv, "", ""}};
    for (const auto& [line, key, value] : rows) {
        const auto setting = vexo::parseSettingLine(line, "=");
        EXPECT_EQ(setting.has_value(), !key.empty()) << line;
        EXPECT_TRUE(!setting || (setting->key == key && setting->value == value)) << line;
    }
    EXPECT_EQ(vexo::parseSettingLine("a := b", ":=")->value, "b");
    EXPECT_FALSE(vexo::parseSettingLine("a=b", ""));
    const auto settings = vexo::parseSettings("\n\na=1\r\nrubbish\nb=2\na=3", "=");
    EXPECT_EQ(settings.size(), 3U);
    EXPECT_EQ(vexo::findSetting(settings, "a"), "1");
    EXPECT_FALSE(vexo::findSetting(settings, "c"));
}

class Settings : public ApplianceTest {
 protected:
    // "1 value", "0 " or "-1 " with the platform's code.
    static std::string ask(const char* file, const char* key = "a", int size = 8) {
        char value[8] = "?";
        VLIBCErrSetEx(0, "", 0);
        const int result = VLIBCFileGetKeyValue(file, key, value, size, 0);
        return std::to_string(result) + ' ' + (VLIBCErrGet() != 0 ? std::to_string(VLIBCErrGet()) : value);
    }
    static std::string failure(int code) { return "-1 " + std::to_string(code); }
};

TEST_F(Settings, GetKeyValue) {
    writeRootFile("/etc/x.conf", "a=\"hello\"\na=\"second\"\nempty=\"\"\n");
    writeRootFile("/etc/huge.conf", "a=1\n");
    ASSERT_EQ(truncate((systemRoot() + "/etc/huge.conf").c_str(), (16 << 20) + 1), 0);
    const struct {
        const char *file, *key;
        int size;
        std::string expected;
    } cases[] = {{"/etc/x.conf", "a", 6, "1 hello"},
                 {"/etc/x.conf", "a", 4, "1 hel"},
                 {"/etc/x.conf", "a", 1, "1 "},
                 {"/etc/x.conf", "empty", 8, "1 "},
                 {"/etc/x.conf", "A", 8, "0 "},
                 {"/etc/none.conf", "a", 8, failure(VEXO_ERR_FILE)},
                 {"/etc/x.conf/below", "a", 8, failure(VEXO_ERR_FILE)},
                 {"/etc", "a", 8, failure(VEXO_ERR_GENERAL)},
                 {"/etc/huge.conf", "a", 8, failure(VEXO_ERR_GENERAL)},
                 {"/etc/x.conf", "a", 0, failure(VEXO_ERR_PARAMETER)},
                 {nullptr, "a", 8, failure(VEXO_ERR_PARAMETER)}};
    for (const auto& c : cases) EXPECT_EQ(ask(c.file, c.key, c.size), c.expected) << &c - cases;
    if (geteuid() != 0) return;
    chmod((systemRoot() + "/etc/huge.conf").c_str(), 0600);
    asUser(kAliceUid, kUsersGid, [] {
        EXPECT_EQ(ask("/etc/huge.conf"), failure(VEXO_ERR_DENIED));
        return 0;
    });
}

TEST_F(Settings, AFileIsReadAgainOnlyWhenItChanged) {
    const std::string file = systemRoot() + "/etc/x.conf";
    const timespec hourAgo[] = {{time(nullptr) - 3600, 0}, {time(nullptr) - 3600, 0}};
    for (const char* text : {"a=1\n", "a=2\n"}) {  // the same inode, size and time: the first is still believed
        writeFile(file, text);
        ASSERT_EQ(utimensat(-1, file.c_str(), hourAgo, 0), 0);
        EXPECT_EQ(ask("/etc/x.conf"), "1 1");
    }
    for (const char* text : {"a=3\n", "a=4\n"}) {  // within one tick of the clock
        writeFile(file, text);
        EXPECT_EQ(ask("/etc/x.conf"), std::string("1 ") + text[2]);
    }
    ASSERT_EQ(unlink(file.c_str()), 0);
    EXPECT_EQ(ask("/etc/x.conf"), failure(VEXO_ERR_FILE)) << "nothing is answered for a file that is gone";
}

TEST_F(Settings, CheckKeyValue) {
    writeRootFile("/etc/x.conf", "a=\"Yes\"\nname=\"\xC3\x89T\xC3\x89\"\n");
    for (const auto& [file, key, value, nocase, answer] :
         Rows<const char*, const char*, const char*, int, int>{{"/etc/x.conf", "a", "Yes", 0, 1},
                                                               {"/etc/x.conf", "a", "yes", 0, 0},
                                                               {"/etc/x.conf", "name", "\xC3\xA9t\xC3\xA9", 1, 1},
                                                               {"/etc/x.conf", "b", "", 0, 0},  // absent is not empty
                                                               {"/etc/none.conf", "a", "Yes", 0, 0},
                                                               {"/etc/x.conf", "a", nullptr, 0, 0}})
        EXPECT_EQ(VLIBCFileCheckKeyValue(file, key, value, nocase), answer);
}

TEST_F(Settings, GetKeysFillsTheCallersHashOrANewOne) {
    writeRootFile("/etc/x.conf", "20001=\"true\"\n20002=\"false\"\n20001=\"false\"\n");
    PVLIBCSZHASH hash = VLIBCSzHashAlloc(2048);
    const PVLIBCSZHASH callers = hash;
    EXPECT_EQ(VLIBCFileGetKeys("/etc/x.conf", &hash, "="), 3);
    EXPECT_EQ(hash, callers);
    EXPECT_STREQ(VLIBCSzHashGetValue(hash, "20001"), "true");
    VLIBCSzHashFree(hash);
    hash = nullptr;
    EXPECT_EQ(VLIBCFileGetKeys("/etc/none.conf", &hash, "="), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    vexo::gate::fail("VLIBCSzHashSetValue", VEXO_ERR_GENERAL, 0, 2);
    EXPECT_EQ(VLIBCFileGetKeys("/etc/x.conf", &hash, "="), -1);
    EXPECT_EQ(VLIBCFileGetKeys("/etc/x.conf", &hash, ""), -1);
    EXPECT_EQ(hash, nullptr);
    EXPECT_EQ(VLIBCFileGetKeys("/etc/x.conf", &hash, ":"), 0);
    EXPECT_NE(hash, nullptr);
    VLIBCSzHashFree(hash);
}

TEST_F(Settings, TheAppliancesOwnFiles) {
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
    for (const auto& [value, minutes] :
         Rows<const char*, int>{{"30", 30}, {"0", 0}, {"-3", -3}, {"30 minutes", -1}, {"", -1}, {"99999999999", -1}}) {
        setSetting("session_timeout", value);
        EXPECT_EQ(VLIBCConfGetKTRTimeout(), minutes) << value;
    }
    ASSERT_EQ(unlink((systemRoot() + "/etc/vexoinfo.conf").c_str()), 0);
    EXPECT_EQ(VexoConf::Info().Get("pexlanderxferlog", "no"), "no");
}

}  // namespace
