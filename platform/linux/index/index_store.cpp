// The store of the shares' indexes: building, replacing, asking about them.
#include "index/index_store.h"

#include <dirent.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <ctime>
#include <exception>
#include <map>
#include <memory>
#include <string_view>

#include "base/owner.h"
#include "base/raised_identity.h"
#include "failure.h"
#include "fault_gate.h"
#include "index/index_connections.h"
#include "index/index_names_format.h"
#include "io/file_io.h"
#include "shares/share_record.h"
#include "shares/share_store.h"
#include "vexo/filesystem.h"
#include "vexo/index.h"
#include "vexo/system_root.h"
#include "vexo/text.h"

namespace vexo::fileindex {
namespace {

constexpr const char* kFolder = "/var/lib/vexo/index";
constexpr const char* kParent = "/var/lib/vexo";
constexpr OpenMode kNewIndex = {.isNew = true};
constexpr std::string_view kNew = ".new";  // of an index while it is built

// What this process is writing of a share.
struct Work {
    int mode;
    Descriptor lock;
    Descriptor live;   // locked while the index is in step with the files
    std::string veto;  // what the share keeps out while it is listed
};

// Never destroyed: the locks go with the process.
std::map<std::string, Work>& works() {
    static auto& value = *new std::map<std::string, Work>;
    return value;
}

std::string storePath(std::string_view share, const char* suffix) {
    return VEXO::SystemPath(kFolder) + "/" + storeName(share) + suffix;
}

std::string newPath(std::string_view share) {
    return storePath(share, kNew.data());
}

bool makeStore() {
    constexpr uid_t keep = static_cast<uid_t>(-1);
    return VEXOFSMkdirP(VEXO::SystemPath(kParent).c_str(), nullptr, 1, keep, keep, 0755) == 0 &&
           VEXOFSMkdirP(VEXO::SystemPath(kFolder).c_str(), nullptr, 1, keep, keep, 0700) == 0;
}

// The lock that everybody takes who writes the share's index. Empty with the slot filled: 0x0800 somebody has it.
Descriptor openLocked(const std::string& path) {
    Descriptor lock = openFile(path, O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK, 0600);
    if (lock && lockFile(lock.get(), LOCK_EX | LOCK_NB)) return lock;
    fail(errno == EWOULDBLOCK ? static_cast<int>(VEXO_ERR_EXISTS) : errorOfErrno(errno));
    return Descriptor();
}

Descriptor lockIndex(std::string_view share) {
    return openLocked(storePath(share, ".lock"));
}

bool removeFile(const std::string& path) {
    for (const char* suffix : {"-journal", ""}) {
        if (unlink((path + suffix).c_str()) == 0 || errno == ENOENT) continue;
        fail(errorOfErrno(errno));
        return false;
    }
    return true;
}

bool indexExists(std::string_view share) {
    struct stat status {};
    return lstat(indexPath(share).c_str(), &status) == 0 && isTrusted(status, S_IFREG);
}

// The names that the share keeps out are not in its index. What they were when it was built stands beside it: with
// others the index would show what is kept out now.
std::string vetoPath(std::string_view share) {
    return storePath(share, ".veto");
}

std::string vetoOf(const ShareDefinition& share) {
    std::string text;
    for (const std::string& pattern : share.veto) text += pattern + "/";
    return text;
}

// No share's: while the index and its note are replaced, neither may pass for the other's.
constexpr const char* kNoVeto = "/";

std::string vetoOf(const std::string& share) {
    const auto shares = currentShares();
    const ShareDefinition* definition = shares == nullptr ? nullptr : shares->find(share);
    return definition == nullptr ? std::string() : vetoOf(*definition);
}

bool noteVeto(const std::string& share, const std::string& text) {
    if (unlink(vetoPath(share).c_str()) != 0 && errno != ENOENT) return false;
    if (text.empty()) return true;
    const Descriptor file = openFile(vetoPath(share), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW, 0600);
    return file && writeAll(file.get(), text);
}

bool isOfThisVeto(const std::string& share) {
    std::string text;
    FileVersion version;
    constexpr size_t kMost = size_t{1} << 20;
    if (!readRegularFile(vetoPath(share), kMost, text, version)) {
        if (errno != ENOENT) return false;
        text.clear();
    }
    return text == vetoOf(share);
}

bool begin(const std::string& share, int mode) {
    const orvel::RaisedIdentity raised;
    if (!makeStore()) return false;
    Work work{mode, lockIndex(share), Descriptor(), vetoOf(share)};
    if (!work.lock) return false;
    if (mode == FI_INDEX_BUILD) {
        if (!removeFile(newPath(share)) || !Database::create(newPath(share), kNewIndex)) return false;
        admitDatabase(newPath(share), kNewIndex);
    } else {
        if (!indexExists(share)) {
            fail(VEXO_ERR_MISSING, ENOENT);
            return false;
        }
        if (!isOfThisVeto(share)) {
            fail(VEXO_ERR_GENERAL, ESTALE);
            return false;
        }
        if (Database::open(indexPath(share), {false, true}) == nullptr) return false;
        admitDatabase(indexPath(share), {false, true});
    }
    works()[share] = std::move(work);
    return true;
}

bool noteTime(sqlite3* db, bool built) {
    const std::string now = std::to_string(time(nullptr));
    const std::string sql = std::string("UPDATE state SET ") + (built ? "built=" + now + "," : "") + "updated=" + now;
    return execute(db, sql.c_str());
}

bool synchronise(const std::string& path, int flags) {
    const Descriptor fd = openFile(path, flags);
    if (fd && fsync(fd.get()) == 0) return true;
    fail(errorOfErrno(errno));
    return false;
}

std::string namesPath(std::string_view share) {
    return storePath(share, ".names");
}

// Where that fails searches do without, and the next update tries again.
void renewNames(const std::string& share, Database& index) {
    const KeepErrno keep;
    const QuietFailures quiet;
    if (namesAreOld(namesPath(share), index)) static_cast<void>(packNames(namesPath(share), index));
}

// The records become an index: trigrams and all.
bool complete(const std::string& share, const std::string& path) {
    const std::unique_ptr<Database> database = Database::open(path, kNewIndex);
    if (database == nullptr) return false;
    sqlite3* db = database->handle();
    const bool done = execute(db, "BEGIN") && execute(db, kShareSchema) && execute(db, drawMark().c_str()) &&
                      noteTime(db, true) && execute(db, "COMMIT");
    if (done) renewNames(share, *database);
    return done;
}

bool replaceIndex(std::string_view share) {
    const std::string path = newPath(share);
    if (!synchronise(path, O_RDONLY)) return false;
    if (rename(path.c_str(), indexPath(share).c_str()) != 0) {
        fail(errorOfErrno(errno));
        return false;
    }
    return synchronise(VEXO::SystemPath(kFolder), O_RDONLY | O_DIRECTORY);
}

bool endBuild(const std::string& share, bool done) {
    const std::string path = newPath(share);
    const bool written = dismissDatabase(path);
    if (done && written && complete(share, path) && noteVeto(share, kNoVeto) && replaceIndex(share) &&
        noteVeto(share, works()[share].veto)) {
        return true;
    }
    const KeepErrno keep;
    return removeFile(path) && !done;
}

bool endUpdate(const std::string& share, bool done) {
    if (!dismissDatabase(indexPath(share))) return false;
    if (!done) return true;
    const std::unique_ptr<Database> database = Database::open(indexPath(share), {false, true});
    if (database == nullptr || !noteTime(database->handle(), false)) return false;
    renewNames(share, *database);
    return true;
}

// Removes what killed builds left, unless the share's index is being written.
long removeUnfinished() {
    const std::string folder = VEXO::SystemPath(kFolder);
    const std::unique_ptr<DIR, orvel::Releaser<closedir>> names(opendir(folder.c_str()));
    if (names == nullptr) return errno == ENOENT ? 0 : fail(errorOfErrno(errno));
    long removed = 0;
    while (const dirent* entry = readdir(names.get())) {
        const std::string_view name = entry->d_name;
        if (!name.ends_with(kNew)) continue;
        const std::string stem = folder + "/" + std::string(name.substr(0, name.size() - kNew.size()));
        const Descriptor lock = openLocked(stem + ".lock");
        if (lock && removeFile(stem + std::string(kNew))) ++removed;
    }
    return removed;
}

// The share's name as it is defined; "" with the slot filled when there is none.
std::string definedName(const char* share) {
    const ShareRecord record = loadShare(share);
    return record == nullptr ? std::string() : std::string(record->szName);
}

// A lock of the file, which whoever asks does not take: it belongs to the writer's open file and ends with it.
struct flock writeLock() {
    struct flock lock {};
    lock.l_type = F_WRLCK;
    lock.l_whence = SEEK_SET;
    return lock;
}

bool isLive(const std::string& share) {
    const Descriptor file = openFile(storePath(share, ".live"), O_RDONLY | O_NOFOLLOW | O_NONBLOCK);
    struct flock lock = writeLock();
    return file && fcntl(file.get(), F_OFD_GETLK, &lock) == 0 && lock.l_type != F_UNLCK;
}

bool mark(const std::string& share, int state, Work& work) {
    if (state != FI_INDEX_LIVE) work.live.reset();
    if (state == FI_INDEX_BEHIND) return true;
    const std::unique_ptr<Database> database = Database::open(indexPath(share), {false, true});
    if (database == nullptr || !noteTime(database->handle(), false)) return false;
    renewNames(share, *database);
    if (state == FI_INDEX_IN_STEP || work.live) return true;
    struct flock lock = writeLock();
    Descriptor file = openFile(storePath(share, ".live"), O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK, 0600);
    if (!file || fcntl(file.get(), F_OFD_SETLK, &lock) != 0) {
        fail(errorOfErrno(errno));
        return false;
    }
    work.live = std::move(file);
    return true;
}

bool readStatus(const std::string& share, FIINDEXSTATUS& status) {
    const std::unique_ptr<Database> database = openIndex(share);
    if (database == nullptr) return false;
    struct stat file {};
    State state{};
    int64_t folders = 0;
    if (!database->readState(state) || !database->count({"is_dir=1"}, folders)) return false;
    if (lstat(indexPath(share).c_str(), &file) != 0) {
        fail(errorOfErrno(errno));
        return false;
    }
    struct stat names {};
    const bool hasNames = lstat(namesPath(share).c_str(), &names) == 0;
    status = {static_cast<unsigned long long>(state.records), static_cast<unsigned long long>(folders),
              file.st_size + (hasNames ? names.st_blocks * 512 : 0), state.built, state.updated};
    return true;
}

}  // namespace

std::string storeName(std::string_view share) {
    static constexpr char digits[] = "0123456789ABCDEF";
    std::string folded;
    VEXO::AppendFoldKey(share, folded);
    std::string out;
    for (const char c : folded) {
        const auto byte = static_cast<unsigned char>(c);
        const bool plain = byte > ' ' && byte != 0x7F && strchr("%/.", c) == nullptr;
        if (plain) {
            out += c;
        } else {
            out += '%';
            out += digits[byte >> 4];
            out += digits[byte & 15];
        }
    }
    return out;
}

std::string indexPath(std::string_view share) {
    return storePath(share, ".db");
}

std::unique_ptr<Database> openIndex(std::string_view share) {
    if (!indexExists(share)) {
        fail(VEXO_ERR_MISSING, ENOENT);
        return nullptr;
    }
    return Database::open(indexPath(share), {true, true});
}

std::unique_ptr<const Names> openNames(std::string_view share, Database& index) {
    return Names::open(namesPath(share), index);
}

}  // namespace vexo::fileindex

using vexo::fileindex::definedName;

int FILEIDXIsIndexEnable(const char* share) try {
    VEXO_GATE("FILEIDXIsIndexEnable", 0);
    const auto shares = share == nullptr ? nullptr : vexo::currentShares();
    const vexo::ShareDefinition* definition = shares == nullptr ? nullptr : shares->find(share);
    if (definition == nullptr || !definition->index) return 0;
    const vexo::KeepErrno keep;
    const orvel::RaisedIdentity raised;
    if (!vexo::fileindex::isOfThisVeto(definition->name)) return 0;
    return static_cast<int>(vexo::fileindex::openIndex(definition->name) != nullptr);
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return 0;
}

int FILEIDXIndexBegin(const char* share, int mode, char* path, int size) try {
    VEXO_GATE("FILEIDXIndexBegin", -1);
    const bool known = mode == FI_INDEX_BUILD || mode == FI_INDEX_UPDATE;
    if (share == nullptr || path == nullptr || size <= 0 || !known) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    path[0] = '\0';
    const std::string name = definedName(share);
    if (name.empty()) return -1;
    const std::string file = mode == FI_INDEX_BUILD ? vexo::fileindex::newPath(name) : vexo::fileindex::indexPath(name);
    if (file.size() >= static_cast<size_t>(size)) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    if (!vexo::fileindex::begin(name, mode)) return -1;
    memcpy(path, file.c_str(), file.size() + 1);
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int FILEIDXIndexEnd(const char* share, int done) try {
    VEXO_GATE("FILEIDXIndexEnd", -1);
    const std::string name = share == nullptr ? std::string() : definedName(share);
    const auto work = vexo::fileindex::works().find(name);
    if (work == vexo::fileindex::works().end()) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const orvel::RaisedIdentity raised;
    const bool ended = work->second.mode == FI_INDEX_BUILD ? vexo::fileindex::endBuild(name, done != 0)
                                                           : vexo::fileindex::endUpdate(name, done != 0);
    vexo::fileindex::works().erase(work);
    return ended ? 0 : -1;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

long FILEIDXSweep() try {
    VEXO_GATE("FILEIDXSweep", -1);
    const orvel::RaisedIdentity raised;
    return vexo::fileindex::removeUnfinished();
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int FILEIDXIndexDrop(const char* share) try {
    VEXO_GATE("FILEIDXIndexDrop", -1);
    if (share == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    // A share that no longer exists may have left its index behind.
    const orvel::RaisedIdentity raised;
    if (!vexo::fileindex::makeStore()) return -1;
    const orvel::Descriptor lock = vexo::fileindex::lockIndex(share);
    if (!lock) return -1;
    using namespace vexo::fileindex;
    return removeFile(indexPath(share)) && removeFile(namesPath(share)) ? 0 : -1;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int FILEIDXIndexStatus(const char* share, FIINDEXSTATUS* status) try {
    VEXO_GATE("FILEIDXIndexStatus", -1);
    if (share == nullptr || status == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    *status = {};
    const orvel::RaisedIdentity raised;
    return vexo::fileindex::readStatus(share, *status) ? 0 : -1;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int FILEIDXIndexAsOf(const char* share, int64_t* updated, int* live) try {
    VEXO_GATE("FILEIDXIndexAsOf", -1);
    if (share == nullptr || updated == nullptr || live == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const orvel::RaisedIdentity raised;
    const auto database = vexo::fileindex::openIndex(share);
    vexo::fileindex::State state{};
    if (database == nullptr || !database->readState(state)) return -1;
    *updated = state.updated;
    *live = static_cast<int>(vexo::fileindex::isLive(share));
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int FILEIDXIndexMark(const char* share, int state) try {
    VEXO_GATE("FILEIDXIndexMark", -1);
    const std::string name = share == nullptr ? std::string() : definedName(share);
    const auto work = vexo::fileindex::works().find(name);
    const bool known = state >= FI_INDEX_BEHIND && state <= FI_INDEX_LIVE;
    if (!known || work == vexo::fileindex::works().end() || work->second.mode != FI_INDEX_UPDATE) {
        return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    }
    const orvel::RaisedIdentity raised;
    return vexo::fileindex::mark(name, state, work->second) ? 0 : -1;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
