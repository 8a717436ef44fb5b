// Real processes: one that changes a place without end beside the one under test, many at once, one that is killed.
#ifndef ORVEL_TESTS_SUPPORT_RACE_H
#define ORVEL_TESTS_SUPPORT_RACE_H

#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstdlib>
#include <ctime>
#include <functional>
#include <vector>

#include "support/wait.h"

namespace support {

// Does `step` again and again in a process of its own, as another user where a uid is given.
class Rival {
 public:
    explicit Rival(const std::function<void()>& step, uid_t uid = 0) : process_(fork()) {
        if (process_ != 0) return;
        prctl(PR_SET_PDEATHSIG, SIGKILL);
        if (uid != 0 && setuid(uid) != 0) _exit(1);
        for (;;) step();
    }
    ~Rival() {
        EXPECT_EQ(waitpid(process_, nullptr, WNOHANG), 0) << "the rival ended early";
        kill(process_, SIGKILL);
        waitpid(process_, nullptr, 0);
    }
    Rival(const Rival&) = delete;
    Rival& operator=(const Rival&) = delete;

 private:
    pid_t process_;
};

// How many of `count` processes at once answer true; each comes to its end.
inline int countAtOnce(int count, const std::function<bool()>& body) {
    std::vector<pid_t> children;
    for (int i = 0; i < count; ++i) {
        children.push_back(fork());
        if (children.back() == 0) _exit(body() ? 1 : 0);
    }
    int answered = 0;
    for (const pid_t child : children) {
        const int status = waitForEnd(child, "one of many at once");
        EXPECT_TRUE(WIFEXITED(status));
        answered += WEXITSTATUS(status);
    }
    return answered;
}

// `body` runs in a process of its own, and is killed in it.
inline void expectKilled(const std::function<void()>& body) {
    const pid_t child = fork();
    if (child == 0) _exit((body(), 0));
    const int status = waitForEnd(child, "the one that is killed");
    EXPECT_TRUE(WIFSIGNALED(status)) << "it lived on";
}

// Runs `round` 200 times, in the long mode (ORVEL_RACE_SECONDS) for that many seconds. How often it ran.
inline long race(const std::function<void()>& round) {
    const char* wanted = getenv("ORVEL_RACE_SECONDS");
    const time_t end = wanted == nullptr ? 0 : time(nullptr) + atol(wanted);
    long rounds = 0;
    for (; wanted == nullptr ? rounds < 200 : time(nullptr) < end; ++rounds) round();
    return rounds;
}

}  // namespace support

#endif
