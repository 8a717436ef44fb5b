#include "free_names.h"

#include <algorithm>
#include <climits>

namespace orvel::cgi {

std::string markedName(const std::string& name, const std::string& mark, bool isFolder) {
    constexpr size_t kLongestEnding = 32, kLongestMark = 128;
    const size_t dot = name.rfind('.');
    const bool hasEnding = !isFolder && dot != std::string::npos && dot != 0 && name.size() - dot <= kLongestEnding;
    const std::string tail = " (" + mark.substr(0, kLongestMark) + ")" + (hasEnding ? name.substr(dot) : "");
    size_t stem = std::min(hasEnding ? dot : name.size(), NAME_MAX - tail.size());
    while (stem > 0 && stem < name.size() && (static_cast<unsigned char>(name[stem]) & 0xC0) == 0x80) --stem;
    return name.substr(0, stem) + tail;
}

std::string numberedName(const std::string& name, int number, bool isFolder) {
    return markedName(name, std::to_string(number), isFolder);
}

std::string FreeNames::take(const std::string& wanted, bool isFolder) {
    if (taken_.insert(wanted).second) return wanted;
    int& number = numbers_.try_emplace(wanted, 1).first->second;
    std::string name;
    do {
        name = numberedName(wanted, ++number, isFolder);
    } while (!taken_.insert(name).second);
    return name;
}

}  // namespace orvel::cgi
