#include "web/session_store.h"

#include <dirent.h>
#include <sys/stat.h>

#include <algorithm>
#include <charconv>
#include <cstdlib>
#include <memory>

#include "base/owner.h"
#include "base/raised_identity.h"
#include "base/random.h"
#include "failure.h"
#include "io/file_io.h"
#include "vexo/settings.h"
#include "vexo/volume.h"
#include "web/run_folder.h"

namespace vexo {
namespace {

constexpr const char* kStore = "sessions";
constexpr int kDefaultTimeout = 15;        // minutes, as for the records of sharing sessions
constexpr int kDefaultLifetime = 24 * 60;  // minutes
constexpr int kLongestLifetime = 366 * 24 * 60;
constexpr time_t kNoteInterval = 60;
constexpr size_t kMaxRecord = 4096;
constexpr size_t kMostOfUser = 32;
using Folder = std::unique_ptr<DIR, orvel::Releaser<closedir>>;

int lifetimeMinutes() {
    const std::string text = VexoConf::Info().Get("session_lifetime", "");
    int minutes = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), minutes);
    const bool whole = error == std::errc() && end == text.data() + text.size();
    return whole && minutes > 0 && minutes <= kLongestLifetime ? minutes : kDefaultLifetime;
}

bool writeSession(int store, const std::string& sid, const std::string& record) {
    const Descriptor fd = openFile(store, sid.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW, 0600);
    if (!fd) return false;
    if (writeAll(fd.get(), record)) return true;
    const KeepErrno keep;
    unlinkat(store, sid.c_str(), 0);
    return false;
}

// The names of all session files of the open store. False with errno when it cannot be read.
bool readNames(const Descriptor& store, std::vector<std::string>& list) {
    Descriptor again = openFile(store.get(), ".", O_RDONLY | O_DIRECTORY);
    const Folder folder(again ? fdopendir(again.get()) : nullptr);
    if (!folder) return false;
    static_cast<void>(again.release());
    while (const dirent* entry = readdir(folder.get())) {
        if (isSessionId(entry->d_name)) list.emplace_back(entry->d_name);
    }
    return true;
}

// Removes what has ended for want of use among the open store's sessions, and counts it.
long sweep(const Descriptor& store) {
    std::vector<std::string> names;
    if (!readNames(store, names)) return -1;
    long removed = 0;
    const SessionLimits limits = sessionLimits();
    const time_t now = time(nullptr);
    for (const std::string& sid : names) {
        struct stat status {};
        if (fstatat(store.get(), sid.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) continue;
        if (isSessionAlive(status.st_mtime, now, now, limits)) continue;
        if (unlinkat(store.get(), sid.c_str(), 0) == 0) ++removed;
    }
    return removed;
}

// The record of a session's file that may be trusted.
std::optional<SessionRecord> readRecord(int fd, struct stat& status) {
    std::string text;
    if (fstat(fd, &status) != 0 || !isTrusted(status, S_IFREG) || !readAll(fd, text, kMaxRecord)) return {};
    return parseSessionRecord(text);
}

// Notes the use, but writes seldom: a listing page asks for many things within a second. What a page asks by itself
// while nobody is at it is no use.
void noteUse(int fd, time_t lastUse, time_t now) {
    if ((lastUse <= now && now - lastUse < kNoteInterval) || getenv("HTTP_ORVEL_IDLE") != nullptr) return;
    const KeepErrno keep;
    const timespec times[] = {{0, UTIME_OMIT}, {0, UTIME_NOW}};
    static_cast<void>(futimens(fd, times));
}

// A session of the open store that is alive; one that has ended goes.
std::optional<KeptSession> findSession(int store, const std::string& sid, const SessionLimits& limits, bool isUse) {
    const Descriptor fd = openFile(store, sid.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK);
    struct stat status {};
    auto record = fd ? readRecord(fd.get(), status) : std::nullopt;
    if (!record) return {};
    const time_t now = time(nullptr);
    if (!isSessionAlive(status.st_mtime, record->time, now, limits)) {
        unlinkat(store, sid.c_str(), 0);
        return {};
    }
    if (isUse) noteUse(fd.get(), status.st_mtime, now);
    return KeptSession{sid, std::move(*record), status.st_mtime};
}

// The session that this request has found alive: its further questions do not read it again.
struct LastFound {
    RecentLook look;
    std::string sid;
    SessionRecord record;
};

LastFound& lastFound() {
    static auto& last = *new LastFound;
    return last;
}

std::vector<KeptSession> find(const Descriptor& store, const std::string& user) {
    const SessionLimits limits = sessionLimits();
    std::vector<KeptSession> list;
    std::vector<std::string> names;
    static_cast<void>(readNames(store, names));  // what cannot be read is not there
    for (const std::string& sid : names) {
        auto found = findSession(store.get(), sid, limits, false);
        if (found && found->record.loggedIn && found->record.user == user) list.push_back(std::move(*found));
    }
    std::sort(list.begin(), list.end(), [](const auto& a, const auto& b) { return a.lastUse > b.lastUse; });
    return list;
}

// Makes room for one more session of a user: who has the password must not fill the machine's memory with them.
void makeRoom(const Descriptor& store, const std::string& user) {
    const auto kept = find(store, user);
    for (size_t i = kMostOfUser - 1; i < kept.size(); ++i) unlinkat(store.get(), kept[i].sid.c_str(), 0);
}

// The user's folders for temporary files. Where they cannot be made, what needs them says so.
void prepareFolders(const std::string& user) {
    const KeepErrno keep;
    const int code = VLIBCErrGet();
    static_cast<void>(VEXOVolumesPrepareFor(user.c_str(), nullptr, nullptr));
    VLIBCErrSetEx(code, __FILE__, __LINE__);
}

}  // namespace

SessionLimits sessionLimits() {
    const int minutes = VLIBCConfGetKTRTimeout();
    return {60LL * (minutes < 0 ? kDefaultTimeout : minutes), 60LL * lifetimeMinutes()};
}

bool isSessionAlive(time_t lastUse, time_t begun, time_t now, const SessionLimits& limits) {
    // A time in the future is a clock that was set back; the next use puts it right.
    const bool used = lastUse >= now || now - lastUse <= limits.idle + kNoteInterval;
    return used && (begun >= now || now - begun <= limits.whole);
}

std::string createSession(SessionRecord record) {
    record.time = time(nullptr);
    record.name = orvel::draw<8>();
    const auto text = buildSessionRecord(record);
    if (!text) {
        fail(VEXO_ERR_PARAMETER, EINVAL);
        return {};
    }
    std::string sid = record.name.empty() ? "" : orvel::draw<16>();
    const orvel::RaisedIdentity raised;
    const Descriptor store = !sid.empty() && makeRunFolder(kStore) ? openRunFolder(kStore) : Descriptor();
    if (store && record.loggedIn) makeRoom(store, record.user);
    if (!store || !writeSession(store.get(), sid, *text)) {
        fail(errorOfErrno(errno));
        return {};
    }
    // One in 256, so that neither the store grows nor every log-in reads it.
    if (sid.starts_with("00")) sweep(store);
    prepareFolders(record.user);
    return sid;
}

std::optional<SessionRecord> useSession(const std::string& sid) {
    if (lastFound().look.isRecent() && lastFound().sid == sid) return lastFound().record;
    const SessionLimits limits = sessionLimits();
    const orvel::RaisedIdentity raised;
    const Descriptor store = isSessionId(sid) ? openRunFolder(kStore) : Descriptor();
    auto found = store ? findSession(store.get(), sid, limits, true) : std::nullopt;
    if (!found) return std::nullopt;
    LastFound& last = lastFound();
    last.look = {};
    last.sid = sid;
    last.record = std::move(found->record);
    last.look.note();
    return last.record;
}

bool useSession(const std::string& sid, const std::string& user) {
    const auto record = useSession(sid);
    return record && record->user == user;
}

std::vector<KeptSession> sessionsOf(const std::string& user) {
    const orvel::RaisedIdentity raised;
    const Descriptor store = openRunFolder(kStore);
    return store ? find(store, user) : std::vector<KeptSession>();
}

bool endSession(const std::string& sid) {
    RecentLook::forgetAll();
    const KeepErrno keep;
    const orvel::RaisedIdentity raised;
    const Descriptor store = isSessionId(sid) ? openRunFolder(kStore) : Descriptor();
    return store && unlinkat(store.get(), sid.c_str(), 0) == 0;
}

long sweepSessions() {
    const orvel::RaisedIdentity raised;
    const Descriptor store = openRunFolder(kStore);
    if (!store) return errno == ENOENT ? 0 : -1;
    return sweep(store);
}

}  // namespace vexo
