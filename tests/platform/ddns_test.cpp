// Dynamic-DNS entries by provider.
#include "vexo/ddns.h"

#include <gtest/gtest.h>

#include "support/appliance.h"
#include "vexo/error.h"

namespace {

class DdnsTest : public support::ApplianceTest {};

TEST_F(DdnsTest, EntriesByProvider) {
    VEXODDNS entry;
    EXPECT_LT(VEXODDNSConfigGet("here.example", &entry), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    writeRootFile("/etc/vexo/ddns.conf",
                  "hostname=\"outside.of.sections\"\n"
                  "[here.example]\r\nuser=\"u\"\r\nhostname=\"box.here.example\"\r\n"
                  "# [commented]\nhostname=\"second.is.ignored\"\n"
                  "[there]\nuser=\"nobody\"\n[link]\nhostname=\"a/b@c\"\n[last]\nhostname=last.example");
    const struct {
        const char* provider;
        const char* host;
    } cases[] = {{"here.example", "box.here.example"},
                 {"last", "last.example"},
                 {"Here.Example", nullptr},
                 {"there", nullptr},
                 {"link", nullptr},
                 {"missing", nullptr},
                 {"", nullptr}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.provider);
        EXPECT_EQ(VEXODDNSConfigGet(c.provider, &entry) >= 0, c.host != nullptr);
        EXPECT_STREQ(entry.szHostname, c.host != nullptr ? c.host : "");
        EXPECT_STREQ(entry.szProvider, c.host != nullptr ? c.provider : "");
        if (c.host == nullptr) {
            EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_MISSING);
        }
    }
    EXPECT_LT(VEXODDNSConfigGet(nullptr, &entry), 0);
    EXPECT_LT(VEXODDNSConfigGet("here.example", nullptr), 0);
}

}  // namespace
