// orveld as a web server, a hurried one and a hostile one meet it.
#include <sys/socket.h>
#include <sys/un.h>

#include <atomic>
#include <thread>

#include "apps/orveld.h"
#include "listener.h"
#include "scgi.h"
#include "slots.h"
#include "support/testing.h"

namespace {

using orvel::orveld::parseBlock;

// Long mode: numbers as in the field, some minutes. Else so few that the run stays short.
size_t many(size_t inLongMode, size_t usually) {
    return getenv("ORVEL_TEST_LONG") != nullptr ? inLongMode : usually;
}

std::string statusOf(const std::string& reply) {
    const size_t at = reply.find("Status: ");
    return at == std::string::npos ? reply : reply.substr(at + 8, 3);
}

std::string netstring(const std::string& text) {
    return std::to_string(text.size()) + ":" + text + ",";
}

std::string zeros(std::string text) {
    for (char& c : text) {
        if (c == '|') c = '\0';
    }
    return text;
}

const std::string kBody = "CONTENT_LENGTH|0|SCGI|1|";

TEST(ScgiBlock, OnlyWholeOnesCount) {
    for (const auto& [what, block, whole] : rowsOf<const char*, std::string, bool>("apps/scgi_blocks"))
        EXPECT_EQ(parseBlock(zeros(block)).has_value(), whole) << what;
    const std::string fits(orvel::orveld::kLongestBlock - 64, 'x');
    EXPECT_TRUE(parseBlock(netstring(zeros(kBody + "HTTP_X|") + fits + '\0')));
    EXPECT_FALSE(parseBlock(netstring(zeros(kBody + "HTTP_X|") + fits + std::string(64, 'x') + '\0')));
}

TEST(ScgiBlock, SetsNothingButWhatWebServersSend) {
    const auto variables = parseBlock(netstring(zeros(
        kBody + "VEXO_ROOT|/x|LD_PRELOAD|x|PATH|/x|TZ|x|HTTP_COOKIE|id=1|REMOTE_USER|alice|ORVEL|1|LISTEN_FDS|1|")));
    ASSERT_TRUE(variables);
    EXPECT_EQ(*variables, (std::vector<std::string>{"CONTENT_LENGTH=0", "HTTP_COOKIE=id=1", "REMOTE_USER=alice"}));
    for (const std::string given : {"10", ""}) {
        const auto length = parseBlock(netstring(zeros(kBody + "BODY_LENGTH|" + given + "|HTTP_CONTENT_LENGTH|5|")));
        ASSERT_TRUE(length);
        EXPECT_EQ(length->front(), "CONTENT_LENGTH=" + given);
    }
}

TEST(ScgiAddress, ANetworkCountsAsOneClient) {
    using orvel::orveld::hashOfAddress;
    EXPECT_EQ(hashOfAddress("2001:db8::1"), hashOfAddress("2001:db8:0:0:ffff::2"));
    EXPECT_NE(hashOfAddress("2001:db8::1"), hashOfAddress("2001:db8:0:1::1"));
    EXPECT_EQ(hashOfAddress("::ffff:10.0.0.1"), hashOfAddress("10.0.0.1"));
    EXPECT_NE(hashOfAddress("10.0.0.1"), hashOfAddress("10.0.0.2"));
    EXPECT_NE(hashOfAddress(""), 0U);
}

class OrveldTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addShare("photo", "write list = alice\n");
        writeFile(photo_ + "/a.txt", "some text");
    }
    static std::string list(const Orveld& orveld, const std::string& address = "127.0.0.1") {
        return orveld.ask(requestOf("list", "alice", "action=folder&path=/photo", "GET", {{"REMOTE_ADDR", address}}));
    }
    static Variables upload(const std::string& name, size_t length, const std::string& address = "127.0.0.1") {
        return requestOf("upload", "alice", "path=/photo/" + name, "PUT",
                         {{"CONTENT_LENGTH", std::to_string(length)}, {"REMOTE_ADDR", address}});
    }
    static void expectServed(const Orveld& orveld, const std::string& address = "127.0.0.1") {
        const auto begin = std::chrono::steady_clock::now();
        EXPECT_NE(list(orveld, address).find("\"a.txt\""), std::string::npos);
        const std::chrono::duration<double, std::milli> took = std::chrono::steady_clock::now() - begin;
        if (getenv("ORVEL_TEST_LONG") != nullptr) std::printf("served in %.1f ms\n", took.count());
    }
};

TEST_F(OrveldTest, WhatIsNoRequestIsEndedAndNothingElse) {
    const Orveld orveld;
    const Rows<const char*, std::string, std::string> rows = {
        {"no number", "GET / HTTP/1.0\r\n\r\n", "400"},
        {"no end of the number", "0000000000000000", "400"},
        {"too long", "65536:" + std::string(1000, 'x'), "400"},
        {"far too long", "99999999:", "400"},
        {"shorter than any", "3:abc,", "400"},
        {"malformed", netstring(zeros(kBody + "HTTP_X|1|HTTP_X|2|")), "400"},
        {"torn", netstring(zeros(kBody)).substr(0, 20), ""},
        {"torn in the number", "24", ""},
        {"nothing", "", ""},
        {"no program", blockOf(requestOf("nothing", "alice", "")), "404"},
        {"a path for one", blockOf(requestOf("list/../../bin/sh", "alice", "")), "404"},
    };
    for (const auto& [what, bytes, status] : rows) {
        const Connection connection = orveld.connect();
        connection.send(bytes);
        connection.endBody();
        EXPECT_EQ(statusOf(connection.receive()), status) << what;
    }
    expectServed(orveld);
    EXPECT_EQ(orveld.figures()["crashed"], 0);
}

TEST_F(OrveldTest, ThoseWhoAreSlowWithTheirHeadersAreEndedAndDelayNobody) {
    const Orveld orveld;
    const std::string block = blockOf(requestOf("list", "alice", "action=shares"));
    std::vector<Connection> slow;
    const size_t count = many(2000, 100);
    for (size_t i = 0; i < count; ++i) {
        slow.push_back(orveld.connect());
        slow.back().send(block.substr(0, i % (block.size() - 1)));
    }
    waitUntil("the slow ones to be read", [&] { return orveld.figures()["reading"].asUInt64() >= count; });
    waitUntil("no child for them", [&] { return orveld.children().empty(); });
    expectServed(orveld);
    for (const Connection& connection : slow) EXPECT_EQ(connection.receive(), "");
    EXPECT_GE(orveld.figures()["malformed"].asUInt64(), count);
}

TEST_F(OrveldTest, OneAddressHasItsPartAndSlowBodiesEnd) {
    const Orveld orveld(Variables{{"orveld_children", "8"}, {"orveld_idle_seconds", "1"}});
    std::vector<Connection> slow;
    const size_t count = many(2000, 30);
    for (size_t i = 0; i < count; ++i) {
        slow.push_back(orveld.connect());
        slow.back().send(blockOf(upload("slow" + std::to_string(i), 10, "10.0.0.1")) + "1");
    }
    // Until then all that is too much is refused one by one, and so may others be.
    waitUntil("the crowd to be turned away", [&] {
        const Json::Value figures = orveld.figures();
        return !figures.isNull() && figures["queued"].asUInt64() == 0;
    });
    expectServed(orveld, "10.0.0.2");
    std::multiset<std::string> answers;
    for (const Connection& connection : slow) {
        const std::string reply = connection.receive();
        answers.insert(statusOf(reply));
        EXPECT_EQ(reply.find("Retry-After: ") != std::string::npos, statusOf(reply) == "503");
    }
    EXPECT_GE(answers.count("400"), 1U) << "a body that stood still";
    EXPECT_EQ(answers.count("400") + answers.count("503"), count);
    // Questions for the figures may have been refused beside them.
    waitUntil("the count", [&] { return orveld.figures()["refused"].asUInt64() >= answers.count("503"); });
    EXPECT_EQ(access((photo_ + "/slow0").c_str(), F_OK), -1);
}

TEST_F(OrveldTest, BeyondTheChildrenRequestsWaitAndBeyondTheQueueTheyAreRefused) {
    const Orveld orveld(Variables{{"orveld_children", "1"}, {"orveld_queue", "1"}});
    const Connection first = orveld.connect();
    first.send(blockOf(upload("first", 4)) + "ab");
    waitUntil("the first", [&] { return orveld.readers().size() == 1; });
    // Which of the two comes first is not known.
    const Connection second = orveld.connect(), third = orveld.connect();
    const std::string block = blockOf(requestOf("list", "alice", "action=folder&path=/photo"));
    second.send(block);
    third.send(block);
    waitUntil("a refusal", [&] { return second.hasReply() || third.hasReply(); });
    const bool secondWaits = !second.hasReply();
    EXPECT_EQ(statusOf((secondWaits ? third : second).receive()), "503");
    first.send("cd");
    EXPECT_EQ(statusOf(first.receive()), "200");
    EXPECT_NE((secondWaits ? second : third).receive().find("\"first\""), std::string::npos);
}

TEST_F(OrveldTest, AKilledChildIsOneFailedRequest) {
    const Orveld orveld;
    for (const int signal : {SIGKILL, SIGTERM, SIGKILL}) {
        const Connection connection = orveld.connect();
        connection.send(blockOf(upload("killed", 10)) + "12345");
        waitUntil("the child", [&] { return orveld.readers().size() == 1; });
        for (const pid_t child : orveld.readers()) EXPECT_EQ(kill(child, signal), 0);
        EXPECT_EQ(statusOf(connection.receive()), signal == SIGTERM ? "400" : "") << "asked to end it says so";
    }
    expectServed(orveld);
    EXPECT_EQ(orveld.figures()["crashed"], 2);
    EXPECT_EQ(access((photo_ + "/killed").c_str(), F_OK), -1);
}

TEST_F(OrveldTest, RequestsWaitForAKilledParent) {
    Orveld orveld({}, {}, true);
    for (size_t i = 0; i < many(50, 3); ++i) {
        const pid_t before = orveld.process();
        const Connection underWay = orveld.connect();
        underWay.send(blockOf(upload("kept" + std::to_string(i), 4)) + "ab");
        waitUntil("the child", [&] { return orveld.readers().size() == 1; });
        EXPECT_EQ(kill(before, SIGKILL), 0);
        expectServed(orveld);
        EXPECT_NE(orveld.process(), before);
        underWay.send("cd");
        EXPECT_EQ(statusOf(underWay.receive()), "200") << "what a child had begun goes on";
    }
    EXPECT_EQ(orveld.end(), 0);
    EXPECT_EQ(access(orveld.socket().c_str(), F_OK), -1);
}

TEST_F(OrveldTest, AReloadLosesNothingAndTakesTheSettings) {
    const Orveld orveld(Variables{{"orveld_children", "256"}});
    std::vector<Connection> uploads;
    for (int i = 0; i < 64; ++i) {
        uploads.push_back(orveld.connect());
        uploads.back().send(blockOf(upload("u" + std::to_string(i), 8)) + "half");
    }
    waitUntil("64 children", [&] { return orveld.readers().size() == 64; });
    setSetting("orveld_children", "1");  // and nobody's log-in is believed any more
    EXPECT_EQ(kill(orveld.process(), SIGHUP), 0);
    for (int i = 0; i < 64; ++i) {
        if (i == 32) kill(orveld.process(), SIGHUP);
        uploads[i].send("half");
        EXPECT_EQ(statusOf(uploads[i].receive()), "200");
        EXPECT_EQ(readFile(photo_ + "/u" + std::to_string(i)), "halfhalf");
    }
    waitUntil("the settings to count", [&] { return statusOf(list(orveld)) == "401"; });
}

TEST_F(OrveldTest, StopServesWhatIsUnderWay) {
    Orveld orveld;
    const Connection connection = orveld.connect();
    connection.send(blockOf(upload("last", 4)) + "ab");
    waitUntil("the child", [&] { return orveld.readers().size() == 1; });
    EXPECT_EQ(kill(orveld.process(), SIGTERM), 0);
    waitUntil("the socket to go", [&] { return access(orveld.socket().c_str(), F_OK) != 0; });
    connection.send("cd");
    EXPECT_EQ(statusOf(connection.receive()), "200");
    EXPECT_EQ(orveld.end(), 0);
}

TEST_F(OrveldTest, AClientThatGoesAwayEndsItsChildExceptInAnOperation) {
    const Orveld orveld;
    const Rows<const char*, unsigned> rows = {{"list", 1}, {"operation", 1}};
    for (const auto& [program, abandoned] : rows) {
        Connection connection = orveld.connect();
        connection.send(
            blockOf(requestOf(program, "alice", "", "POST",
                              {{"CONTENT_LENGTH", "10"}, {"CONTENT_TYPE", "application/x-www-form-urlencoded"}})));
        waitUntil("the child", [&] { return orveld.readers().size() == 1; });
        // It waits for its form. Stopped, it does not see the end of that.
        const pid_t child = orveld.readers().front();
        EXPECT_EQ(kill(child, SIGSTOP), 0);
        connection.hangUp();
        expectServed(orveld);
        kill(child, SIGCONT);  // it may be gone by now
        waitUntil("its end", [&] { return orveld.children().empty(); });
        EXPECT_EQ(orveld.figures()["abandoned"].asUInt(), abandoned) << program;
    }
}

TEST_F(OrveldTest, NothingStaysBehindInTheParent) {
    const Orveld orveld;
    const std::string process = "/proc/" + std::to_string(orveld.process());
    const auto descriptors = [&] {
        size_t count = 0;
        for (int i = 0; i < 1000; ++i)
            count += access((process + "/fd/" + std::to_string(i)).c_str(), F_OK) == 0 ? 1 : 0;
        return count;
    };
    const auto memory = [&] {
        const std::string status = readFile(process + "/status");
        return std::stol(status.substr(status.find("RssAnon:") + 8));  // pages of libraries come by the page cache
    };
    const auto ask = [&](size_t count) {
        std::atomic<size_t> next = 0;
        std::vector<std::thread> threads;
        for (int thread = 0; thread < 8; ++thread)
            threads.emplace_back([&] {
                for (size_t i = next++; i < count; i = next++) {
                    const Variables request =
                        i % 3 == 0 ? requestOf("list", "alice", "action=shares") : requestOf("why", "", "");
                    EXPECT_EQ(statusOf(orveld.ask(request)), i % 3 == 0 ? "200" : "401");
                }
            });
        for (std::thread& thread : threads) thread.join();
        waitUntil("standard streams, socket, events and signals alone to be open",
                  [&] { return orveld.children().empty() && descriptors() == 6; });
    };
    ask(many(1000, 30));
    const long memoryBefore = memory();
    ask(many(1000000, 200));
    EXPECT_LT(memory() - memoryBefore, 512) << "KiB";
    if (getenv("ORVEL_TEST_LONG") != nullptr) std::printf("%ld KiB before, %ld after\n", memoryBefore, memory());
}

TEST_F(OrveldTest, WhoIsLoggedInIsBelievedOnlyOfTrustedWebServers) {
    const Orveld orveld(Variables{{"orveld_trusted_logins", ""}, {"orveld_web_servers", "20001"}},
                        {{"REMOTE_USER", "alice"}, {"HTTP_COOKIE", "id=x"}});
    EXPECT_EQ(statusOf(list(orveld)), "401");
    SKIP_WITHOUT_ROOT();
    const auto askAs = [&](uid_t uid, const std::string& path) {
        return asUser(uid, kUsersGid, [&] {
            const std::string reply = orveld.ask({{"CONTENT_LENGTH", "0"}, {"SCGI", "1"}, {"SCRIPT_NAME", path}});
            return statusOf(reply) == "403" ? 3 : statusOf(reply) == "405" ? 5 : statusOf(reply) == "200" ? 2 : 1;
        });
    };
    EXPECT_EQ(askAs(kAliceUid, "/cgi-bin/list"), 5) << "she may speak: no method was given";
    EXPECT_EQ(askAs(kBobUid, "/cgi-bin/list"), 3);
    EXPECT_EQ(askAs(kAliceUid, orvel::orveld::kStatusPath), 3);
    EXPECT_NE(orveld.ask({{"CONTENT_LENGTH", "0"}, {"SCGI", "1"}, {"SCRIPT_NAME", orvel::orveld::kStatusPath}})
                  .find("orveld_requests_total{program=\"list\"}"),
              std::string::npos);
}

TEST_F(OrveldTest, WhatStandsAtThePathOfTheSocketStays) {
    const std::string file = systemRoot() + "/file";
    writeFile(file, "mine");
    EXPECT_EQ(runProgram({ORVELD, "--socket", file}).status, 1);
    EXPECT_EQ(readFile(file), "mine");
    const Orveld orveld;
    EXPECT_EQ(runProgram({ORVELD, "--socket", orveld.socket()}).status, 1);
    expectServed(orveld);
    EXPECT_EQ(runProgram({ORVELD, "--socket", systemRoot() + "/" + std::string(120, 'x')}).status, 1);
}

TEST_F(OrveldTest, ASocketThatNobodyListensOnIsReplaced) {
    const std::string path = "/tmp/orveld-" + std::to_string(getpid()) + "-1";
    std::string error;
    close(orvel::orveld::ownListener(path, error));
    const Orveld orveld;
    expectServed(orveld);
}

}  // namespace
