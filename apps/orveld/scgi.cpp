#include "scgi.h"

#include <algorithm>
#include <charconv>

namespace orvel::orveld {
namespace {

constexpr size_t kMostDigits = 5;
constexpr std::string_view kLength = "CONTENT_LENGTH";
constexpr std::string_view kTrueLength = "BODY_LENGTH";

constexpr std::string_view kNames[] = {
    "AUTH_TYPE",      "CONTENT_LENGTH",  "CONTENT_TYPE",   "DOCUMENT_ROOT", "DOCUMENT_URI", "GATEWAY_INTERFACE",
    "HTTPS",          "PATH_INFO",       "QUERY_STRING",   "REMOTE_ADDR",   "REMOTE_PORT",  "REMOTE_USER",
    "REQUEST_METHOD", "REQUEST_SCHEME",  "REQUEST_URI",    "SCRIPT_NAME",   "SERVER_ADDR",  "SERVER_NAME",
    "SERVER_PORT",    "SERVER_PROTOCOL", "SERVER_SOFTWARE"};

bool isTaken(std::string_view name) {
    return name.starts_with("HTTP_") || std::find(std::begin(kNames), std::end(kNames), name) != std::end(kNames);
}

bool isNumber(std::string_view text) {
    return text.find_first_not_of("0123456789") == std::string_view::npos;
}

// Cuts off what ends at the next NUL byte; nothing when none is left.
std::optional<std::string_view> takeText(std::string_view& rest) {
    const size_t end = rest.find('\0');
    if (end == std::string_view::npos) return std::nullopt;
    const std::string_view text = rest.substr(0, end);
    rest.remove_prefix(end + 1);
    return text;
}

bool hasDoubled(std::vector<std::string_view> names) {
    std::sort(names.begin(), names.end());
    return std::adjacent_find(names.begin(), names.end()) != names.end();
}

}  // namespace

BlockState blockLength(std::string_view text, size_t& length) {
    const size_t colon = std::min(text.find(':'), text.size());
    const std::string_view digits = text.substr(0, colon);
    if (digits.size() > kMostDigits || !isNumber(digits)) return BlockState::kBad;
    if (colon == text.size()) return BlockState::kMore;
    size_t number = 0;
    std::from_chars(digits.data(), digits.data() + digits.size(), number);
    length = digits.size() + 1 + number + 1;
    const bool fits = !digits.empty() && digits.front() != '0' && length >= kShortestBlock && length <= kLongestBlock;
    return fits ? BlockState::kKnown : BlockState::kBad;
}

std::optional<std::vector<std::string>> parseBlock(std::string_view block) {
    size_t length = 0;
    if (blockLength(block, length) != BlockState::kKnown || length != block.size() || !block.ends_with(',')) {
        return std::nullopt;
    }
    std::string_view rest = block.substr(block.find(':') + 1);
    rest.remove_suffix(1);
    std::vector<std::string> variables;
    std::vector<std::string_view> names;
    while (!rest.empty()) {
        const auto name = takeText(rest);
        const auto value = takeText(rest);
        if (!name || !value || name->empty() || name->find('=') != std::string_view::npos) return std::nullopt;
        if ((*name == kLength) != names.empty()) return std::nullopt;
        names.push_back(*name);
        if (isTaken(*name)) variables.emplace_back(*name).append("=").append(*value);
        if (*name == kTrueLength) variables.front().assign(kLength).append("=").append(*value);
    }
    if (std::find(names.begin(), names.end(), "SCGI") == names.end() || hasDoubled(names)) return std::nullopt;
    return variables;
}

std::string buildBlock(const std::vector<std::string>& variables) {
    std::string body;
    for (const std::string& variable : variables) {
        const size_t end = std::min(variable.find('='), variable.size());
        body.append(variable, 0, end).append(1, '\0');
        body.append(variable, std::min(end + 1, variable.size())).append(1, '\0');
    }
    return std::to_string(body.size()) + ":" + body + ",";
}

}  // namespace orvel::orveld
