// What "copy" and "move" have in common.
#ifndef ORVEL_CGI_OPERATION_TRANSFER_JOB_H
#define ORVEL_CGI_OPERATION_TRANSFER_JOB_H

#include "operation/conflict.h"
#include "operation/item.h"
#include "operation/operation.h"
#include "target.h"

namespace orvel::cgi {

int startTransfer(Operation& operation, bool move);

// Asks whether the user may make something in the folder at `info`. The share may forbid to replace files; what is to
// be overwritten is then skipped. 0 or a library code.
int judgeTarget(const User& user, const PathInfo& info, Conflict& conflict);

// Opens the place at `path`, where something was once, for it to be put back. 0 or a library code; after a failure no
// folder made here is left.
int openOrigin(const User& user, const std::string& path, Missing missing, Conflict& conflict, PathInfo& info,
               Target& place);

// Records the folders above `path` that were made for it, the topmost first.
void noteMade(const Target& place, std::string path, UndoRecord& undo);

// Whether the file system of the open folder is one where case does not count.
bool isOnFat(const Descriptor& folder);

}  // namespace orvel::cgi

#endif
