// Home folders: below the root of the share "homes".
#ifndef VEXO_LINUX_USER_HOME_H
#define VEXO_LINUX_USER_HOME_H

#include <string>

namespace vexo {

// The home of `user`, made or not; "" when there is no share "homes".
[[nodiscard]] std::string homeOf(const std::string& user);

}  // namespace vexo

#endif
