// An earlier version of a file or folder: what lies in a snapshot where it lies now.
//
// Who may see it is decided now: what is there must be one that the user may read, and where it is gone the deepest
// folder above that is left; then comes what its permissions were.
#ifndef ORVEL_CGI_VERSIONS_VERSION_H
#define ORVEL_CGI_VERSIONS_VERSION_H

#include <sys/stat.h>

#include <string>

#include "operation/judge.h"
#include "orvel/file_info.h"
#include "request.h"
#include "snapshots.h"

namespace orvel::cgi {

// What a path names now.
class Present {
 public:
    // Asks the share's rule and opens what is there, as the user, whose identity the process has taken on. 0; 407 for
    // what the user may not read, and for what is neither a file nor a folder; else a code as of confinedOpen.
    int open(const User& user, const std::string& path, Need need);

    [[nodiscard]] bool isThere() const { return there_; }
    [[nodiscard]] const struct stat& status() const { return status_; }  // where it is there
    [[nodiscard]] const PathInfo& info() const { return info_; }
    // Where it lies, free of links; of what is gone, where it would lie.
    [[nodiscard]] const std::string& realPath() const { return realPath_; }
    // The shelves of its versions. 0 or a library code.
    int findShelves(Shelves& shelves) const;
    // Whether what lies at `below`, relative to this folder, may be shown as it was: 0, also where nothing is there
    // now.
    [[nodiscard]] int judge(const std::string& below) const;

 private:
    int findFolderOfMissing();

    PathInfo info_;
    Descriptor root_, folder_;  // the folder that is left, or that it is or lies in
    std::string realRoot_, realFolder_, realPath_;
    struct stat status_ {};
    bool there_ = false;
};

struct Version {
    Present present;
    Snapshot snapshot;
    Descriptor root;     // of the snapshot
    std::string inside;  // its path below that, "." for the root itself
    Descriptor opened;   // as a place
    struct stat status {};
};

// Opens what lay where the present thing lies, in one snapshot: a file or folder, of the present one's kind. Names in
// the snapshot are hidden from here on as those of the present folder are. 0, or 408 where it has none.
int openVersionIn(const Shelf& shelf, Version& version);

// Opens the version of the path in the snapshot `name`. 0 or a library code.
int openVersion(const User& user, const std::string& path, const std::string& name, Need need, Version& version);

// What a request calls a snapshot, parameter "snapshot" or "snapshot_raw". Nothing for what cannot be one.
std::optional<std::string> versionParam(const VEXO::WebCGI& web);

// Whether a request names one, be it wrongly.
[[nodiscard]] bool namesVersion(const VEXO::WebCGI& web);

// "name (2026-11-01 12.00).ext": what a version is called beside the present file.
std::string versionName(const std::string& name, const Snapshot& snapshot, bool isFolder);

}  // namespace orvel::cgi

#endif
