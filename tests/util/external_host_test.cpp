#include "orvel/external_host.h"

#include "support/testing.h"
#include "util/host_header.h"

namespace {

void setEnvironment(const char* name, const char* value) {
    if (value == nullptr) {
        unsetenv(name);
    } else {
        setenv(name, value, 1);
    }
}

std::string address(const char* httpHost, const char* https = nullptr) {
    setEnvironment("HTTP_HOST", httpHost);
    setEnvironment("HTTPS", https);
    std::string text = "left over";
    EXPECT_EQ(&GetRemoteAddr(text), &text);
    return text;
}

class ExternalHost : public ApplianceTest {
 protected:
    void TearDown() override {
        unsetenv("HTTP_HOST");
        unsetenv("HTTPS");
        ApplianceTest::TearDown();
    }
};

TEST(HostHeader, Table) {
    const std::string longest(4095, 'h');
    for (const auto& [text, host, port] : Rows<std::string, std::string, std::string>{
             row("", "", ""), row("box", "box", ""), row("192.168.1.10:5000", "192.168.1.10", "5000"),
             row("box:5000/x:1", "box", "5000"), row("box/x:1", "box", ""), row("box:", "box", ""),
             row("box:/x", "box", ""), row("box:1:2", "box", "1:2"), row(":80", "", "80"),
             row("[fe80::1]:5000", "[fe80::1]", "5000"), row("[fe80::1]", "[fe80::1]", ""),
             row("[fe80::1]x:80", "[fe80::1]", ""), row("[a/b]:80/", "[a/b]", "80"), row("[fe80", "[fe80", ""),
             row("[]]:1", "[]", ""), row(longest + "xx:" + longest + "yy", longest, longest)}) {
        const auto split = orvel::splitHostHeader(text.c_str());
        EXPECT_EQ(split.host, host) << text;
        EXPECT_EQ(split.port, port) << text;
    }
    EXPECT_EQ(orvel::splitHostHeader(nullptr).host + orvel::splitHostHeader(nullptr).port, "");
}

TEST_F(ExternalHost, RequestAlone) {
    EXPECT_EQ(address("192.168.1.10:5000"), "http://192.168.1.10:5000");
    EXPECT_EQ(address("[fe80::1]:5000", "on"), "https://[fe80::1]:5000");
    EXPECT_EQ(address("box", "ON"), "https://box");
    EXPECT_EQ(address("box", "1"), "http://box");
    EXPECT_EQ(address("box", ""), "http://box");
    EXPECT_EQ(address(nullptr), "http://");
}

TEST_F(ExternalHost, ConfiguredHostAndPorts) {
    setSetting("external_host_ip", "nas.example.org");
    EXPECT_EQ(address("box:5000"), "http://nas.example.org:5000");
    setSetting("external_port_ktr_http", "81");
    EXPECT_EQ(address("box:5000"), "http://nas.example.org:81");
    EXPECT_EQ(address("box:5001", "on"), "https://nas.example.org:5001")
        << "the other scheme's port counts for nothing";
    EXPECT_EQ(address("box", "on"), "https://nas.example.org");
    setSetting("external_port_ktr_https", "444444444444444444");
    EXPECT_EQ(address("box:5001", "on"), "https://nas.example.org:444444444444444") << "cut to 15 characters";
}

TEST_F(ExternalHost, EmptyValuesCountAsAbsent) {
    setSetting("external_host_ip", "");
    setSetting("external_port_ktr_http", "");
    EXPECT_EQ(address("box:5000"), "http://box:5000");
}

TEST_F(ExternalHost, DynamicName) {
    setDefaultSetting("supportddns", "yes");
    setSetting("ddns_update", "YES");
    setSetting("ddns_select", "acme");
    writeRootFile("/etc/vexo/ddns.conf", "[acme]\nhostname=\"me.acme.example\"\n");
    EXPECT_EQ(address("box:5000"), "http://me.acme.example:5000");
    setSetting("external_host_ip", "nas.example.org");
    EXPECT_EQ(address("box:5000"), "http://nas.example.org:5000") << "the recorded host comes first";
}

TEST_F(ExternalHost, DynamicNameNotInUse) {
    writeRootFile("/etc/vexo/ddns.conf", "[acme]\nhostname=\"me.acme.example\"\n");
    const std::string on = "ddns_update=\"yes\"\n";
    const std::string select = "ddns_select=\"acme\"\n";
    for (const auto& [supported, settings] : Rows<const char*, std::string>{
             {"supportddns=\"no\"\n", on + select},
             {"", on + select},
             {"supportddns=\"Yes\"\n", on + select},  // this one is compared exactly
             {"supportddns=\"yes\"\n", "ddns_update=\"no\"\n" + select},
             {"supportddns=\"yes\"\n", "ddns_update=\"yesyesyes\"\n" + select},
             {"supportddns=\"yes\"\n", select},
             {"supportddns=\"yes\"\n", on},
             {"supportddns=\"yes\"\n", on + "ddns_select=\"\"\n"},
         }) {
        writeRootFile("/etc.defaults/vexoinfo.conf", supported);
        writeRootFile("/etc/vexoinfo.conf", settings);
        EXPECT_EQ(address("box:5000"), "http://box:5000") << supported << settings;
    }
}

TEST_F(ExternalHost, DynamicNameFails) {
    setDefaultSetting("supportddns", "yes");
    setSetting("ddns_update", "yes");
    setSetting("ddns_select", "ac\tme");
    vexo::gate::fail("VEXODDNSConfigGet", 0xBE00, ENOENT);
    announceLog(
        " Failed to get DDNS info by select name ac\\x09me, errno=No such file or directory, vexo_error=[BE00]");
    EXPECT_EQ(address("box:5000"), "http://box:5000");
    vexo::gate::reset();
    // Reads: the external host, ddns_update, ddns_select. The port has been read before them.
    vexo::gate::fail("VLIBCFileGetKeyValue", 0x8100, EIO, 3);
    announceLog(" Failed to get ddns_update of /etc/vexoinfo.conf");
    EXPECT_EQ(address("box:5000"), "http://box:5000");
    vexo::gate::reset();
    vexo::gate::fail("VLIBCFileGetKeyValue", 0x8100, EIO, 4);
    announceLog(" Failed to get ddns_select of /etc/vexoinfo.conf");
    EXPECT_EQ(address("box:5000"), "http://box:5000");
    vexo::gate::reset();
    announceLog(" Failed to get ddns_update of /etc/vexoinfo.conf");
    EXPECT_EQ(unlink((systemRoot() + "/etc/vexoinfo.conf").c_str()), 0);
    EXPECT_EQ(address("box:5000"), "http://box:5000");
}

}  // namespace
