#include "request.h"

#include <optional>
#include <string>
#include <vector>

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

TEST(Request, ListsOfPathsNameTheFolderOnce) {
    using Paths = std::vector<std::string>;
    for (const auto& [query, paths] : Rows<const char*, std::optional<Paths>>{
             row("paths_raw=/a/one%0Atwo%252Fhalf%0D%0A%0D%0A/b%0Ac&path=/d",
                 Paths{"/a/one", "/a/two/half", "/b", "/c", "/d"}),
             row("paths_raw=one", std::nullopt), row("paths_raw=/a%0A%25zz", std::nullopt),
             row("paths_raw=/a%0A%2500", std::nullopt), row("path_raw=/a&paths_raw=/b%0Ac", Paths{"/b", "/c", "/a"}),
             row("path=", Paths{""}), row("", Paths{})}) {
        setenv("QUERY_STRING", query, 1);
        EXPECT_EQ(pathParams(VEXO::WebCGI()), paths) << query;
    }
    unsetenv("QUERY_STRING");
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
