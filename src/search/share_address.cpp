#include "search/share_address.h"

#include <cstdlib>

#include "core/owned.h"
#include "vexo/error.h"
#include "vexo/share.h"
#include "vexo/user.h"

namespace orvel {
namespace {

std::string definedRoot(const std::string& share, const std::string& user) {
    ShareRecord record;
    if (VEXOShareGet(share.c_str(), acquire(record)) == 0) return record->szPath;
    UserRecord owner;
    const bool home = share == kHomesShare && VLIBCErrGet() == VEXO_ERR_SHARE_MISSING;
    return home && VEXOUserGet(user.c_str(), acquire(owner)) >= 0 ? owner->szHome : "";
}

}  // namespace

std::string rootAbove(const std::string& share, const std::string& user, const std::string& realPath) {
    const auto holds = [&](const std::string& root) { return realPath == root || liesBelow(realPath, root); };
    std::string root = definedRoot(share, user);
    if (root.empty() || holds(root)) return root;
    const CString resolved(realpath(root.c_str(), nullptr));  // the path of a home has no links in it
    return resolved != nullptr && holds(resolved.get()) ? resolved.get() : "";
}

}  // namespace orvel
