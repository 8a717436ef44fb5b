// The critical section, fought for by real processes.
#include "vexo/critical_section.h"

#include <sys/mman.h>
#include <sys/wait.h>

#include <array>
#include <atomic>
#include <chrono>
#include <csignal>
#include <random>

#include "support/testing.h"

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr const char* kLock = "/tmp/section.lock";

// Memory that all processes see.
struct Shared {
    std::atomic<int> inside, collisions, passes;
};

class CriticalSection : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        makeFolder(systemRoot() + "/tmp", 01777);
    }
    // A process that passes through the section so many times.
    pid_t start(int times) {
        const pid_t child = fork();
        if (child != 0) return child;
        for (; times > 0; --times) {
            const int handle = VexoCgiBeginCriticalSection(kLock, 30000);
            if (handle < 0) _exit(1);
            if (shared_->inside.exchange(getpid()) != 0) ++shared_->collisions;
            usleep(2000);
            ++shared_->passes;
            shared_->inside = 0;
            VexoCgiEndCriticalSection(handle);
        }
        _exit(0);
    }
    Shared* shared_ =
        static_cast<Shared*>(mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
};

TEST_F(CriticalSection, TheTimeIsKeptAndASweptFolderToo) {
    const int handle = VexoCgiBeginCriticalSection(kLock, 0);
    ASSERT_GE(handle, 0);
    for (const int limit : {-5, 0, 150}) {
        const auto begin = Clock::now();
        EXPECT_FAILS(VexoCgiBeginCriticalSection(kLock, limit), ETIMEDOUT, VEXO_ERR_GENERAL);
        EXPECT_GE(Clock::now() - begin, milliseconds(std::max(limit, 0)));
        EXPECT_LT(Clock::now() - begin, milliseconds(std::max(limit, 0) + 100));
    }
    // Who waits for a lock file that was removed must not go in beside who made a new one.
    const pid_t waiter = fork();
    if (waiter == 0) _exit(VexoCgiBeginCriticalSection(kLock, 300) == -1 ? 0 : 1);
    usleep(50000);
    fs::remove(systemRoot() + kLock);
    const int second = VexoCgiBeginCriticalSection(kLock, 0);
    EXPECT_GE(second, 0);
    errno = EDOM;
    VexoCgiEndCriticalSection(handle);
    VexoCgiEndCriticalSection(-1);
    EXPECT_EQ(errno, EDOM);
    int status = 0;
    waitpid(waiter, &status, 0);
    EXPECT_EQ(status, 0);
    VexoCgiEndCriticalSection(second);
    EXPECT_FAILS(VexoCgiBeginCriticalSection("/none/lock", 10), ENOENT, VEXO_ERR_FILE);
}

TEST_F(CriticalSection, SixtyFourProcessesAllGetIn) {
    std::array<pid_t, 64> children{};
    for (pid_t& child : children) child = start(3);
    for (const pid_t child : children) {
        int status = 0;
        waitpid(child, &status, 0);
        EXPECT_EQ(status, 0);
    }
    EXPECT_EQ(shared_->collisions, 0);
    EXPECT_EQ(shared_->passes, 3 * 64);
}

TEST_F(CriticalSection, DeathFreesIt) {
    constexpr int kForever = 1 << 30;
    std::array<pid_t, 8> children{};
    for (pid_t& child : children) child = start(kForever);
    std::minstd_rand random(1);
    for (int kills = 0; kills < 150; ++kills) {
        usleep(5000);
        pid_t& victim = children[random() % children.size()];
        kill(victim, SIGKILL);
        waitpid(victim, nullptr, 0);
        victim = start(kForever);
    }
    EXPECT_GT(shared_->passes, 50);
    for (const pid_t child : children) {
        kill(child, SIGKILL);
        waitpid(child, nullptr, 0);
    }
    const int handle = VexoCgiBeginCriticalSection(kLock, 1000);
    EXPECT_GE(handle, 0) << "still held after the last holder's death";
    VexoCgiEndCriticalSection(handle);
}

}  // namespace
