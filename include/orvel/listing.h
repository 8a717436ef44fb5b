// Listings: the entries of a folder, the shares of a user, users and groups.
#ifndef ORVEL_LISTING_H
#define ORVEL_LISTING_H

#include <list>
#include <map>
#include <string>
#include <vector>

#include "orvel/dir_entry.h"
#include "orvel/export.h"
#include "orvel/mount_status.h"
#include "orvel/user_directory.h"
#include "vexo/user.h"

namespace FileSearch {
class FindComp;
}

// The order of a listing: folders before files, then the column that `sortBy` names, then names without case.
//
// Columns: "size" (between two files only), "mtime", "crtime", "ctime", "atime" (older first), "user", "group" (by
// numeric id), "posix" (the nine permission bits), "type" (extension without case). "name" and every other key order by
// name alone.
class ORVEL_API EnumCompare {
 public:
    explicit EnumCompare(const std::string& sortBy) : sortBy_(sortBy) {}
    // Whether `a` comes before `b`: a strict weak order.
    bool operator()(const DIRENTRY_INFO& a, const DIRENTRY_INFO& b) const;

 private:
    std::string sortBy_;
};

// One object serves one request: it reads the mount table once and asks for each owner's name once. Single-threaded.
class ORVEL_API OrvEnum {
 public:
    OrvEnum();
    ~OrvEnum();
    OrvEnum(const OrvEnum&) = delete;
    OrvEnum& operator=(const OrvEnum&) = delete;

    // Lists the folder `realPath`, shown as `path`, and appends the asked page to `entries`.
    //
    // path, realPath  share-relative and real path of the folder, bytes; children are these + "/" + name. Path "/"
    //                 itself is the share listing's. The real path is looked up once. "/proc/self/fd/N" stands for a
    //                 folder that the caller holds open: that one is listed, whatever stands at its path by now, and
    //                 the real path of messages, mounts and entries is where it lies.
    // sortBy          column as in EnumCompare; null keeps the reading order.
    // additional      ADDITIONAL_... bits; the bit that fills the sort column is added.
    // offset, limit   the page; limit 0 means everything, whatever the offset. An offset past the end is an empty page.
    // ascending       false reverses the whole list, folders last, also without a sort column.
    // criteria        all must accept the entry's name (their status argument is all zero). Borrowed, no null.
    // entries         what it holds already is sorted, counted and cut together with the folder's entries.
    // total           receives the number of entries before the page was cut; 0 from the moment the folder is tried.
    //
    // Left out: hidden names, and whatever is neither folder nor regular file (links too). Entries that vanish while
    // being read are dropped. A mount whose server does not answer is listed as a folder with mountPointType
    // "remotefail". With no bit but ADDITIONAL_REAL_PATH the status of entries is not read.
    //
    // Returns false with 400 null or empty path, null total; 407 for "/" and for denied; 408 missing; 410 a network
    // mount that does not answer; 402 else, what is no folder included (logged). A failing status of one entry ends the
    // listing with 407 (denied), 401, or, for an I/O failure, no code; it is logged, and the entries read so far stay
    // in `entries`. Leaves the working directory at "/".
    bool OrvLibDirEntryListEnum(const char* path, const char* realPath, const char* sortBy, int additional,
                                unsigned long offset, unsigned long limit, bool ascending, _tag_dir_entry_type_ type,
                                std::vector<FileSearch::FindComp*> criteria, std::list<DIRENTRY_INFO>& entries,
                                unsigned long* total);

    // Lists the user's home folder and the shares that `user` may use as folders "/home" and "/<share>", and appends
    // the asked page to `entries`.
    //
    // user            a name with a backslash is a domain user, else one with "@" a directory-server user, else local.
    // context         passed on for domain and directory users: the login session.
    // writableOnly    only shares that the user may write to.
    // sortBy, additional, offset, limit, ascending, entries, total   as above; also ADDITIONAL_VOLUME_STATUS and
    //                 ADDITIONAL_SYNC_SHARE. Unsorted, the home comes first.
    //
    // Returns false with 403 null user (logged), 400 null total, 401 the shares cannot be enumerated (logged), or with
    // the code of the resolution when the home's real path cannot be resolved (logged). Shares that are hidden, missing
    // or unreadable are left out.
    bool OrvLibShareEntryListEnum(const char* user, const char* context, bool writableOnly, const char* sortBy,
                                  int additional, unsigned long offset, unsigned long limit, bool ascending,
                                  std::list<DIRENTRY_INFO>& entries, unsigned long* total);

    // Fills `info` for one entry: its share-relative path, its real path, its name, the filter, and the d_type that
    // readdir gave (DT_UNKNOWN when not known). Returns 0 keep; 1 skip: filtered out, neither folder nor file,
    // vanished, or (mountPointType "remotefail", to be kept) on a network mount that does not answer; -1 failure
    // (logged) with 407 denied, 401 else, no code after an I/O failure, 400 (not logged) for a null argument.
    int FillFileInfo(const char* path, const char* realPath, const char* name, _tag_dir_entry_type_ type,
                     unsigned char dType, int additional, DIRENTRY_INFO& info);

    // Sorts stably in the order of EnumCompare(sortBy).
    void EntryListSort(std::list<DIRENTRY_INFO>& entries, std::string sortBy);

    // Cuts the page out of `entries`: removes the first `offset`, then all after the next `limit`. Limit 0 keeps
    // everything.
    void OrvLibDirEntrySlice(std::list<DIRENTRY_INFO>& entries, unsigned long offset, unsigned long limit);

    // Adds every user (group) of one source by id; an id that the map holds already gets its name replaced. False when
    // the source cannot be opened (logged); no library code.
    bool EnumAllUsers(std::map<unsigned int, _tag_USER_INFO_>& users, AUTH_TYPE type);
    bool EnumAllGroups(std::map<unsigned int, _tag_GROUP_INFO_>& groups, AUTH_TYPE type);

    // Appends the ids of the groups of `user`; nothing, and true, for a user who has none or is unknown. False (logged,
    // no library code) when the platform's list holds something that is no number; what was appended stays.
    bool EnumUserGroups(std::list<unsigned int>& gids, std::string user);

 private:
    OrvelMountStatus mounts_;
    OrvelUserEnum names_;
};

#endif
