#include "vexo/critical_section.h"

#include <sys/file.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <exception>
#include <random>
#include <string>
#include <thread>

#include "base/raised_identity.h"
#include "failure.h"
#include "fault_gate.h"
#include "io/file_io.h"
#include "io/trusted_file.h"
#include "vexo/system_root.h"

namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::microseconds;

// Between two attempts, at random: those who wait must not stay in step, or the same one would come first each time.
constexpr int kShortestPause = 1000;  // microseconds
constexpr int kLongestPause = 5000;

enum class Attempt { entered, busy, failed };

orvel::Descriptor openLock(const std::string& path) {
    const orvel::RaisedIdentity raised;
    return vexo::openTrusted(path, O_RDWR | O_CREAT, 0600);
}

// False for a lock file that was removed meanwhile (folders of temporary files are swept): others lock another one.
bool isStillThere(int lock, const std::string& path) {
    struct stat mine {};
    struct stat there {};
    return fstat(lock, &mine) == 0 && lstat(path.c_str(), &there) == 0 && orvel::isSameFile(mine, there);
}

Attempt tryToEnter(orvel::Descriptor& lock, const std::string& path) {
    if (!lock) lock = openLock(path);
    if (!lock) return Attempt::failed;
    if (flock(lock.get(), LOCK_EX | LOCK_NB) != 0) {
        return errno == EWOULDBLOCK || errno == EINTR ? Attempt::busy : Attempt::failed;
    }
    if (isStillThere(lock.get(), path)) return Attempt::entered;
    lock.reset();
    return Attempt::busy;
}

// Sleeps a little, at most until `deadline`; false when that has passed.
bool pauseUntil(Clock::time_point deadline, std::minstd_rand& random) {
    const auto now = Clock::now();
    if (now >= deadline) return false;
    const microseconds pause(std::uniform_int_distribution<int>(kShortestPause, kLongestPause)(random));
    std::this_thread::sleep_until(std::min<Clock::time_point>(now + pause, deadline));
    return true;
}

}  // namespace

int VexoCgiBeginCriticalSection(const char* name, int milliseconds) try {
    VEXO_GATE("VexoCgiBeginCriticalSection", -1);
    if (name == nullptr || *name == '\0') return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    const std::string path = VEXO::SystemPath(name);
    const auto deadline = Clock::now() + std::chrono::milliseconds(std::max(milliseconds, 0));
    std::minstd_rand random(static_cast<unsigned>(getpid()) +
                            static_cast<unsigned>(deadline.time_since_epoch().count()));
    orvel::Descriptor lock;
    while (true) {
        const Attempt attempt = tryToEnter(lock, path);
        if (attempt == Attempt::entered) {
            errno = before;
            return lock.release();
        }
        if (attempt == Attempt::failed) return vexo::fail(vexo::errorOfFile(errno));
        if (!pauseUntil(deadline, random)) return vexo::fail(VEXO_ERR_GENERAL, ETIMEDOUT);
    }
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

void VexoCgiEndCriticalSection(int handle) {
    if (handle < 0) return;
    const orvel::Descriptor lock(handle);
    const vexo::KeepErrno keep;
    // By name, not by closing alone: a forked child may hold the descriptor too.
    flock(lock.get(), LOCK_UN);
}
