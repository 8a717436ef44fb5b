#include "io/sqlite_handle.h"

#include <cerrno>

namespace vexo {
namespace {

constexpr int kMaxStatement = 16 << 20;
constexpr int kMaxValue = 64 << 20;

bool distrust(sqlite3* db) {
    sqlite3_limit(db, SQLITE_LIMIT_SQL_LENGTH, kMaxStatement);
    sqlite3_limit(db, SQLITE_LIMIT_LENGTH, kMaxValue);
    sqlite3_limit(db, SQLITE_LIMIT_ATTACHED, 0);
    for (const auto& [option, value] : {std::pair{SQLITE_DBCONFIG_DEFENSIVE, 1},
                                        {SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0},
                                        {SQLITE_DBCONFIG_ENABLE_TRIGGER, 0}}) {
        if (sqlite3_db_config(db, option, value, nullptr) != SQLITE_OK) return false;
    }
    return sqlite3_exec(db, "PRAGMA mmap_size=0; PRAGMA cell_size_check=ON", nullptr, nullptr, nullptr) == SQLITE_OK;
}

}  // namespace

Database openDatabase(const std::string& path, int flags) {
    sqlite3* opened = nullptr;
    const int result = sqlite3_open_v2(path.c_str(), &opened, flags | SQLITE_OPEN_EXRESCODE, nullptr);
    Database db(opened);  // on failure, too
    if (result == SQLITE_OK && distrust(opened)) return db;
    errno = errnoOfSqlite(result == SQLITE_OK ? sqlite3_errcode(opened) : result);
    return nullptr;
}

Statement prepare(sqlite3* db, const char* sql, const char** rest) {
    sqlite3_stmt* prepared = nullptr;
    const int result = sqlite3_prepare_v2(db, sql, -1, &prepared, rest);
    if (result != SQLITE_OK) errno = errnoOfSqlite(result);
    return Statement(prepared);
}

int errnoOfSqlite(int result) {
    switch (result & 0xFF) {
        case SQLITE_NOMEM:
            return ENOMEM;
        case SQLITE_FULL:
            return ENOSPC;
        case SQLITE_BUSY:
        case SQLITE_LOCKED:
        case SQLITE_INTERRUPT:
            return ETIMEDOUT;
        case SQLITE_PERM:
        case SQLITE_AUTH:
            return EACCES;
        case SQLITE_READONLY:
            return EROFS;
        case SQLITE_ERROR:
        case SQLITE_MISUSE:
        case SQLITE_TOOBIG:
            return EINVAL;
        default:
            return EIO;
    }
}

}  // namespace vexo
