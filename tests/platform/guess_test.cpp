// Whose guess at a password is judged when. The time stands where a test puts it.
//   ORVEL_TEST_GUESSERS: how many addresses fill the table, 9,000 without it.
#include "vexo/guess.h"

#include <queue>

#include "platform/trust.h"
#include "web/guess_rules.h"
#include "web/keyed_hash.h"

namespace {

using Time = long long;  // milliseconds

constexpr const char* kLink = "link";

class GuessTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        setTime(1000000);
    }
    void setTime(Time time) {
        now_ = time;
        setenv("VEXO_GATE_MILLISECONDS", std::to_string(time).c_str(), 1);
    }
    // One guess of an address; 0 when it was judged, else how long to wait. Keeps the turn for the next call.
    int guess(const std::string& address, bool right = false, const std::string& what = kLink, bool known = false) {
        std::string& turn = turns_[what + address];
        VEXOGUESS answer;
        const int judged = VEXOGuessBegin(what.c_str(), address.c_str(), turn.c_str(), known ? 1 : 0, &answer);
        EXPECT_GE(judged, 0);
        turn = answer.turn;
        if (judged != 1) return answer.wait;
        return VEXOGuessEnd(what.c_str(), address.c_str(), right ? 1 : 0, &answer) == 1 ? 0 : answer.wait;
    }
    // Guesses until it is judged, and says how long that took.
    Time guessPatiently(const std::string& address) {
        const Time begin = now_;
        for (int wait = guess(address); wait > 0; wait = guess(address)) setTime(now_ + wait);
        return now_ - begin;
    }
    static std::string addressOf(int number) {
        return "10." + std::to_string(number >> 16) + '.' + std::to_string(number >> 8 & 255) + '.' +
               std::to_string(number & 255);
    }
    Time now_ = 0;
    std::map<std::string, std::string> turns_;
    std::string file_ = systemRoot() + "/run/vexo/guesses";
};

TEST(KeyedHash, KnownAnswers) {
    const vexo::HashKey key = {0x0706050403020100U, 0x0f0e0d0c0b0a0908U};
    EXPECT_EQ(vexo::keyedHash(key, ""), (vexo::Hash{0xe6a825ba047f81a3U, 0x930255c71472f66dU}));
    EXPECT_EQ(vexo::keyedHash(key, {"\0", 1}), (vexo::Hash{0x44af996bd8c187daU, 0x45fc229b11597634U}));
}

TEST_F(GuessTest, AnAddressIsJudgedMoreAndMoreSlowlyAtThatLinkOnly) {
    EXPECT_EQ(guessPatiently("192.0.2.1"), 0);
    for (const Time wait : {2, 4, 8, 16, 32, 60, 60}) EXPECT_EQ(guessPatiently("192.0.2.1"), wait * 1000);
    EXPECT_EQ(guess("::ffff:192.0.2.1"), 60000) << "the same address";
    EXPECT_EQ(guess("192.0.2.1", true, "other"), 1000) << "a second between any two";
    setTime(now_ + 1000);
    EXPECT_EQ(guess("192.0.2.1", true, "other"), 0);
    EXPECT_EQ(guess("192.0.2.1"), 59000) << "a log-in elsewhere takes nothing back";
    EXPECT_EQ(guess("192.0.2.2"), 0);
    setTime(now_ + 59000);
    EXPECT_EQ(guess("192.0.2.1", true), 0);
    EXPECT_EQ(guessPatiently("192.0.2.1"), 1000) << "after a right one";
    EXPECT_EQ(guessPatiently("192.0.2.1"), 60000);
    setTime(now_ + 60000 + 10 * 60000);
    EXPECT_EQ(guessPatiently("192.0.2.1"), 0);
    EXPECT_EQ(guessPatiently("192.0.2.1"), 2000) << "forgotten after ten quiet minutes";
    setTime(now_ + 4000);
    EXPECT_EQ(guess("192.0.2.1", true), 0);
    for (const Time wait : {1, 8}) EXPECT_EQ(guessPatiently("192.0.2.1"), wait * 1000) << "the right one took one back";

    EXPECT_EQ(guess("2001:db8:1:2::3", false, "six"), 0);
    EXPECT_EQ(guess("2001:db8:1:2:ffff::", false, "six"), 2000) << "64 bits are one client";
    EXPECT_EQ(guess("2001:db8:1:3::3", false, "six"), 200);
    EXPECT_EQ(guess("unknown", false, "text"), 0);
    EXPECT_EQ(guess("_hidden", false, "text"), 2000) << "whatever is not an address is one";
    EXPECT_EQ(VEXOGuessWrong("cookie", "192.0.2.9"), 0);
    EXPECT_EQ(guess("192.0.2.9", false, "cookie"), 2000) << "what was recognised as wrong counts";
    EXPECT_FAILS(VEXOGuessWrong("", "192.0.2.9"), EINVAL, VEXO_ERR_PARAMETER);
}

TEST_F(GuessTest, TurnsAreKeptAndBelongToWhoGotThem) {
    EXPECT_EQ(guess("192.0.2.1"), 0);
    EXPECT_EQ(guess("192.0.2.2"), 200);
    EXPECT_EQ(guess("192.0.2.3"), 400);
    setTime(now_ + 100);
    EXPECT_EQ(guess("192.0.2.2"), 100) << "asking again changes nothing";
    EXPECT_EQ(guess("192.0.2.4"), 500);
    turns_[kLink + std::string("192.0.2.2")] = turns_[kLink + std::string("192.0.2.3")];
    EXPECT_EQ(guess("192.0.2.2"), 5100) << "not the turn of this address: until that is over";
    setTime(now_ + 300 + 4900);
    EXPECT_EQ(guess("192.0.2.3"), 0) << "late, but in time";
    EXPECT_EQ(guess("192.0.2.4"), 200) << "not even who is late comes within the fifth of a second";
    setTime(now_ + 200);
    EXPECT_EQ(guess("192.0.2.4"), 0);
    EXPECT_EQ(guess("192.0.2.2"), 200) << "a lost turn: the address gets another one";
    EXPECT_EQ(guess("192.0.2.5", true, kLink, true), 0) << "who has known the password passes by the order";
    EXPECT_EQ(guess("192.0.2.5", true, kLink, true), 1000) << "but not by the pace";
}

TEST_F(GuessTest, TwoAtOnceOnTheWholeMachine) {
    VEXOGUESS first, second;
    int seated[2];
    char word = 0;
    ASSERT_EQ(pipe(seated), 0);
    EXPECT_EQ(VEXOGuessBegin("a", "192.0.2.1", "", 0, &first), 1);
    const pid_t other = fork();
    if (other == 0) {
        const bool begun = VEXOGuessBegin("b", "192.0.2.1", "", 0, &second) == 0 &&  // too early for the address
                           VEXOGuessBegin("b", "192.0.2.2", "", 0, &second) == 1;
        _exit(begun && write(seated[1], "x", 1) == 1 && pause() != 0 ? 0 : 1);
    }
    close(seated[1]);
    EXPECT_EQ(read(seated[0], &word, 1), 1) << "until the other process has its seat, or has ended";
    close(seated[0]);
    EXPECT_EQ(guess("192.0.2.3", false, "c"), 100);
    kill(other, SIGKILL);
    waitpid(other, nullptr, 0);
    EXPECT_EQ(guess("192.0.2.3", false, "c"), 0) << "the dead hold no seat, and the turn was kept";
    EXPECT_EQ(VEXOGuessEnd("a", "192.0.2.1", 0, &first), 1);
}

TEST_F(GuessTest, LogInsOfALinkInAMinute) {
    const Time begin = now_;
    for (int i = 0; i < 64; ++i) EXPECT_EQ(guess(addressOf(i), true, kLink, true), 0);
    EXPECT_EQ(guess(addressOf(64), true, kLink, true), 60000);
    EXPECT_EQ(guess(addressOf(65), true, "other"), 0);
    setTime(begin + 100);
    EXPECT_EQ(guess(addressOf(66), true), 59900) << "the order goes on behind the minute";
    EXPECT_EQ(guess(addressOf(67), true), 60100);
    setTime(begin + 60000);
    EXPECT_EQ(guess(addressOf(66), true), 0);
    setTime(begin + 60200);
    EXPECT_EQ(guess(addressOf(67), true), 0);
}

TEST_F(GuessTest, SixtyProcessesAtOnceAreJudgedOnce) {
    EXPECT_EQ(countAtOnce(60, [&] { return guess("192.0.2.1") == 0; }), 1);
}

// `count` addresses guess as often as they may while a visitor comes at `arrival`: what he waits, and what was judged.
struct Storm {
    Time waited = 0;
    int mostInASecond = 0;
};

class GuessStorm : public GuessTest {
 protected:
    // Of those who have a turn every third comes late, as late as he may.
    Storm storm(int count, int guesses, Time arrival) {
        using Event = std::pair<Time, int>;
        std::priority_queue<Event, std::vector<Event>, std::greater<>> events;
        const Time begin = now_;
        Storm seen;
        for (int i = 0; i < count; ++i) events.emplace(begin + i % 50, i);
        std::vector<Time> judged;
        Time due = begin + arrival, came = 0;
        for (int asked = 0; asked < guesses || came == 0;) {
            const auto [time, who] = events.top();
            if (came == 0 && due <= time) {
                setTime(due);
                const int wait = guess("192.0.2.77", true);
                due += wait;
                if (wait == 0) came = now_;
                continue;
            }
            events.pop();
            setTime(time);
            ++asked;
            const int wait = guess(addressOf(who));
            if (wait == 0) judged.push_back(now_);
            events.emplace(now_ + std::max(wait, 1) + (who % 3 == 0 ? 4900 : 0), who);
        }
        for (size_t i = 0, first = 0; i < judged.size(); ++i) {
            while (judged[i] - judged[first] >= 1000) ++first;
            seen.mostInASecond = std::max(seen.mostInASecond, static_cast<int>(i - first + 1));
        }
        seen.waited = came - begin - arrival;
        return seen;
    }
};

TEST_F(GuessStorm, TheRightPasswordIsAnsweredInTurn) {
    for (const auto& [count, arrival, limit] :
         Rows<int, Time, Time>{row(100, 30000, 19000), row(1000, 1500, 199000), row(1000, 600000, 199000)}) {
        fs::remove(file_);
        turns_.clear();
        const Storm seen = storm(count, 10000, arrival);
        EXPECT_LE(seen.waited, limit) << "a log-in takes one more second";
        EXPECT_LE(seen.mostInASecond, 5);
        EXPECT_EQ(guess("192.0.2.78", true, "other"), 0);
    }
}

// More addresses than the table has places: nobody is shut out for good.
TEST_F(GuessStorm, StrangersWhoFillTheTable) {
    const char* wanted = getenv("ORVEL_TEST_GUESSERS");
    const int count = wanted == nullptr ? 9000 : atoi(wanted);
    const Storm seen = storm(count, count * 4, 60000);
    EXPECT_LE(seen.waited, 8192 * 200 * 4) << "a few times the longest order";
    EXPECT_LE(seen.mostInASecond, 5);
    for (int i = 0; i < 20; ++i)
        EXPECT_EQ(guess("192.0.2." + std::to_string(100 + i), true, "other" + std::to_string(i)), 0);
    EXPECT_LT(fs::file_size(file_), 500000U);
}

TEST_F(GuessTest, TheFileIsTrustedOrBegunAnew) {
    char seal[33], again[33];
    for (const auto& [text, isSame] : Rows<const char*, bool>{{"text", true}, {"other", false}}) {
        EXPECT_TRUE(VEXOGuessSeal("text", seal) == 0 && VEXOGuessSeal(text, again) == 0);
        EXPECT_EQ(std::string(seal).size(), 32U);
        EXPECT_EQ(std::string(seal) == again, isSame);
    }
    EXPECT_EQ(statusOf(file_).st_mode & 07777, 0600U);
    const std::string whole = readFile(file_);
    std::string oldBoot = whole, oldFormat = whole;
    oldBoot[8] ^= 1;
    oldFormat[0] ^= 1;
    for (const std::string& text : {oldBoot, oldFormat, whole.substr(0, 100), std::string()}) {
        guess("192.0.2.1");
        writeFile(file_, text, 0600);
        EXPECT_EQ(guess("192.0.2.1"), 0) << "nothing is known";
        EXPECT_EQ(guess("192.0.2.1"), 2000);
        EXPECT_EQ(VEXOGuessSeal("text", again), 0);
        EXPECT_STRNE(seal, again);
    }
    plantEach(file_, [&] {
        VEXOGUESS answer;
        EXPECT_REFUSED(VEXOGuessBegin(kLink, "192.0.2.1", nullptr, 0, &answer));
        EXPECT_REFUSED(VEXOGuessSeal("text", seal));
        EXPECT_STREQ(seal, "");
    });
    if (geteuid() != 0) return;
    actingForAlice([&] { EXPECT_EQ(guess("192.0.2.1"), 0); });
    EXPECT_EQ(statusOf(file_).st_uid, 0U);
}

}  // namespace
