// Settings files: the format, and the operations that read it.
#include "vexo/settings.h"

#include "settings/settings_text.h"
#include "support/testing.h"
#include "vexo/ddns.h"

namespace {

TEST(SettingsFormat, Lines) {
    for (const auto& [line, key, value] : rowsOf<std::string, std::string, std::string>("platform/setting_lines")) {
        const auto setting = vexo::parseSettingLine(line, "=");
        EXPECT_EQ(setting.has_value(), !key.empty()) << line;
        EXPECT_TRUE(!setting || (setting->key == key && setting->value == value)) << line;
    }
    EXPECT_EQ(vexo::parseSettingLine("a := b", ":=")->value, "b");
    EXPECT_FALSE(vexo::parseSettingLine("a=b", ""));
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

TEST_F(Settings, ValuesAndFailures) {
    writeRootFile("/etc/x.conf", "a=\"Hello\"\na=\"second\"\nempty=\"\"\nname=\"\xC3\x89T\xC3\x89\"\n");
    writeRootFile("/etc/huge.conf", "a=1\n");
    ASSERT_EQ(truncate((systemRoot() + "/etc/huge.conf").c_str(), (16 << 20) + 1), 0);
    for (const auto& [file, key, size, expected] : Rows<const char*, const char*, int, std::string>{
             row("/etc/x.conf", "a", 6, "1 Hello"), row("/etc/x.conf", "a", 4, "1 Hel"),
             row("/etc/x.conf", "empty", 1, "1 "), row("/etc/x.conf", "A", 8, "0 "),
             row("/etc/x.conf/below", "a", 8, failure(VEXO_ERR_FILE)), row("/etc", "a", 8, failure(VEXO_ERR_GENERAL)),
             row("/etc/huge.conf", "a", 8, failure(VEXO_ERR_GENERAL)),
             row("/etc/x.conf", "a", 0, failure(VEXO_ERR_PARAMETER))})
        EXPECT_EQ(ask(file, key, size), expected) << file << key << size;
    for (const auto& [key, value, nocase, answer] : Rows<const char*, const char*, int, int>{
             row("a", "Hello", 0, 1), row("a", "hello", 0, 0), row("name", "\xC3\xA9t\xC3\xA9", 1, 1),
             row("b", "", 0, 0)})  // absent is not empty
        EXPECT_EQ(VLIBCFileCheckKeyValue("/etc/x.conf", key, value, nocase), answer) << value;
    if (geteuid() != 0) return;
    chmod((systemRoot() + "/etc/huge.conf").c_str(), 0600);
    asUser(kAliceUid, kUsersGid, [] { EXPECT_EQ(ask("/etc/huge.conf"), failure(VEXO_ERR_DENIED)); });
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
    EXPECT_EQ(VexoConf::Info().Get("pexlanderxferlog", "no"), "no");
    EXPECT_EQ(VLIBCErrGet(), 0);
    for (const auto& [value, answer] : Rows<const char*, int>{{"yes", 1}, {"YES", 0}}) {
        setDefaultSetting("support_s2s", value);
        EXPECT_EQ(VLIBCSupportGet("support_s2s"), answer);
    }
    for (const auto& [value, minutes] : Rows<const char*, int>{row("0", 0), row("-3", -3), row("30 minutes", -1),
                                                               row("", -1), row("99999999999", -1)}) {
        setSetting("session_timeout", value);
        EXPECT_EQ(VLIBCConfGetKTRTimeout(), minutes) << value;
    }
}

TEST_F(Settings, DynamicNamesByProvider) {
    VEXODDNS entry;
    EXPECT_FAILS(VEXODDNSConfigGet("here.example", &entry), ENOENT, VEXO_ERR_FILE);
    writeRootFile("/etc/vexo/ddns.conf",
                  "hostname=\"outside.of.sections\"\n"
                  "[here.example]\r\nuser=\"u\"\r\nhostname=\"box.here.example\"\r\n"
                  "# [commented]\nhostname=\"second.is.ignored\"\n"
                  "[there]\nuser=\"nobody\"\n[link]\nhostname=\"a/b@c\"\n[last]\nhostname=last.example");
    for (const auto& [provider, host] : Rows<const char*, const char*>{
             row("here.example", "box.here.example"), row("last", "last.example"), row("Here.Example", ""),
             row("there", ""), row("link", ""), row("missing", ""), row("", "")}) {
        EXPECT_EQ(VEXODDNSConfigGet(provider, &entry) >= 0, *host != '\0') << provider;
        EXPECT_STREQ(entry.szHostname, host);
        EXPECT_STREQ(entry.szProvider, *host != '\0' ? provider : "");
        EXPECT_TRUE(*host != '\0' || VLIBCErrGet() == VEXO_ERR_MISSING);
    }
}

}  // namespace
