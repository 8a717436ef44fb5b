#include "web/guess_rules.h"

#include <arpa/inet.h>
#include <netinet/in.h>

#include <algorithm>

#include "web/auto_block_rules.h"

namespace vexo {
namespace {

constexpr std::int64_t kLongestDelay = 60 * 1000;
constexpr std::int64_t kMemory = 10 * 60 * 1000;  // of wrong guesses
constexpr std::int64_t kMinute = 60 * 1000;
constexpr std::int64_t kLate = 5000;        // to a turn: a page in the background is woken up once a second
constexpr std::int64_t kLateToCall = 2000;  // a call lies near, so its time is easily met

// The next time at which one more may be judged there.
std::int64_t call(Guessed& thing, std::int64_t now) {
    const std::int64_t time = std::max(now, thing.nextJudged);
    thing.nextJudged = time + kGuessSlot;
    return time;
}

GuessVerdict waitFor(std::int64_t time, std::int64_t now, bool hasTurn) {
    return {.now = false, .wait = std::max<std::int64_t>(time - now, 1), .hasTurn = hasTurn};
}

void note(Guesser& guesser) {
    const std::int64_t remembered = guesser.wrong > 0 ? kMemory : 0;
    guesser.ends = std::max(endOfTurn(guesser), guesser.next + remembered);
}

void note(Guessed& thing) {
    thing.ends = std::max({thing.nextTurn, thing.nextJudged, thing.minute + kMinute});
}

}  // namespace

std::int64_t delayAfter(std::uint32_t wrong) {
    return wrong >= 6 ? kLongestDelay : kGuessPace << wrong;
}

std::int64_t endOfTurn(const Guesser& guesser) {
    if (guesser.turn == 0) return 0;
    return guesser.turn + (guesser.called != 0 ? kLateToCall : kLate);
}

GuessVerdict judgeTurn(Guessed& thing, Guesser& here, const Guesser& anywhere, bool holder, std::int64_t now) {
    if (here.turn != 0 && now >= endOfTurn(here)) here.turn = 0;
    if (here.turn != 0 && !holder) return waitFor(endOfTurn(here), now, false);
    // Its own pace comes first: a turn that it could not use would only make others wait.
    const std::int64_t earliest = std::max(here.turn == 0 ? here.next : 0, anywhere.next);
    if (now < earliest) return waitFor(earliest, now, here.turn != 0);
    if (here.turn == 0) {
        here.turn = std::max(now, thing.nextTurn);
        here.called = 0;
        thing.nextTurn = here.turn + kGuessSlot;
    }
    if (here.called == 0 && now >= here.turn) {
        here.turn = call(thing, now);
        here.called = 1;
    }
    note(here);
    note(thing);
    if (now < here.turn) return waitFor(here.turn, now, true);
    return {.now = true, .wait = 0, .hasTurn = true};
}

void grant(Guesser& here, Guesser& anywhere, std::int64_t now) {
    here.turn = 0;
    wrongGuess(here, now);
    anywhere.next = now + kGuessPace;
    note(anywhere);
}

void wrongGuess(Guesser& here, std::int64_t now) {
    here.wrong = std::min<std::uint32_t>(here.wrong + 1, 1000);
    here.next = now + delayAfter(here.wrong);
    note(here);
}

void rightGuess(Guesser& here, std::int64_t now) {
    if (here.wrong > 0) --here.wrong;
    here.next = now + kGuessPace;
    note(here);
}

std::int64_t countLogIn(Guessed& thing, std::int64_t now) {
    if (now >= thing.minute + kMinute) {
        thing.minute = now;
        thing.logIns = 0;
    }
    const bool full = thing.logIns >= kMostLogInsInAMinute;
    if (full) {
        // The order goes on behind the minute, so that whoever knows the password cannot keep others out.
        thing.nextTurn = std::max(thing.nextTurn, thing.minute + kMinute);
        thing.nextJudged = std::max(thing.nextJudged, thing.minute + kMinute);
    } else {
        ++thing.logIns;
    }
    note(thing);
    return full ? thing.minute + kMinute - now : 0;
}

std::string clientOf(const char* address) {
    const auto normal = normaliseAddress(address);
    in6_addr six{};
    if (!normal) return "";
    if (inet_pton(AF_INET6, normal->c_str(), &six) != 1) return *normal;
    return std::string(reinterpret_cast<const char*>(six.s6_addr), 8);
}

}  // namespace vexo
