#include "vexo/auto_block.h"

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <exception>
#include <initializer_list>
#include <string>
#include <string_view>
#include <utility>

#include "base/raised_identity.h"
#include "failure.h"
#include "fault_gate.h"
#include "io/sqlite_handle.h"
#include "io/trusted_file.h"
#include "vexo/filesystem.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"
#include "web/auto_block_rules.h"

namespace {

constexpr const char* kFolder = "/var/lib/vexo";
constexpr const char* kStore = "/var/lib/vexo/autoblock.db";
constexpr int kPatience = 8000;  // milliseconds for the locks of others
constexpr size_t kMaxTag = 64;
constexpr int kMaxRows = 10000;
constexpr long long kForGood =
    24LL * 60 * 60;  // seconds after which asking again is worth it, for who is denied for good

// `since` is the first failure of the window, `denied` the time of the denial or 0.
constexpr const char* kSchema =
    "CREATE TABLE IF NOT EXISTS failures(address TEXT NOT NULL, tag TEXT NOT NULL, count INTEGER NOT NULL,"
    " since INTEGER NOT NULL, denied INTEGER NOT NULL, PRIMARY KEY(address, tag)) WITHOUT ROWID";
// What has ended; a time in the future is a clock that was set back.
constexpr const char* kForgetEnded =
    "DELETE FROM failures WHERE CASE WHEN denied = 0 THEN since > ?1 OR ?1 - since >= ?2"
    " ELSE ?3 > 0 AND abs(?1 - denied) >= ?3 END";
constexpr const char* kCount =
    "INSERT INTO failures VALUES(?1, ?2, 1, ?3, 0) ON CONFLICT DO UPDATE SET count = count + 1";
constexpr const char* kDeny =
    "UPDATE failures SET denied = ?3 WHERE address = ?1 AND tag = ?2 AND denied = 0 AND count >= ?4";
// Whoever has many addresses must not fill the disk: the oldest counts go first, then the oldest denials.
constexpr const char* kBound =
    "DELETE FROM failures WHERE (address, tag) IN (SELECT address, tag FROM failures ORDER BY denied, since"
    " LIMIT max(0, (SELECT count(*) FROM failures) - ?1))";
// For how many seconds more.
constexpr const char* kAsk =
    "SELECT CASE WHEN ?3 = 0 THEN ?4 ELSE ?3 - abs(?2 - denied) END FROM failures"
    " WHERE address = ?1 AND denied <> 0 AND (?3 = 0 OR abs(?2 - denied) < ?3) ORDER BY 1 DESC LIMIT 1";
constexpr const char* kReset = "DELETE FROM failures WHERE address = ?1";

struct Value {
    // Not explicit: a list of values reads as the statement does.
    Value(std::string_view from) : text(from), isText(true) {}
    Value(long long from) : number(from) {}
    std::string_view text;
    long long number = 0;
    bool isText = false;
};

vexo::AutoBlockRules currentRules() {
    const vexo::KeepErrno keep;
    const VexoConf::Info settings;
    return vexo::parseAutoBlockRules(settings.Get("autoblock_enable", ""), settings.Get("autoblock_attempts", ""),
                                     settings.Get("autoblock_minutes", ""),
                                     settings.Get("autoblock_expire_minutes", ""));
}

// Runs one statement. SQLITE_ROW when it has a row, whose first number `found` takes, SQLITE_DONE when not, else what
// went wrong, with errno.
int run(sqlite3* db, const char* sql, std::initializer_list<Value> values, int* found = nullptr) {
    const vexo::Statement statement = vexo::prepare(db, sql);
    if (!statement) return sqlite3_errcode(db);
    int index = 0;
    for (const Value& value : values) {
        ++index;
        if (value.isText) {
            sqlite3_bind_text(statement.get(), index, value.text.data(), static_cast<int>(value.text.size()),
                              SQLITE_STATIC);
        } else {
            sqlite3_bind_int64(statement.get(), index, value.number);
        }
    }
    const int result = sqlite3_step(statement.get());
    if (result == SQLITE_ROW && found != nullptr) *found = sqlite3_column_int(statement.get(), 0);
    if (result != SQLITE_ROW && result != SQLITE_DONE) errno = vexo::errnoOfSqlite(result);
    return result;
}

bool isDone(int result) {
    return result == SQLITE_ROW || result == SQLITE_DONE;
}

// Makes sure that the store's file is there (where `create`) and ours.
bool checkFile(const std::string& path, bool create) {
    const int flags = O_RDWR | (create ? O_CREAT : 0);
    if (vexo::openTrusted(path, flags, 0600)) return true;
    if (errno != ENOENT || !create) return false;
    constexpr uid_t keep = static_cast<uid_t>(-1);
    if (VEXOFSMkdirP(VEXO::SystemPath(kFolder).c_str(), nullptr, 1, keep, keep, 0755) != 0) return false;
    return static_cast<bool>(vexo::openTrusted(path, flags, 0600));
}

// Null with errno; ENOENT where nothing was ever counted.
vexo::Database openStore(bool create) {
    const std::string path = VEXO::SystemPath(kStore);
    if (!checkFile(path, create)) return nullptr;
    vexo::Database db = vexo::openDatabase(path, SQLITE_OPEN_READWRITE);
    if (!db) return db;
    sqlite3_busy_timeout(db.get(), kPatience);
    // A count that a power failure takes back does no harm, a wait for the disk at each failed log-in does.
    const bool ready = isDone(run(db.get(), "PRAGMA synchronous=NORMAL", {})) && isDone(run(db.get(), kSchema, {}));
    return ready ? std::move(db) : nullptr;
}

bool count(sqlite3* db, std::string_view address, std::string_view tag, const vexo::AutoBlockRules& rules) {
    const long long now = time(nullptr);
    const bool counted = isDone(run(db, "BEGIN IMMEDIATE", {})) &&
                         isDone(run(db, kForgetEnded, {now, rules.window, rules.duration})) &&
                         isDone(run(db, kCount, {address, tag, now})) &&
                         isDone(run(db, kDeny, {address, tag, now, static_cast<long long>(rules.attempts)})) &&
                         isDone(run(db, kBound, {static_cast<long long>(kMaxRows)}));
    return counted && isDone(run(db, "COMMIT", {}));  // else closing takes it back
}

bool isTag(std::string_view tag) {
    return !tag.empty() && tag.size() <= kMaxTag &&
           std::all_of(tag.begin(), tag.end(), [](unsigned char byte) { return byte >= 0x20 && byte != 0x7F; });
}

int failStore() {
    return vexo::fail(vexo::errorOfFile(errno));
}

}  // namespace

int VEXOAutoBlockWait(const char* address) try {
    const auto normal = address == nullptr ? std::nullopt : vexo::normaliseAddress(address);
    if (!normal) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    const vexo::AutoBlockRules rules = currentRules();
    if (!rules.enabled) return 0;
    const orvel::RaisedIdentity raised;
    const vexo::Database db = openStore(false);
    if (!db && errno != ENOENT) return failStore();
    int wait = 0;
    const long long now = time(nullptr);
    if (db && !isDone(run(db.get(), kAsk, {std::string_view(*normal), now, rules.duration, kForGood}, &wait))) {
        return failStore();
    }
    errno = before;
    return wait;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VexoCgiIsDeniedIP(const char* address) try {
    VEXO_GATE("VexoCgiIsDeniedIP", -1);
    return std::min(VEXOAutoBlockWait(address), 1);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOAutoBlockResetByIP(const char* address) try {
    VEXO_GATE("VEXOAutoBlockResetByIP", -1);
    const auto normal = address == nullptr ? std::nullopt : vexo::normaliseAddress(address);
    if (!normal) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    const orvel::RaisedIdentity raised;
    const vexo::Database db = openStore(false);
    if (!db && errno != ENOENT) return failStore();
    if (db && !isDone(run(db.get(), kReset, {std::string_view(*normal)}))) return failStore();
    errno = before;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int AutoBlockFailLoginSet(const char* address, const char* tag) try {
    VEXO_GATE("AutoBlockFailLoginSet", -1);
    const auto normal = address == nullptr ? std::nullopt : vexo::normaliseAddress(address);
    if (!normal || tag == nullptr || !isTag(tag)) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    const vexo::AutoBlockRules rules = currentRules();
    if (!rules.enabled) return 0;
    const orvel::RaisedIdentity raised;
    const vexo::Database db = openStore(true);
    if (!db || !count(db.get(), *normal, tag, rules)) return failStore();
    errno = before;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

long VEXOAutoBlockSweep() try {
    VEXO_GATE("VEXOAutoBlockSweep", -1);
    const vexo::AutoBlockRules rules = currentRules();
    const orvel::RaisedIdentity raised;
    const vexo::Database db = openStore(false);
    if (!db) return errno == ENOENT ? 0 : failStore();
    const long long now = time(nullptr);
    if (!isDone(run(db.get(), kForgetEnded, {now, rules.window, rules.duration}))) return failStore();
    return sqlite3_changes(db.get());
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
