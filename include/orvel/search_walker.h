// A running search: chosen folders and criteria in, a task with its results out. Shares that the file index covers are
// answered from it, the others are walked, and so are folders that no index holds (hidden ones, recycle bins, network
// mounts, those behind links); both give the same records.
//
// Failures are reported by result and by the platform's error number, and logged at LOG_ERR where a function does not
// say otherwise; the library code is not set here (look-ups of privileges and paths set theirs). Constructing an object
// may throw std::bad_alloc and nothing else.
#ifndef ORVEL_SEARCH_WALKER_H
#define ORVEL_SEARCH_WALKER_H

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "orvel/directory_walker.h"
#include "orvel/export.h"
#include "orvel/file_info.h"
#include "orvel/file_record.h"
#include "orvel/search_criteria.h"

namespace FileSearch {

// Which file or folder stood at a path.
struct FileMark {
    uint64_t device;
    uint64_t inode;
};

// The chosen folders by share name, in ascending byte order; within a share in the order of their insertion.
class ORVEL_API SearchShareDirMap {
 public:
    using Shares = std::map<std::string, std::vector<PathInfo>>;

    // Adds the folder at a share-relative path and notes which one it is. A folder that the user may not list, one that
    // is reached by a link or ".." out of the share, and a recycle bin, is passed over: true. A folder of the user's
    // home goes under "homes": share name, path ("/homes/<user>/...") and share root are those of that share. False
    // when the path cannot be resolved, with the platform error of PathInfoFactory::create. Side effect: the current
    // directory may become the folder.
    bool insertDir(const char* user, const char* sid, const std::string& folder);

    // The folders chosen in a share; null when there are none. Valid until the next insertion.
    [[nodiscard]] const std::vector<PathInfo>* findShare(const std::string& share) const;
    [[nodiscard]] const Shares& shares() const { return shares_; }
    // What stood at the path of the folder at `position` of a share when it was inserted.
    [[nodiscard]] const FileMark& markOf(const std::string& share, std::size_t position) const;

 private:
    Shares shares_;
    std::map<std::string, std::vector<FileMark>> marks_;  // at the same positions
};

// Adds a record of each entry it is called for to a result database. Entries that are not in a share, and records that
// cannot be stored, are logged and left out: true. False only when memory is out.
class ORVEL_API OrvSearchCallBack : public OrvDirectoryWalkerCallBack {
 public:
    explicit OrvSearchCallBack(const char* taskDatabasePath);
    ~OrvSearchCallBack() override;
    // `context`: the share's root; `extra`: the share's name (null counts as "").
    bool operator()(const std::string& displayPath, const std::string& context, const std::string& realPath,
                    const std::string& name, _tag_VEXOSTAT_& status, const std::string* extra) override;
    // The platform error of the last record that could not be stored; 0: none was lost.
    [[nodiscard]] int lossReason() const { return lossReason_; }
    [[nodiscard]] bool hasStored() const { return stored_; }  // a record at least

 private:
    FileRecord record_;
    std::string database_;
    int lossReason_ = 0;
    bool stored_ = false;
};

// Tests each entry against the criteria and hands what matches on to the result callback. `criteria` must outlive it;
// without any, every entry matches. The result is whether there is a cancel flag, not its value (kept: the walker reads
// the flag itself), so without one a walk ends, as failed, after its first entry; false, too, when memory is out.
class ORVEL_API OrvSearchCompWalkerCB : public OrvDirectoryWalkerCallBack {
 public:
    OrvSearchCompWalkerCB(const char* taskDatabasePath, const std::vector<FindComp*>& criteria, int* cancelFlag);
    ~OrvSearchCompWalkerCB() override;
    bool operator()(const std::string& displayPath, const std::string& context, const std::string& realPath,
                    const std::string& name, _tag_VEXOSTAT_& status, const std::string* extra) override;
    // As of the result callback.
    [[nodiscard]] int lossReason() const { return results_->lossReason(); }
    [[nodiscard]] bool hasStored() const { return results_->hasStored(); }

 private:
    std::unique_ptr<OrvSearchCallBack> results_;
    const std::vector<FindComp*>& criteria_;
    int* cancelFlag_;
};

// Verdicts on folders of one share, each asked for once: what lies in a folder is seen only where a walk of the calling
// identity, from one of the chosen folders down, would come by and read names and statuses.
class ORVEL_API DirPrivilegeMap {
 public:
    // `shareRoot`: real path; `chosen`: the folders chosen in the share.
    DirPrivilegeMap(const std::string& shareRoot, const std::vector<PathInfo>& chosen);
    ~DirPrivilegeMap();
    DirPrivilegeMap(const DirPrivilegeMap&) = delete;
    DirPrivilegeMap& operator=(const DirPrivilegeMap&) = delete;

    // `folder`: path within the share, "" for its root. False, too, when memory is out. Logs nothing.
    bool findDirPrivilege(std::string_view folder);

 private:
    [[nodiscard]] bool canWalk(std::string_view folder) const;

    int root_;                                   // descriptor of the share's root
    std::set<std::string, std::less<>> chosen_;  // paths within the share
    std::map<std::string, bool, std::less<>> verdicts_;
};

// Constructed, initialised once, walked once. The cancel flag is the caller's and may be raised at any time: any
// nonzero value ends the search between folders and shares, 1 (what callers set) also within a walk. A null flag is
// accepted, see OrvSearchCompWalkerCB.
class ORVEL_API OrvSearchWalker {
 public:
    OrvSearchWalker(const char* user, const char* sid, int* cancelFlag);
    ~OrvSearchWalker();
    OrvSearchWalker(const OrvSearchWalker&) = delete;
    OrvSearchWalker& operator=(const OrvSearchWalker&) = delete;

    // Resolves the folders (share-relative paths), creates the task and its database on the volume of the first share,
    // and chains the criteria, which must be at least one and outlive the walker. False with the platform error 0x0D00
    // (no criteria), 0x0300 (no folder is left to search), that of a path that cannot be resolved, or of the database.
    bool init(const std::vector<std::string>& folders, const std::vector<FindComp*>& criteria);
    // The first step of init: fills the folder map. True, too, when the cancel flag ended it early.
    bool BuildDirMap(const std::vector<std::string>& folders);

    // Searches. A folder is walked only if it is still the one that was chosen, opened beneath its share's root;
    // another one in its place, or a way there that leads out of the share meanwhile, makes it missing.
    // `accessTimeCriteria`: those of the criteria that ask for access times, which an index cannot know. True when
    // everything was searched or the search was cancelled; the results so far stay. The platform error is then 0, or
    // where records could not be stored, for whatever reason, that of the last of them. False with the platform error
    // 0x0D00 (not initialised, or the index failed), 0x0600 or 0x0300 (a chosen folder is missing or denied; not
    // logged), 0x8100 (another failure of its status), 0x8000 (the walk failed). A chosen path that is no folder is
    // passed over. Side effect: the current directory.
    bool Walk(const std::vector<FindATimeComp*>& accessTimeCriteria);
    // Takes the matches of one indexed share from the file index; called by Walk.
    bool WalkDB(const std::string& shareName, const std::vector<PathInfo>& folders,
                const std::vector<FindATimeComp*>& accessTimeCriteria);

    // True: only the entries directly in the chosen folders. False from the start.
    void setSearchCurrentDir(bool currentOnly);
    // The order in which results are asked for while the search is still going on, as for OrvSearchDBTask::queryResult:
    // where an index keeps it, what comes first in it is found first. Without it, in any order.
    void setShownOrder(const char* sortBy, const bool* sortFlag);
    // "" before a successful init; then what OrvSearchDBTask takes, until the walker ends.
    [[nodiscard]] const char* getDBTaskId() const;
    [[nodiscard]] const char* getDBVol() const;

 private:
    [[nodiscard]] bool cancelled() const { return cancelFlag_ != nullptr && *cancelFlag_ != 0; }
    [[nodiscard]] bool prepare(const std::vector<std::string>& folders, const std::vector<FindComp*>& criteria);
    [[nodiscard]] bool makeTask(const std::vector<FindComp*>& criteria);
    [[nodiscard]] bool search(const std::vector<FindATimeComp*>& accessTimeCriteria);
    [[nodiscard]] bool searchShare(const std::string& shareName, const std::vector<PathInfo>& folders,
                                   const std::vector<FindATimeComp*>& accessTimeCriteria);
    [[nodiscard]] bool walkFolder(const PathInfo& folder, const FileMark& mark);
    [[nodiscard]] bool askIndex(const std::string& shareName, const std::vector<PathInfo>& folders,
                                const std::vector<FindATimeComp*>& accessTimeCriteria);

    std::unique_ptr<OrvSearchCompWalkerCB> callback_;
    int* cancelFlag_;
    bool currentFolderOnly_ = false;
    std::string user_;
    std::optional<std::string> sid_;
    std::string taskId_, volume_, database_;
    __tag_FI_SQL_COND* root_ = nullptr;
    SearchShareDirMap map_;
    std::optional<FISORT> shown_;
};

}  // namespace FileSearch

#endif
