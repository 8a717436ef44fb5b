#include "link_database.h"

#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "failure.h"
#include "io/trusted_file.h"
#include "vexo/filesystem.h"
#include "vexo/link_store.h"
#include "vexo/system_root.h"

namespace vexo {
namespace {

constexpr int kPatience = 4000;  // milliseconds for the locks of others

// What stands beside the links has a version, SQLite's user_version; a database without it is of version 0.
constexpr std::int64_t kVersion = 2;

// The library reads the first seven columns by these names.
constexpr const char* kTable =
    "CREATE TABLE IF NOT EXISTS sharingLinks(linkID TEXT PRIMARY KEY NOT NULL, uid TEXT NOT NULL, filepath TEXT NOT "
    "NULL, filename TEXT NOT NULL, password TEXT NOT NULL, AvailDate TEXT NOT NULL, ExpDate TEXT NOT NULL, owner TEXT "
    "NOT NULL, created TEXT NOT NULL)";
constexpr const char* kBeside =
    "CREATE TABLE IF NOT EXISTS linkMore(linkID TEXT PRIMARY KEY NOT NULL, note TEXT NOT NULL DEFAULT '', most INTEGER "
    "NOT NULL DEFAULT 0, used INTEGER NOT NULL DEFAULT 0, lastUse INTEGER NOT NULL DEFAULT 0);"
    "CREATE TABLE IF NOT EXISTS linkTaken(linkID TEXT NOT NULL, who TEXT NOT NULL, what TEXT NOT NULL, at INTEGER NOT "
    "NULL, PRIMARY KEY(linkID, who, what));"
    // Of their own, so that nothing that reads links takes one for a link to read. `name` is bytes.
    "CREATE TABLE IF NOT EXISTS uploadLinks(linkID TEXT PRIMARY KEY NOT NULL, uid TEXT NOT NULL, filepath TEXT NOT "
    "NULL, password TEXT NOT NULL, AvailDate TEXT NOT NULL, ExpDate TEXT NOT NULL, owner TEXT NOT NULL, created TEXT "
    "NOT NULL, folder TEXT NOT NULL, mostFiles INTEGER NOT NULL, mostBytes INTEGER NOT NULL, files INTEGER NOT NULL "
    "DEFAULT 0, bytes INTEGER NOT NULL DEFAULT 0);"
    "CREATE TABLE IF NOT EXISTS sentFiles(linkID TEXT NOT NULL, at INTEGER NOT NULL, address TEXT NOT NULL, name TEXT "
    "NOT NULL, size INTEGER NOT NULL);"
    "CREATE INDEX IF NOT EXISTS sentBy ON sentFiles(linkID);"
    "PRAGMA user_version = 2;";

// Whether something bears the name; what cannot be determined counts so, and fails when it is opened.
bool isThere(const std::string& path) {
    struct stat status {};
    return lstat(path.c_str(), &status) == 0 || errno != ENOENT;
}

// An empty database at `path`, which is the caller's own; what a killed process left there goes first.
bool makeTable(const std::string& path) {
    for (const char* rest : {"", "-journal"}) {
        if (unlink((path + rest).c_str()) != 0 && errno != ENOENT) return false;
    }
    if (!openTrusted(path, O_RDWR | O_CREAT | O_EXCL, 0600)) return false;
    const Database made = openDatabase(path, SQLITE_OPEN_READWRITE);
    if (!made) return false;
    const int result = sqlite3_exec(made.get(), kTable, nullptr, nullptr, nullptr);
    if (result != SQLITE_OK) errno = errnoOfSqlite(result);
    return result == SQLITE_OK;
}

// Makes the database with its folder, one process at a time, and names it once it is whole. False with errno.
bool makeDatabase(const std::string& path) {
    constexpr uid_t keep = static_cast<uid_t>(-1);
    const std::string folder = path.substr(0, path.rfind('/')), part = path + ".new";
    if (VEXOFSMkdirP(folder.c_str(), nullptr, 1, keep, keep, 0755) != 0) return false;
    const Descriptor lock = vexo::openFile(folder, O_RDONLY | O_DIRECTORY);
    if (!lock || !lockFile(lock.get(), LOCK_EX)) return false;
    if (isThere(path)) return true;  // another process was faster
    if (makeTable(part) && rename(part.c_str(), path.c_str()) == 0) return fsync(lock.get()) == 0;
    const KeepErrno keepErrno;
    unlink(part.c_str());
    return false;
}

}  // namespace

std::string textOf(const Statement& row, int column) {
    const auto* bytes = static_cast<const char*>(sqlite3_column_blob(row.get(), column));
    return bytes == nullptr ? "" : std::string(bytes, static_cast<size_t>(sqlite3_column_bytes(row.get(), column)));
}

std::int64_t numberOf(const Statement& row, int column) {
    return strtoll(textOf(row, column).c_str(), nullptr, 10);
}

bool LinkDatabase::fail() {
    error_ = database_ == nullptr ? std::strerror(errno) : sqlite3_errmsg(database_.get());
    return false;
}

bool LinkDatabase::execute(const char* sql) {
    return sqlite3_exec(database_.get(), sql, nullptr, nullptr, nullptr) == SQLITE_OK || fail();
}

// Adds what stands beside the links, once.
bool LinkDatabase::upgrade() {
    std::int64_t version = 0;
    const TakeRow take = [&version](const Statement& row) { version = numberOf(row, 0); };
    if (!run("PRAGMA user_version", {}, take)) return false;
    if (version == kVersion) return true;
    if (version > kVersion) {
        error_ = "made by a newer version";
        return false;
    }
    LinkTransaction transaction(*this);
    // One without its table is broken: it must not pass for one without links.
    return transaction.begun() && execute("SELECT 1 FROM sharingLinks LIMIT 1") && execute(kBeside) &&
           transaction.commit();
}

bool LinkDatabase::openFile(const std::string& path, bool adding) {
    if (database_ != nullptr) return true;
    if (!isTrustedFile(path)) return fail();
    database_ = openDatabase(path, SQLITE_OPEN_READWRITE);
    if (database_ == nullptr) return fail();
    sqlite3_busy_timeout(database_.get(), kPatience);
    if ((!adding || execute(kTable)) && upgrade()) return true;
    database_.reset();
    return false;
}

bool LinkDatabase::openForAdding() {
    const std::string path = VEXO::SystemPath(VEXO::kLinkDatabase);
    if (database_ == nullptr && !isThere(path) && !makeDatabase(path)) return fail();
    return openFile(path, true);
}

bool LinkDatabase::open(bool& there) {
    const std::string path = VEXO::SystemPath(VEXO::kLinkDatabase);
    there = database_ != nullptr || isThere(path);
    return !there || openFile(path, false);
}

bool LinkDatabase::run(const char* sql, const std::vector<std::string>& values, const TakeRow& take) {
    const Statement statement = prepare(database_.get(), sql);
    if (statement == nullptr) return fail();
    for (size_t i = 0; i < values.size(); ++i) {
        sqlite3_bind_text(statement.get(), static_cast<int>(i + 1), values[i].data(),
                          static_cast<int>(values[i].size()), SQLITE_TRANSIENT);
    }
    int state = SQLITE_DONE;
    while ((state = sqlite3_step(statement.get())) == SQLITE_ROW) {
        if (take) take(statement);
    }
    return state == SQLITE_DONE || fail();
}

}  // namespace vexo
