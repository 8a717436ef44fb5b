#include "listing.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "confined.h"
#include "criteria.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/listing.h"
#include "orvel/privilege.h"
#include "reply.h"

namespace orvel::cgi {
namespace {

struct AdditionalWord {
    std::string_view word;
    int bit;
};

constexpr AdditionalWord kWords[] = {{"real_path", ADDITIONAL_REAL_PATH},
                                     {"size", ADDITIONAL_SIZE},
                                     {"owner", ADDITIONAL_OWNER},
                                     {"time", ADDITIONAL_TIME},
                                     {"perm", ADDITIONAL_PERM},
                                     {"type", ADDITIONAL_TYPE},
                                     {"mount_point_type", ADDITIONAL_MOUNT_POINT_TYPE},
                                     {"volume_status", ADDITIONAL_VOLUME_STATUS},
                                     {"sync_share", ADDITIONAL_SYNC_SHARE},
                                     {"icon", kAdditionalIcon}};

int bitOf(std::string_view word) {
    for (const AdditionalWord& known : kWords) {
        if (known.word == word) return known.bit;
    }
    return 0;
}

const char* sidOf(const ListRequest& request) {
    return request.sid.empty() ? nullptr : request.sid.c_str();
}

// The library calls entries by where the open folder lies, the program by the share's root, to which links may lead.
void putRealPaths(Listing& listing, const std::string& realPath) {
    for (DIRENTRY_INFO& entry : listing.entries) {
        if (!entry.realPath.empty()) entry.realPath = realPath + "/" + entry.name;
    }
}

}  // namespace

int additionalBits(std::string_view words) {
    int bits = 0;
    while (!words.empty()) {
        const size_t end = std::min(words.find(','), words.size());
        bits |= bitOf(words.substr(0, end));
        words.remove_prefix(std::min(end + 1, words.size()));
    }
    return bits;
}

ReturnToFolder::ReturnToFolder() : start_(open(".", O_PATH | O_DIRECTORY | O_CLOEXEC)) {}

ReturnToFolder::~ReturnToFolder() {
    [[maybe_unused]] const int ignored = start_ ? fchdir(start_.get()) : 0;
}

int openFolderToList(const ListRequest& request, PathInfo& info, Descriptor& folder, std::string& realPath) {
    // The top level is the share listing's; the answer is that of the folder listing, which resolution would pre-empt.
    if (request.path == "/") return ORV_ERR_DENIED;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(request.user.c_str(), request.path, info)) return lastCode();
    OrvLibSetErr(ORV_ERR_NONE);
    // A refusal sets no code, a look-up that failed does.
    if (!CheckShareListPrivilege(request.user.c_str(), sidOf(request), info.path.c_str()))
        return lastCode(ORV_ERR_DENIED);
    return confinedFolder(info, linkPolicyOf(info.shareName), folder, realPath);
}

int listFolder(const ListRequest& request, Listing& listing) {
    PathInfo info;
    Descriptor folder;
    std::string realPath;
    const int refusal = openFolderToList(request, info, folder, realPath);
    return refusal != ORV_ERR_NONE ? refusal : listOpened(request, folder, info.path, realPath, listing);
}

int listOpened(const ListRequest& request, const Descriptor& folder, const std::string& path,
               const std::string& realPath, Listing& listing) {
    const ReturnToFolder back;
    struct stat status {};
    if (fstat(folder.get(), &status) != 0) return refusalCode(errno, realPath);
    if (!S_ISDIR(status.st_mode)) return ORV_ERR_MISSING;
    Criteria criteria;
    if (!request.pattern.empty()) {
        const int code = criteria.addNames(request.pattern);
        if (code != ORV_ERR_NONE) return code;
    }
    OrvEnum enumeration;
    const bool withIcon = (request.additional & kAdditionalIcon) != 0;  // that of a folder is found by its real path
    const int additional = (request.additional & ~kAdditionalIcon) | (withIcon ? ADDITIONAL_REAL_PATH : 0);
    const bool listed = enumeration.OrvLibDirEntryListEnum(
        path.c_str(), folder.path().c_str(), request.sortBy.empty() ? "name" : request.sortBy.c_str(), additional,
        request.offset, request.limit, request.ascending, request.type, criteria.list(), listing.entries,
        &listing.total);
    if (!listed) return lastCode();
    putRealPaths(listing, realPath);
    return ORV_ERR_NONE;
}

int listShares(const ListRequest& request, Listing& listing) {
    OrvLibSetErr(ORV_ERR_NONE);
    OrvEnum enumeration;
    const bool listed = enumeration.OrvLibShareEntryListEnum(
        request.user.c_str(), sidOf(request), false, request.sortBy.empty() ? nullptr : request.sortBy.c_str(),
        request.additional & ~kAdditionalIcon, request.offset, request.limit, request.ascending, listing.entries,
        &listing.total);
    return listed ? ORV_ERR_NONE : lastCode();
}

void writeListing(const ListRequest& request, const Listing& listing,
                  void (*append)(const DIRENTRY_INFO&, int, std::string&), Output& out) {
    out.text() += '{';
    writePage(request, listing, append, out);
    out.text() += '}';
}

void writePage(const ListRequest& request, const Listing& listing,
               void (*append)(const DIRENTRY_INFO&, int, std::string&), Output& out) {
    out.text() +=
        "\"total\":" + std::to_string(listing.total) + ",\"offset\":" + std::to_string(request.offset) + ",\"items\":[";
    bool first = true;
    for (const DIRENTRY_INFO& entry : listing.entries) {
        if (!first) out.text() += ',';
        first = false;
        append(entry, request.additional, out.text());
        out.spill();
    }
    out.text() += ']';
}

}  // namespace orvel::cgi
