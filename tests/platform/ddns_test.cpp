// Dynamic-DNS entries by provider.
#include "vexo/ddns.h"

#include "support/testing.h"

namespace {

class DdnsTest : public ApplianceTest {};

TEST_F(DdnsTest, EntriesByProvider) {
    VEXODDNS entry;
    EXPECT_LT(VEXODDNSConfigGet("here.example", &entry), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    writeRootFile("/etc/vexo/ddns.conf",
                  "hostname=\"outside.of.sections\"\n"
                  "[here.example]\r\nuser=\"u\"\r\nhostname=\"box.here.example\"\r\n"
                  "# [commented]\nhostname=\"second.is.ignored\"\n"
                  "[there]\nuser=\"nobody\"\n[link]\nhostname=\"a/b@c\"\n[last]\nhostname=last.example");
    for (const auto& [provider, host] : Rows<const char*, const char*>{
             row("here.example", "box.here.example"), row("last", "last.example"), row("Here.Example", nullptr),
             row("there", nullptr), row("link", nullptr), row("missing", nullptr), row("", nullptr)}) {
        SCOPED_TRACE(provider);
        EXPECT_EQ(VEXODDNSConfigGet(provider, &entry) >= 0, host != nullptr);
        EXPECT_STREQ(entry.szHostname, host != nullptr ? host : "");
        EXPECT_STREQ(entry.szProvider, host != nullptr ? provider : "");
        EXPECT_TRUE(host != nullptr || VLIBCErrGet() == VEXO_ERR_MISSING);
    }
}

}  // namespace
