#include "public_link.h"

#include <crypt.h>

#include <cstring>
#include <memory>

#include "base/owner.h"
#include "orvel/external_host.h"
#include "vexo/error.h"
#include "vexo/user.h"

namespace orvel::cgi {
namespace {

constexpr const char* kProgram = "/cgi-bin/share?FOLDER_SHARING=";
constexpr const char* kApplication = "VEXO.QDS.App.Quorvane3.Instance";

// Visitors act with the file manager's privilege of the owner: without it their log-in would be refused.
Owner mayUseFileManager(const std::string& user) {
    VLIBCErrSetEx(0, __FILE__, __LINE__);
    if (VLIBUserPrivilegeHas(user.c_str(), kApplication) == 1) return Owner::kThere;
    return VLIBCErrGet() == 0 ? Owner::kGone : Owner::kUnknown;
}

}  // namespace

std::string hashPassword(const std::string& password) {
    const char* setting = crypt_gensalt("$y$", 0, nullptr, 0);
    crypt_data work = {};
    const char* hash = setting == nullptr ? nullptr : crypt_rn(password.c_str(), setting, &work, sizeof work);
    return hash == nullptr || hash[0] == '*' ? "" : hash;
}

bool passwordMatches(const std::string& password, const std::string& hash) {
    crypt_data work = {};
    const char* made = crypt_rn(password.c_str(), hash.c_str(), &work, sizeof work);
    if (made == nullptr || made[0] == '*' || std::strlen(made) != hash.size()) return false;
    unsigned char difference = 0;
    for (size_t i = 0; i < hash.size(); ++i) difference |= static_cast<unsigned char>(made[i] ^ hash[i]);
    return difference == 0;
}

Owner ownerOf(const Link& link) {
    std::unique_ptr<VEXOUSER, Releaser<VEXOUserFree>> found;
    if (VEXOUserGet(link.owner.c_str(), acquire(found)) < 0) {
        return VLIBCErrGet() == VEXO_ERR_USER_MISSING ? Owner::kGone : Owner::kUnknown;
    }
    if (found->uid != link.uid || VEXOUserIsExpired(found->expiry) == 1) return Owner::kGone;
    return mayUseFileManager(link.owner);
}

std::string linkAddress(const std::string& id) {
    std::string base;
    const bool known = !GetRemoteAddr(base).ends_with("//");
    return (known ? base : "") + kProgram + id;
}

}  // namespace orvel::cgi
