// The critical section, fought for by real processes.
#include "vexo/critical_section.h"

#include <sys/wait.h>

#include <chrono>
#include <csignal>

#include "support/testing.h"

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr const char* kLock = "/tmp/section.lock";

class CriticalSection : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        makeFolder(systemRoot() + "/tmp", 01777);
    }
};

TEST_F(CriticalSection, TheTimeIsKeptAndASweptFolderToo) {
    const int handle = VexoCgiBeginCriticalSection(kLock, 0);
    ASSERT_GE(handle, 0);
    for (const int limit : {-5, 0, 150}) {
        const auto begin = Clock::now();
        EXPECT_FAILS(VexoCgiBeginCriticalSection(kLock, limit), ETIMEDOUT, VEXO_ERR_GENERAL);
        EXPECT_GE(Clock::now() - begin, milliseconds(std::max(limit, 0)));
    }
    // Who waits for a lock file that was replaced must not go in beside who holds the new one.
    const pid_t waiter = fork();
    if (waiter == 0) _exit(VexoCgiBeginCriticalSection(kLock, 300) == -1 ? 0 : 1);
    const int second = VexoCgiBeginCriticalSection("/tmp/new.lock", 0);
    EXPECT_GE(second, 0);
    fs::rename(systemRoot() + "/tmp/new.lock", systemRoot() + kLock);
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

// Who is inside marks it by a folder, which nobody else may find there.
TEST_F(CriticalSection, SixtyFourProcessesAllGetInOneAtATime) {
    const std::string mark = systemRoot() + "/tmp/inside";
    for (int process = 0; process < 64; ++process) {
        if (fork() != 0) continue;
        for (int time = 0; time < 3; ++time) {
            const int handle = VexoCgiBeginCriticalSection(kLock, 30000);
            if (handle < 0 || mkdir(mark.c_str(), 0700) != 0) _exit(1);
            usleep(2000);
            rmdir(mark.c_str());
            VexoCgiEndCriticalSection(handle);
        }
        _exit(0);
    }
    for (int status = 0; wait(&status) > 0;) EXPECT_EQ(status, 0);
}

TEST_F(CriticalSection, DeathFreesIt) {
    const pid_t holder = fork();
    if (holder == 0) _exit(VexoCgiBeginCriticalSection(kLock, 0) >= 0 ? raise(SIGKILL) : 1);
    int status = 0;
    waitpid(holder, &status, 0);
    EXPECT_TRUE(WIFSIGNALED(status));
    const int handle = VexoCgiBeginCriticalSection(kLock, 0);
    EXPECT_GE(handle, 0);
    VexoCgiEndCriticalSection(handle);
}

}  // namespace
