// Records of background work: one JSON document a task, in a folder for each user, read by later requests.
//
// A task's name is bytes of any kind but "", "." and ".." and is at most 200 bytes long, "/", "%" and a leading "."
// counted thrice. Readers see a document whole, before or after an update; one that is torn, larger than 1 MiB or
// nested deeper than 64 levels reads as a task without properties that nobody works on any more, created when the file
// was last written. A file that others could have written, and a link, is no task. The store is central: its operations
// reach it as root in a process that may become root.
#ifndef VEXO_TASK_H
#define VEXO_TASK_H

#include <json/value.h>
#include <sys/types.h>

#include <memory>
#include <string>

#include "vexo/export.h"

namespace KTR {

class TaskMgr;

class VEXO_API Task {
 public:
    ~Task();
    Task(const Task&) = delete;
    Task& operator=(const Task&) = delete;

    // Reads the document anew, unless an update is open. False when it is gone; what was read before then stays.
    bool reload();
    // The property as last read, null when there is none.
    Json::Value getProperty(const char* name) const;
    // Sets a property: inside an update when that ends, else at once. False when it could not be written.
    bool setProperty(const char* name, const Json::Value& value);
    // Opens an update: the document is locked and read anew. False when it is gone or cannot be locked, and inside an
    // update. Other updates wait for its end, so it is kept short and not left open over a fork.
    bool beginUpdate();
    // Writes what was set since and unlocks. False when there is no update or it could not be written (one that could
    // not be read again is not): the document is then as before, here as well.
    bool endUpdate();

    // Notes the calling process, by number and start time, as the one that does the work.
    bool attach();
    // The process noted when it still runs and is the same one, else 0.
    pid_t getWorker() const;
    // Marks the work as done, for good.
    bool finish();
    // True when the work was marked as done, or its process ended without doing so (see hasFailed). A process of which
    // that cannot be determined counts as running.
    bool isFinished() const;
    // True when the process noted is gone and never marked the work as done.
    bool hasFailed() const;
    // Seconds since the epoch, 0 when unknown.
    long long getCreateTime() const;
    std::string getName() const;
    // Removes the document; true even if it is gone already.
    bool remove();

 private:
    friend class TaskMgr;
    struct Impl;
    explicit Task(std::unique_ptr<Impl> impl);
    std::unique_ptr<Impl> impl_;
};

// The tasks of one user.
class VEXO_API TaskMgr {
 public:
    explicit TaskMgr(const char* user);
    ~TaskMgr();
    TaskMgr(const TaskMgr&) = delete;
    TaskMgr& operator=(const TaskMgr&) = delete;

    bool hasTask(const char* name) const;
    // The task (the caller's to delete), null when there is none.
    Task* getTask(const char* name) const;
    // A new task without properties, created now, the calling process noted as the one that works on it until another
    // attaches itself (the caller's to delete). Null with the slot set: 0x0800 exists, 0x0D00 a bad name, 0x2900 no
    // space, 0x8100 else.
    Task* createTask(const char* name);
    // Appends the names of all tasks that begin with `prefix` to the array `names`, sorted. False when they cannot be
    // listed, `names` as it was.
    bool getAllTaskId(const char* prefix, Json::Value& names) const;
    // Appends the names of all users who ever had tasks to the array `users`, sorted. As above.
    static bool getAllUsers(Json::Value& users);

 private:
    struct Impl;
    std::unique_ptr<Impl> impl_;
};

}  // namespace KTR

#endif
