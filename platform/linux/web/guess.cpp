#include "vexo/guess.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <exception>
#include <string>
#include <string_view>

#include "base/raised_identity.h"
#include "failure.h"
#include "fault_gate.h"
#include "io/trusted_file.h"
#include "web/guess_rules.h"
#include "web/guess_table.h"

namespace {

using vexo::Guessed;
using vexo::Guesser;
using vexo::Slot;

constexpr std::int64_t kBusy = 100;  // both seats are taken, each for some twenty milliseconds
constexpr size_t kTurnLength = 32;

// Milliseconds of the machine's run. Tests set the time, so that it never decides.
std::int64_t currentTime() {
#ifdef VEXO_FAULT_GATE
    if (const char* set = getenv("VEXO_GATE_MILLISECONDS")) return strtoll(set, nullptr, 10);
#endif
    timespec now{};
    clock_gettime(CLOCK_BOOTTIME, &now);
    return now.tv_sec * std::int64_t{1000} + now.tv_nsec / 1000000;
}

// The open table with the records of one guesser at one thing.
struct Guess {
    vexo::GuessTable table;
    std::int64_t now = 0;
    std::string pair;  // both names
    Slot<Guessed> thing;
    Slot<Guesser> here, anywhere;

    // False with errno.
    [[nodiscard]] bool open(const char* what, const char* address) {
        if (!table.open()) return false;
        now = currentTime();
        const std::string client = vexo::clientOf(address);
        pair = std::string(what) + '\n' + client;
        return table.findThing(keyOf(std::string("thing\n") + what), now, thing) &&
               table.findGuesser(keyOf("here\n" + pair), now, here) &&
               table.findPace(keyOf("anywhere\n" + client), now, anywhere);
    }
    [[nodiscard]] bool save() { return table.save(thing) && table.save(here) && table.save(anywhere); }
    // What only the table can make of the turn that the guesser has.
    [[nodiscard]] std::string turnText() {
        const vexo::Hash hash = table.hash("turn\n" + std::to_string(here.record.turn) + '\n' + pair);
        return textOf(hash);
    }
    static std::string textOf(const vexo::Hash& hash) {
        char text[kTurnLength + 1];
        snprintf(text, sizeof text, "%016lx%016lx", hash[0], hash[1]);
        return text;
    }

 private:
    [[nodiscard]] std::uint64_t keyOf(std::string_view name) const { return table.hash(name)[0]; }
};

int fail() {
    return vexo::fail(vexo::errorOfFile(errno));
}

bool isGiven(const char* text) {
    return text != nullptr && *text != '\0';
}

void wait(VEXOGUESS& answer, std::int64_t time, const std::string& turn) {
    answer.wait = static_cast<int>(std::clamp<std::int64_t>(time, 1, INT_MAX));
    snprintf(answer.turn, sizeof answer.turn, "%s", turn.c_str());
}

// Whether the guess may be judged now; else `answer` says when.
bool isDue(Guess& guess, const char* turn, bool known, VEXOGUESS& answer) {
    const bool holder = isGiven(turn) && guess.here.record.turn != 0 && guess.turnText() == turn;
    vexo::GuessVerdict verdict;
    if (known) {
        const std::int64_t pace = guess.anywhere.record.next - guess.now;
        verdict = {.now = pace <= 0, .wait = pace, .hasTurn = holder};
    } else if (guess.here.at < 0 && guess.thing.record.nextTurn > guess.now) {
        verdict = {.now = false, .wait = guess.here.record.ends - guess.now, .hasTurn = false};
    } else {
        verdict = judgeTurn(guess.thing.record, guess.here.record, guess.anywhere.record, holder, guess.now);
    }
    if (verdict.now && guess.table.takeSeat()) return true;
    wait(answer, verdict.now ? kBusy : verdict.wait, verdict.hasTurn ? guess.turnText() : "");
    return false;
}

}  // namespace

int VEXOGuessBegin(const char* what, const char* address, const char* turn, int known, VEXOGUESS* answer) try {
    if (answer != nullptr) *answer = {.wait = 0, .turn = "", .seat = -1};
    VEXO_GATE("VEXOGuessBegin", -1);
    if (!isGiven(what) || address == nullptr || answer == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    const orvel::RaisedIdentity raised;
    Guess guess;
    if (!guess.open(what, address)) return fail();
    const bool due = isDue(guess, turn, known != 0, *answer);
    if (due) vexo::grant(guess.here.record, guess.anywhere.record, guess.now);
    if (!guess.save()) return fail();
    if (due) answer->seat = guess.table.unlock().release();
    errno = before;
    return static_cast<int>(due);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOGuessEnd(const char* what, const char* address, int right, VEXOGUESS* answer) try {
    if (answer != nullptr && answer->seat >= 0) {
        close(answer->seat);
        answer->seat = -1;
    }
    VEXO_GATE("VEXOGuessEnd", -1);
    if (!isGiven(what) || address == nullptr || answer == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    if (right == 0) return 1;  // it has been counted since it began
    const int before = errno;
    const orvel::RaisedIdentity raised;
    Guess guess;
    if (!guess.open(what, address)) return fail();
    vexo::rightGuess(guess.here.record, guess.now);
    const std::int64_t time = vexo::countLogIn(guess.thing.record, guess.now);
    if (!guess.save()) return fail();
    if (time > 0) wait(*answer, time, "");
    errno = before;
    return static_cast<int>(time == 0);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOGuessWrong(const char* what, const char* address) try {
    VEXO_GATE("VEXOGuessWrong", -1);
    if (!isGiven(what) || address == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    const orvel::RaisedIdentity raised;
    Guess guess;
    if (!guess.open(what, address)) return fail();
    vexo::wrongGuess(guess.here.record, guess.now);
    if (!guess.save()) return fail();
    errno = before;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOGuessSeal(const char* text, char* seal) try {
    if (seal != nullptr) *seal = '\0';
    VEXO_GATE("VEXOGuessSeal", -1);
    if (text == nullptr || seal == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    const orvel::RaisedIdentity raised;
    vexo::GuessTable table;
    if (!table.open()) return fail();
    const std::string made = Guess::textOf(table.hash(std::string("seal\n") + text));
    made.copy(seal, kTurnLength);
    seal[kTurnLength] = '\0';
    errno = before;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
