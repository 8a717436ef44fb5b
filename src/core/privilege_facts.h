// What is asked of the platform before a share privilege can be decided.
#ifndef ORVEL_CORE_PRIVILEGE_FACTS_H
#define ORVEL_CORE_PRIVILEGE_FACTS_H

#include <optional>
#include <string>

#include "core/privilege_decision.h"
#include "vexo/share.h"

namespace orvel {

// Membership is a search in groups, so a decision asks no further than it must; an explanation asks everything.
enum class AskLists { kUntilDecided, kAll };
[[nodiscard]] ListMembership listsOf(const char* user, const VEXOSHARE& share, AskLists extent);

// Whether `user` (null is legal) is an administrator. False with 401, logged, when that cannot be determined.
[[nodiscard]] bool askAdministrator(const char* user, bool& administrator);

struct ShareFacts {
    std::string shareName;
    std::string shareRoot;
    unsigned mask = 0;
    ListMembership lists;              // not asked when a service answered
    std::optional<int> serviceAnswer;  // of a domain or directory user's privilege service
};

// Asks about the share of `path`; neither `path` nor `user` is null. False with 401 (no component), 408 (share), 402 or
// 406 (service).
[[nodiscard]] bool askShare(const char* path, const char* user, const char* sid, AskLists extent, ShareFacts& facts);

struct ShareVerdict {
    PrivilegeRule rule;
    int privilege;
};
[[nodiscard]] ShareVerdict judgeShare(const ShareFacts& facts);

}  // namespace orvel

#endif
