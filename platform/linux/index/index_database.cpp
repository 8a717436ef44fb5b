#include "index/index_database.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <ctime>
#include <utility>

#include "failure.h"
#include "index/index_columns.h"
#include "index/index_room.h"
#include "index/index_vfs.h"
#include "io/file_io.h"
#include "vexo/error.h"
#include "vexo/text.h"

namespace vexo::fileindex {
namespace {

constexpr int kBusyMilliseconds = 10000;
constexpr int kSoonMilliseconds = 100;
constexpr int64_t kPageSize = 8192, kMostPages = 1 << 30;

// Compared word for word before a database is used, so a change here makes another format.
constexpr std::array<const char*, 4> kSchema = {
    "CREATE TABLE record(id INTEGER PRIMARY KEY,name TEXT,share TEXT,path TEXT,parent TEXT,share_root TEXT,"
    "extension TEXT,permission TEXT,owner TEXT,group_name TEXT,is_dir INTEGER,size INTEGER,created INTEGER,"
    "changed INTEGER,accessed INTEGER,modified INTEGER,mode INTEGER,uid INTEGER,gid INTEGER)",
    "CREATE UNIQUE INDEX record_address ON record(path,share)",
    "CREATE TABLE state(records INTEGER,written INTEGER,built INTEGER,updated INTEGER,highest INTEGER)",
    "CREATE TABLE ranking(id INTEGER PRIMARY KEY,records BLOB)",
};

// The first of these in the index of a share: paths are made of what else a record has, the share is always the same.
constexpr const char* kRecordOfShare =
    "CREATE TABLE record(id INTEGER PRIMARY KEY,name TEXT,share TEXT AS (''),"
    "path TEXT AS (CASE parent WHEN '' THEN name ELSE parent||'/'||name END),parent TEXT,share_root TEXT AS (''),"
    "extension TEXT,permission TEXT,owner TEXT,group_name TEXT,is_dir INTEGER,size INTEGER,created INTEGER,"
    "changed INTEGER,accessed INTEGER,modified INTEGER,mode INTEGER,uid INTEGER,gid INTEGER)";

const char* schemaAt(size_t at, bool isIndex) {
    return isIndex && at == 0 ? kRecordOfShare : kSchema[at];
}

std::string_view bytesOf(sqlite3_value* value) {
    const auto* text = static_cast<const char*>(sqlite3_value_blob(value));
    return text == nullptr ? std::string_view() : std::string_view(text, sqlite3_value_bytes(value));
}

// A test of a text by what a pointer of this kind stands for.
template <class Test>
void answer(sqlite3_context* context, sqlite3_value** values, const char* kind,
            bool (Test::*test)(std::string_view) const) {
    try {
        const auto* asked = static_cast<const Test*>(sqlite3_value_pointer(values[0], kind));
        sqlite3_result_int(context, static_cast<int>(asked != nullptr && (asked->*test)(bytesOf(values[1]))));
    } catch (...) {
        sqlite3_result_error_nomem(context);
    }
}

void matchFunction(sqlite3_context* context, int, sqlite3_value** values) {
    answer(context, values, "wildcard", &orvel::Wildcard::match);
}

void endingFunction(sqlite3_context* context, int, sqlite3_value** values) {
    answer(context, values, "endings", &Endings::match);
}

void keyFunction(sqlite3_context* context, int, sqlite3_value** values) {
    try {
        std::string out;
        VEXO::AppendFoldKey(bytesOf(values[0]), out);
        sqlite3_result_blob64(context, out.data(), out.size(), SQLITE_TRANSIENT);
    } catch (...) {
        sqlite3_result_error_nomem(context);
    }
}

void withinFunction(sqlite3_context* context, int, sqlite3_value** values) {
    answer(context, values, "folders", &FolderSet::holds);
}

void comparableFunction(sqlite3_context* context, int, sqlite3_value** values) {
    try {
        std::string out;
        orvel::appendComparable(bytesOf(values[0]), out);
        sqlite3_result_text64(context, out.data(), out.size(), SQLITE_TRANSIENT, SQLITE_UTF8);
    } catch (...) {
        sqlite3_result_error_nomem(context);
    }
}

bool addFunctions(sqlite3* db) {
    constexpr int flags = SQLITE_UTF8 | SQLITE_DETERMINISTIC | SQLITE_INNOCUOUS;
    const auto add = [db](const char* name, int arguments, auto function) {
        return sqlite3_create_function(db, name, arguments, flags, nullptr, function, nullptr, nullptr) == SQLITE_OK;
    };
    return add("vexo_match", 2, matchFunction) && add("vexo_ending", 2, endingFunction) &&
           add("vexo_within", 2, withinFunction) && add("vexo_comparable", 1, comparableFunction) &&
           add("vexo_key", 1, keyFunction);
}

// A file may be made to harm who opens it; only the central store may say by triggers what is to be done.
void limit(sqlite3* db, bool ofShare) {
    sqlite3_db_config(db, SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
    sqlite3_db_config(db, SQLITE_DBCONFIG_TRUSTED_SCHEMA, static_cast<int>(ofShare), nullptr);
    sqlite3_db_config(db, SQLITE_DBCONFIG_ENABLE_TRIGGER, static_cast<int>(ofShare), nullptr);
    sqlite3_db_config(db, SQLITE_DBCONFIG_ENABLE_VIEW, 0, nullptr);
    sqlite3_db_config(db, SQLITE_DBCONFIG_ENABLE_LOAD_EXTENSION, 0, nullptr);
    sqlite3_limit(db, SQLITE_LIMIT_LENGTH, 4 << 20);
    sqlite3_limit(db, SQLITE_LIMIT_COLUMN, 100);
    sqlite3_limit(db, SQLITE_LIMIT_ATTACHED, 0);
    sqlite3_limit(db, SQLITE_LIMIT_WORKER_THREADS, 0);
}

}  // namespace

// Filled in no order, the unique index takes twice the room of one that is made anew; what that frees is used by the
// others.
const char* const kShareSchema =
    "REINDEX record_address;"
    "CREATE INDEX record_parent ON record(parent);"
    "CREATE VIRTUAL TABLE trigram USING fts5(name,content='',columnsize=0,detail=none,"
    "tokenize='trigram case_sensitive 1');"
    "INSERT INTO trigram(rowid,name) SELECT id,vexo_comparable(name) FROM record;"
    "CREATE TRIGGER record_insert AFTER INSERT ON record BEGIN "
    "INSERT INTO trigram(rowid,name) VALUES(new.id,vexo_comparable(new.name));END;"
    "CREATE TRIGGER record_delete AFTER DELETE ON record BEGIN "
    "INSERT INTO trigram(trigram,rowid,name) VALUES('delete',old.id,vexo_comparable(old.name));END;"
    "CREATE TRIGGER record_update AFTER UPDATE OF name ON record BEGIN "
    "INSERT INTO trigram(trigram,rowid,name) VALUES('delete',old.id,vexo_comparable(old.name));"
    "INSERT INTO trigram(rowid,name) VALUES(new.id,vexo_comparable(new.name));END;";

Database::~Database() {
    const KeepErrno keep;
    insert_ = Statement();
    sqlite3_close_v2(db_);
}

std::unique_ptr<Database> Database::open(const std::string& path, OpenMode mode) {
    const std::string resolved = resolveFolder(path);
    struct stat status {};
    if (resolved.empty() || lstat(resolved.c_str(), &status) != 0) {
        fail(errno == EACCES ? VEXO_ERR_DENIED : VEXO_ERR_FILE);
        return nullptr;
    }
    if (!isTrusted(status, S_IFREG)) {
        fail(VEXO_ERR_FILE, EACCES);
        return nullptr;
    }
    const int flags = SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_NOFOLLOW | SQLITE_OPEN_EXRESCODE |
                      (mode.readOnly ? SQLITE_OPEN_READONLY : SQLITE_OPEN_READWRITE);
    sqlite3* db = nullptr;
    const int result = sqlite3_open_v2(resolved.c_str(), &db, flags, trustedFileSystem());
    std::unique_ptr<Database> database(new Database(path, db, mode));
    if (result != SQLITE_OK) {
        failSql(db, result);
        return nullptr;
    }
    if (database->configure(mode) && database->hasOurSchema()) return database;
    // What a killed writer began must be taken back before anybody reads, and only a writer can.
    const bool unfinished = sqlite3_extended_errcode(db) == SQLITE_READONLY_ROLLBACK;
    database.reset();
    if (!unfinished || !mode.readOnly || open(path, {false, mode.ofShare}) == nullptr) return nullptr;
    return open(path, mode);
}

bool Database::create(const std::string& path, OpenMode mode) {
    const std::string resolved = resolveFolder(path);
    if (resolved.empty() || !openFile(resolved, O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW, 0600)) {
        const int code = errorOfErrno(errno);
        fail(code == VEXO_ERR_MISSING ? static_cast<int>(VEXO_ERR_FILE) : code);
        return false;
    }
    // A journal that an earlier file of this name left behind is not ours to play back.
    unlink((resolved + "-journal").c_str());
    sqlite3* db = nullptr;
    constexpr int flags = SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_NOFOLLOW | SQLITE_OPEN_EXRESCODE;
    const int result = sqlite3_open_v2(resolved.c_str(), &db, flags, trustedFileSystem());
    Database database(resolved, db, mode);
    const bool opened = result == SQLITE_OK || failSql(db, result);
    if (opened && database.configure(mode) && database.makeSchema()) return true;
    const KeepErrno keep;
    database.rollBack();
    unlink(resolved.c_str());
    return false;
}

bool Database::configure(OpenMode mode) {
    limit(db_, mode.ofShare);
    waitForOthers(true);
    if (!addFunctions(db_)) return failSql(db_);
    // Results are worth nothing after a loss of power, but must survive the death of their writer. Pages that a large
    // batch changed wait in memory: written early, they would lock readers out for the rest of the batch.
    // In an index that is built they need not, and its sorts use files, so that memory does not grow with it.
    if (!execute(db_, mode.isNew ? "PRAGMA temp_store=FILE;PRAGMA cache_spill=ON"
                                 : "PRAGMA temp_store=MEMORY;PRAGMA cache_spill=OFF")) {
        return false;
    }
    if (!mode.ofShare && !mode.readOnly && !boundRoom()) return false;
    constexpr const char* common = "PRAGMA secure_delete=OFF;PRAGMA cache_size=-16384;";
    return execute(db_, common) &&
           execute(db_, mode.ofShare ? "PRAGMA synchronous=FULL;PRAGMA mmap_size=2147418112;"
                                     : "PRAGMA synchronous=OFF;PRAGMA mmap_size=0;PRAGMA cell_size_check=ON;");
}

// What is beyond fails as on a full disk.
bool Database::boundRoom() {
    const int64_t pages = std::clamp<int64_t>(roomForResults(path_) / kPageSize, 1, kMostPages);
    return execute(db_, ("PRAGMA max_page_count=" + std::to_string(pages)).c_str());
}

bool Database::makeSchema() {
    const std::string identity =
        "PRAGMA page_size=" + std::to_string(kPageSize) +
        ";PRAGMA auto_vacuum=NONE;BEGIN;PRAGMA application_id=" + std::to_string(kApplicationId) + ";";
    if (!execute(db_, identity.c_str())) return false;
    for (size_t i = 0; i < kSchema.size(); ++i) {
        if (!execute(db_, schemaAt(i, isIndex_))) return false;
    }
    return execute(db_, "INSERT INTO state VALUES(0,0,0,0,0);COMMIT");
}

bool Database::hasOurSchema() {
    Statement statement;
    if (!statement.prepare(db_, "SELECT coalesce(sql,'') FROM sqlite_schema ORDER BY rowid")) return false;
    size_t rows = 0;
    Statement::Step step = statement.step();
    for (; step == Statement::kRow; step = statement.step()) {
        const bool known = rows < kSchema.size() ? statement.text(0) == schemaAt(rows, isIndex_) : ofShare_;
        ++rows;
        if (!known) break;
    }
    if (step == Statement::kFailed) return false;
    if (step == Statement::kDone && rows >= kSchema.size()) return true;
    fail(VEXO_ERR_GENERAL, EINVAL);
    return false;
}

void Database::waitForOthers(bool wait) {
    sqlite3_busy_timeout(db_, wait ? kBusyMilliseconds : kSoonMilliseconds);
}

bool Database::select(const Condition& condition, std::vector<int64_t>& ids) {
    Statement statement;
    if (!statement.prepare(db_, "SELECT id FROM record WHERE " + condition.sql + " ORDER BY id") ||
        !statement.bind(condition.values)) {
        return false;
    }
    Statement::Step step = statement.step();
    for (; step == Statement::kRow; step = statement.step()) ids.push_back(statement.number(0));
    return step == Statement::kDone;
}

bool Database::count(const Condition& condition, int64_t& count) {
    Statement statement;
    if (!statement.prepare(db_, "SELECT count(*) FROM record WHERE " + condition.sql) ||
        !statement.bind(condition.values) || statement.step() != Statement::kRow) {
        return false;
    }
    count = statement.number(0);
    return true;
}

bool Database::readState(State& state) {
    Statement statement;
    if (!statement.prepare(db_, "SELECT records,written,built,updated FROM state") ||
        statement.step() != Statement::kRow) {
        return false;
    }
    state = {std::max<int64_t>(statement.number(0), 0), statement.number(1), statement.number(2), statement.number(3)};
    return true;
}

bool Database::readHighest(int64_t& id) {
    Statement statement;
    if (!statement.prepare(db_, "SELECT max(highest,coalesce((SELECT max(id) FROM record),0)) FROM state") ||
        statement.step() != Statement::kRow) {
        return false;
    }
    id = statement.number(0);
    return true;
}

}  // namespace vexo::fileindex
