#include "web/login_rules.h"

#include <algorithm>
#include <charconv>

#include "web/cgi_text.h"

namespace vexo {
namespace {

constexpr uid_t kUidMin = 1000;
constexpr uid_t kNobody = 65534;
constexpr size_t kLongestName = 255;

}  // namespace

uid_t parseUidMin(std::string_view text) {
    constexpr std::string_view kKey = "UID_MIN";
    uid_t least = kUidMin;
    while (!text.empty()) {
        std::string_view line = trimBlanks(takePiece(text, '\n'));
        if (!line.starts_with(kKey)) continue;
        line.remove_prefix(kKey.size());
        if (!line.starts_with(' ') && !line.starts_with('\t')) continue;
        line = trimBlanks(line);
        uid_t value = 0;
        const auto [end, error] = std::from_chars(line.data(), line.data() + line.size(), value);
        if (error == std::errc() && end == line.data() + line.size()) least = value;
    }
    return least;
}

bool isPersonsUid(uid_t uid, uid_t least) {
    return uid != 0 && uid >= least && uid != kNobody && uid != static_cast<uid_t>(-1);
}

std::vector<std::string> parseLogInGroups(std::string_view text) {
    std::vector<std::string> groups;
    while (!text.empty()) {
        const std::string_view group = trimBlanks(takePiece(text, ','));
        if (!group.empty()) groups.push_back("@" + std::string(group));
    }
    return groups;
}

bool isLogInName(std::string_view name) {
    const auto fits = [](unsigned char byte) { return byte >= 0x20 && byte != 0x7F && byte != '/' && byte != ':'; };
    return !name.empty() && name.size() <= kLongestName && name != "." && name != ".." && name.front() != '-' &&
           std::all_of(name.begin(), name.end(), fits);
}

}  // namespace vexo
