// What an upload asks before and while its data goes into place.
#ifndef ORVEL_UPLOAD_CHECK_H
#define ORVEL_UPLOAD_CHECK_H

#include <string>

#include "orvel/export.h"
#include "orvel/privilege.h"
#include "vexo/session.h"
#include "vexo/upload.h"

// Is the web session authorised, and does its user hold the file manager's application privilege? `appId` (may be null)
// is what the session is asked for; the privilege is always the file manager's own (kept). Sets no code, logs nothing.
ORVEL_API bool IsAuthorized(WebMan& webMan, const char* appId);

// The library code for a failure of the upload's parser; 401 for any value without one, 0 included. Stores nothing.
ORVEL_API int ConvUploadErrnoToAPIErr(_tag_cgi_upload_errno_ err);

// May `user` store a file at the share-relative `path`? In this order: the path is resolved, the share's privilege
// asked (which may set `overwriteMode`, see CheckShareUploadPrivilege), the process takes on the user's identity, and
// the deepest existing ancestor must be the user's to write, the missing components fit for the file system. `sid` may
// be null. Returns 0, or the library code of the refusal, which is also stored, except 401 for a failed switch of
// identity or one that left a user who is no administrator at uid 0. Refusals are logged. Side effect: from the switch
// on the process acts as the user, for good.
ORVEL_API int CheckFile(std::string path, const char* user, const char* sid, _tag__type_& overwriteMode);

// Copies the uploaded data from `source` to `target` (real paths) with `user` as the owner, replacing an existing file;
// `isCancelled` (may be null) is asked meanwhile. The target appears whole, its data on the disk, or not at all. On one
// file system the source itself becomes the target, and is gone.
// False with the library code: 401, 407, 408, 411, 412 (a long name, also on an encrypted share), 414, 415, 416, 419,
// 1804 cancelled, 1805 too large for the file system; without a code for a null path (not logged) or an unknown user.
ORVEL_API bool MoveFile(const char* user, const char* source, const char* target, int (*isCancelled)());

#endif
