// The shares of this machine: the definitions read from their files, once a process and again when one of them changed.
#ifndef VEXO_LINUX_SHARE_STORE_H
#define VEXO_LINUX_SHARE_STORE_H

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "accounts/account_record.h"
#include "shares/share_options.h"

namespace vexo {

class ShareTable {
 public:
    ShareTable(std::vector<ShareDefinition> shares, std::optional<ShareDefinition> homes);
    [[nodiscard]] const std::vector<ShareDefinition>& all() const { return shares_; }
    [[nodiscard]] const ShareDefinition* find(std::string_view name) const;  // without case
    // What [homes] says, where homes are in no share; null where they are in one, or there are none.
    [[nodiscard]] const ShareDefinition* homes() const { return homes_ ? &*homes_ : nullptr; }
    // True when `path` is the root of a share for the user of this request.
    [[nodiscard]] bool isRoot(const std::string& path) const;
    // The shares, and the homes, that the real path `path` lies in for the user of this request, the innermost first.
    [[nodiscard]] std::vector<const ShareDefinition*> holding(const std::string& path) const;
    // Whether any share keeps names out.
    [[nodiscard]] bool vetoes() const { return vetoes_; }
    // The path of the recycle bin in the share of this root, for the user of this request.
    [[nodiscard]] std::string recycleIn(const std::string& root) const;
    // Whether `path` is the recycle bin of a share, or the folder of the share that holds it.
    [[nodiscard]] bool isRecycle(const std::string& path) const;

 private:
    std::vector<ShareDefinition> shares_;  // in the order of the definitions
    std::optional<ShareDefinition> homes_;
    std::unordered_map<std::string, size_t> byName_;
    std::unordered_multimap<std::string, size_t> byRoot_;  // those whose root is the same for every user
    std::vector<size_t> withVariables_;
    bool vetoes_ = false;
    bool recycles_ = false;  // any share has a bin of its own name
};

// The definitions as they are now; null with errno when they, or the settings that say where they are, cannot be read.
// A table stays as it is while it is held.
[[nodiscard]] std::shared_ptr<const ShareTable> currentShares();

// The root of a share for the user of this request (REMOTE_USER, else the owner of the effective uid); nothing when
// the variables of its path make no root for this user.
[[nodiscard]] std::optional<std::string> rootOf(const ShareDefinition& share);

// The root of a share for one account.
[[nodiscard]] std::optional<std::string> rootFor(const ShareDefinition& share, const Account& account);

// The account of the user of this request.
[[nodiscard]] Lookup requestAccount(Account& account);

// The home of `account` where homes are in no share; nothing when there is none for this account.
[[nodiscard]] std::optional<std::string> homeIn(const ShareDefinition& homes, const Account& account);

// What was read, and why a section is no share.
struct DefinitionsReport {
    std::vector<std::string> paths;  // of the files, the main one first
    int error = 0;                   // errno where that, or the settings that name it (in its place), cannot be read
    Definitions definitions;
    std::vector<ShareReading> readings;  // of the sections, in their order
};
// Reads the definitions anew.
[[nodiscard]] DefinitionsReport reportDefinitions();

}  // namespace vexo

#endif
