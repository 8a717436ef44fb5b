// A setting that another value must not stand in for.
#ifndef VEXO_LINUX_APPLIANCE_SETTING_H
#define VEXO_LINUX_APPLIANCE_SETTING_H

#include <optional>
#include <string>
#include <string_view>

namespace vexo {

// The value of `key` in /etc/vexoinfo.conf, `otherwise` where there is no such file or no such key. Nothing, with
// errno, when that cannot be determined.
[[nodiscard]] std::optional<std::string> readSetting(std::string_view key, std::string_view otherwise);

// The group whose members act as root; "" for none. Nothing, with errno, when that cannot be determined.
[[nodiscard]] std::optional<std::string> administratorsGroup();

}  // namespace vexo

#endif
