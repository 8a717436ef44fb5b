// The shares of this machine: the definitions read from their files, once a process and again when one of them changed.
#ifndef VEXO_LINUX_SHARE_STORE_H
#define VEXO_LINUX_SHARE_STORE_H

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "shares/share_options.h"

namespace vexo {

class ShareTable {
 public:
    explicit ShareTable(std::vector<ShareDefinition> shares);
    [[nodiscard]] const std::vector<ShareDefinition>& all() const { return shares_; }
    [[nodiscard]] const ShareDefinition* find(std::string_view name) const;  // without case
    // True when `path` is the root of a share for the user of this request.
    [[nodiscard]] bool isRoot(const std::string& path) const;

 private:
    std::vector<ShareDefinition> shares_;  // in the order of the definitions
    std::unordered_map<std::string, size_t> byName_;
    std::unordered_map<std::string, size_t> byRoot_;  // those whose root is the same for every user
    std::vector<size_t> withVariables_;
};

// The definitions as they are now; null with errno when they cannot be read. A table stays as it is while it is held.
[[nodiscard]] std::shared_ptr<const ShareTable> currentShares();

// The root of a share for the user of this request (REMOTE_USER, else the owner of the effective uid); nothing when
// the variables of its path make no root for this user.
[[nodiscard]] std::optional<std::string> rootOf(const ShareDefinition& share);

}  // namespace vexo

#endif
