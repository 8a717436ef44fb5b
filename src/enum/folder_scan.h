// The first half of a folder listing: what the folder holds, as compact records.
#ifndef ORVEL_ENUM_FOLDER_SCAN_H
#define ORVEL_ENUM_FOLDER_SCAN_H

#include <cstddef>
#include <string>
#include <vector>

#include "core/given_folder.h"
#include "orvel/dir_entry.h"
#include "orvel/mount_status.h"
#include "orvel/search_criteria.h"
#include "vexo/stat.h"

namespace orvel {

// Enters and opens the folder, and leaves the working directory at "/". Nothing with the library code set: 410 network
// mount that does not answer, 407 denied, 408 missing, 402 else (logged).
Descriptor openFolder(const GivenFolder& given);

// An entry of which only its place in the order is needed, until it turns out to be on the page.
struct ScannedEntry {
    size_t name;  // where it begins in ScannedFolder::names
    bool isDirectory;
    bool hasStatus;    // `status` was read; else it is zero
    bool unreachable;  // a network mount whose server does not answer
    _tag_VEXOSTAT_ status;
};

struct ScannedFolder {
    std::string names;  // each ended by a NUL
    std::vector<ScannedEntry> entries;
    [[nodiscard]] const char* name(const ScannedEntry& entry) const { return names.c_str() + entry.name; }
};

struct ScanRequest {
    const char* realPath;
    _tag_dir_entry_type_ filter;
    int additional;
    const std::vector<FileSearch::FindComp*>& criteria;
};

// Appends every entry that the listing keeps, in reading order. False when one entry's failure ends the listing
// (logged, the code set as FillFileInfo does) or the folder cannot be read on; `scanned` holds the entries before it
// then.
bool scanFolder(int folder, const ScanRequest& request, OrvelMountStatus& mounts, ScannedFolder& scanned);

}  // namespace orvel

#endif
