// Tests that mount file systems of their own.
#ifndef ORVEL_TESTS_PLATFORM_PRIVATE_MOUNTS_H
#define ORVEL_TESTS_PLATFORM_PRIVATE_MOUNTS_H

#include <sched.h>
#include <sys/mount.h>

#include <functional>

#include "support/appliance.h"

namespace support {

constexpr int kNoPrivateMounts = 96;

// Runs `body` in a forked child whose mounts nobody else sees. Its result, or kNoPrivateMounts where the machine does
// not allow that. Whole programs of tests run in here, so the limit is for the longest of them.
inline int inPrivateMounts(const std::function<int()>& body) {
    const auto whole = [&] {
        if (unshare(CLONE_NEWNS) != 0 || mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0)
            return kNoPrivateMounts;
        return body();
    };
    return inChild(whole, std::chrono::hours(5));
}

}  // namespace support

// Skips the test, with the reason, when `result` says that there were no private mounts; it must be 0 otherwise.
#define EXPECT_WITH_PRIVATE_MOUNTS(result)                                                                  \
    do {                                                                                                    \
        const int childResult = (result);                                                                   \
        if (childResult == support::kNoPrivateMounts) GTEST_SKIP() << "needs a mount namespace of its own"; \
        EXPECT_EQ(childResult, 0);                                                                          \
    } while (false)

#endif
