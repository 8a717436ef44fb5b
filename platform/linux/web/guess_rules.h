// Whose guess at a password is judged when. Pure; times are milliseconds of one clock.
#ifndef VEXO_LINUX_GUESS_RULES_H
#define VEXO_LINUX_GUESS_RULES_H

#include <cstdint>
#include <string>

namespace vexo {

// What is guessed at. As it stands in the file.
struct Guessed {
    std::uint64_t key = 0;
    std::int64_t ends = 0;        // from then on it says nothing
    std::int64_t nextTurn = 0;    // the first turn that nobody was given
    std::int64_t nextJudged = 0;  // the first time at which nobody is judged yet
    std::int64_t minute = 0;      // the begin of the minute in which
    std::int64_t logIns = 0;      // so many logged in
};

// Who guesses: an address at one thing, or, for the pace alone, an address anywhere. As it stands in the file.
struct Guesser {
    std::uint64_t key = 0;
    std::int64_t ends = 0;     // from then on it says nothing
    std::int64_t next = 0;     // not judged before
    std::int64_t turn = 0;     // its turn, 0 while it has none
    std::uint32_t wrong = 0;   // guesses that were wrong, or are being judged
    std::uint32_t called = 0;  // 1: the turn is the very time at which it is judged
};

struct GuessVerdict {
    bool now = false;       // judge it, once grant() has noted it
    std::int64_t wait = 0;  // else: ask again after so long,
    bool hasTurn = false;   // with the turn that the guesser has
};

inline constexpr std::int64_t kGuessPace = 1000;  // between two guesses of an address
inline constexpr std::int64_t kGuessSlot = 200;   // between two guesses at one thing
inline constexpr std::int64_t kMostLogInsInAMinute = 64;

// How long a guesser with so many wrong guesses waits for the next.
std::int64_t delayAfter(std::uint32_t wrong);

// When the turn of a guesser is lost; 0 for one without.
std::int64_t endOfTurn(const Guesser& guesser);

// `holder`: whoever asks has shown that the turn of `here`, the address at this thing, is his. `anywhere` is the
// address on the whole machine. Gives a turn to who has none and may have one. Turns are given 200 ms apart, in the
// order in which guessers come. Who comes late to his turn, but within five seconds, is called in the same way: so
// however many come at once, no two are judged within 200 ms, and nobody who comes in time is pushed aside.
GuessVerdict judgeTurn(Guessed& thing, Guesser& here, const Guesser& anywhere, bool holder, std::int64_t now);

// Notes a guess that is judged from now on: wrong until rightGuess() takes that back.
void grant(Guesser& here, Guesser& anywhere, std::int64_t now);
void wrongGuess(Guesser& here, std::int64_t now);
void rightGuess(Guesser& here, std::int64_t now);

// Counts a log-in: 0, or how long nobody more may log in, and be judged, there.
std::int64_t countLogIn(Guessed& thing, std::int64_t now);

// What counts as one client: an IPv4 address, the first 64 bits of an IPv6 address, "" for what is not an address.
std::string clientOf(const char* address);

}  // namespace vexo

#endif
