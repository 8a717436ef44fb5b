#include "vexo/database.h"

#include <chrono>
#include <cstring>
#include <exception>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "failure.h"
#include "fault_gate.h"
#include "io/file_io.h"
#include "io/sqlite_handle.h"
#include "io/trusted_file.h"
#include "vexo/system_root.h"

namespace {

using Clock = std::chrono::steady_clock;

constexpr auto kPatience = std::chrono::seconds(3);  // for one statement, locks included
constexpr auto kBusyPause = std::chrono::milliseconds(5);
constexpr int kStepsBetweenLooks = 20000;
constexpr size_t kMaxResult = size_t{64} << 20;

}  // namespace

struct VEXODB {
    std::string path;
    vexo::Database db;
    Clock::time_point deadline;
    std::string error;
};

struct VEXODBRESULT {
    std::vector<std::string> columns;
    std::vector<std::optional<std::string>> fields;  // row by row; empty for NULL
    int nextRow = 0;

    [[nodiscard]] int rows() const { return columns.empty() ? 0 : static_cast<int>(fields.size() / columns.size()); }
};

namespace {

int waitWhileBusy(void* connection, int) {
    if (Clock::now() >= static_cast<VEXODB*>(connection)->deadline) return 0;
    std::this_thread::sleep_for(kBusyPause);
    return 1;
}

int stopWhenLate(void* connection) {
    return static_cast<int>(Clock::now() >= static_cast<VEXODB*>(connection)->deadline);
}

vexo::Database connect(VEXODB& connection, int flags) {
    vexo::Database db = vexo::openDatabase(connection.path, flags);
    if (!db) return db;
    sqlite3_busy_handler(db.get(), waitWhileBusy, &connection);
    sqlite3_progress_handler(db.get(), kStepsBetweenLooks, stopWhenLate, &connection);
    return db;
}

// Has SQLite undo the change that a writer's death left half done; a reader alone may not.
void endInterruptedChange(VEXODB& connection) {
    const vexo::Database db = connect(connection, SQLITE_OPEN_READWRITE);
    if (db) sqlite3_exec(db.get(), "SELECT 1 FROM sqlite_schema LIMIT 1", nullptr, nullptr, nullptr);
}

// Adds the current row. False beyond the limit or without memory.
bool keepRow(sqlite3_stmt* statement, VEXODBRESULT& result, size_t& room) {
    for (int column = 0; column < static_cast<int>(result.columns.size()); ++column) {
        std::optional<std::string> field;
        if (sqlite3_column_type(statement, column) != SQLITE_NULL) {
            const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, column));
            if (text == nullptr) return false;
            field.emplace(text, static_cast<size_t>(sqlite3_column_bytes(statement, column)));
        }
        const size_t size = sizeof field + (field ? field->size() : 0);
        if (size > room) return false;
        room -= size;
        result.fields.push_back(std::move(field));
    }
    return true;
}

// Steps through the statement. SQLITE_DONE, or what went wrong.
int collect(sqlite3_stmt* statement, VEXODBRESULT& result) {
    for (int column = 0; column < sqlite3_column_count(statement); ++column) {
        const char* name = sqlite3_column_name(statement, column);
        if (name == nullptr) return SQLITE_NOMEM;
        result.columns.emplace_back(name);
    }
    size_t room = kMaxResult;
    int step = SQLITE_ROW;
    while ((step = sqlite3_step(statement)) == SQLITE_ROW) {
        if (!keepRow(statement, result, room)) return SQLITE_TOOBIG;
    }
    return step;
}

// What became of a statement: a result of SQLite, and a text where SQLite has none.
struct Outcome {
    int result;
    const char* why = nullptr;
};

Outcome run(sqlite3* db, const char* sql, VEXODBRESULT& result) {
    const char* rest = nullptr;
    const vexo::Statement statement = vexo::prepare(db, sql, &rest);
    if (!statement) {
        const int failure = sqlite3_extended_errcode(db);
        return failure == SQLITE_OK ? Outcome{SQLITE_MISUSE, "no statement"} : Outcome{failure};
    }
    if (rest[std::strspn(rest, " \t\r\n;")] != '\0') return {SQLITE_MISUSE, "more than one statement"};
    if (sqlite3_stmt_readonly(statement.get()) == 0) return {SQLITE_READONLY, "a statement that would write"};
    const int end = collect(statement.get(), result);
    return {end, end == SQLITE_TOOBIG ? "result too large" : nullptr};
}

int failStatement(VEXODB& connection, const Outcome& outcome) {
    connection.error = outcome.why != nullptr ? outcome.why : sqlite3_errmsg(connection.db.get());
    const int code = outcome.result == SQLITE_MISUSE ? VEXO_ERR_PARAMETER : VEXO_ERR_GENERAL;
    return vexo::fail(code, vexo::errnoOfSqlite(outcome.result));
}

}  // namespace

PVEXODB VEXODBConnect(const char* file) try {
    VEXO_GATE("VEXODBConnect", nullptr);
    if (file == nullptr) {
        vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
        return nullptr;
    }
    const int before = errno;
    auto connection = std::make_unique<VEXODB>();
    connection->path = VEXO::SystemPath(file);
    if (vexo::isTrustedFile(connection->path)) connection->db = connect(*connection, SQLITE_OPEN_READONLY);
    if (!connection->db) {
        vexo::fail(vexo::errorOfFile(errno));
        return nullptr;
    }
    errno = before;
    return connection.release();
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return nullptr;
}

int VEXODBExecute(PVEXODB db, const char* sql, PVEXODBRESULT* result) try {
    if (result != nullptr) *result = nullptr;
    VEXO_GATE("VEXODBExecute", -1);
    if (db == nullptr || sql == nullptr || result == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    db->error.clear();
    db->deadline = Clock::now() + kPatience;
    auto rows = std::make_unique<VEXODBRESULT>();
    Outcome outcome = run(db->db.get(), sql, *rows);
    if (outcome.result == SQLITE_READONLY_ROLLBACK) {
        endInterruptedChange(*db);
        *rows = {};
        outcome = run(db->db.get(), sql, *rows);
    }
    if (outcome.result != SQLITE_DONE) return failStatement(*db, outcome);
    *result = rows.release();
    errno = before;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

const char* VEXODBErrorGet(PVEXODB db) {
    return db == nullptr ? "" : db->error.c_str();
}

void VEXODBClose(PVEXODB db) {
    const vexo::KeepErrno keep;
    delete db;
}

int VEXODBFetchRow(PVEXODBRESULT result, int* row) {
    VEXO_GATE("VEXODBFetchRow", -1);
    if (row != nullptr) *row = -1;
    if (result == nullptr || row == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    if (result->nextRow >= result->rows()) return -1;
    *row = result->nextRow++;
    return 0;
}

const char* VEXODBFetchField(PVEXODBRESULT result, int row, const char* name) {
    VEXO_GATE("VEXODBFetchField", nullptr);
    if (result == nullptr || name == nullptr || row < 0 || row >= result->rows()) return nullptr;
    for (size_t column = 0; column < result->columns.size(); ++column) {
        if (sqlite3_stricmp(result->columns[column].c_str(), name) != 0) continue;
        const auto& field = result->fields[static_cast<size_t>(row) * result->columns.size() + column];
        return field ? field->c_str() : nullptr;
    }
    return nullptr;
}

void VEXODBFreeResult(PVEXODBRESULT result) {
    delete result;
}
