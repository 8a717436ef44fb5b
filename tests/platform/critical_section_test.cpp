// The critical section, fought for by real processes.
#include "vexo/critical_section.h"

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
    const std::string lock = systemRoot() + kLock, left = systemRoot() + "/tmp/left";
    const pid_t waiter = fork();
    if (waiter == 0) _exit(VexoCgiBeginCriticalSection(kLock, 60000) >= 0 && fs::exists(left) ? 0 : 1);
    const auto hasOpen = [&](int count) {
        return waitUntil("who waits to open the lock", [&] {
            std::error_code gone;
            const auto isLock = [&](const fs::path& fd) { return fs::read_symlink(fd, gone) == lock; };
            const fs::directory_iterator open("/proc/" + std::to_string(waiter) + "/fd", gone);
            return std::count_if(open, {}, isLock) == count;
        });
    };
    EXPECT_TRUE(hasOpen(2)) << "beside the one that it has from here";
    const int second = VexoCgiBeginCriticalSection("/tmp/new.lock", 0);
    EXPECT_GE(second, 0);
    fs::rename(systemRoot() + "/tmp/new.lock", lock);
    errno = EDOM;
    VexoCgiEndCriticalSection(handle);
    VexoCgiEndCriticalSection(-1);
    EXPECT_EQ(errno, EDOM);
    EXPECT_TRUE(hasOpen(1)) << "the new one";
    writeFile(left, "");
    VexoCgiEndCriticalSection(second);
    EXPECT_EQ(support::waitForEnd(waiter, "the one that waited for the lock"), 0);
    EXPECT_FAILS(VexoCgiBeginCriticalSection("/none/lock", 10), ENOENT, VEXO_ERR_FILE);
}

// Who is inside marks it by a folder, which nobody else may find there.
TEST_F(CriticalSection, SixtyFourProcessesAllGetInOneAtATime) {
    const std::string mark = systemRoot() + "/tmp/inside";
    const auto enters = [&] {
        for (int time = 0; time < 3; ++time) {
            const int handle = VexoCgiBeginCriticalSection(kLock, 30000);
            if (handle < 0 || mkdir(mark.c_str(), 0700) != 0) return false;
            usleep(2000);
            rmdir(mark.c_str());
            VexoCgiEndCriticalSection(handle);
        }
        return true;
    };
    EXPECT_EQ(countAtOnce(64, enters), 64);
}

}  // namespace
