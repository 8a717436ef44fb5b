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
    struct {
        const char* proxies;
        const char* peer;
        bool kept;
    } const cases[] = {
        {"", "127.0.0.1", false},
        {"10.0.0.1, 10.0.0.2", "10.0.0.2", true},
        {"10.0.0.1, 10.0.0.2", "10.0.0.20", false},
        {"10.0.0.1,,", "", false},
    };
    for (const auto& request : cases) {
        writeRootFile("/etc/vexoinfo.conf", std::string("trusted_proxies=\"") + request.proxies + "\"\n");
        setenv("REMOTE_ADDR", request.peer, 1);
        setenv("HTTP_X_FORWARDED_FOR", "192.0.2.1", 1);
        setenv("HTTP_CLIENT_IP", "192.0.2.2", 1);
        dropForwardedFor();
        EXPECT_EQ(getenv("HTTP_X_FORWARDED_FOR") != nullptr, request.kept) << request.proxies << " " << request.peer;
        EXPECT_EQ(getenv("HTTP_CLIENT_IP") != nullptr, request.kept) << request.proxies << " " << request.peer;
    }
    unsetenv("REMOTE_ADDR");
    unsetenv("HTTP_X_FORWARDED_FOR");
    unsetenv("HTTP_CLIENT_IP");
}

}  // namespace
