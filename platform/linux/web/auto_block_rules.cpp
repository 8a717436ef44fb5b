#include "web/auto_block_rules.h"

#include <arpa/inet.h>
#include <netinet/in.h>

#include <charconv>
#include <cstring>

namespace vexo {
namespace {

constexpr int kMaxNumber = 1000000;

int parseNumber(std::string_view text, int least, int otherwise) {
    int value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    const bool whole = error == std::errc() && end == text.data() + text.size();
    return whole && value >= least && value <= kMaxNumber ? value : otherwise;
}

}  // namespace

AutoBlockRules parseAutoBlockRules(std::string_view enable, std::string_view attempts, std::string_view minutes,
                                   std::string_view expireMinutes) {
    AutoBlockRules rules;
    rules.enabled = enable != "no";
    rules.attempts = parseNumber(attempts, 1, rules.attempts);
    rules.window = 60LL * parseNumber(minutes, 1, static_cast<int>(rules.window / 60));
    rules.duration = 60LL * parseNumber(expireMinutes, 0, static_cast<int>(rules.duration / 60));
    return rules;
}

std::optional<std::string> normaliseAddress(const char* address) {
    char text[INET6_ADDRSTRLEN];
    in_addr four{};
    in6_addr six{};
    if (inet_pton(AF_INET6, address, &six) == 1) {
        if (!IN6_IS_ADDR_V4MAPPED(&six)) return inet_ntop(AF_INET6, &six, text, sizeof text);
        std::memcpy(&four, six.s6_addr + 12, sizeof four);
    } else if (inet_pton(AF_INET, address, &four) != 1) {
        return {};
    }
    return inet_ntop(AF_INET, &four, text, sizeof text);
}

}  // namespace vexo
