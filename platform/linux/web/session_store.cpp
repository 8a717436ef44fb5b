#include "web/session_store.h"

#include <dirent.h>
#include <sys/stat.h>

#include <memory>
#include <optional>

#include "base/raised_identity.h"
#include "base/random.h"
#include "failure.h"
#include "io/file_io.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"
#include "vexo/volume.h"
#include "web/session_record.h"

namespace vexo {
namespace {

constexpr const char* kRunFolder = "/run";
constexpr const char* kPlatformFolder = "/run/vexo";
constexpr const char* kStoreFolder = "/run/vexo/sessions";
constexpr int kDefaultTimeout = 15;  // minutes, as for the records of sharing sessions
constexpr time_t kNoteInterval = 60;
constexpr size_t kMaxRecord = 4096;

struct CloseFolder {
    void operator()(DIR* folder) const {
        const KeepErrno keep;
        closedir(folder);
    }
};
using Folder = std::unique_ptr<DIR, CloseFolder>;

long long timeoutSeconds() {
    const int minutes = VLIBCConfGetKTRTimeout();
    return 60LL * (minutes < 0 ? kDefaultTimeout : minutes);
}

bool makeFolder(const char* path, mode_t mode) {
    return mkdir(VEXO::SystemPath(path).c_str(), mode) == 0 || errno == EEXIST;
}

bool makeStore() {
    return makeFolder(kRunFolder, 0755) && makeFolder(kPlatformFolder, 0755) && makeFolder(kStoreFolder, 0700);
}

Descriptor openStore() {
    Descriptor store = openFile(VEXO::SystemPath(kStoreFolder), O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
    struct stat status {};
    if (store && (fstat(store.get(), &status) != 0 || !isTrusted(status, S_IFDIR))) {
        errno = EACCES;
        return Descriptor();
    }
    return store;
}

bool writeSession(int store, const std::string& sid, const std::string& record) {
    const Descriptor fd = openFile(store, sid.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW, 0600);
    if (!fd) return false;
    if (writeAll(fd.get(), record)) return true;
    const KeepErrno keep;
    unlinkat(store, sid.c_str(), 0);
    return false;
}

// Removes what has ended among the open store's sessions, and counts it.
long sweep(const Descriptor& store) {
    Descriptor again = openFile(store.get(), ".", O_RDONLY | O_DIRECTORY);
    const Folder folder(again ? fdopendir(again.get()) : nullptr);
    if (!folder) return -1;
    static_cast<void>(again.release());
    long removed = 0;
    const long long timeout = timeoutSeconds();
    const time_t now = time(nullptr);
    while (const dirent* entry = readdir(folder.get())) {
        struct stat status {};
        if (!isSessionId(entry->d_name)) continue;
        if (fstatat(store.get(), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) != 0) continue;
        if (isSessionAlive(status.st_mtime, now, timeout)) continue;
        if (unlinkat(store.get(), entry->d_name, 0) == 0) ++removed;
    }
    return removed;
}

// The user of a session's file that may be trusted.
std::optional<std::string> readUser(int fd, struct stat& status) {
    std::string text;
    if (fstat(fd, &status) != 0 || !isTrusted(status, S_IFREG) || !readAll(fd, text, kMaxRecord)) return {};
    auto record = parseSessionRecord(text);
    if (!record) return {};
    return std::move(record->user);
}

// Notes the use, but writes seldom: a listing page asks for many things within a second.
void noteUse(int fd, time_t lastUse, time_t now) {
    if (lastUse <= now && now - lastUse < kNoteInterval) return;
    const KeepErrno keep;
    const timespec times[] = {{0, UTIME_OMIT}, {0, UTIME_NOW}};
    static_cast<void>(futimens(fd, times));
}

bool findSession(const std::string& sid, const std::string& user, long long timeout) {
    const Descriptor store = openStore();
    if (!store) return false;
    const Descriptor fd = openFile(store.get(), sid.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK);
    struct stat status {};
    if (!fd || readUser(fd.get(), status) != user) return false;
    const time_t now = time(nullptr);
    if (!isSessionAlive(status.st_mtime, now, timeout)) {
        unlinkat(store.get(), sid.c_str(), 0);
        return false;
    }
    noteUse(fd.get(), status.st_mtime, now);
    return true;
}

// The user's folders for temporary files. Where they cannot be made, what needs them says so.
void prepareFolders(const std::string& user) {
    const KeepErrno keep;
    const int code = VLIBCErrGet();
    static_cast<void>(VEXOVolumesPrepareFor(user.c_str(), nullptr, nullptr));
    VLIBCErrSetEx(code, __FILE__, __LINE__);
}

}  // namespace

bool isSessionAlive(time_t lastUse, time_t now, long long timeout) {
    // A use in the future is a clock that was set back; the next use puts it right.
    return lastUse >= now || now - lastUse <= timeout + kNoteInterval;
}

std::string createSession(const std::string& user, const std::string& address) {
    const auto record = buildSessionRecord({user, address, time(nullptr)});
    if (!record) {
        fail(VEXO_ERR_PARAMETER, EINVAL);
        return {};
    }
    std::string sid = orvel::draw<16>();
    const orvel::RaisedIdentity raised;
    const Descriptor store = !sid.empty() && makeStore() ? openStore() : Descriptor();
    if (!store || !writeSession(store.get(), sid, *record)) {
        fail(errorOfErrno(errno));
        return {};
    }
    // One in 256, so that neither the store grows nor every log-in reads it.
    if (sid.starts_with("00")) sweep(store);
    prepareFolders(user);
    return sid;
}

bool useSession(const std::string& sid, const std::string& user) {
    const long long timeout = timeoutSeconds();
    const orvel::RaisedIdentity raised;
    return isSessionId(sid) && findSession(sid, user, timeout);
}

long sweepSessions() {
    const orvel::RaisedIdentity raised;
    const Descriptor store = openStore();
    if (!store) return errno == ENOENT ? 0 : -1;
    return sweep(store);
}

}  // namespace vexo
