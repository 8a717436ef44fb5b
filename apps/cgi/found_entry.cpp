#include "found_entry.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <climits>
#include <cstdlib>
#include <exception>
#include <memory>
#include <string>

#include "base/beneath.h"
#include "base/owner.h"
#include "orvel/error_state.h"
#include "reply.h"
#include "vexo/acl.h"
#include "vexo/share.h"
#include "vexo/stat.h"

namespace orvel::cgi {
namespace {

std::string homeOf(const std::string& user) {
    char path[PATH_MAX], canonical[PATH_MAX];
    if (VEXOServiceHomePathGet(user.c_str(), path, sizeof path) != 0) return "";
    return realpath(path, canonical) != nullptr ? canonical : "";
}

// What the calling identity may do with the files of rows. Rows are older than what stands at their paths by now: each
// file is asked about in its folder, which is opened beneath the share's root without links; one that cannot be reached
// that way grants nothing.
class RowRights {
 public:
    void put(const __tag_FI_FILE_INFO_DATA& record, DIRENTRY_INFO& entry) {
        enter(record.szShareRoot, *record.szParent == '\0' ? "." : record.szParent);
        _tag_VEXOSTAT_ status;
        if (!folder_ || VLIBCFileLStatAt(folder_.get(), record.szName, VEXO_STAT_BASIC, &status) < 0) return;
        if (!S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) return;
        if (!rights_ || VEXOACLFolderPermGet(rights_.get(), record.szName, &status, &entry.aclPrivilege) < 0) return;
        const std::string file = folder_.path(record.szName);
        entry.isAclMode = VEXOACLIsSupportOnDevice(file.c_str(), status.st_device) > 0 ? 1 : 0;
    }

 private:
    // Rows of one folder mostly stand together.
    void enter(const std::string& shareRoot, const std::string& path) {
        if (shareRoot == shareRoot_ && path == path_) return;
        rights_.reset();
        if (shareRoot != shareRoot_) root_ = Descriptor(open(shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
        folder_ = root_ ? openBeneath(root_, path, LinkPolicy::kNone, O_PATH | O_DIRECTORY) : Descriptor();
        if (folder_) rights_.reset(VEXOACLFolderOpen(folder_.get()));
        shareRoot_ = shareRoot;
        path_ = path;
    }

    std::string shareRoot_, path_;  // of the folder that is open, or could not be opened
    Descriptor root_, folder_;
    std::unique_ptr<VEXOACLFOLDER, Releaser<VEXOACLFolderClose>> rights_;
};

struct Page {
    std::string home;  // real path of the user's own, "" for none
    int additional;
    Listing& listing;
    RowRights rights = {};
    bool failed = false;
};

DIRENTRY_INFO entryOf(const __tag_FI_FILE_INFO_DATA& record, const std::string& home) {
    DIRENTRY_INFO entry;
    entry.name = record.szName;
    entry.realPath = std::string(record.szShareRoot) + "/" + record.szPath;
    const bool own = !home.empty() && entry.realPath.starts_with(home + "/");
    entry.path =
        own ? "/home" + entry.realPath.substr(home.size()) : "/" + std::string(record.szShare) + "/" + record.szPath;
    entry.isDirectory = record.isDir != 0;
    if (!entry.isDirectory) entry.type = record.szExtension;
    entry.size = record.size;
    entry.mode = record.mode;
    entry.uid = record.uid;
    entry.gid = record.gid;
    entry.owner = record.szOwner;
    entry.group = record.szGroup;
    entry.mtime = static_cast<uint32_t>(record.modified);
    entry.ctime = static_cast<uint32_t>(record.changed);
    entry.crtime = static_cast<uint32_t>(record.created);
    entry.atime = static_cast<uint32_t>(record.accessed);
    return entry;
}

BOOL take(__tag_FI_FILE_INFO_DATA* record, void* arg) {
    auto& page = *static_cast<Page*>(arg);
    try {
        DIRENTRY_INFO& entry = page.listing.entries.emplace_back(entryOf(*record, page.home));
        if ((page.additional & ADDITIONAL_PERM) != 0) page.rights.put(*record, entry);
    } catch (const std::exception&) {
        page.failed = true;  // memory is out; nothing may be thrown through the platform
    }
    return page.failed ? 0 : 1;
}

}  // namespace

int readResults(const ListRequest& request, FileSearch::OrvSearchDBTask& results, Listing& listing) {
    const ReturnToFolder back;
    Page page = {homeOf(request.user), request.additional, listing};
    const char* sortBy = request.sortBy.empty() ? "name" : request.sortBy.c_str();
    unsigned long long total = 0;
    const bool read = results.queryResult(request.offset, request.limit, sortBy, &request.ascending, &request.type,
                                          request.pattern.c_str(), take, &page, &total);
    listing.total = total;
    if (!read) return platformCode();
    return page.failed ? ORV_ERR_GENERAL : ORV_ERR_NONE;
}

}  // namespace orvel::cgi
