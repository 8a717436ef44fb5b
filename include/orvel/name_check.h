// Checks of names and real paths before something is created, and the temporary folders of a volume.
//
// Strings are bytes unless said otherwise; paths longer than 4,095 bytes are judged by their first 4,095.
#ifndef ORVEL_NAME_CHECK_H
#define ORVEL_NAME_CHECK_H

#include <string>

#include "orvel/export.h"

// The value of `aclBits` that asks for no test of permissions.
inline constexpr int ORV_NO_ACL_TEST = 32;

// True when `name` (one component) may be used. False with 400 for null or empty, 418 for ".", "..", a name with ":" or
// "/", one that begins with "._", and the platform's hidden folders.
ORVEL_API bool OrvCheckReservedName(const char* name);

// May `name` be created inside the real directory `dirRealPath`? 0; -1 with 400 (null or empty), 418 (reserved), 419 (a
// character that the FAT file system there cannot store), or the code of errno when the type of the file system cannot
// be determined (logged). The directory itself need not exist.
ORVEL_API int OrvCheckFileName(const char* dirRealPath, const char* name);

// Validates a real target path: its existing part must be a file or a folder that the caller may use, what lies beyond
// it must suit the file system. With `walkUp` the existing part is the longest existing prefix, else the whole path.
// `aclBits` are the request bits of ACLAccess, or ORV_NO_ACL_TEST; 0 always fails, with the code that was there before.
// `existingPart` (may be null) receives the existing part once it is known to be usable; it is left alone before that.
// Returns 0; -1 with 400 (null, empty, not absolute, or beginning with "//"), 401, 407, 408 (missing, or only "/"), 410
// (a network mount that does not answer), 411, 419, the code of errno when the type of the file system cannot be
// determined, or the code that was there before when the permissions cannot be read (see ACLAccess). The platform error
// is set as well: 0x0D00 for a relative path, 0x0300 with 407, 0x0600 with 408, 0x1100 with 410, 0x8100 with 401.
// Logged: what is no file or folder, refused permissions, and failures of unknown cause. Names are not tested for being
// reserved: that is OrvCheckFileName's.
ORVEL_API int OrvCheckPath(const char* realPath, bool walkUp, int aclBits, std::string* existingPart);

// May the file manager work on the volume of this path? Only external volumes can be refused: those whose file system
// is not one of the types 0 to 6, or unknown. A path without a volume is not refused (logged). Sets no code.
ORVEL_API bool OrvLibFileSystemSupported(const char* realPath);

// Is the text well-formed UTF-8 as a pattern of lead and continuation bytes, sequences of up to six bytes included?
// Null and empty text is. Overlong forms, surrogates and values above U+10FFFF are not refused.
ORVEL_API bool IsUnicodeString(const char* text);

// Makes sure that "@tmp" and "@tmp/orvel" exist below a volume, mode 0777. What exists already is left alone, whatever
// its type. Returns 0; -1 (logged) for null or empty, or when a folder cannot be made. Sets no code. Side effect: when
// it makes a folder the process's umask becomes 0 and stays so, for later files of those folders.
ORVEL_API int OrvCreateTmpDir(char* volumePath);

#endif
