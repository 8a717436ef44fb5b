#include "index/watch.h"

#include <poll.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <chrono>
#include <condition_variable>
#include <csignal>
#include <cstdio>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <stop_token>
#include <string>
#include <thread>
#include <utility>

#include "base/file.h"
#include "command.h"
#include "index/indexer.h"
#include "index/work.h"
#include "vexo/index.h"

namespace orvel::ctl {
namespace {

using Clock = std::chrono::steady_clock;
using std::chrono::milliseconds;
using std::chrono::seconds;

constexpr milliseconds kGathering(100);  // what happens to one file mostly happens within
constexpr milliseconds kTick(500);
constexpr seconds kBehind(5);  // an event that has waited for so long
constexpr seconds kNoting(60);
constexpr seconds kMountLooks(2);
constexpr size_t kMostNames = 200000;  // remembered; with more it is quicker to compare everything

void say(const std::string& share, const std::string& what) {
    printf("%s: %s\n", terminalText(share).c_str(), terminalText(what).c_str());
    fflush(stdout);
}

// The disk is for those who wait for it.
void useIdleDisk() {
    constexpr int process = 1, idle = 3, classShift = 13;
    syscall(SYS_ioprio_set, process, 0, idle << classShift);
}

// Reads events as they come, so that the kernel's queue stays short whatever the index is doing.
class Gatherer {
 public:
    struct Gathered {
        Touched touched;
        bool lost = false;  // events, or the marks no longer fit the mounts
        Clock::time_point since;
    };

    explicit Gatherer(const std::string& root) : events_(root), thread_([this](const std::stop_token& s) { run(s); }) {}

    // What was gathered since the last time, waiting for it as long as a tick; what ended the thread is thrown.
    Gathered next() {
        std::unique_lock<std::mutex> lock(mutex_);
        const auto any = [this] { return !gathered_.touched.empty() || gathered_.lost || !failure_.empty(); };
        if (some_.wait_for(lock, kTick, any)) {
            lock.unlock();
            std::this_thread::sleep_for(kGathering);
            lock.lock();
        }
        if (!failure_.empty()) throw std::runtime_error(failure_);
        count_ = 0;
        return std::exchange(gathered_, {});
    }

 private:
    void run(const std::stop_token& stop) {
        Clock::time_point looked = Clock::now();
        try {
            while (!stop.stop_requested()) {
                pollfd queue = {events_.descriptor(), POLLIN, 0};
                const bool some = poll(&queue, 1, static_cast<int>(kTick.count())) > 0;
                const bool looks = Clock::now() - looked > kMountLooks;
                if (looks) looked = Clock::now();
                if ((looks && events_.mountsChanged()) || (some && !take())) {
                    lose();
                    std::this_thread::sleep_for(kTick);
                }
            }
        } catch (const std::exception& error) {
            const std::lock_guard<std::mutex> lock(mutex_);
            failure_ = error.what();
        }
        some_.notify_one();
    }
    bool take() {
        const std::lock_guard<std::mutex> lock(mutex_);
        if (gathered_.touched.empty()) gathered_.since = Clock::now();
        if (gathered_.lost || count_ > kMostNames || !events_.read(gathered_.touched, count_)) return false;
        some_.notify_one();
        return true;
    }
    void lose() {
        const std::lock_guard<std::mutex> lock(mutex_);
        gathered_ = {{}, true, Clock::now()};
        some_.notify_one();
    }

    FileEvents events_;
    std::mutex mutex_;
    std::condition_variable some_;
    Gathered gathered_;
    size_t count_ = 0;
    std::string failure_;
    std::jthread thread_;  // last: it uses all of them
};

class Watch {
 public:
    Watch(const SDK::Share& share, int& stop, int& full)
        : share_(share.GetName()),
          files_(filesOf(share, &stop)),
          stop_(stop),
          full_(full),
          work_(share, false),
          rows_(files_.root(), share_, work_.database()) {}

    // Events are gathered from before the comparison on, so that none is missed in between.
    void follow() {
        while (stop_ == 0) {
            Gatherer events(files_.root());
            compareAll();
            if (stop_ != 0) return;
            mark(FI_INDEX_LIVE, "live");
            Indexer indexer(files_, rows_, &stop_);
            followEvents(events, indexer);
            if (stop_ == 0) mark(FI_INDEX_BEHIND, "behind, compares by the times of folders");
        }
    }

    void update(unsigned long pause) {
        while (stop_ == 0) {
            compareAll();
            work_.mark(FI_INDEX_IN_STEP);
            const auto end = Clock::now() + seconds(pause);
            while (stop_ == 0 && full_ == 0 && Clock::now() < end) std::this_thread::sleep_for(kTick);
        }
    }

    void done() { work_.done(); }

 private:
    void mark(int state, const char* what) {
        if (state_ != state) say(share_, what);
        state_ = state;
        work_.mark(state);
        noted_ = Clock::now();
    }

    void compareAll() {
        checkRoot();
        const bool everything = std::exchange(full_, 0) != 0;
        Indexer indexer(files_, rows_, &stop_);
        const bool whole = indexer.update(everything);
        rows_.commit();
        if (whole && !indexer.unread().empty()) say(share_, indexer.unread() + "; the index of it is what it was");
    }

    // Until events were lost or all is to be compared.
    void followEvents(Gatherer& events, Indexer& indexer) {
        bool changed = false;
        while (stop_ == 0 && full_ == 0) {
            const Gatherer::Gathered gathered = events.next();
            const int64_t asOf = kernelClock();
            if (gathered.lost) return;
            if (!gathered.touched.empty()) {
                checkRoot();
                indexer.follow(gathered.touched);
                changed = true;
                rows_.commit();
                const bool late = Clock::now() - gathered.since > kBehind;
                if (late && state_ == FI_INDEX_LIVE) mark(FI_INDEX_BEHIND, "behind");
                if (!late && state_ != FI_INDEX_LIVE) mark(FI_INDEX_LIVE, "live again");
            }
            indexer.settleQuiet(asOf);
            rows_.commit();
            if (changed && state_ == FI_INDEX_LIVE && Clock::now() - noted_ > kNoting) {
                mark(FI_INDEX_LIVE, "live");
                changed = false;
            }
        }
    }

    // A volume that went away must not empty the index.
    void checkRoot() const {
        struct stat opened {};
        struct stat found {};
        if (stat(files_.openedRoot().path().c_str(), &opened) != 0 || stat(files_.root().c_str(), &found) != 0 ||
            !isSameFile(opened, found)) {
            refuse(share_, "its folder is no longer there");
        }
    }

    const std::string share_;
    const ShareFiles files_;
    int& stop_;
    int& full_;
    IndexWork work_;
    IndexRows rows_;
    int state_ = FI_INDEX_BEHIND;
    Clock::time_point noted_;
};

// False when it was told to end.
bool buildMissing(const SDK::Share& share, int& stop) {
    FIINDEXSTATUS status = {};
    if (FILEIDXIndexStatus(share.GetName(), &status) == 0) return true;
    say(share.GetName(), "builds its index");
    const ShareFiles files = filesOf(share, &stop);
    IndexWork work(share, true);
    IndexRows rows(files.root(), share.GetName(), work.database());
    try {
        Indexer indexer(files, rows, &stop);
        if (!indexer.build()) {
            say(share.GetName(), "broken off");
            return false;
        }
    } catch (const Unreadable& error) {
        refuse(share.GetName(), error.what());
    }
    work.done();
    return true;
}

}  // namespace

int watchIndex(const SDK::Share& share, unsigned long pause, int& stop, int& full) {
    useIdleDisk();
    if (!buildMissing(share, stop)) return 0;
    Watch watch(share, stop, full);
    try {
        watch.follow();
    } catch (const NoFileEvents& reason) {
        say(share.GetName(), std::string(reason.what()) + "; updates every " + std::to_string(pause) + " seconds");
        watch.update(pause);
    }
    watch.done();
    return 0;
}

}  // namespace orvel::ctl
