// One operation under every single fault of the platform.
#ifndef ORVEL_TESTS_SUPPORT_FAULT_SWEEP_H
#define ORVEL_TESTS_SUPPORT_FAULT_SWEEP_H

#include <gtest/gtest.h>

#include <cerrno>
#include <functional>

#include "fault_gate.h"
#include "support/appliance.h"

namespace support {

// Runs `operation` with the platform's call 1, 2, 3... failing (platform error `code`), until a run meets no fault any
// more, and returns how many runs met one. `operation` gets the number of the failing call, 0 in the last, clean run,
// and checks what must hold then. `call` names the one kind of call that fails.
inline int sweepFaults(int code, const std::function<void(int)>& operation, const char* call = "*") {
    constexpr int kLimit = 500;
    for (int nth = 1; nth < kLimit; ++nth) {
        vexo::gate::reset();
        vexo::gate::fail(call, code, EIO, nth);
        const int before = openDescriptors();
        SCOPED_TRACE("call " + std::to_string(nth) + " fails");
        operation(nth);
        EXPECT_EQ(openDescriptors(), before);
        takeLog();
        if (vexo::gate::calls(call) >= nth) continue;
        vexo::gate::reset();
        operation(0);
        return nth - 1;
    }
    ADD_FAILURE() << "no run without a fault";
    return kLimit;
}

}  // namespace support

#endif
