#include "request.h"

#include <grp.h>

#include <optional>

#include "client_address.h"
#include "support/testing.h"

using namespace orvel::cgi;

namespace {

TEST(Request, NumbersAreDigitsThatFit) {
    EXPECT_EQ(parseNumber("0"), 0U);
    EXPECT_EQ(parseNumber("18446744073709551615"), 18446744073709551615U);
    for (const char* text : {"", "-1", "+1", " 1", "1 ", "1x", "0x10", "1.0", "18446744073709551616"})
        EXPECT_EQ(parseNumber(text), std::nullopt) << text;
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

TEST(ClientAddress, IsWhatTheLastTrustedProxySaw) {
    const std::vector<std::string> proxies = {"10.0.0.1", "2001:db8::1"};
    for (const auto& [forwarded, client] : rowsOf<const char*, const char*>("apps/forwarded"))
        EXPECT_EQ(clientBehind(forwarded, "10.0.0.9", proxies), client) << forwarded;
}

class ActAs : public ApplianceTest {};

TEST_F(ActAs, NothingOfRootsIsLeft) {
    SKIP_WITHOUT_ROOT();
    addUser("toor", 0, 0);
    constexpr int kAsUser = 0, kRefused = 1;
    for (const auto& [user, refused, outcome] : Rows<const char*, std::vector<Refusal>, int>{
             {"alice", {}, kAsUser},
             {"carol", {}, kAsUser},  // an administrator stays root
             {"toor", {}, kRefused},  // nobody else does
             {"alice", {{SYS_setresuid, EPERM}}, kRefused},
             {"alice", {{SYS_setresgid, EPERM}}, kRefused},
             {"alice", {{SYS_setgroups, EPERM}}, kRefused},
             {"alice", {{SYS_setgroups, EPERM}, {SYS_setresgid, EPERM}}, kRefused}}) {
        SCOPED_TRACE(user);
        EXPECT_EQ(inChild([&, user = user, refused = refused] {
                      const gid_t roots[] = {0, 4};
                      if (setgroups(2, roots) != 0 || (!refused.empty() && !refuseCalls(refused))) return 9;
                      const int code = actAs(nullptr, user, false);
                      EXPECT_EQ(takeLog().empty(), code == 0);
                      return code == 0 ? kAsUser : kRefused;
                  }),
                  outcome);
    }
    const auto asBob = [] { return actAs(nullptr, "alice", false) == 0 ? 0 : 1; };
    EXPECT_EQ(asUser(kBobUid, kUsersGid, asBob), 0) << "a process that never was root goes on as itself";
}

class ForwardedFor : public ApplianceTest {};

TEST_F(ForwardedFor, CountsOnlyFromConfiguredProxies) {
    for (const auto& [proxies, peer, forwarded, client, settled] :
         rowsOf<const char*, const char*, const char*, const char*, const char*>("apps/proxies")) {
        writeRootFile("/etc/vexoinfo.conf", std::string("trusted_proxies=\"") + proxies + "\"\n");
        setenv("REMOTE_ADDR", peer, 1);
        unsetenv("HTTP_X_FORWARDED_FOR");
        if (forwarded != nullptr) setenv("HTTP_X_FORWARDED_FOR", forwarded, 1);
        if (client != nullptr) setenv("HTTP_CLIENT_IP", client, 1);
        settleClientAddress();
        const char* address = getenv("HTTP_X_FORWARDED_FOR");
        EXPECT_STREQ(address == nullptr ? "" : address, settled) << proxies << " " << peer;
        EXPECT_EQ(getenv("HTTP_CLIENT_IP"), nullptr);
    }
    unsetenv("REMOTE_ADDR");
    unsetenv("HTTP_X_FORWARDED_FOR");
}

}  // namespace
