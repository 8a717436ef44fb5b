// The link database as a file: found, made, upgraded, asked. Everything as root, which the caller sees to.
#ifndef VEXO_LINUX_LINK_DATABASE_H
#define VEXO_LINUX_LINK_DATABASE_H

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "io/sqlite_handle.h"

namespace vexo {

std::string textOf(const Statement& row, int column);
std::int64_t numberOf(const Statement& row, int column);

class LinkDatabase {
 public:
    using TakeRow = std::function<void(const Statement& row)>;

    // Notes the failure just met; false.
    bool fail();
    [[nodiscard]] const std::string& error() const { return error_; }
    void close() { database_.reset(); }

    // Opens it, made where there is none.
    [[nodiscard]] bool openForAdding();
    // Opens the one that is there; `there` is false, and nothing is open, where no link was ever made.
    [[nodiscard]] bool open(bool& there);

    // On an open one: runs a statement, and hands over its rows.
    [[nodiscard]] bool run(const char* sql, const std::vector<std::string>& values, const TakeRow& take = nullptr);
    // How many rows the last statement changed.
    [[nodiscard]] int changed() const { return sqlite3_changes(database_.get()); }

 private:
    bool openFile(const std::string& path, bool adding);
    bool upgrade();
    bool execute(const char* sql);

    Database database_;
    std::string error_;
};

// A transaction that keeps other writers out; it is taken back unless commit() succeeded.
class LinkTransaction {
 public:
    explicit LinkTransaction(LinkDatabase& database)
        : database_(database), open_(database.run("BEGIN IMMEDIATE", {})) {}
    ~LinkTransaction() {
        if (open_) static_cast<void>(database_.run("ROLLBACK", {}));
    }
    LinkTransaction(const LinkTransaction&) = delete;
    LinkTransaction& operator=(const LinkTransaction&) = delete;
    [[nodiscard]] bool begun() const { return open_; }
    [[nodiscard]] bool commit() {
        if (open_ && !database_.run("COMMIT", {})) return false;
        open_ = false;
        return true;
    }

 private:
    LinkDatabase& database_;
    bool open_;
};

}  // namespace vexo

#endif
