// What a background operation reports about itself in its task record.
#ifndef ORVEL_CGI_OPERATION_PROGRESS_H
#define ORVEL_CGI_OPERATION_PROGRESS_H

#include <json/value.h>

#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "operation/undo_record.h"
#include "vexo/task.h"

namespace orvel::cgi {

// The record's "data": {"action", "state": "running", "done", "cancelled" or "failed", "items_done", "items_skipped",
// "items_failed", "items_total", "bytes_done", "bytes_total", "current", "errors": [{"path","code","key"}],
// "errors_left_out": how many more there were than the list holds, "new": [{"path"}] and "new_count": see noteNew,
// "undo_count" and "undo_left_out": see undo, "measured": see measures}; paths are share-relative. Totals may grow. At
// most one of these objects in a process.
class Progress {
 public:
    Progress(KTR::Task& task, const std::string& user, const std::string& action);
    ~Progress();
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    // More is to be done.
    void expect(long long items, long long bytes);
    // The item at work. Everything is published: for the first item at once, later at intervals.
    void begin(const std::string& path);
    void bytes(long long count);
    // How the item ended.
    void done() { count(itemsDone_); }
    void skipped() { count(itemsSkipped_); }
    void failed(const std::string& path, int code);
    // The same with a code and a key that the library does not have.
    void failed(const std::string& path, int code, const char* key);
    // The whole operation failed.
    void broken(const std::string& path, int code);
    // What the operation was to make lacks something, although it was made.
    void markFailed() { state_ = "failed"; }
    // These came into the folder at `path` after what was chosen there was listed; the first of them are kept.
    void noteNew(const std::string& path, const std::vector<std::string>& names);
    // Where it is written down how to undo what was done.
    [[nodiscard]] UndoRecord& undo() { return undo_; }
    // The record has a member "measured" as well, which is asked for whenever the record is written.
    void measures(std::function<Json::Value()> measured) { measured_ = std::move(measured); }
    // How many items were done so far.
    [[nodiscard]] long long itemsDone() const { return itemsDone_; }
    // Whether the user wants the operation to end. To be asked often.
    bool stopped();

    // Writes the record now. False when it could not be written.
    bool publish();
    // Writes the last word and marks the task as finished.
    void end();

    // For VEXOFileCopy: publishes how far its copy is, and says whether to stop.
    static int askDuringCopy();

 private:
    void count(long long& items);
    void publishNowAndThen(long long underWay);
    [[nodiscard]] Json::Value data(long long underWay) const;
    [[nodiscard]] float fraction(long long underWay) const;

    KTR::Task& task_;
    UndoRecord undo_;
    std::string action_, current_, state_ = "running";
    long long itemsDone_ = 0, itemsSkipped_ = 0, itemsFailed_ = 0, itemsTotal_ = 0;
    long long bytesDone_ = 0, bytesTotal_ = 0;
    Json::Value errors_{Json::arrayValue};
    size_t errorBytes_ = 0;
    long long errorsLeftOut_ = 0;
    Json::Value new_{Json::arrayValue};
    Json::Int64 newCount_ = 0;
    std::function<Json::Value()> measured_;
    long long publishedAt_ = 0;  // milliseconds
    bool begun_ = false;
};

}  // namespace orvel::cgi

#endif
