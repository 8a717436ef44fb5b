// What another program does to a database of SQLite.
#ifndef ORVEL_TESTS_SUPPORT_SQLITE_H
#define ORVEL_TESTS_SUPPORT_SQLITE_H

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <string>

namespace support {

// Executes these statements, by a connection of their own, which stays if it is to be `kept`. The first value of the
// last row; "" without one.
inline std::string sql(const std::string& file, const std::string& statements, bool kept = false) {
    std::string value;
    sqlite3* database = nullptr;
    const auto keep = [](void* target, int, char** values, char**) {
        return *static_cast<std::string*>(target) = values[0], 0;
    };
    EXPECT_EQ(sqlite3_open(file.c_str(), &database), SQLITE_OK);
    EXPECT_EQ(sqlite3_exec(database, statements.c_str(), keep, &value, nullptr), SQLITE_OK) << sqlite3_errmsg(database);
    if (!kept) sqlite3_close(database);
    return value;
}

}  // namespace support

#endif
