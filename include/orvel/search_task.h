// The results of one search: a database of their own, the task, from which pages are read while the search runs and
// after it, and which later file operations keep true.
//
// A task lies at <volume>/@tmp/orvel/PXSearch/<owner>/<task id>, where local users can write: the platform opens it as
// untrusted. Volume paths, owner names and task ids are UTF-8; an owner or an id that is null, empty, "." or "..", or
// holds "/", and a path of 4,095 bytes or more, name nothing: it does not exist, is never made and never removed.
// Failures are logged at LOG_ERR where a function does not say otherwise; no library code is set, the platform's error
// number is that of the failed operation. Constructing an object may throw std::bad_alloc and nothing else.
#ifndef ORVEL_SEARCH_TASK_H
#define ORVEL_SEARCH_TASK_H

#include <string>

#include "orvel/dir_entry.h"
#include "orvel/export.h"
#include "vexo/index.h"
#include "vexo/stat.h"

namespace FileSearch {

class ORVEL_API OrvSearchDBTask {
 public:
    // The task `taskId` (null: a new id) of `owner`. Where its file does not exist the folders are made; the file
    // itself is FILEIDXDBCreate's to make.
    OrvSearchDBTask(const char* volume, const char* owner, const char* taskId);
    ~OrvSearchDBTask();

    [[nodiscard]] const char* getDBTaskId() const;        // "" when owner or id name nothing
    [[nodiscard]] const char* getDBTaskFilePath() const;  // as above
    // Deletes the task's file. False, not logged, with errno when it cannot be deleted.
    bool remove();

    // One page of the results. `sortBy`: "size", "mtime", "crtime", "ctime", "atime", "user", "group", "posix", "type",
    // "ppath" (the folder, then the share, the latter in the opposite direction) or any other word for the name;
    // `sortFlag`: true is ascending; either null: by name, ascending. `typeFilter` (null: all): only folders or only
    // files. `nameFilter` (null or "": all): what the name must contain, as a wildcard pattern. `callback` gets each
    // record of the page and `userData`; 0 ends the page. `count` receives the number of records that pass the filters,
    // whatever the page.
    // False for `limit` 0 or a null `count` (not logged), or when the database cannot be read; `count` then may be set
    // and part of the page handed over.
    bool queryResult(unsigned long offset, unsigned long limit, const char* sortBy, const bool* sortFlag,
                     const _tag_dir_entry_type_* typeFilter, const char* nameFilter,
                     BOOL (*callback)(__tag_FI_FILE_INFO_DATA*, void*), void* userData, unsigned long long* count);

    // Updates after file operations. A record is addressed by a share's name ("home" counts as "homes") and a real path
    // below that share's root; another one is cut behind its second component, or fails before the database is touched.
    // Records that are not there are no failure.

    // Removes the record of a file or folder that is gone, and all below it.
    bool delRecs(std::string shareName, std::string path);
    // Rewrites owner, group, permissions and times of one record. `userName`, `groupName`: null leaves that column; an
    // empty name and "root" become the decimal id, as in every record.
    bool updatePermRecs(std::string shareName, std::string path, const char* userName, const char* groupName,
                        _tag_VEXOSTAT_& status);
    // Adds the record of a new file with the names of its owner and group; one that is there already stays as it is.
    bool insertFile(std::string shareName, std::string path, std::string owner, std::string group,
                    _tag_VEXOSTAT_& status);
    // Moves one record to a new address, in the place of one that is there, and refreshes all its columns.
    bool updateFile(std::string shareName, std::string path, std::string newShareName, std::string newPath,
                    _tag_VEXOSTAT_& status);
    // Moves every record below a folder that was renamed or moved (the folder's own record is updateFile's), each with
    // its present status where that can be read.
    bool updateFileInFolder(std::string shareName, std::string path, std::string newShareName, std::string newPath);

    // Where a task lies; "" where owner or id name nothing.
    static std::string getDBTaskDir(const char* volume, const char* owner);
    static std::string getDBTaskFilePath(const char* volume, const char* owner, const char* taskId);
    static bool checkDBTaskDirExists(const char* volume, const char* owner);
    static bool checkDBTaskExists(const char* volume, const char* owner, const char* taskId);
    // Makes the folders of a task as root, those it makes with mode 0777; the effective user id is the caller's again
    // afterwards. Side effect: the volume's temporary folder. Failures are logged; the platform error is 0x2500 (no
    // space) or 0x8100 when the temporary folder could not be made.
    static void createDBTaskDir(const char* volume, const char* owner, const char* taskId);
    // A random number, from the kernel where it gives any.
    static unsigned int GetRandom();
    // An id that no task of the owner has: time and random number in upper-case hexadecimal. "" when memory is out.
    static std::string getUniqueID(const char* volume, const char* owner);

 private:
    std::string owner_, taskId_, filePath_;
};

// The tasks of one owner. Task objects are the caller's to delete.
class ORVEL_API OrvSearchDBTaskMgr {
 public:
    explicit OrvSearchDBTaskMgr(const char* owner);
    ~OrvSearchDBTaskMgr();

    std::string getDBTaskDir(const char* volume) const;
    bool hasDBTask(const char* volume, const char* taskId) const;
    // Null when the task does not exist; nothing is made then.
    OrvSearchDBTask* getDBTask(const char* volume, const char* taskId) const;
    // A task with this id, or with a new one when it is null; its folders exist then. Null when the id or the owner
    // names nothing, or memory is out.
    OrvSearchDBTask* createDBTask(const char* volume, const char* taskId);

 private:
    std::string owner_;
};

}  // namespace FileSearch

#endif
