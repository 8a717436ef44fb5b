// Membership in lists of users and groups.
#ifndef VEXO_LINUX_USER_LIST_H
#define VEXO_LINUX_USER_LIST_H

#include <sys/types.h>

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "vexo/list.h"
#include "vexo/share.h"

namespace vexo {

// Asks lists for one user. The user's groups are looked up at the first group in a list, and once.
class ListedUser {
 public:
    explicit ListedUser(std::string name) : name_(std::move(name)) {}

    [[nodiscard]] bool isIn(PVLIBCSZLIST list);
    // `entry`: a name, a group or "*", or conditions as the lists of shares have them.
    [[nodiscard]] bool matches(std::string_view entry);
    // The right that the lists of a share give: no access beats read-write beats read-only.
    [[nodiscard]] int rightOn(const VEXOSHARE& share);
    // True once a lookup failed otherwise than by "not found": the answers given are then not to be relied on. errno
    // and the slot say why.
    [[nodiscard]] bool failed() const { return failed_; }

 private:
    [[nodiscard]] bool holds(std::string_view entry);
    [[nodiscard]] bool hasId(std::string_view text);
    [[nodiscard]] bool isInGroup(const std::string& group);
    [[nodiscard]] const std::vector<gid_t>& groups();

    std::string name_;
    std::optional<std::vector<gid_t>> groups_;
    bool failed_ = false;
};

}  // namespace vexo

#endif
