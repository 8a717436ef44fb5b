// What the calling identity may do with what is opened by one path and spoken of by another.
#ifndef ORVEL_CORE_ACL_PRIVILEGE_H
#define ORVEL_CORE_ACL_PRIVILEGE_H

#include <string>

#include "core/given_folder.h"

namespace orvel {

// As GetACLPrivilege answers for `path`; `text` is what a log line calls it.
[[nodiscard]] unsigned permissionsOf(const char* path, const char* text);

// As CheckDirListPrivilege answers.
[[nodiscard]] bool mayListFolder(const GivenFolder& folder);
// What that does about a folder that fails: logs it and stores its code.
void reportUnlistable(const std::string& text, EntryFailure failure, int error);

}  // namespace orvel

#endif
