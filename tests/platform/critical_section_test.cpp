// The critical section, fought for by real processes.
#include "vexo/critical_section.h"

#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <functional>
#include <random>
#include <string>
#include <thread>

#include "support/appliance.h"
#include "vexo/error.h"

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr const char* kLock = "/tmp/section.lock";

struct Shared {
    std::atomic<int> inside;
    std::atomic<int> collisions;
    std::atomic<int> passes;
    std::atomic<long long> longestWait;  // milliseconds
};

class CriticalSection : public support::ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        support::makeFolder(systemRoot() + "/tmp", 01777);
        void* memory = mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
        ASSERT_NE(memory, MAP_FAILED);
        shared_ = new (memory) Shared{};
    }
    void TearDown() override {
        munmap(shared_, sizeof(Shared));
        ApplianceTest::TearDown();
    }
    static pid_t start(const std::function<void()>& body) {
        const pid_t child = fork();
        if (child != 0) return child;
        body();
        _exit(0);
    }
    static long long since(Clock::time_point begin) {
        return std::chrono::duration_cast<milliseconds>(Clock::now() - begin).count();
    }
    // Enters, stays a little and leaves.
    void pass(int stayMilliseconds) {
        const auto begin = Clock::now();
        const int handle = VexoCgiBeginCriticalSection(kLock, 30000);
        if (handle < 0) _exit(1);
        if (shared_->inside.exchange(getpid()) != 0) ++shared_->collisions;
        const long long waited = since(begin);
        long long longest = shared_->longestWait;
        while (waited > longest && !shared_->longestWait.compare_exchange_weak(longest, waited)) {
        }
        std::this_thread::sleep_for(milliseconds(stayMilliseconds));
        ++shared_->passes;
        shared_->inside = 0;
        VexoCgiEndCriticalSection(handle);
    }
    Shared* shared_ = nullptr;
};

TEST_F(CriticalSection, TheTimeIsKeptAndErrnoToo) {
    const int handle = VexoCgiBeginCriticalSection(kLock, 0);
    ASSERT_GE(handle, 0);
    for (const int limit : {-5, 0, 150}) {
        const auto begin = Clock::now();
        EXPECT_EQ(VexoCgiBeginCriticalSection(kLock, limit), -1);
        EXPECT_EQ(errno, ETIMEDOUT);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
        EXPECT_GE(since(begin), std::max(limit, 0));
        EXPECT_LT(since(begin), std::max(limit, 0) + 100);
    }
    // A folder swept meanwhile: who waits for the old file must not go in beside who made a new one.
    const pid_t waiter = start([&] { _exit(VexoCgiBeginCriticalSection(kLock, 300) == -1 ? 0 : 1); });
    std::this_thread::sleep_for(milliseconds(50));
    ASSERT_EQ(unlink((systemRoot() + kLock).c_str()), 0);
    const int second = VexoCgiBeginCriticalSection(kLock, 0);
    EXPECT_GE(second, 0);
    VexoCgiEndCriticalSection(handle);
    int status = 0;
    waitpid(waiter, &status, 0);
    EXPECT_EQ(status, 0);
    errno = EDOM;
    VexoCgiEndCriticalSection(second);
    VexoCgiEndCriticalSection(-1);
    EXPECT_EQ(errno, EDOM);
    EXPECT_EQ(VexoCgiBeginCriticalSection("/none/lock", 10), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
}

TEST_F(CriticalSection, SixtyFourProcessesAllGetIn) {
    std::array<pid_t, 64> children{};
    for (pid_t& child : children) {
        child = start([&] {
            for (int round = 0; round < 3; ++round) pass(2);
        });
    }
    for (const pid_t child : children) {
        int status = 0;
        waitpid(child, &status, 0);
        EXPECT_EQ(status, 0);
    }
    EXPECT_EQ(shared_->collisions, 0);
    EXPECT_EQ(shared_->passes, 3 * 64);
    EXPECT_LT(shared_->longestWait, 15000);
}

TEST_F(CriticalSection, DeathFreesIt) {
    constexpr int kProcesses = 8;
    std::array<pid_t, kProcesses> children{};
    const auto begin = [&] {
        return start([&] {
            while (true) pass(1);
        });
    };
    for (pid_t& child : children) child = begin();
    std::minstd_rand random(1);
    for (int kills = 0; kills < 150; ++kills) {
        std::this_thread::sleep_for(milliseconds(5));
        pid_t& victim = children[random() % kProcesses];
        kill(victim, SIGKILL);
        waitpid(victim, nullptr, 0);
        int dead = victim;
        shared_->inside.compare_exchange_strong(dead, 0);
        victim = begin();
    }
    for (const pid_t child : children) {
        kill(child, SIGKILL);
        waitpid(child, nullptr, 0);
    }
    const int handle = VexoCgiBeginCriticalSection(kLock, 1000);
    EXPECT_GE(handle, 0) << "still held after the last holder's death";
    VexoCgiEndCriticalSection(handle);
    EXPECT_GT(shared_->passes, 50);
}

}  // namespace
