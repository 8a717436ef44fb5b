// Waiting for what another process does: bounded, and it says what it waited for.
#ifndef ORVEL_TESTS_SUPPORT_WAIT_H
#define ORVEL_TESTS_SUPPORT_WAIT_H

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <string>
#include <thread>

namespace support {

// Looks until `isSo`, a minute at most; false, with a failure that names `what`, when it never came.
inline bool waitUntil(const std::string& what, const std::function<bool()>& isSo) {
    using namespace std::chrono_literals;
    for (const auto end = std::chrono::steady_clock::now() + 60s; std::chrono::steady_clock::now() < end;) {
        if (isSo()) return true;
        std::this_thread::sleep_for(5ms);
    }
    if (isSo()) return true;
    ADD_FAILURE() << "waited a minute in vain for " << what;
    return false;
}

}  // namespace support

#endif
