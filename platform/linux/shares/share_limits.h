// Which options of smb.conf close a share, since they keep somebody or something out there and nobody keeps it out
// here. Pure.
#ifndef VEXO_LINUX_SHARE_LIMITS_H
#define VEXO_LINUX_SHARE_LIMITS_H

#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace vexo {

// A line of the definitions: which of their files, 0 being the main one, and the line's number.
struct Place {
    int file = 0;
    int line = 0;
};

struct LimitValue {
    std::string name;  // of the option, for people
    std::string text;
    Place place;
    bool own = false;  // stated by the section itself
};
// The options of a section that may close it, by limitKey.
using LimitValues = std::map<std::string, LimitValue, std::less<>>;

struct Closing {
    std::string option;
    std::string text;  // the option's value
    std::string why;
    Place place;
};

// What the option `key` (without blanks, in lower case) is kept by among LimitValues: the same for synonyms. "" for an
// option that is known to keep nobody out, whatever its value.
[[nodiscard]] std::string limitKey(std::string_view key);

// What the option is called in smb.conf(5); as it is written for one that is not known.
[[nodiscard]] std::string limitName(const std::string& key, std::string_view written);

// The options that close a section with these values. `global` is what [global] says in the end: some options count
// for all shares, wherever they stand. `ignored` names the options that the administrator wants to be ignored.
[[nodiscard]] std::vector<Closing> closingsOf(const LimitValues& own, const LimitValues& global,
                                              const std::vector<std::string>& ignored);

// The name of the first variable in `text` that is not one of `known` letters and for which Samba would put something;
// nothing when there is none.
[[nodiscard]] std::optional<std::string> unknownVariable(std::string_view text, std::string_view known);

}  // namespace vexo

#endif
