// The properties of one listed entry. FillFileInfo, by path, and the listing of a folder, by descriptor and name, are
// both made of these steps.
#ifndef ORVEL_ENUM_ENTRY_FILL_H
#define ORVEL_ENUM_ENTRY_FILL_H

#include <sys/types.h>

#include <string>

#include "orvel/dir_entry.h"
#include "orvel/mount_status.h"
#include "orvel/user_directory.h"
#include "vexo/stat.h"

namespace orvel {

inline constexpr const char* kUnreachable = "remotefail";  // mountPointType of a mount whose server does not answer

enum class TypeVerdict { Keep, Skip, AskStatus };

// What the d_type of an entry decides before its status is read.
TypeVerdict judgeType(unsigned char dType, _tag_dir_entry_type_ filter, int additional);
// Whether an entry of this mode is listed.
bool passes(mode_t mode, _tag_dir_entry_type_ filter);
// The flags with which the status of an entry is read.
unsigned statusFlags(int additional);

enum class StatusFailure { Unreachable, Vanished, Fatal };

// What a failed status read (errno `systemCode`) means. A fatal one is logged and sets its library code.
StatusFailure judgeStatusFailure(int systemCode, const char* realPath, OrvelMountStatus& mounts);

// The extension in upper case, "" when there is none.
std::string typeOf(const char* name);

// Fills what `additional` asks for, except the permissions.
void fillProperties(const char* realPath, const _tag_VEXOSTAT_& status, int additional, OrvelMountStatus& mounts,
                    OrvelUserEnum& names, DIRENTRY_INFO& info);

}  // namespace orvel

#endif
