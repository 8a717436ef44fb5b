// SQLite statements with an owner, and what their failures are called.
#ifndef VEXO_LINUX_INDEX_STATEMENT_H
#define VEXO_LINUX_INDEX_STATEMENT_H

#include <sqlite3.h>

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

#include "base/wildcard.h"
#include "index/index_alternatives.h"

namespace vexo::fileindex {

// What vexo_match compares with.
using Pattern = std::shared_ptr<const orvel::Wildcard>;
// What vexo_ending and vexo_within ask.
using EndingList = std::shared_ptr<const Endings>;
using FolderList = std::shared_ptr<const FolderSet>;
using Value = std::variant<int64_t, std::string, Pattern, EndingList, FolderList>;

// Fills the slot and errno with the last failure of `db`, and gives false.
bool failSql(sqlite3* db, const char* file = __builtin_FILE(), int line = __builtin_LINE());
// The same for a result of SQLite that `db` need not remember; `db` may be null.
bool failSql(sqlite3* db, int result, const char* file = __builtin_FILE(), int line = __builtin_LINE());

struct Failure {
    int code;  // of the platform
    int systemCode;
};

// While it lives, failures of this thread do not reach the slot: it belongs to the thread that asked for something.
class QuietFailures {
 public:
    QuietFailures();
    ~QuietFailures();
    QuietFailures(const QuietFailures&) = delete;
    QuietFailures& operator=(const QuietFailures&) = delete;
    [[nodiscard]] static Failure last();
};

// Operations give false with the slot filled on failure.
class Statement {
 public:
    Statement() = default;
    ~Statement() { sqlite3_finalize(statement_); }
    Statement(Statement&& other) noexcept : statement_(std::exchange(other.statement_, nullptr)) {}
    Statement& operator=(Statement&& other) noexcept {
        std::swap(statement_, other.statement_);
        return *this;
    }
    explicit operator bool() const { return statement_ != nullptr; }
    [[nodiscard]] sqlite3_stmt* get() const { return statement_; }

    [[nodiscard]] bool prepare(sqlite3* db, std::string_view sql);
    // Values 1, 2, 3... The statement borrows them until it is reset.
    [[nodiscard]] bool bind(const std::vector<Value>& values);
    [[nodiscard]] bool bind(int at, int64_t value);
    // Texts are any bytes but NUL: SQLite stores, compares and gives them back as they are.
    [[nodiscard]] bool bindText(int at, std::string_view text);
    [[nodiscard]] bool bindBytes(int at, std::string_view bytes);

    enum Step { kFailed = -1, kDone = 0, kRow = 1 };
    [[nodiscard]] Step step();
    // A statement that gives no rows, and is reset for the next time.
    [[nodiscard]] bool run();
    void reset() { sqlite3_reset(statement_); }

    [[nodiscard]] int64_t number(int column) const { return sqlite3_column_int64(statement_, column); }
    // Valid until the next step. A NUL follows.
    [[nodiscard]] std::string_view text(int column) const;

 private:
    [[nodiscard]] bool bindPointer(int at, const void* pointer, const char* kind);
    [[nodiscard]] bool bindValue(int at, int64_t value) { return bind(at, value); }
    [[nodiscard]] bool bindValue(int at, const std::string& value) { return bindText(at, value); }
    [[nodiscard]] bool bindValue(int at, const Pattern& value) { return bindPointer(at, value.get(), "wildcard"); }
    [[nodiscard]] bool bindValue(int at, const EndingList& value) { return bindPointer(at, value.get(), "endings"); }
    [[nodiscard]] bool bindValue(int at, const FolderList& value) { return bindPointer(at, value.get(), "folders"); }

    sqlite3_stmt* statement_ = nullptr;
};

[[nodiscard]] bool execute(sqlite3* db, const char* sql);

}  // namespace vexo::fileindex

#endif
