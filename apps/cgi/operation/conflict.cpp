#include "operation/conflict.h"

#include <algorithm>
#include <climits>

namespace orvel::cgi {

std::optional<Conflict> conflictOf(std::string_view word) {
    if (word == "error") return Conflict::kError;
    if (word == "skip") return Conflict::kSkip;
    if (word == "overwrite") return Conflict::kOverwrite;
    if (word == "keep_both") return Conflict::kKeepBoth;
    return std::nullopt;
}

std::string numberedName(const std::string& name, int number, bool isFolder) {
    constexpr size_t kLongestEnding = 32;
    const size_t dot = name.rfind('.');
    const bool hasEnding = !isFolder && dot != std::string::npos && dot != 0 && name.size() - dot <= kLongestEnding;
    const std::string tail = " (" + std::to_string(number) + ")" + (hasEnding ? name.substr(dot) : "");
    size_t stem = std::min(hasEnding ? dot : name.size(), NAME_MAX - tail.size());
    while (stem > 0 && stem < name.size() && (static_cast<unsigned char>(name[stem]) & 0xC0) == 0x80) --stem;
    return name.substr(0, stem) + tail;
}

}  // namespace orvel::cgi
