#include "vexo/link_store.h"

#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>

#include "base/raised_identity.h"
#include "base/random.h"
#include "failure.h"
#include "fault_gate.h"
#include "io/sqlite_handle.h"
#include "io/trusted_file.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"

namespace VEXO {
namespace {

constexpr int kPatience = 4000;  // milliseconds for the locks of others
constexpr size_t kIdBytes = 16;

// The library reads the first seven columns by these names.
constexpr const char* kTable =
    "CREATE TABLE IF NOT EXISTS sharingLinks(linkID TEXT PRIMARY KEY NOT NULL, uid TEXT NOT NULL, filepath TEXT NOT "
    "NULL, filename TEXT NOT NULL, password TEXT NOT NULL, AvailDate TEXT NOT NULL, ExpDate TEXT NOT NULL, owner TEXT "
    "NOT NULL, created TEXT NOT NULL)";
constexpr const char* kInsert =
    "INSERT INTO sharingLinks(linkID, owner, uid, filepath, filename, password, AvailDate, ExpDate, created) "
    "VALUES(?,?,?,?,?,?,?,?,?)";
constexpr const char* kSelect =
    "SELECT linkID, owner, uid, filepath, password, AvailDate, ExpDate, created FROM sharingLinks ";
constexpr const char* kDelete = "DELETE FROM sharingLinks WHERE linkID = ?1 AND (?2 = '' OR owner = ?2)";

std::string text(const vexo::Statement& row, int column) {
    const auto* bytes = static_cast<const char*>(sqlite3_column_blob(row.get(), column));
    return bytes == nullptr ? "" : std::string(bytes, static_cast<size_t>(sqlite3_column_bytes(row.get(), column)));
}

std::int64_t number(const vexo::Statement& row, int column) {
    return strtoll(text(row, column).c_str(), nullptr, 10);
}

Link linkOf(const vexo::Statement& row) {
    return {.id = text(row, 0),
            .owner = text(row, 1),
            .uid = static_cast<uid_t>(number(row, 2)),
            .path = text(row, 3),
            .passwordHash = text(row, 4),
            .available = number(row, 5),
            .expires = number(row, 6),
            .created = number(row, 7)};
}

vexo::Statement prepare(sqlite3* database, const char* sql, const std::vector<std::string>& values) {
    vexo::Statement statement = vexo::prepare(database, sql);
    for (size_t i = 0; statement != nullptr && i < values.size(); ++i) {
        sqlite3_bind_text(statement.get(), static_cast<int>(i + 1), values[i].data(),
                          static_cast<int>(values[i].size()), SQLITE_TRANSIENT);
    }
    return statement;
}

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
    if (!vexo::openTrusted(path, O_RDWR | O_CREAT | O_EXCL, 0600)) return false;
    const vexo::Database made = vexo::openDatabase(path, SQLITE_OPEN_READWRITE);
    if (!made) return false;
    const int result = sqlite3_exec(made.get(), kTable, nullptr, nullptr, nullptr);
    if (result != SQLITE_OK) errno = vexo::errnoOfSqlite(result);
    return result == SQLITE_OK;
}

// Makes the database with its folder, one process at a time, and names it once it is whole. False with errno.
bool makeDatabase(const std::string& path) {
    constexpr uid_t keep = static_cast<uid_t>(-1);
    const std::string folder = path.substr(0, path.rfind('/')), part = path + ".new";
    if (VEXOFSMkdirP(folder.c_str(), nullptr, 1, keep, keep, 0755) != 0) return false;
    const vexo::Descriptor lock = vexo::openFile(folder, O_RDONLY | O_DIRECTORY);
    if (!lock || !vexo::lockFile(lock.get(), LOCK_EX)) return false;
    if (isThere(path)) return true;  // another process was faster
    if (makeTable(part) && rename(part.c_str(), path.c_str()) == 0) return fsync(lock.get()) == 0;
    const vexo::KeepErrno keepErrno;
    unlink(part.c_str());
    return false;
}

}  // namespace

struct LinkStore::Impl {
    vexo::Database database;
    std::string error;

    bool fail() {
        error = database == nullptr ? std::strerror(errno) : sqlite3_errmsg(database.get());
        return false;
    }
    // Opens the database that is there.
    bool open(const std::string& path) {
        if (database != nullptr) return true;
        if (!vexo::isTrustedFile(path)) return fail();
        database = vexo::openDatabase(path, SQLITE_OPEN_READWRITE);
        if (database == nullptr) return fail();
        sqlite3_busy_timeout(database.get(), kPatience);
        return true;
    }
    // Opens it, made where there is none.
    bool openForAdding() {
        const std::string path = SystemPath(kLinkDatabase);
        if (database == nullptr && !isThere(path) && !makeDatabase(path)) return fail();
        if (!open(path)) return false;
        return sqlite3_exec(database.get(), kTable, nullptr, nullptr, nullptr) == SQLITE_OK || fail();
    }
    // Runs a statement and hands over its rows.
    bool run(const char* sql, const std::vector<std::string>& values, std::vector<Link>* links = nullptr) {
        const vexo::Statement statement = prepare(database.get(), sql, values);
        if (statement == nullptr) return fail();
        int state = SQLITE_DONE;
        while ((state = sqlite3_step(statement.get())) == SQLITE_ROW && links != nullptr) {
            links->push_back(linkOf(statement));
        }
        return state == SQLITE_DONE || fail();
    }
    // Runs a statement where a link was ever made; else there is just nothing.
    bool ask(const char* sql, const std::vector<std::string>& values, std::vector<Link>* links, bool& asked) {
        const std::string path = SystemPath(kLinkDatabase);
        asked = database != nullptr || isThere(path);
        return !asked || (open(path) && run(sql, values, links));
    }
};

LinkStore::LinkStore() : impl_(std::make_unique<Impl>()) {}

LinkStore::~LinkStore() {
    const orvel::RaisedIdentity raised;
    impl_->database.reset();
}

const std::string& LinkStore::error() const {
    return impl_->error;
}

bool LinkStore::add(Link& link) {
    VEXO_GATE("LinkStore::add", impl_->fail());
    const orvel::RaisedIdentity raised;
    if (!impl_->openForAdding()) return false;
    link.id = orvel::draw<kIdBytes>();
    link.created = time(nullptr);
    if (link.id.empty()) {
        impl_->error = std::strerror(errno);
        return false;
    }
    return impl_->run(
        kInsert, {link.id, link.owner, std::to_string(link.uid), link.path, link.path.substr(link.path.rfind('/') + 1),
                  link.passwordHash, std::to_string(link.available), std::to_string(link.expires),
                  std::to_string(link.created)});
}

bool LinkStore::find(const std::string& id, std::optional<Link>& link) {
    VEXO_GATE("LinkStore::find", impl_->fail());
    const orvel::RaisedIdentity raised;
    std::vector<Link> links;
    bool asked = false;
    link.reset();
    if (!impl_->ask((std::string(kSelect) + "WHERE linkID = ?").c_str(), {id}, &links, asked)) return false;
    if (!links.empty()) link = links.front();
    return true;
}

bool LinkStore::list(const std::string& owner, std::vector<Link>& links) {
    VEXO_GATE("LinkStore::list", impl_->fail());
    const orvel::RaisedIdentity raised;
    bool asked = false;
    const std::string sql = std::string(kSelect) + "WHERE ?1 = '' OR owner = ?1 ORDER BY rowid";
    return impl_->ask(sql.c_str(), {owner}, &links, asked);
}

bool LinkStore::remove(const std::string& id, const std::string& owner, bool& removed) {
    removed = false;
    VEXO_GATE("LinkStore::remove", impl_->fail());
    const orvel::RaisedIdentity raised;
    bool asked = false;
    if (!impl_->ask(kDelete, {id, owner}, nullptr, asked)) return false;
    removed = asked && sqlite3_changes(impl_->database.get()) > 0;
    return true;
}

}  // namespace VEXO
