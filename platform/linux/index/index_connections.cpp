#include "index/index_connections.h"

#include <pthread.h>
#include <sys/stat.h>

#include <algorithm>
#include <condition_variable>
#include <csignal>
#include <cstdlib>
#include <map>
#include <new>
#include <stop_token>
#include <string>
#include <string_view>
#include <thread>
#include <utility>
#include <vector>

#include "failure.h"

namespace vexo::fileindex {
namespace {

using Clock = Database::Clock;

// After so long a batch is committed even if nothing more is inserted: somebody looks at the results meanwhile.
constexpr std::chrono::milliseconds kBatchAge(500);
constexpr size_t kMostOpen = 8;

struct Entry {
    std::string path;
    dev_t device;
    ino_t inode;
    std::unique_ptr<Database> database;
    bool isStore;
    Failure failure;  // of a commit that nobody waited for; code 0: none
    unsigned long long used;
};

// For its lifetime the calling thread takes no signals, nor do those that it starts.
class NoSignals {
 public:
    NoSignals() : before_() {
        sigset_t all;
        sigfillset(&all);
        pthread_sigmask(SIG_SETMASK, &all, &before_);
    }
    ~NoSignals() { pthread_sigmask(SIG_SETMASK, &before_, nullptr); }
    NoSignals(const NoSignals&) = delete;
    NoSignals& operator=(const NoSignals&) = delete;

 private:
    sigset_t before_;
};

// What one process has open. It is never destroyed, so that it serves also at exit; a forked child begins with an empty
// one and leaves its parent's connections alone, as SQLite demands.
class Connections {
 public:
    static Connections& ofThisProcess();

    std::mutex mutex;
    std::map<std::string, OpenMode, std::less<>> admitted;

    Database* find(std::string_view path);
    bool close(const std::string& path);
    void commitAll();
    void endCommitter(std::unique_lock<std::mutex>& lock);
    void stop();

 private:
    Connections() = default;
    Entry* openEntry(const std::string& path, const struct stat& status);
    Database* use(Entry& entry);
    void makeRoom();
    void startCommitter();
    void commitOld(const std::stop_token& stop);

    std::vector<std::unique_ptr<Entry>> entries_;
    unsigned long long uses_ = 0;
    std::jthread committer_;
    std::condition_variable_any ended_;
};

Connections* current = nullptr;
// From the parent process; never read, but reachable for leak checkers.
[[gnu::used]] Connections* inherited = nullptr;

// SQLite notes for the whole process which locks it holds, and a child would inherit the notes without the locks: so
// none is held at a fork, and nobody is inside SQLite. Nor does the committer run: a thread that is just being started
// may hold locks of the C++ runtime or of a sanitizer, which nobody would release in the child.
void prepareFork() {
    if (current == nullptr) return;
    std::unique_lock<std::mutex> lock(current->mutex);
    current->endCommitter(lock);
    current->commitAll();
    lock.release();
}

void goOnInParent() {
    if (current != nullptr) current->mutex.unlock();
}

void beginAnewInChild() {
    inherited = std::exchange(current, nullptr);
}

Connections& Connections::ofThisProcess() {
    static const bool registered =
        pthread_atfork(prepareFork, goOnInParent, beginAnewInChild) == 0 && std::atexit(closeDatabases) == 0;
    // Without either, rows could be lost or written twice.
    if (!registered) throw std::bad_alloc();
    if (current == nullptr) current = new Connections;
    return *current;
}

Database* Connections::find(std::string_view path) {
    const auto same = std::find_if(entries_.begin(), entries_.end(), [&](const auto& e) { return e->path == path; });
    // While a batch is open its file is not asked for again: SQLite sees for itself when it begins the next.
    if (same != entries_.end() && (*same)->database->batchBegan() && (*same)->failure.code == 0) return use(**same);
    struct stat status {};
    if (lstat(std::string(path).c_str(), &status) != 0) {
        fail(errno == EACCES ? VEXO_ERR_DENIED : VEXO_ERR_FILE);
        return nullptr;
    }
    // One connection for each file, whatever it is called: a second one would lose the first one's locks.
    const auto found = std::find_if(entries_.begin(), entries_.end(), [&](const auto& e) {
        return e->device == status.st_dev && e->inode == status.st_ino;
    });
    if (found != entries_.end()) return use(**found);
    if (same != entries_.end()) entries_.erase(same);
    Entry* entry = openEntry(std::string(path), status);
    return entry == nullptr ? nullptr : use(*entry);
}

Entry* Connections::openEntry(const std::string& path, const struct stat& status) {
    const auto mode = admitted.find(path);
    const bool isStore = mode != admitted.end();
    std::unique_ptr<Database> database = Database::open(path, isStore ? mode->second : OpenMode());
    if (database == nullptr) return nullptr;
    makeRoom();
    entries_.push_back(
        std::make_unique<Entry>(Entry{path, status.st_dev, status.st_ino, std::move(database), isStore, {}, 0}));
    return entries_.back().get();
}

Database* Connections::use(Entry& entry) {
    entry.used = ++uses_;
    if (entry.failure.code != 0) {
        const Failure failure = std::exchange(entry.failure, {});
        fail(failure.code, failure.systemCode);
        return nullptr;
    }
    if (!entry.isStore) startCommitter();
    return entry.database.get();
}

// One whose batch could not be written stays open until its next use has reported that.
void Connections::makeRoom() {
    if (entries_.size() < kMostOpen) return;
    const auto oldest = std::min_element(entries_.begin(), entries_.end(), [](const auto& a, const auto& b) {
        const bool isBroken = a->failure.code != 0;
        return isBroken != (b->failure.code != 0) ? !isBroken : a->used < b->used;
    });
    Entry& entry = **oldest;
    const QuietFailures quiet;
    if (entry.failure.code == 0 && !entry.database->commit()) entry.failure = QuietFailures::last();
    if (entry.failure.code == 0) entries_.erase(oldest);
}

bool Connections::close(const std::string& path) {
    const auto found = std::find_if(entries_.begin(), entries_.end(), [&](const auto& e) { return e->path == path; });
    if (found == entries_.end()) return true;
    const bool done = use(**found) != nullptr && (*found)->database->commit();
    entries_.erase(found);
    return done;
}

// The thread takes no signals: they are for the program, which gets them again even if no thread can be created.
void Connections::startCommitter() {
    if (committer_.joinable()) return;
    const NoSignals quiet;
    committer_ = std::jthread([this](const std::stop_token& stop) { commitOld(stop); });
}

// The lock is given up while the thread ends; the next one that is started has a stop state of its own.
void Connections::endCommitter(std::unique_lock<std::mutex>& lock) {
    while (committer_.joinable()) {
        std::jthread ending;
        ending.swap(committer_);
        lock.unlock();
        ending.request_stop();
        ending.join();
        lock.lock();
    }
}

void Connections::commitOld(const std::stop_token& stop) {
    const QuietFailures quiet;
    std::unique_lock<std::mutex> lock(mutex);
    while (!stop.stop_requested()) {
        ended_.wait_for(lock, stop, kBatchAge / 2, [] { return false; });
        for (const auto& entry : entries_) {
            const auto began = entry->database->batchBegan();
            // The store is reached as root, and the whole process would become that.
            if (entry->isStore || !began || Clock::now() - *began < kBatchAge) continue;
            if (!entry->database->commit()) entry->failure = QuietFailures::last();
        }
    }
}

// Failures are reported at the next use.
void Connections::commitAll() {
    const KeepErrno keep;
    const orvel::RaisedIdentity raised;
    const QuietFailures quiet;
    for (const auto& entry : entries_) {
        if (!entry->database->commit()) entry->failure = QuietFailures::last();
    }
}

void Connections::stop() {
    std::unique_lock<std::mutex> lock(mutex);
    endCommitter(lock);
    commitAll();
    entries_.clear();
}

}  // namespace

Lease::Lease(const char* path) {
    Connections& connections = Connections::ofThisProcess();
    lock_ = std::unique_lock<std::mutex>(connections.mutex);
    if (connections.admitted.find(std::string_view(path)) != connections.admitted.end()) raised_.emplace();
    database_ = connections.find(path);
}

void admitDatabase(const std::string& path, OpenMode mode) {
    Connections& connections = Connections::ofThisProcess();
    const std::lock_guard<std::mutex> lock(connections.mutex);
    connections.admitted[path] = mode;
}

bool dismissDatabase(const std::string& path) {
    Connections& connections = Connections::ofThisProcess();
    const std::lock_guard<std::mutex> lock(connections.mutex);
    const orvel::RaisedIdentity raised;
    connections.admitted.erase(path);
    return connections.close(path);
}

void closeDatabases() {
    Connections::ofThisProcess().stop();
}

}  // namespace vexo::fileindex
