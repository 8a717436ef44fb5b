// Who may log in. Pure.
#ifndef VEXO_LINUX_LOGIN_RULES_H
#define VEXO_LINUX_LOGIN_RULES_H

#include <sys/types.h>

#include <string>
#include <string_view>
#include <vector>

namespace vexo {

// UID_MIN of login.defs; 1000 where it says nothing, or nothing that is a number.
uid_t parseUidMin(std::string_view text);

// True for the uid of a person: nobody's own, and those below `least`, are not.
bool isPersonsUid(uid_t uid, uid_t least);

// The groups of the setting "log_in_groups", separated by commas, as entries of a list ("@name"). Empty: everybody.
std::vector<std::string> parseLogInGroups(std::string_view text);

// False for what is handed to no service as a name: it could be none, and might be taken for more than one line or for
// a path.
bool isLogInName(std::string_view name);

}  // namespace vexo

#endif
