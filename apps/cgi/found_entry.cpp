#include "found_entry.h"

#include <climits>
#include <cstdlib>
#include <exception>
#include <string>

#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "reply.h"
#include "vexo/acl.h"
#include "vexo/share.h"

namespace orvel::cgi {
namespace {

std::string homeOf(const std::string& user) {
    char path[PATH_MAX], canonical[PATH_MAX];
    if (VEXOServiceHomePathGet(user.c_str(), path, sizeof path) != 0) return "";
    return realpath(path, canonical) != nullptr ? canonical : "";
}

struct Page {
    std::string home;  // real path of the user's own, "" for none
    int additional;
    Listing& listing;
    bool failed = false;
};

DIRENTRY_INFO entryOf(const __tag_FI_FILE_INFO_DATA& record, const std::string& home, int additional) {
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
    if ((additional & ADDITIONAL_PERM) != 0) {
        entry.aclPrivilege = GetACLPrivilege(entry.realPath.c_str());
        entry.isAclMode = VEXOACLIsSupport(entry.realPath.c_str(), -1, 2) > 0 ? 1 : 0;
    }
    return entry;
}

BOOL take(__tag_FI_FILE_INFO_DATA* record, void* arg) {
    auto& page = *static_cast<Page*>(arg);
    try {
        page.listing.entries.push_back(entryOf(*record, page.home, page.additional));
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
