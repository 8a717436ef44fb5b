// Waiting for what another process does: bounded, and it says what it waited for.
#ifndef ORVEL_TESTS_SUPPORT_WAIT_H
#define ORVEL_TESTS_SUPPORT_WAIT_H

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <csignal>
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

// The wait status of the child at its end; one that has not ended after `limit` is killed, which is a failure.
inline int waitForEnd(pid_t child, const std::string& what, std::chrono::minutes limit = std::chrono::minutes(4)) {
    const int handle = static_cast<int>(syscall(SYS_pidfd_open, child, 0));
    pollfd end = {.fd = handle, .events = POLLIN, .revents = 0};
    if (handle >= 0 && poll(&end, 1, static_cast<int>(std::chrono::milliseconds(limit).count())) == 0) {
        ADD_FAILURE() << "waited " << limit.count() << " minutes in vain for the end of " << what;
        kill(child, SIGKILL);
    }
    close(handle);
    int status = -1;
    EXPECT_EQ(TEMP_FAILURE_RETRY(waitpid(child, &status, 0)), child) << what;
    return status;
}

}  // namespace support

#endif
