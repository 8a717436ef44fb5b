#include "search/indexed_folder.h"

#include <cstdlib>
#include <string>
#include <string_view>

#include "core/owned.h"
#include "search/share_address.h"
#include "vexo/filesystem.h"
#include "vexo/share.h"

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

bool isLeftOut(const std::string& shareRoot, std::string_view within) {
    const std::string top = below(shareRoot, within.substr(0, within.find('/')));
    if (VEXOShareIsShareRecycle(top.c_str()) == 1) return true;
    while (!within.empty()) {
        const std::size_t end = std::min(within.find('/'), within.size());
        if (VEXOEAIsHiddenFile(std::string(within.substr(0, end)).c_str()) == 1) return true;
        within.remove_prefix(std::min(end + 1, within.size()));
    }
    return false;
}

}  // namespace

bool indexHolds(const PathInfo& folder) {
    const std::string_view within = pathWithinShare(folder.path);
    return folder.realPath == below(folder.shareRoot, within) && !isLeftOut(folder.shareRoot, within) &&
           !leadsThroughLinks(folder, within);
}

}  // namespace orvel
