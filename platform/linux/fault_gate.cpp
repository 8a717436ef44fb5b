#include "fault_gate.h"

#ifdef VEXO_FAULT_GATE

#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "io/file_io.h"

namespace vexo::gate {
namespace {

struct Order {
    std::string operation;
    Verdict verdict;
    int remaining;  // calls until it strikes; 0 strikes at every call
};

// Made at first use and never destroyed: operations also run before main and at exit.
struct State {
    std::vector<Order> orders;
    std::map<std::string, int, std::less<>> calls;
};

State& state() {
    static State& value = *new State;
    return value;
}

struct Hold {
    std::string operation, file;
};

// VEXO_GATE_HOLD: "OPERATION=FILE;OPERATION=FILE".
std::vector<Hold> orderedHolds() {
    std::vector<Hold> holds;
    const char* text = getenv("VEXO_GATE_HOLD");
    for (std::string_view rest = text == nullptr ? "" : text; !rest.empty();) {
        const std::string_view one = rest.substr(0, rest.find(';'));
        rest.remove_prefix(std::min(rest.size(), one.size() + 1));
        const size_t equals = std::min(one.find('='), one.size());
        holds.push_back(
            {std::string(one.substr(0, equals)), std::string(one.substr(std::min(equals + 1, one.size())))});
    }
    return holds;
}

// Takes signals while it waits, and at no other moment.
class SignalWait {
 public:
    SignalWait() {
        sigset_t all;
        sigfillset(&all);
        pthread_sigmask(SIG_SETMASK, &all, &before_);
    }
    ~SignalWait() { pthread_sigmask(SIG_SETMASK, &before_, nullptr); }
    SignalWait(const SignalWait&) = delete;
    SignalWait& operator=(const SignalWait&) = delete;

    // False when a signal ended it.
    [[nodiscard]] bool pause() const {
        constexpr timespec kPause{0, 2'000'000};
        return ppoll(nullptr, 0, &kPause, &before_) == 0;
    }

 private:
    sigset_t before_{};
};

bool letGo = false;  // by a signal: to the end of the process

void holdAt(const Hold& order) {
    constexpr int kPauses = 30'000;  // a minute
    const SignalWait wait;
    const Descriptor file = openFile(AT_FDCWD, order.file.c_str(), O_WRONLY | O_APPEND);
    struct stat shut {};
    if (!file || fstat(file.get(), &shut) != 0) return;
    dprintf(file.get(), "%d is held before %s\n", getpid(), order.operation.c_str());
    for (int i = 0; i < kPauses; ++i) {
        struct stat now {};
        // While it is open no other file can have its number.
        if (stat(order.file.c_str(), &now) != 0 || now.st_ino != shut.st_ino) return;
        letGo = !wait.pause();
        if (letGo) return;
    }
    dprintf(file.get(), "%d gives up: held before %s for a minute\n", getpid(), order.operation.c_str());
    abort();
}

}  // namespace

Verdict ask(const char* operation) {
    const int savedErrno = errno;
    static const std::vector<Hold>& holds = *new std::vector<Hold>(orderedHolds());
    for (const Hold& order : holds) {
        if (order.operation == operation && !letGo) holdAt(order);
    }
    State& now = state();
    ++now.calls[operation];
    ++now.calls["*"];
    Verdict verdict{false, 0, 0};
    // Every order counts the call, even if an earlier one has decided it.
    for (auto order = now.orders.begin(); order != now.orders.end();) {
        if (order->operation != "*" && order->operation != operation) {
            ++order;
            continue;
        }
        const bool always = order->remaining == 0;
        const bool strikes = always || --order->remaining == 0;
        if (strikes && !verdict.fail) verdict = order->verdict;
        order = strikes && !always ? now.orders.erase(order) : order + 1;
    }
    errno = savedErrno;
    return verdict;
}

void fail(const char* operation, int code, int systemCode, int nth) {
    state().orders.push_back({operation, {true, code, systemCode}, nth});
}

void reset() {
    state() = {};
}

int calls(const char* operation) {
    const auto found = state().calls.find(operation);
    return found == state().calls.end() ? 0 : found->second;
}

}  // namespace vexo::gate

#endif
