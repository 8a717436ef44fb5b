// Many visitors at once, of whom some are killed.
//   ORVEL_TEST_STORM_SECONDS: how long processes are killed, 3 without it.
#include <random>

#include "sharing/login_add.h"
#include "sharing/login_record.h"
#include "sharing/visitor_fixture.h"
#include "vexo/critical_section.h"

using namespace std::chrono_literals;

namespace {

constexpr int kSessions = 1000;

class SessionStormTest : public VisitorTest {
 protected:
    void SetUp() override {
        VisitorTest::SetUp();
        std::string text;
        for (int i = 0; i < kSessions; ++i)
            text += "10.0.0.5,alice,session" + std::to_string(i) + ",99000,99500,1,0,link\n";
        writeRecords(text);
    }
    static int check(int session) {
        char user[64] = {};
        return checkSession(("session" + std::to_string(session)).c_str(), "link", user, sizeof user, 15);
    }
    static int lookUp(int session) {
        _tag_VexoCgi request = {orvel::kRecordLock, orvel::kRecordFile, {{"id", "session" + std::to_string(session)}}};
        char user[64] = {}, link[] = "link";
        return VexoCgiHasRecord(&request, user, sizeof user, link);
    }
    static pid_t start(const std::function<bool()>& body) {
        const pid_t child = fork();
        if (child == 0) _exit(body() ? 0 : 1);
        return child;
    }
};

TEST_F(SessionStormTest, KilledProcessesLoseNothing) {
    const char* wanted = getenv("ORVEL_TEST_STORM_SECONDS");
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(wanted == nullptr ? 3 : atoi(wanted));
    // Adders write down the link of each record that they were told to be in the file.
    const std::string acknowledged = systemRoot() + "/acknowledged";
    writeFile(acknowledged, "");
    const auto adder = [&] {
        const int fd = open(acknowledged.c_str(), O_WRONLY | O_APPEND | O_CLOEXEC);
        const std::string name = "p" + std::to_string(getpid()) + "n";
        for (int i = 0;; ++i) {
            const std::string user = name + std::to_string(i), line = user + "\n";
            std::string session;
            if (!orvel::addLoginRecord(user.c_str(), session, 0, user.c_str())) return false;
            if (write(fd, line.data(), line.size()) != static_cast<ssize_t>(line.size())) return false;
        }
    };
    const auto checker = [] {
        for (int i = 0; check(i % kSessions) == 1; i += 7) {
        }
        return false;
    };
    const auto looker = [] {
        for (int i = 0; lookUp(i % kSessions) == 1; i += 11) {
        }
        return false;
    };
    std::vector<std::function<bool()>> roles = {looker, looker};
    for (int i = 0; i < 8; ++i) roles.insert(roles.end(), {adder, checker});
    std::vector<pid_t> running;
    for (const auto& role : roles) running.push_back(start(role));
    const auto killOne = [&](size_t victim) {
        kill(running[victim], SIGKILL);
        int status = 0;
        waitpid(running[victim], &status, 0);
        EXPECT_TRUE(WIFSIGNALED(status)) << "process " << victim << " had given up";
        running[victim] = 0;
    };
    std::minstd_rand random(20120101);
    int samples = 0;
    while (std::chrono::steady_clock::now() < end && !HasFailure()) {
        std::this_thread::sleep_for(20ms);
        EXPECT_EQ(statusOf(path(orvel::kRecordFile)).st_mode, S_IFREG | 0600U);
        const size_t victim = random() % roles.size();
        killOne(victim);
        running[victim] = start(roles[victim]);
        ++samples;
    }
    for (size_t i = 0; i < running.size(); ++i) killOne(i);
    const int lock = VexoCgiBeginCriticalSection(orvel::kRecordLock, 1000);
    EXPECT_GE(lock, 0) << "the section is free after the last kill";
    VexoCgiEndCriticalSection(lock);

    const std::string text = records();
    std::string again;
    std::string_view rest = text;
    size_t records = 0;
    for (orvel::LoginRecord record; orvel::nextLoginRecord(rest, orvel::kLongestCheckedLine, record); ++records) {
        orvel::appendLoginRecord(record, again);
    }
    EXPECT_EQ(again, text) << "a line is torn";
    std::istringstream links(readFile(acknowledged));
    size_t added = 0;
    for (std::string link; std::getline(links, link); ++added) {
        EXPECT_NE(text.find(",0," + link + "\n"), std::string::npos) << "lost: " << link;
    }
    EXPECT_GE(records, kSessions + added);
    EXPECT_GT(added, 0U);
    printf("%d kills, %zu records added, %zu in the file\n", samples, added, records);
}

}  // namespace
