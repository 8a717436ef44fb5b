// Which source an account comes from, recognised by the spelling of its name.
#ifndef ORVEL_CORE_USER_KIND_H
#define ORVEL_CORE_USER_KIND_H

#include <string_view>

namespace orvel {

enum class UserKind { kLocal = 1, kDomain = 2, kDirectory = 8 };

inline UserKind userKindOf(std::string_view user) {
    if (user.find('\\') != std::string_view::npos) return UserKind::kDomain;
    if (user.find('@') != std::string_view::npos) return UserKind::kDirectory;
    return UserKind::kLocal;
}

}  // namespace orvel

#endif
