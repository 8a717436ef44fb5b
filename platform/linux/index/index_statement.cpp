#include "index/index_statement.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "failure.h"

namespace vexo::fileindex {
namespace {

thread_local bool quiet = false;
thread_local Failure lastFailure = {};

Failure reasonOf(int result, int systemCode) {
    if (systemCode == ENOSPC || systemCode == EDQUOT) return {VEXO_ERR_NO_SPACE, systemCode};
    switch (result & 0xFF) {
        case SQLITE_FULL:
            return {VEXO_ERR_NO_SPACE, ENOSPC};
        case SQLITE_CANTOPEN:
            return {VEXO_ERR_FILE, systemCode != 0 ? systemCode : EACCES};
        case SQLITE_PERM:
        case SQLITE_READONLY:
            return {VEXO_ERR_DENIED, EACCES};
        case SQLITE_NOMEM:
            return {VEXO_ERR_GENERAL, ENOMEM};
        case SQLITE_BUSY:
        case SQLITE_LOCKED:
            return {VEXO_ERR_GENERAL, EBUSY};
        default:
            return {VEXO_ERR_GENERAL, EIO};
    }
}

}  // namespace

bool failSql(sqlite3* db, const char* file, int line) {
    return failSql(db, sqlite3_errcode(db), file, line);
}

bool failSql(sqlite3* db, int result, const char* file, int line) {
    const bool fromSystem = (result & 0xFF) == SQLITE_IOERR || (result & 0xFF) == SQLITE_CANTOPEN;
    lastFailure = reasonOf(result, fromSystem && db != nullptr ? sqlite3_system_errno(db) : 0);
    if (!quiet) fail(lastFailure.code, lastFailure.systemCode, file, line);
    return false;
}

QuietFailures::QuietFailures() {
    quiet = true;
}

QuietFailures::~QuietFailures() {
    quiet = false;
}

Failure QuietFailures::last() {
    return lastFailure;
}

bool Statement::prepare(sqlite3* db, std::string_view sql) {
    reset();
    sqlite3_finalize(std::exchange(statement_, nullptr));
    const int result = sqlite3_prepare_v3(db, sql.data(), static_cast<int>(sql.size()), SQLITE_PREPARE_PERSISTENT,
                                          &statement_, nullptr);
    return result == SQLITE_OK || failSql(db, result);
}

bool Statement::bind(int at, int64_t value) {
    return sqlite3_bind_int64(statement_, at, value) == SQLITE_OK || failSql(sqlite3_db_handle(statement_));
}

bool Statement::bindText(int at, std::string_view text) {
    // A null pointer would be bound as NULL.
    const char* start = text.empty() ? "" : text.data();
    return sqlite3_bind_text64(statement_, at, start, text.size(), SQLITE_STATIC, SQLITE_UTF8) == SQLITE_OK ||
           failSql(sqlite3_db_handle(statement_));
}

bool Statement::bindBytes(int at, std::string_view bytes) {
    return sqlite3_bind_blob64(statement_, at, bytes.data(), bytes.size(), SQLITE_STATIC) == SQLITE_OK ||
           failSql(sqlite3_db_handle(statement_));
}

bool Statement::bind(const std::vector<Value>& values) {
    int at = 0;
    return std::all_of(values.begin(), values.end(), [&](const Value& value) {
        ++at;
        return std::visit([&](const auto& v) { return bindValue(at, v); }, value);
    });
}

bool Statement::bindPointer(int at, const void* pointer, const char* kind) {
    return sqlite3_bind_pointer(statement_, at, const_cast<void*>(pointer), kind, nullptr) == SQLITE_OK ||
           failSql(sqlite3_db_handle(statement_));
}

Statement::Step Statement::step() {
    const int result = sqlite3_step(statement_);
    if (result == SQLITE_ROW) return kRow;
    if (result == SQLITE_DONE) return kDone;
    failSql(sqlite3_db_handle(statement_), result);
    return kFailed;
}

bool Statement::run() {
    const Step result = step();
    const KeepErrno keep;
    reset();
    return result != kFailed;
}

std::string_view Statement::text(int column) const {
    const auto* bytes = reinterpret_cast<const char*>(sqlite3_column_text(statement_, column));
    if (bytes == nullptr) return "";
    return {bytes, static_cast<size_t>(sqlite3_column_bytes(statement_, column))};
}

bool execute(sqlite3* db, const char* sql) {
    const int result = sqlite3_exec(db, sql, nullptr, nullptr, nullptr);
    return result == SQLITE_OK || failSql(db, result);
}

}  // namespace vexo::fileindex
