// The actions of the program "operation". Each answers 0 or a library code, and fills `data` of the reply.
#ifndef ORVEL_CGI_OPERATION_OPERATION_H
#define ORVEL_CGI_OPERATION_OPERATION_H

#include <json/value.h>

#include <string>
#include <vector>

#include "operation/choice.h"
#include "orvel/file_info.h"
#include "request.h"
#include "vexo/web.h"

namespace orvel::cgi {

struct Operation {
    const User& user;
    const VEXO::WebCGI& web;
    std::string path;     // share-relative, for an action that takes one,
    PathInfo info;        // and what it resolved to
    Choice chosen;        // for the others
    std::string culprit;  // path to name when the action is refused
    Json::Value data;
    const char* key = nullptr;  // of a failure that is this program's own
};

// "parents" = "true": missing folders above are made, too. data: {"path"}.
int makeFolderOperation(Operation& operation);
// "name" or "name_raw": the new name, in the same folder. data: {"path"}, the new one, and "undo", an id for
// undoOperation.
int renameOperation(Operation& operation);
// data: {"items":[{"name","path","mtime","mount_type"}]}, the sub-folders by name, "mount_type" only for mount points.
int subfoldersOperation(Operation& operation);
// "names_raw": names, percent-encoded, one a line, or rows as below, whose names are meant. data:
// {"items":[{"name","isdir","size","mtime"}]}, those of them that the folder has, each of a link itself.
int presentOperation(Operation& operation);

// These go on in the background; data: {"taskid"}. They take several paths, or rows of a kept listing ("listing",
// "ranges", "except"), and what goes wrong with one of them shows in the task (see Progress) while the others are
// worked on.

// "target" or "target_raw": the folder to copy or move to; "conflict": see conflict.h.
int copyOperation(Operation& operation);
int moveOperation(Operation& operation);
// To the share's recycle bin, where it has one; "permanent" = "true", and what lies in the bin: for good.
int deleteOperation(Operation& operation);
// Puts what lies in a recycle bin back where it was; "conflict" as above.
int restoreOperation(Operation& operation);
// Restores what lies at the paths from the snapshot "snapshot" or "snapshot_raw" (see list/versions.h): over what is
// there
// ("conflict" as above; what is replaced goes into the recycle bin where the share has one), or with "beside" = "true"
// under a name with the date. What may not be read now is left out.
int recoverOperation(Operation& operation);
// Empties the recycle bin of the share that the path lies in.
int emptyOperation(Operation& operation);
// "target" or "target_raw": the zip to make; "conflict" as above.
int compressOperation(Operation& operation);
// Unpacks the archives at the paths into the folder "target" or "target_raw"; "conflict" as above.
int extractOperation(Operation& operation);

// Changes permissions: see readChange for what is to be changed; "below" = "true": of all that lies below, too, links
// left alone. Without "confirm" = "true" it is refused (2201, data: {"warnings"}) where the user gives up what he
// cannot take back: see Loss.
int permitOperation(Operation& operation);
// Not in the background: data: what the chosen items have in common, see permissions_shown.cpp; and what a user or
// group
// ("user", "group") may do with the item at the path, see access_of.cpp.
int permissionsOperation(Operation& operation);
int accessOperation(Operation& operation);

// Undoes what the operation "taskid" did, item by item: a copy, move, rename, deletion into the bin, restoring. What is
// not as the operation left it stays, and so does what would not find its old place. "search": as "taskid" above.
int undoOperation(Operation& operation);

// Counts what is chosen, with all that lies below it, see SizeReport: "measured" of the task, and "items_total" and
// "bytes_total" of one that has ended.
int measureOperation(Operation& operation);

// "taskid" (or without it, all of the user's): data: the task, or {"tasks":[...]}; see taskReply.
int statusOperation(Operation& operation);
// Asks the task "taskid" to end; data: the task. One that has ended is no failure.
int cancelOperation(Operation& operation);
// Removes the record of "taskid" (420 while it runs), or without it those of all that ended. data: {"cleared"}.
int clearOperation(Operation& operation);

}  // namespace orvel::cgi

#endif
