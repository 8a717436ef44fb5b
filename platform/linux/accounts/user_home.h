// Home folders: below the root of the share "homes".
#ifndef VEXO_LINUX_USER_HOME_H
#define VEXO_LINUX_USER_HOME_H

#include <string>
#include <string_view>

namespace vexo {

// The home of `user`, made or not; "" when there is no share "homes".
[[nodiscard]] std::string homeOf(const std::string& user);

// Whether homes lie below this folder: the root of the share "homes", what is above it, and "@DOMAIN" in it.
[[nodiscard]] bool isAboveHomes(std::string_view folder);

}  // namespace vexo

#endif
