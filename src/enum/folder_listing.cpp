// The listing of one folder. Every entry is scanned into a compact record; full records are built for the page alone.
#include <algorithm>
#include <cerrno>
#include <cstring>
#include <memory>
#include <numeric>
#include <optional>

#include "core/acl_privilege.h"
#include "core/boundary.h"
#include "core/owned.h"
#include "enum/entry_fill.h"
#include "enum/entry_order.h"
#include "enum/folder_scan.h"
#include "enum/page.h"
#include "orvel/listing.h"
#include "orvel/privilege.h"
#include "vexo/acl.h"
#include "vexo/error.h"

namespace orvel {
namespace {

bool isEmpty(const char* text) {
    return text == nullptr || *text == '\0';
}

// Keeps what a failure left for the caller while further platform operations run.
class FailureKeeper {
 public:
    FailureKeeper() = default;
    ~FailureKeeper() {
        VLIBCErrSetEx(code_, file_, line_);
        errno = systemCode_;
    }
    FailureKeeper(const FailureKeeper&) = delete;
    FailureKeeper& operator=(const FailureKeeper&) = delete;

 private:
    int systemCode_ = errno;
    int code_ = VLIBCErrGet();
    const char* file_ = VLIBCErrorGetFile();
    int line_ = VLIBCErrorGetLine();
};

using PermissionFolder = std::unique_ptr<VEXOACLFOLDER, Releaser<VEXOACLFolderClose>>;

// Builds the full records of scanned entries.
class RecordBuilder {
 public:
    RecordBuilder(const Descriptor& folder, const char* path, const std::string& realPath, int additional,
                  const ScannedFolder& scanned, OrvelMountStatus& mounts, OrvelUserEnum& names)
        : permissions_((additional & ADDITIONAL_PERM) != 0 ? VEXOACLFolderOpen(folder.get()) : nullptr),
          path_(std::string(path) + "/"),
          realPath_(realPath + "/"),
          opened_(folder.path("")),
          realPrefix_(realPath_.size()),
          openedPrefix_(opened_.size()),
          additional_(additional),
          scanned_(scanned),
          mounts_(mounts),
          names_(names) {}

    void append(size_t position, std::list<DIRENTRY_INFO>& entries) {
        const ScannedEntry& entry = scanned_.entries[position];
        DIRENTRY_INFO& info = entries.emplace_back();
        info.name = scanned_.name(entry);
        info.path.reserve(path_.size() + info.name.size());
        info.path.append(path_).append(info.name);
        info.isDirectory = entry.isDirectory;
        realPath_.resize(realPrefix_);
        realPath_ += info.name;
        if ((additional_ & ADDITIONAL_REAL_PATH) != 0) info.realPath = realPath_;
        if (entry.unreachable) info.mountPointType = kUnreachable;
        if (!entry.hasStatus) return;
        fillProperties(realPath_.c_str(), entry.status, additional_, mounts_, names_, info);
        if ((additional_ & ADDITIONAL_PERM) != 0) fillPermissions(entry.status, info);
    }

 private:
    void fillPermissions(const _tag_VEXOSTAT_& status, DIRENTRY_INFO& info) {
        opened_.resize(openedPrefix_);
        opened_ += info.name;
        // The folder's quick answer; where it has none, the full question decides and reports.
        if (!permissions_ ||
            VEXOACLFolderPermGet(permissions_.get(), info.name.c_str(), &status, &info.aclPrivilege) < 0) {
            info.aclPrivilege = permissionsOf(opened_.c_str(), realPath_.c_str());
        }
        info.isAclMode = VEXOACLIsSupportOnDevice(opened_.c_str(), status.st_device) > 0 ? 1 : 0;
    }

    PermissionFolder permissions_;
    std::string path_;
    std::string realPath_;  // of the folder, then of the entry at hand
    std::string opened_;    // the same by the open folder: what it leads to, however long the real path is
    size_t realPrefix_, openedPrefix_;
    int additional_;
    const ScannedFolder& scanned_;
    OrvelMountStatus& mounts_;
    OrvelUserEnum& names_;
};

// The positions of the page's entries, in the order in which they are shown.
std::vector<size_t> pagePositions(const ScannedFolder& scanned, const Paging& paging) {
    const Range range = pageOf(scanned.entries.size(), paging);
    std::vector<size_t> positions(range.last - range.first);
    if (paging.sortBy == nullptr) {
        std::iota(positions.begin(), positions.end(), range.first);
    } else {
        const Column column = columnOf(paging.sortBy);
        EntryOrder order(column, scanned.entries.size());
        for (const ScannedEntry& entry : scanned.entries) {
            const char* name = scanned.name(entry);
            const bool hasType = column == Column::Type && entry.hasStatus && !entry.isDirectory;
            order.add(figuresOf(entry.isDirectory, entry.status), name, hasType ? typeOf(name) : std::string());
        }
        positions = order.take(range.first, range.last);
    }
    if (!paging.ascending) std::reverse(positions.begin(), positions.end());
    return positions;
}

void appendAll(RecordBuilder& builder, size_t count, std::list<DIRENTRY_INFO>& entries) {
    for (size_t position = 0; position < count; ++position) builder.append(position, entries);
}

}  // namespace
}  // namespace orvel

OrvEnum::OrvEnum() = default;
OrvEnum::~OrvEnum() = default;

bool OrvEnum::OrvLibDirEntryListEnum(const char* path, const char* realPath, const char* sortBy, int additional,
                                     unsigned long offset, unsigned long limit, bool ascending,
                                     _tag_dir_entry_type_ type, std::vector<FileSearch::FindComp*> criteria,
                                     std::list<DIRENTRY_INFO>& entries, unsigned long* total) {
    return orvel::guarded(false, [&] {
        if (orvel::isEmpty(path) || orvel::isEmpty(realPath) || total == nullptr) {
            OrvLibSetErr(ORV_ERR_PARAMETER);
            return false;
        }
        if (strcmp(path, "/") == 0) {  // the shares are listed by OrvLibShareEntryListEnum
            OrvLibSetErr(ORV_ERR_DENIED);
            return false;
        }
        *total = 0;
        const int wanted = orvel::widened(additional, sortBy);
        const orvel::GivenFolder given(realPath);
        const orvel::Descriptor folder = orvel::openFolder(given);
        if (!folder) return false;
        orvel::ScannedFolder scanned;
        const orvel::ScanRequest request{given.text().c_str(), type, wanted, criteria};
        const bool complete = orvel::scanFolder(folder.get(), request, mounts_, scanned);
        std::optional<orvel::FailureKeeper> keeper;
        if (!complete) keeper.emplace();
        orvel::RecordBuilder builder(folder, path, given.text(), wanted, scanned, mounts_, names_);
        if (!complete) {
            orvel::appendAll(builder, scanned.entries.size(), entries);
            return false;
        }
        const orvel::Paging paging{sortBy, ascending, offset, limit};
        if (!entries.empty()) {  // what the caller had is ordered and cut together with the folder's entries
            orvel::appendAll(builder, scanned.entries.size(), entries);
            orvel::arrange(entries, paging, *total);
            return true;
        }
        for (const size_t position : orvel::pagePositions(scanned, paging)) builder.append(position, entries);
        *total = scanned.entries.size();
        return true;
    });
}
