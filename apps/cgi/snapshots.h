// Where the snapshots of a folder are, and of when each is.
#ifndef ORVEL_CGI_SNAPSHOTS_H
#define ORVEL_CGI_SNAPSHOTS_H

#include <ctime>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/descriptor.h"

namespace orvel::cgi {

// What says of when a snapshot is: its name, snapper's record beside it, or the file system.
enum class Dated { kNot, kByName, kByRecord, kByFileSystem };

struct Snapshot {
    std::string name;  // in its shelf
    time_t time = 0;
    Dated dated = Dated::kNot;
};

// The date in a name such as "autosnap_2026-11-01_12:00:00_hourly": UTC where it has "GMT" or "UTC", else local time.
// Pure but for the time zone.
[[nodiscard]] std::optional<time_t> dateInName(std::string_view name);
// The date of a name that is nothing else, in a format of strptime(3).
[[nodiscard]] std::optional<time_t> dateByFormat(const std::string& name, const std::string& format, bool isLocalTime);

// A folder that holds snapshots, opened as the user.
struct Shelf {
    Descriptor folder;
    std::string base;    // real path of the folder that they are snapshots of
    std::string inside;  // where that lies in each of them, "" for all of it
    std::string format;  // of their names; "" where any will do
    bool isLocalTime = false;
    bool takesUndated = false;  // everything in it is a snapshot
};

struct Shelves {
    std::vector<Shelf> all;  // the nearest first
    bool isClosed = false;   // there is one that the user may not read
};

// The shelves that may hold versions of what lies in `folder`, open, at the real path `path`; `root` is the root of its
// share. 0 or a library code.
[[nodiscard]] int findShelves(const std::string& root, const Descriptor& folder, const std::string& path,
                              Shelves& shelves);

// The snapshots in a shelf, the latest first; those without a date last. False when only part of them could be read.
[[nodiscard]] bool snapshotsIn(const Shelf& shelf, std::vector<Snapshot>& snapshots);
// The one of that name; nothing where there is none.
[[nodiscard]] std::optional<Snapshot> snapshotOf(const Shelf& shelf, const std::string& name);
// Opens it as a place, beneath its shelf and through no link; null with errno.
[[nodiscard]] Descriptor openSnapshot(const Shelf& shelf, const std::string& name);

// Whether the name in the open folder is, or lies in, a snapshot: nothing is ever written there, even where the file
// system would allow it.
[[nodiscard]] bool isInSnapshot(const Descriptor& folder, const std::string& name);

}  // namespace orvel::cgi

#endif
