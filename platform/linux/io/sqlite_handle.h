// Owners of what SQLite hands out.
#ifndef VEXO_LINUX_SQLITE_HANDLE_H
#define VEXO_LINUX_SQLITE_HANDLE_H

#include <sqlite3.h>

#include <memory>
#include <string>

namespace vexo {

struct CloseDatabase {
    void operator()(sqlite3* db) const { sqlite3_close_v2(db); }
};
struct FinalizeStatement {
    void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Database = std::unique_ptr<sqlite3, CloseDatabase>;
using Statement = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

// Opens a database of which neither the schema nor the content is believed: nothing in it runs code, no page is mapped,
// no other database is attached. `flags` as for sqlite3_open_v2. Null with errno.
[[nodiscard]] Database openDatabase(const std::string& path, int flags);

// The first statement of `sql`; null with errno. `rest`, if given, is what follows it.
[[nodiscard]] Statement prepare(sqlite3* db, const char* sql, const char** rest = nullptr);

// An errno value for a result of SQLite.
int errnoOfSqlite(int result);

}  // namespace vexo

#endif
