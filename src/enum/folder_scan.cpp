#include "enum/folder_scan.h"

#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "base/printable.h"
#include "core/boundary.h"
#include "enum/entry_fill.h"
#include "enum/folder_reader.h"
#include "vexo/filesystem.h"
#include "vexo/share_files.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelenum";

bool isOnRemoteMount(const char* realPath) {
    return VEXOFSIsInMountTable(realPath) >= 0 && VEXOFSIsRemoteFS() == 1;
}

bool tellsOfDeadServer(int systemCode) {
    return systemCode == EHOSTDOWN || systemCode == ENXIO || systemCode == EIO || systemCode == ENOENT;
}

void reportFolder(int systemCode, const char* realPath, bool opening) {
    if (tellsOfDeadServer(systemCode) && isOnRemoteMount(realPath)) {
        OrvLibSetErr(ORV_ERR_REMOTE);
    } else if (systemCode == EACCES || systemCode == EPERM) {
        OrvLibSetErr(ORV_ERR_DENIED);
    } else if (systemCode == ENOENT || (opening && systemCode == ENOTDIR)) {
        OrvLibSetErr(ORV_ERR_MISSING);
    } else {
        const std::string text = printable(realPath);
        errno = systemCode;
        syslog(LOG_ERR, "%s:%d Failed to access %s, errno=%m", kSource, __LINE__, text.c_str());
        OrvLibSetErr(ORV_ERR_DIRECTORY);
    }
    errno = systemCode;
}

bool acceptedBy(const std::vector<FileSearch::FindComp*>& criteria, const char* name) {
    static constexpr _tag_VEXOSTAT_ kNoStatus = {};  // read only after this test
    return std::all_of(criteria.begin(), criteria.end(),
                       [&](FileSearch::FindComp* c) { return (*c)(name, kNoStatus); });
}

// Reads one folder, entry by entry.
class Scan {
 public:
    Scan(int folder, const ScanRequest& request, OrvelMountStatus& mounts, ScannedFolder& out)
        : folder_(folder), request_(request), flags_(statusFlags(request.additional)), mounts_(mounts), out_(out) {}

    bool run() {
        bool failed = false;
        VEXOShareNamesAt(request_.realPath);
        const int systemCode = FolderReader().forEach(folder_, [&](const char* name, unsigned char dType) {
            if (VEXOEAIsHiddenFile(name) == 1 || !acceptedBy(request_.criteria, name)) return true;
            failed = !take(name, dType);
            return !failed;
        });
        if (systemCode == 0) return !failed;
        reportFolder(systemCode, request_.realPath, true);  // half a folder must not pass for the whole
        return false;
    }

 private:
    // False when the listing ends here.
    bool take(const char* name, unsigned char dType) {
        ScannedEntry entry{out_.names.size(), dType == DT_DIR, false, false, {}};
        switch (judgeType(dType, request_.filter, request_.additional)) {
            case TypeVerdict::Skip:
                return true;
            case TypeVerdict::Keep:
                keep(name, entry);
                return true;
            case TypeVerdict::AskStatus:
                break;
        }
        if (VLIBCFileLStatAt(folder_, name, flags_, &entry.status) < 0) return takeFailed(name, entry);
        if (!passes(entry.status.st_mode, request_.filter)) return true;
        entry.isDirectory = S_ISDIR(entry.status.st_mode);
        entry.hasStatus = true;
        keep(name, entry);
        return true;
    }

    bool takeFailed(const char* name, ScannedEntry& entry) {
        const int systemCode = errno;
        const std::string realPath = std::string(request_.realPath) + "/" + name;
        switch (judgeStatusFailure(systemCode, realPath.c_str(), mounts_)) {
            case StatusFailure::Vanished:
                return true;
            case StatusFailure::Fatal:
                return false;
            case StatusFailure::Unreachable:
                break;
        }
        entry.isDirectory = true;
        entry.unreachable = true;
        entry.status = {};
        keep(name, entry);
        return true;
    }

    void keep(const char* name, const ScannedEntry& entry) {
        out_.names.append(name, strlen(name) + 1);
        out_.entries.push_back(entry);
    }

    int folder_;
    const ScanRequest& request_;
    unsigned flags_;
    OrvelMountStatus& mounts_;
    ScannedFolder& out_;
};

}  // namespace

Descriptor openFolder(const GivenFolder& given) {
    // Entering proves that the folder may be entered, which opening alone does not.
    EnteredFolder entered = given.enter();
    const bool opening = entered.failure == EntryFailure::kOpen;
    if (opening && chdir("/") != 0) {
        reportFolder(errno, given.text().c_str(), false);
        return Descriptor();
    }
    if (!entered.folder) reportFolder(entered.error, given.text().c_str(), opening);
    return std::move(entered.folder);
}

bool scanFolder(int folder, const ScanRequest& request, OrvelMountStatus& mounts, ScannedFolder& scanned) {
    return Scan(folder, request, mounts, scanned).run();
}

}  // namespace orvel
