// Home folders: below the root of the share "homes", or where [homes] without such a share says that they are.
#ifndef VEXO_LINUX_USER_HOME_H
#define VEXO_LINUX_USER_HOME_H

#include <sys/types.h>

#include <string>
#include <string_view>

namespace vexo {

// The home of `user`, made or not; "" when this user has none.
[[nodiscard]] std::string homeOf(const std::string& user);

// Whether homes lie below this folder: the root of the share "homes", what is above it, and "@DOMAIN" in it. Without
// such a share, whether that of `user` does.
[[nodiscard]] bool isAboveHomes(std::string_view folder, uid_t user);

}  // namespace vexo

#endif
