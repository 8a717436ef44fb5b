#include "request.h"

#include "support/testing.h"

using namespace orvel::cgi;

namespace {

TEST(Request, NumbersAreDigitsThatFit) {
    EXPECT_EQ(parseNumber("0"), 0U);
    EXPECT_EQ(parseNumber("18446744073709551615"), 18446744073709551615U);
    for (const char* text : {"", "-1", "+1", " 1", "1 ", "1x", "0x10", "1.0", "18446744073709551616"}) {
        EXPECT_EQ(parseNumber(text), std::nullopt) << text;
    }
}

class ForwardedFor : public ApplianceTest {};

TEST_F(ForwardedFor, CountsOnlyFromConfiguredProxies) {
    for (const auto& [proxies, peer, kept] : Rows<const char*, const char*, bool>{
             row("", "127.0.0.1", false), row("10.0.0.1, 10.0.0.2", "10.0.0.2", true),
             row("10.0.0.1, 10.0.0.2", "10.0.0.20", false), row("10.0.0.1,,", "", false)}) {
        writeRootFile("/etc/vexoinfo.conf", std::string("trusted_proxies=\"") + proxies + "\"\n");
        setenv("REMOTE_ADDR", peer, 1);
        setenv("HTTP_X_FORWARDED_FOR", "192.0.2.1", 1);
        setenv("HTTP_CLIENT_IP", "192.0.2.2", 1);
        dropForwardedFor();
        EXPECT_EQ(getenv("HTTP_X_FORWARDED_FOR") != nullptr, kept) << proxies << " " << peer;
        EXPECT_EQ(getenv("HTTP_CLIENT_IP") != nullptr, kept) << proxies << " " << peer;
    }
    unsetenv("REMOTE_ADDR");
    unsetenv("HTTP_X_FORWARDED_FOR");
    unsetenv("HTTP_CLIENT_IP");
}

}  // namespace
