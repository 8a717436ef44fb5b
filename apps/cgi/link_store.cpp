#include "link_store.h"

#include <crypt.h>
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <memory>
#include <system_error>

#include "base/descriptor.h"
#include "base/owner.h"
#include "base/raised_identity.h"
#include "base/random.h"
#include "orvel/external_host.h"
#include "vexo/system_root.h"
#include "vexo/user.h"

namespace fs = std::filesystem;

namespace orvel::cgi {
namespace {

constexpr const char* kFile = "/usr/vexo/etc/pexlander/pxsharing.db";
constexpr const char* kProgram = "/cgi-bin/share?FOLDER_SHARING=";
constexpr int kBusyMilliseconds = 4000;
constexpr size_t kIdBytes = 16;  // their digits are a name for a cookie and a field of a record

// The library reads the first seven columns by these names.
constexpr const char* kTable =
    "CREATE TABLE IF NOT EXISTS sharingLinks(linkID TEXT PRIMARY KEY NOT NULL, uid TEXT NOT NULL, filepath TEXT NOT "
    "NULL, filename TEXT NOT NULL, password TEXT NOT NULL, AvailDate TEXT NOT NULL, ExpDate TEXT NOT NULL, owner TEXT "
    "NOT NULL, created TEXT NOT NULL)";
constexpr const char* kColumns = "SELECT linkID, owner, uid, filepath, password, AvailDate, ExpDate, created";

struct Finalize {
    void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Statement = std::unique_ptr<sqlite3_stmt, Finalize>;

Statement prepare(sqlite3* database, const std::string& sql, const std::vector<std::string>& values) {
    sqlite3_stmt* made = nullptr;
    sqlite3_prepare_v2(database, sql.c_str(), -1, &made, nullptr);
    Statement statement(made);
    for (size_t i = 0; statement != nullptr && i < values.size(); ++i) {
        sqlite3_bind_text(made, static_cast<int>(i + 1), values[i].data(), static_cast<int>(values[i].size()),
                          SQLITE_TRANSIENT);
    }
    return statement;
}

std::string text(const Statement& row, int column) {
    const auto* bytes = static_cast<const char*>(sqlite3_column_blob(row.get(), column));
    return bytes == nullptr ? "" : std::string(bytes, static_cast<size_t>(sqlite3_column_bytes(row.get(), column)));
}

std::int64_t number(const Statement& row, int column) {
    return strtoll(text(row, column).c_str(), nullptr, 10);
}

Link linkOf(const Statement& row) {
    return {.id = text(row, 0),
            .owner = text(row, 1),
            .uid = static_cast<uid_t>(number(row, 2)),
            .path = text(row, 3),
            .passwordHash = text(row, 4),
            .available = number(row, 5),
            .expires = number(row, 6),
            .created = number(row, 7)};
}

// Makes the file, with its folder, before SQLite would make it for everybody to read.
bool makeFile(const std::string& path) {
    std::error_code ignored;
    fs::create_directories(fs::path(path).parent_path(), ignored);
    const Descriptor made(::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
    return static_cast<bool>(made);
}

}  // namespace

LinkStore::LinkStore() = default;

LinkStore::~LinkStore() {
    const RaisedIdentity root;
    sqlite3_close(database_);
}

bool LinkStore::fail() {
    error_ = database_ == nullptr ? std::strerror(errno) : sqlite3_errmsg(database_);
    return false;
}

bool LinkStore::open(bool make) {
    if (database_ != nullptr) return true;
    const std::string path = VEXO::SystemPath(kFile);
    if (make && !makeFile(path)) return fail();
    constexpr int kFlags = SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOFOLLOW | SQLITE_OPEN_PRIVATECACHE;
    if (sqlite3_open_v2(path.c_str(), &database_, kFlags, nullptr) != SQLITE_OK) return fail();
    sqlite3_busy_timeout(database_, kBusyMilliseconds);
    sqlite3_db_config(database_, SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
    sqlite3_db_config(database_, SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0, nullptr);
    return !make || sqlite3_exec(database_, kTable, nullptr, nullptr, nullptr) == SQLITE_OK || fail();
}

bool LinkStore::add(Link& link) {
    const RaisedIdentity root;
    if (!open(true)) return false;
    link.id = draw<kIdBytes>();
    link.created = time(nullptr);
    if (link.id.empty()) return fail();
    const Statement insert =
        prepare(database_,
                "INSERT INTO sharingLinks(linkID, owner, uid, filepath, filename, password, AvailDate, ExpDate, "
                "created) VALUES(?,?,?,?,?,?,?,?,?)",
                {link.id, link.owner, std::to_string(link.uid), link.path, link.path.substr(link.path.rfind('/') + 1),
                 link.passwordHash, std::to_string(link.available), std::to_string(link.expires),
                 std::to_string(link.created)});
    return (insert != nullptr && sqlite3_step(insert.get()) == SQLITE_DONE) || fail();
}

bool LinkStore::query(const char* condition, const std::string& value, std::vector<Link>& links) {
    const RaisedIdentity root;
    // No link was ever made.
    if (access(VEXO::SystemPath(kFile).c_str(), F_OK) != 0 && errno == ENOENT) return true;
    if (!open(false)) return false;
    const std::string sql = std::string(kColumns) + " FROM sharingLinks WHERE " + condition + " ORDER BY rowid";
    const Statement rows = prepare(database_, sql, {value});
    if (rows == nullptr) return fail();
    int state = SQLITE_DONE;
    while ((state = sqlite3_step(rows.get())) == SQLITE_ROW) links.push_back(linkOf(rows));
    return state == SQLITE_DONE || fail();
}

bool LinkStore::find(const std::string& id, std::optional<Link>& link) {
    std::vector<Link> links;
    if (!query("linkID = ?", id, links)) return false;
    link.reset();
    if (!links.empty()) link = links.front();
    return true;
}

bool LinkStore::list(const std::string& owner, std::vector<Link>& links) {
    return query("?1 = '' OR owner = ?1", owner, links);
}

bool LinkStore::remove(const std::string& id, const std::string& owner, bool& removed) {
    std::optional<Link> link;
    if (!find(id, link)) return false;
    removed = link && (owner.empty() || link->owner == owner);
    if (!removed) return true;
    const RaisedIdentity root;
    const Statement statement = prepare(database_, "DELETE FROM sharingLinks WHERE linkID = ?", {id});
    return (statement != nullptr && sqlite3_step(statement.get()) == SQLITE_DONE) || fail();
}

std::string hashPassword(const std::string& password) {
    const char* setting = crypt_gensalt("$y$", 0, nullptr, 0);
    crypt_data work = {};
    const char* hash = setting == nullptr ? nullptr : crypt_rn(password.c_str(), setting, &work, sizeof work);
    return hash == nullptr || hash[0] == '*' ? "" : hash;
}

bool passwordMatches(const std::string& password, const std::string& hash) {
    crypt_data work = {};
    const char* made = crypt_rn(password.c_str(), hash.c_str(), &work, sizeof work);
    if (made == nullptr || made[0] == '*' || std::strlen(made) != hash.size()) return false;
    unsigned char difference = 0;
    for (size_t i = 0; i < hash.size(); ++i) difference |= static_cast<unsigned char>(made[i] ^ hash[i]);
    return difference == 0;
}

bool ownerIsThere(const Link& link) {
    std::unique_ptr<VEXOUSER, Releaser<VEXOUserFree>> found;
    return VEXOUserGet(link.owner.c_str(), acquire(found)) >= 0 && found->uid == link.uid &&
           VEXOUserIsExpired(found->expiry) != 1;
}

std::string linkAddress(const std::string& id) {
    std::string base;
    const bool known = !GetRemoteAddr(base).ends_with("//");
    return (known ? base : "") + kProgram + id;
}

}  // namespace orvel::cgi
