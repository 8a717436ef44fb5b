// Share-relative paths ("/photo/2012/a.jpg") and the real paths they stand for.
//
// A share-relative path is UTF-8 text that begins with "/"; its first component names a share, or, when it is "home",
// the logged-in user's own home folder. The rest is appended to the share's root as it stands: repeated slashes, "."
// and ".." pass through, so a program confines the result to the share root before it opens it for a user. Failures are
// logged at LOG_ERR where a function does not say otherwise.
#ifndef ORVEL_SHARE_PATH_H
#define ORVEL_SHARE_PATH_H

#include <string>

#include "orvel/export.h"

// The first component of `path` when `first` is nonzero, else the last one. Empty components do not count; only the
// first 4,094 bytes take part. `path` is read only. The result comes from malloc, the caller frees it; null when `path`
// is null, holds no "/" or nothing else, or memory is out. Sets no library code.
ORVEL_API char* OrvLibGetTokOfPath(char* path, int first);

// Resolves `path` for `userName`. Returns 1 with all four outputs filled: `realPath`, `shareName` (the first
// component), `volumePath` (`shareRoot` up to its second "/") and `shareRoot` (for "home" the canonical home folder,
// which is created on first use). Returns 0 with 400 for a null or empty argument, 401 when there is no first component
// or the share cannot be read, 408 when there is no such share, or the code of OrvUserHomeFullPathGet. Outputs filled
// before a failure keep their new values. Not logged: 400.
ORVEL_API int OrvFullPathGet(const char* path, std::string& realPath, std::string& shareName, std::string& volumePath,
                             std::string& shareRoot, const std::string& userName);

// Puts the canonical path of the user's home folder into `homePath`. Side effect: creates the folder and its parents,
// owned by the user, mode 0755. Returns 1; 0 with 403 unknown user, 408 when the user-home service is off or the folder
// cannot be made, or the code of OrvLibRealFullPathGet. `homePath` is unchanged on failure.
ORVEL_API int OrvUserHomeFullPathGet(std::string& homePath, const std::string& userName);

// Writes the real path of `path` into `out`: at most `outSize` - 2 bytes and a terminator, cut when it is longer;
// nothing when `outSize` is below 2. Shares only, "home" is not known here. Returns 0, or -1 with the platform error
// number 0x0D00 null argument, 0x8100 no first component, 0x1400 no such share (not logged); sets no library code.
// Kept: the share record that a successful call reads is never given back.
ORVEL_API int OrvLibTransFullPath(char* path, char* out, int outSize);

// Canonicalises `path` (symbolic links, "." and "..") into `resolved`, which holds at least 4,096 bytes whatever `size`
// says; `size` must only be nonzero. Returns 1; 0 with 400 for a null argument or size 0 (not logged), 408 missing, 407
// denied, 401 else (a component that is no folder, too). `resolved` is undefined after a failure; errno is kept.
ORVEL_API int OrvLibRealFullPathGet(const char* path, char* resolved, int size);

// Whether `path` lies in a home folder: "home", "/home" or below "/home/"; and, when `userName` (may be null) is given,
// the user's own folder in the share "homes", compared without case: for "/homes..." that answer is final. Side effect:
// for a domain or directory user the home folder is created where the user-home service is on. Sets no library code,
// logs nothing.
ORVEL_API bool IsDirUserHome(const std::string& path, const char* userName);

// Puts into `*isEncrypted` whether the share is encrypted (false for "home"). Returns 1; 0 with 408 when the share
// cannot be read, `*isEncrypted` false; 0 with 400 when `isEncrypted` is null.
ORVEL_API int OrvLibCheckEncryptShare(const std::string& shareName, bool* isEncrypted);

#endif
