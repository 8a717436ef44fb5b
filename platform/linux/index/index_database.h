// One open database of records.
#ifndef VEXO_LINUX_INDEX_DATABASE_H
#define VEXO_LINUX_INDEX_DATABASE_H

#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "index/index_condition.h"
#include "index/index_statement.h"
#include "vexo/index.h"

namespace vexo::fileindex {

struct OpenMode {
    bool readOnly = false;
    bool ofShare = false;  // in the central store: it may hold the trigrams of names, and outlives a loss of power
    bool isNew = false;    // an index while it is built: nobody reads it yet, and nobody needs it after a loss of power
};

// What a database says about itself; times are seconds since the epoch, 0 for never.
struct State {
    int64_t records;
    int64_t written;  // when a record was last added, changed or removed
    int64_t built;    // of a share's index: when it was built
    int64_t updated;  // and when that or an update ended
};

// What only the index of a share holds beside the records: trigrams of names, kept by triggers, and an index on
// folders.
extern const char* const kShareSchema;

// Operations give false with the slot filled on failure; a failed write takes its whole batch back. Not to be used from
// two threads at once.
class Database {
 public:
    using Clock = std::chrono::steady_clock;

    // Null with the slot filled: 0x0900 missing or not to be trusted, 0x0300 denied, 0x8100 no database of ours.
    [[nodiscard]] static std::unique_ptr<Database> open(const std::string& path, OpenMode mode);
    // A new file with no records; 0x0800 when `path` is there already. Nothing is left of one that failed.
    [[nodiscard]] static bool create(const std::string& path, OpenMode mode = {});

    // Takes back what was not committed.
    ~Database();
    Database(const Database&) = delete;
    Database& operator=(const Database&) = delete;

    [[nodiscard]] sqlite3* handle() const { return db_; }
    [[nodiscard]] const std::string& path() const { return path_; }

    [[nodiscard]] bool insert(const __tag_FI_FILE_INFO_DATA& record);
    [[nodiscard]] bool update(const __tag_FI_SQL_COND* set, const __tag_FI_SQL_COND* where);
    [[nodiscard]] bool remove(const __tag_FI_SQL_COND* where);
    // Ends the batch of writes.
    [[nodiscard]] bool commit();
    // When the batch that is open began; empty when none is.
    [[nodiscard]] std::optional<Clock::time_point> batchBegan() const { return began_; }
    void rollBack();
    // Whether a database that another process uses is waited for (as at first) or given up soon.
    void waitForOthers(bool wait);

    // The ids of the records that satisfy the condition, ascending.
    [[nodiscard]] bool select(const Condition& condition, std::vector<int64_t>& ids);
    [[nodiscard]] bool count(const Condition& condition, int64_t& count);
    [[nodiscard]] bool readState(State& state);
    // The highest id that a record has or, in the index of a share, ever had.
    [[nodiscard]] bool readHighest(int64_t& id);

 private:
    Database(std::string path, sqlite3* db, OpenMode mode)
        : path_(std::move(path)), db_(db), ofShare_(mode.ofShare), isIndex_(mode.ofShare || mode.isNew) {}
    [[nodiscard]] bool configure(OpenMode mode);
    [[nodiscard]] bool hasOurSchema();
    [[nodiscard]] bool boundRoom();
    [[nodiscard]] bool makeSchema();
    [[nodiscard]] bool begin();
    // What a write ends with.
    [[nodiscard]] bool written(bool done);
    [[nodiscard]] bool change(const std::string& sql, const std::vector<Value>& values);
    [[nodiscard]] bool clearTarget(const std::vector<const __tag_FI_SQL_COND*>& set, const Condition& where);

    std::string path_;
    sqlite3* db_;
    bool ofShare_;
    bool isIndex_;  // of a share, complete or not
    Statement insert_;
    std::optional<Clock::time_point> began_;
    bool isFirst_ = true;  // batch of this connection
    int rows_ = 0;         // written in this batch
    int64_t added_ = 0;    // records more than before this batch
    // In the index of a share no id is given to a second record, even after the first one is gone: this is the highest
    // so far. Searches read on behind an id that they have come to.
    int64_t highest_ = 0;
};

}  // namespace vexo::fileindex

#endif
