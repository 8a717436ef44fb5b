#include "orvel/external_host.h"

#include "support/testing.h"
#include "util/host_header.h"

namespace {

std::string address(const char* httpHost, const char* https = "") {
    setenv("HTTP_HOST", httpHost, 1);
    setenv("HTTPS", https, 1);
    std::string text = "left over";
    EXPECT_EQ(&GetRemoteAddr(text), &text);
    return text;
}

class ExternalHost : public ApplianceTest {};

TEST(HostHeader, Table) {
    const std::string longest(4095, 'h');
    Rows<std::string, std::string, std::string> rows =
        rowsOf<std::string, std::string, std::string>("util/host_headers");
    rows.emplace_back(longest + "xx:" + longest + "yy", longest, longest);
    for (const auto& [text, host, port] : rows) {
        const auto split = orvel::splitHostHeader(text.c_str());
        EXPECT_EQ(split.host, host) << text;
        EXPECT_EQ(split.port, port) << text;
    }
    EXPECT_EQ(orvel::splitHostHeader(nullptr).host, "");
}

TEST_F(ExternalHost, TheConfiguredHostAndPortOrTheRequests) {
    EXPECT_EQ(address("[fe80::1]:5000", "on"), "https://[fe80::1]:5000");
    EXPECT_EQ(address("box", "ON"), "https://box");
    EXPECT_EQ(address("box", "1"), "http://box");
    setSetting("external_host_ip", "");
    setSetting("external_port_ktr_http", "");
    EXPECT_EQ(address("box:5000"), "http://box:5000") << "empty values count as absent";
    setSetting("external_host_ip", "nas.example.org");
    EXPECT_EQ(address("box:5000"), "http://nas.example.org:5000");
    setSetting("external_port_ktr_http", "81");
    EXPECT_EQ(address("box:5000"), "http://nas.example.org:81");
    EXPECT_EQ(address("box:5001", "on"), "https://nas.example.org:5001")
        << "the other scheme's port counts for nothing";
    setSetting("external_port_ktr_https", "444444444444444444");
    EXPECT_EQ(address("box:5001", "on"), "https://nas.example.org:444444444444444") << "cut to 15 characters";
}

TEST_F(ExternalHost, TheDynamicNameIsUsedWhereAllOfItIsOn) {
    writeRootFile("/etc/vexo/ddns.conf", "[acme]\nhostname=\"me.acme.example\"\n");
    for (const auto& [defaults, settings, host] : rowsOf<std::string, std::string, std::string>("util/dynamic_names")) {
        writeRootFile("/etc.defaults/vexoinfo.conf", defaults);
        writeRootFile("/etc/vexoinfo.conf", settings);
        EXPECT_EQ(address("box:5000"), "http://" + host + ":5000") << defaults << settings;
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
    // Reads: the port, the external host, ddns_update, ddns_select.
    for (const auto& [nth, key] : Rows<int, const char*>{{3, "ddns_update"}, {4, "ddns_select"}}) {
        vexo::gate::reset();
        vexo::gate::fail("VLIBCFileGetKeyValue", 0x8100, EIO, nth);
        announceLog(std::string(" Failed to get ") + key + " of /etc/vexoinfo.conf");
        EXPECT_EQ(address("box:5000"), "http://box:5000");
    }
}

}  // namespace
