// A share that a user defines for himself (`net usershare`): a small file of its own. Pure.
#ifndef VEXO_LINUX_USER_SHARE_H
#define VEXO_LINUX_USER_SHARE_H

#include <string>
#include <string_view>
#include <vector>

#include "shares/share_definitions.h"

namespace vexo {

constexpr size_t kMaxUserShareFile = size_t{10} << 10;

// What [global] says about user shares in the end.
struct UserShareRules {
    std::string folder;  // of the files; "" where user shares are off
    unsigned most = 100;
    bool ownerOnly = true;
    std::vector<std::string> allowed, denied;  // beginnings of paths
    std::string likeShare;                     // the section that they are made after; "" for none
    Place place;                               // where the folder is stated
    std::string fault;                         // why there are no user shares; "" for no reason
};
// `byDefault`: the folder where none is stated.
[[nodiscard]] UserShareRules userShareRules(const OptionValues& global, std::string_view byDefault);

struct UserShare {
    std::string name;
    std::string path;
    std::vector<UserShareEntry> entries;
    std::string fault;  // why it is no share; "" for no reason
};
// `file`: its name, which is the share's.
[[nodiscard]] UserShare readUserShare(std::string_view file, std::string_view text, const UserShareRules& rules);

}  // namespace vexo

#endif
