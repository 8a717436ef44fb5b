// Copying and moving of files and whole folders.
#ifndef ORVEL_CGI_OPERATION_TRANSFER_H
#define ORVEL_CGI_OPERATION_TRANSFER_H

#include <functional>
#include <optional>
#include <set>
#include <string>
#include <unordered_map>
#include <vector>

#include "free_names.h"
#include "operation/conflict.h"
#include "operation/item.h"
#include "operation/progress.h"

namespace orvel::cgi {

// Keeps what a copy is about to replace.
class Replacing {
 public:
    virtual ~Replacing() = default;
    // Before: what is there is also elsewhere from then on, or there alone. 0, or a code why it is not to be replaced.
    virtual int keep(const Entry& there, const struct stat& status) = 0;
    // It was replaced; `undo` learns where it is. Or it was not.
    virtual void replaced(UndoRecord& undo) = 0;
    virtual void giveBack() = 0;
};

// Files appear under their names whole or not at all, with the permissions and times of the source; a new folder gets
// them once it is filled. Links are copied as they are. What fails is reported, each item for itself, and the rest goes
// on; so does what is neither a file, a folder nor a link. A copy passes hidden names over. The progress learns how to
// undo it, except what replaced something else, which would not come back.
//
// A move is a rename; where that is not possible, on another file system, it is a copy, hidden names included, after
// which the source is removed: once the copy is on the disk, and nothing but what was copied.
class Transfer {
 public:
    struct Rules {
        Conflict conflict;
        bool move;
        Owner owner;
        bool onFat;  // the target: names that differ only in case are one there
        std::string (*nextName)(const std::string& name, int number, bool isFolder) = numberedName;  // see kKeepBoth
        Replacing* replacing = nullptr;                          // files and links, of a copy
        std::function<int(const std::string& path)> judge = {};  // 0, or why what lies in a folder is not copied
    };
    Transfer(Progress& progress, const Rules& rules) : progress_(progress), rules_(rules) {}

    // Puts `from` where `to` says; its name, and its path with it, change when both are kept. `to.folder` is the same
    // for all calls. Sizes must have been measured before, except for a move. True when all of it arrived.
    bool run(const Item& from, Entry& to);
    // What the last run copied.
    [[nodiscard]] long long bytes() const { return bytes_; }

 private:
    enum class Result { kDone, kFailed, kExists };
    struct FoldedOrder {
        bool operator()(const std::string& a, const std::string& b) const;
    };
    using Names = std::set<std::string, FoldedOrder>;

    // A file or link of the folder at work that was copied, and is to be removed.
    struct Copied {
        std::string name, copy;
        struct stat status;
        bool replaced;
    };

    Result place(const Entry& from, const struct stat& status, Entry& to, Names& taken);
    Result resolve(const Entry& from, const struct stat& status, Entry& to);
    Result replace(const Entry& from, const struct stat& status, const Entry& to, const struct stat& there);
    Result keepBoth(const Entry& from, const struct stat& status, Entry& to);
    Result make(const Entry& from, const struct stat& status, const Entry& to, bool replace);
    Result rename(const Entry& from, const struct stat& status, const Entry& to, bool replace);
    Result copy(const Entry& from, const struct stat& status, const Entry& to, bool replace);
    Result copyFile(const Entry& from, const struct stat& status, const Entry& to, bool replace);
    Result copyLink(const Entry& from, const struct stat& status, const Entry& to, bool replace);
    Result makeFolder(const Entry& from, const struct stat& status, const Entry& to);
    Result fill(const Entry& from, const struct stat& status, const Entry& to, bool made);
    bool fillWhole(const Entry& from, const Descriptor& source, const Entry& to, const Descriptor& target);
    bool fillFrom(const Entry& from, const Descriptor& source, const Entry& to, const Descriptor& target);
    Result arrived(const Entry& from, const struct stat& status, const Entry& to, bool replace);
    bool removeCopied(const Entry& from, const Descriptor& source, const Entry& to, const Descriptor& target);
    static bool isOnDisk(const Copied& copied, const Descriptor& target);
    void makeAlike(const Entry& to, const Descriptor& folder, const struct stat& status) const;
    Result removeSource(const Entry& from, const struct stat& status);
    void noteMoved(const Entry& from, const struct stat& status, const Entry& to, bool replace);
    void noteCopied(const Entry& from, const struct stat& status, const Entry& to, bool replace);
    Result failed(const Entry& entry, int code);
    Result failedWith(const Entry& entry, int error);
    Result done();

    Progress& progress_;
    Rules rules_;
    Names taken_;                                   // at the top of the target
    std::unordered_map<std::string, int> numbers_;  // by path: the last that keepBoth gave a name at the top
    const Item* top_ = nullptr;                     // of the run
    std::optional<struct stat> topTarget_;          // the folder that it becomes
    bool renaming_ = false;                         // no rename of this run met another file system yet
    bool hidden_ = false;                           // what is at work is never shown, nor counted
    std::vector<Copied> copied_;                    // in the folder at work
    int depth_ = 0;
    int made_ = 0;  // folders above what is at work that were made for a move: they are undone as a whole
    long long bytes_ = 0;
};

}  // namespace orvel::cgi

#endif
