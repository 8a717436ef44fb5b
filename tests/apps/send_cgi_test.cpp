// The program send: strangers' files into the folder of a link, and nothing else.
#include <future>

#include "apps/cgi_test.h"
#include "send/pace.h"
#include "support/gate.h"
#include "support/race.h"
#include "support/sqlite.h"
#include "vexo/link_store.h"

namespace {

class SendCgi : public CgiTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        SKIP_WITHOUT_ROOT();
        makeFolder(systemRoot() + "/tmp", 01777);
        openFolder(shareRoot("photo") + "/party");
        setSetting("trusted_proxies", "127.0.0.1, 10.0.0.1");
    }
    static std::string create(const std::string& more = "") {
        const CgiReply made = post(PROGRAM_LINK, "alice", "action=create&path=/photo/party&inbox=from%20guests" + more);
        EXPECT_EQ(made.status, 200) << made.body;
        return made.json["data"]["id"].asString();
    }
    static Variables visitor(const std::string& link, const std::string& address = "192.0.2.1") {
        return {{"HTTP_X_FORWARDED_FOR", address}, {"HTTP_FOLDER_SHARING", link}};
    }
    static RawReply send(const std::string& link, const std::string& name, const std::string& content,
                         const Variables& more = {}) {
        Variables all = visitor(link);
        all["CONTENT_TYPE"] = "application/octet-stream";
        for (const auto& [key, value] : more) all[key] = value;
        return RawReply(runCgi(PROGRAM_SEND, "", "POST", "name=" + name, content, all));
    }
    static CgiReply look(const std::string& link, const std::string& action) {
        return CgiReply(runCgi(PROGRAM_SHARE, "", "GET", "action=" + action, "", visitor(link)));
    }
    static Json::Value received(const std::string& link, const std::string& user = "alice") {
        return get(PROGRAM_LINK, user, "action=received&id=" + link).json["data"]["items"];
    }
    [[nodiscard]] std::string inbox(const std::string& name = "from guests") const {
        return shareRoot("photo") + "/party/" + name;
    }
};

TEST_F(SendCgi, StrangersSendAndTheOwnerSees) {
    const std::string link = create(), second = create();
    EXPECT_EQ(send(second, "x", "second").status, 200);
    EXPECT_EQ(namesIn(inbox("from guests (2)")), Names{"x"}) << "a folder of each link's own";
    const RawReply sent = send(link, "a%20%C3%A4.txt", "one");
    EXPECT_EQ(sent.body, "{\"success\":true}") << "nothing about where it went";
    expectOwned(inbox() + "/a ä.txt", kAliceUid, 0644);
    writeFile(inbox() + "/same", "the owner's");
    give(inbox() + "/same");
    EXPECT_EQ(countAtOnce(4, [&] { return send(link, "same", "new").status == 200; }), 4);
    EXPECT_EQ(readFile(inbox() + "/same"), "the owner's") << "nothing is replaced";
    EXPECT_EQ(namesIn(inbox()).size(), 6U);

    const Json::Value items = received(link);
    Names names = each(items, "name");
    EXPECT_EQ(names.back(), "a ä.txt");
    std::sort(names.begin(), names.end());
    EXPECT_EQ(names, (Names{"a ä.txt", "same (2)", "same (3)", "same (4)", "same (5)"}));
    EXPECT_EQ(items[0]["address"], "192.0.2.1");
    EXPECT_EQ(items[0]["size"], 3);
    EXPECT_GT(items[0]["time"].asInt64(), 0);
    EXPECT_EQ(received(link, "bob").size(), 0U);

    for (const char* action : {"list", "download", "download&path=same"}) EXPECT_EQ(look(link, action).status, 404);
    const Json::Value state = look(link, "state").json["data"]["receives"];
    EXPECT_EQ(state["name"], "from guests");
    EXPECT_EQ(state["files_left"], 95);
    EXPECT_EQ(support::sql(systemRoot() + VEXO::kLinkDatabase, "SELECT count(*) FROM sharingLinks"), "0")
        << "what reads links finds none to read";

    EXPECT_EQ(post(PROGRAM_LINK, "alice", "action=revoke&id=" + link).status, 200);
    EXPECT_EQ(send(link, "late", "x").status, 404);
    EXPECT_EQ(received(link).size(), 0U);
    EXPECT_EQ(namesIn(inbox()).size(), 6U) << "what came stays";
}

TEST_F(SendCgi, WhatStrangersTry) {
    const std::string link = create("&most_bytes=9"), guarded = create("&password=word");
    const std::string reading =
        post(PROGRAM_LINK, "alice", "action=create&path=/photo/party").json["data"]["id"].asString();
    const std::string longest(255, 'n');
    const std::map<std::string, std::string> links = {{"box", link}, {"guarded", guarded}, {"reading", reading}};
    for (const auto& [to, name, variable, value, expected] :
         rowsOf<std::string, std::string, std::string, std::string, int>("apps/strangers")) {
        const Variables more = variable.empty() ? Variables() : Variables{{variable, value}};
        EXPECT_EQ(send(links.contains(to) ? links.at(to) : to, name, "12345", more).status, expected)
            << to << " " << name << " " << value;
    }
    EXPECT_EQ(send(link, longest + "n", "12345").status, 400);
    EXPECT_EQ(namesIn(shareRoot("photo") + "/party"), (Names{"from guests", "from guests (2)"}));
    EXPECT_EQ(namesIn(inbox()), Names{});
    EXPECT_EQ(send(link, longest, "12345").status, 200);
    for (const char* wrong : {"&inbox=a%2Fb", "&inbox=..", "&inbox=x&most_files=0", "&inbox=x&most_files=10001",
                              "&inbox=x&most_bytes=0", "&inbox=x&most_bytes=x"}) {
        EXPECT_NE(code(post(PROGRAM_LINK, "alice", std::string("action=create&path=/photo/party") + wrong)), 0)
            << wrong;
    }
    EXPECT_EQ(code(post(PROGRAM_LINK, "bob", "action=received&id=" + link)), 0) << "and shows him nothing";
}

TEST_F(SendCgi, BoundsHoldHoweverManyComeAtOnce) {
    const std::string few = create("&most_files=3");
    int next = 0;
    const auto fromEverywhere = [&](const std::string& link) {
        return countAtOnce(8, [&, at = ++next] {
            return send(link, "f", "12345",
                        {{"HTTP_X_FORWARDED_FOR", "192.0.2." + std::to_string(at * 10 + getpid() % 8)}})
                       .status == 200;
        });
    };
    const int first = fromEverywhere(few);
    EXPECT_LE(first, 3);
    while (received(few).size() < 3) ASSERT_EQ(send(few, "f", "12345").status, 200) << "there is room left";
    EXPECT_EQ(send(few, "f", "12345").status, 413);
    EXPECT_EQ(namesIn(inbox()).size(), 3U);
    EXPECT_EQ(post(PROGRAM_LINK, "alice", "action=change&most_files=4&id=" + few).status, 200);
    EXPECT_EQ(send(few, "f", "12345").status, 200);

    const std::string small = create("&most_bytes=12");
    EXPECT_LE(fromEverywhere(small), 2);
    EXPECT_LE(namesIn(inbox("from guests (2)")).size(), 2U);
}

TEST_F(SendCgi, WhatEndsTheLinkEndsUploadsUnderWay) {
    int number = 0;
    const std::function<void(const std::string&)> steps[] = {
        [](const std::string& link) { post(PROGRAM_LINK, "alice", "action=revoke&id=" + link); },
        [](const std::string& link) { post(PROGRAM_LINK, "alice", "action=change&expires=172799&id=" + link); },
        [this](const std::string&) {
            fs::rename(inbox("from guests (2)"), inbox("elsewhere"));
            openFolder(inbox("from guests (2)"));
        }};
    const std::string first = create();
    for (const auto& end : steps) {
        SCOPED_TRACE(++number);
        const std::string link = create();
        support::Gate gate("LinkStore::beginReceiving", systemRoot() + "/gate" + std::to_string(number));
        // Where the folder is another one, the link is not asked any more.
        const bool named = number != 3;
        auto sent = std::async(std::launch::async, [&] { return send(link, "x", "content", {gate.order()}).status; });
        if (named) {
            ASSERT_TRUE(gate.holds());
            end(link);
        }
        gate.open();
        if (!named) {
            EXPECT_EQ(sent.get(), 200);
            end(link);
            EXPECT_EQ(send(link, "y", "content").status, 404) << "another folder of that name";
            EXPECT_EQ(namesIn(inbox("from guests (2)")), Names{});
            continue;
        }
        EXPECT_EQ(sent.get(), 404);
        EXPECT_EQ(namesIn(inbox("from guests (2)")), Names{});
        fs::remove(inbox("from guests (2)"));
    }
}

TEST_F(SendCgi, WhoIsTooSlow) {
    using orvel::cgi::Pace;
    using std::chrono::seconds;
    const Pace::Clock::time_point begin;
    Pace pace(begin);
    EXPECT_FALSE(pace.isTooSlow(1, begin + seconds(60))) << "anybody may begin slowly";
    EXPECT_TRUE(pace.isTooSlow(1, begin + seconds(61)));
    EXPECT_FALSE(pace.isTooSlow(100 * 1024, begin + seconds(100)));
    EXPECT_TRUE(pace.isTooSlow(1, begin + seconds(200)));
}

}  // namespace
