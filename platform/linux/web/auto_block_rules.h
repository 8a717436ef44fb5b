// When an address is denied. Pure.
#ifndef VEXO_LINUX_AUTO_BLOCK_RULES_H
#define VEXO_LINUX_AUTO_BLOCK_RULES_H

#include <optional>
#include <string>
#include <string_view>

namespace vexo {

struct AutoBlockRules {
    bool enabled = true;
    int attempts = 10;
    long long window = 5LL * 60;          // seconds in which so many failures deny
    long long duration = 24LL * 60 * 60;  // seconds for which they do; 0: for good
};

// The texts of the settings; one that is no number of its kind counts as unset.
AutoBlockRules parseAutoBlockRules(std::string_view enable, std::string_view attempts, std::string_view minutes,
                                   std::string_view expireMinutes);

// The one spelling of an address, IPv4-mapped IPv6 becomes IPv4; empty if not an address.
std::optional<std::string> normaliseAddress(const char* address);

}  // namespace vexo

#endif
