#include "search/indexed_folder.h"

#include <cstdlib>
#include <string>
#include <string_view>

#include "core/owned.h"
#include "search/share_address.h"
#include "vexo/filesystem.h"
#include "vexo/index.h"
#include "vexo/share.h"
#include "vexo/share_files.h"

namespace orvel {
namespace {

std::string below(const std::string& folder, std::string_view path) {
    return path.empty() ? folder : folder + "/" + std::string(path);
}

// A path that cannot be resolved counts as one without links: the search meets the reason itself.
bool leadsThroughLinks(const PathInfo& folder, std::string_view within) {
    const CString root(realpath(folder.shareRoot.c_str(), nullptr));
    const CString resolved(realpath(folder.realPath.c_str(), nullptr));
    return root != nullptr && resolved != nullptr && below(root.get(), within) != resolved.get();
}

// An indexer does not enter these; the mount table knows without asking the server.
bool isNetworkMount(const std::string& realPath) {
    return VEXOFSIsInMountTable(realPath.c_str()) >= 0 && VEXOFSIsRemoteFS() == 1;
}

bool isLeftOut(const std::string& shareRoot, std::string_view within) {
    const std::string top = below(shareRoot, within.substr(0, within.find('/')));
    if (VEXOShareIsShareRecycle(top.c_str()) == 1) return true;
    std::string at = shareRoot;
    VEXOShareNamesAt(shareRoot.c_str());
    while (!within.empty()) {
        const std::size_t end = std::min(within.find('/'), within.size());
        const std::string name(within.substr(0, end));
        at += '/' + name;
        if (VEXOEAIsHiddenFile(name.c_str()) == 1 || isNetworkMount(at)) return true;
        within.remove_prefix(std::min(end + 1, within.size()));
    }
    return false;
}

}  // namespace

bool indexHolds(const PathInfo& folder) {
    if (folder.path.size() >= sizeof __tag_FI_SQL_COND::szValue) return false;  // a condition would cut it
    const std::string_view within = pathWithinShare(folder.path);
    return folder.realPath == below(folder.shareRoot, within) && !isLeftOut(folder.shareRoot, within) &&
           !leadsThroughLinks(folder, within);
}

}  // namespace orvel
