// The program preferences: small, the user's own, whole whatever comes between.
#include <thread>

#include "apps/cgi_test.h"

namespace {

class PreferencesCgi : public CgiTest {
 protected:
    static CgiReply set(const std::string& user, const std::string& values) {
        return post(PROGRAM_PREFERENCES, user, "action=set&values=" + percentEncode(values));
    }
    static std::string kept(const std::string& user) {
        std::string text;
        orvel::cgi::appendJson(get(PROGRAM_PREFERENCES, user, "action=get").json["data"]["values"], text);
        return text;
    }
    static std::string fileOf(uid_t uid) {
        return systemRoot() + "/var/lib/vexo/preferences/" + std::to_string(uid) + "/values.json";
    }
};

TEST_F(PreferencesCgi, EachUserHasTheOwn) {
    SKIP_WITHOUT_ROOT();
    EXPECT_EQ(kept("alice"), "{}");
    EXPECT_FALSE(fs::exists(systemRoot() + "/var/lib/vexo/preferences")) << "asking makes nothing";
    EXPECT_EQ(code(set("alice", R"({"density":"dense","places":["/photo"]})")), 0);
    EXPECT_EQ(code(set("alice", R"({"density":null,"mode":"grid"})")), 0);
    EXPECT_EQ(kept("alice"), R"({"mode":"grid","places":["/photo"]})");
    EXPECT_EQ(kept("bob"), "{}");
    EXPECT_EQ(statusOf(fileOf(kAliceUid)).st_mode & 07777, 0600U);
    EXPECT_EQ(statusOf(fs::path(fileOf(kAliceUid)).parent_path()).st_mode & 07777, 0700U);
    // Somebody else got the uid.
    const std::string other = readFile(fileOf(kAliceUid));
    writeFile(fileOf(kAliceUid), other.substr(0, other.find("alice")) + "eve" + other.substr(other.find("alice") + 5));
    EXPECT_EQ(kept("alice"), "{}");
}

TEST_F(PreferencesCgi, WhatIsRefusedChangesNothing) {
    SKIP_WITHOUT_ROOT();
    EXPECT_EQ(code(set("alice", R"({"mode":"grid"})")), 0);
    const std::string most(size_t{64} << 10, 'x'), deep = std::string(20, '[') + std::string(20, ']');
    for (const auto& [values, expected] : Rows<std::string, int>{
             row("", ORV_ERR_PARAMETER), row("[]", ORV_ERR_PARAMETER), row("{\"mode\":", ORV_ERR_PARAMETER),
             row("{\"Mode\":1}", ORV_ERR_PARAMETER), row("{\"\":1}", ORV_ERR_PARAMETER),
             row("{\"mode\":\"\xFF\"}", ORV_ERR_PARAMETER), row("{\"mode\":" + deep + "}", ORV_ERR_PARAMETER),
             row("{\"mode\":1,\"more\":\"" + most + "\"}", ORV_ERR_FILE_TOO_BIG)})
        EXPECT_EQ(code(set("alice", values)), expected) << values.substr(0, 40);
    EXPECT_EQ(code(get(PROGRAM_PREFERENCES, "alice", "action=set&values={}")), ORV_ERR_PARAMETER) << "not posted";
    EXPECT_EQ(kept("alice"), R"({"mode":"grid"})");
    for (const char* damage : {"{\"version\":2,\"user\":\"alice\",\"values\":{}}", "torn"}) {
        writeFile(fileOf(kAliceUid), damage);
        EXPECT_EQ(code(set("alice", R"({"mode":"list"})")), ORV_ERR_GENERAL);
        EXPECT_EQ(readFile(fileOf(kAliceUid)), damage);
    }
}

TEST_F(PreferencesCgi, BrowsersAtOnceLoseNothing) {
    SKIP_WITHOUT_ROOT();
    std::vector<std::thread> browsers;
    for (int i = 0; i < 4; ++i)
        browsers.emplace_back([i] {
            for (int n = 0; n < 5; ++n) set("alice", "{\"b" + std::to_string(i) + "." + std::to_string(n) + "\":1}");
        });
    for (auto& browser : browsers) browser.join();
    EXPECT_EQ(get(PROGRAM_PREFERENCES, "alice", "action=get").json["data"]["values"].size(), 20U);
}

}  // namespace
