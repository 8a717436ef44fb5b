#include "fault_gate.h"

#ifdef VEXO_FAULT_GATE

#include <map>
#include <string>
#include <vector>

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

}  // namespace

Verdict ask(const char* operation) {
    const int savedErrno = errno;
    State& now = state();
    ++now.calls[operation];
    ++now.calls["*"];
    Verdict verdict{false, 0, 0};
    // Every order counts the call, also when an earlier one has decided it.
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
