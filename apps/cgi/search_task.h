// A search between two requests: a record of its work and a database of its results.
#ifndef ORVEL_CGI_SEARCH_TASK_H
#define ORVEL_CGI_SEARCH_TASK_H

#include <memory>
#include <string>

#include "orvel/search_task.h"
#include "vexo/task.h"

namespace orvel::cgi {

// Properties of the record.
inline constexpr const char* kVolumeProperty = "volume";
inline constexpr const char* kSharesProperty = "shares";      // {name: "index" or "walk"}
inline constexpr const char* kSearchedProperty = "searched";  // [path of a share], percent-encoded
inline constexpr const char* kIndexesProperty = "indexes";    // {name: {"updated","live"}}, as the search began
inline constexpr const char* kLeftOutProperty = "left_out";   // [folder]: without what network mounts below it hold
inline constexpr const char* kStoppedProperty = "stopped";    // true when it was ended before it had seen everything
inline constexpr const char* kCodeProperty = "code";          // library code of a failure

// An id as the library makes them: it can name nothing but a task.
bool isTaskId(const std::string& text);

struct SearchTask {
    std::unique_ptr<KTR::Task> record;
    std::unique_ptr<FileSearch::OrvSearchDBTask> results;  // null when the database is gone
};

// Finds a user's task, whose id was checked. 0, or 408 when he has none of that id.
int findTask(const std::string& user, const std::string& id, SearchTask& task);
// Makes the record of a new one, with the calling process as the one at work. Null on failure.
std::unique_ptr<KTR::Task> makeRecord(const std::string& user, const std::string& id);

// Asks the process at work to end with what it has, waits for it as long as a request may take, and reports whether it
// has ended. With `forGood` one that does not listen is killed.
bool endWork(KTR::Task& record, bool forGood);
// Removes database and record. False when the record stays.
bool removeTask(const SearchTask& task);

// Before another one is begun: removes what ended and whose beginning lies nearly two days away, of searches and of
// operations, and of what ended later the oldest, where the user has too many, or their results take more than half of
// the setting "search_results_mib" on a volume. 0, or 420 when too many are at work.
int makeRoomForTask(const std::string& user);

}  // namespace orvel::cgi

#endif
