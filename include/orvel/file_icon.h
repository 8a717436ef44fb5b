// The icon that a listing shows for an entry.
#ifndef ORVEL_FILE_ICON_H
#define ORVEL_FILE_ICON_H

#include <string>

#include "orvel/export.h"

// Chooses the file name of the icon for an entry and puts it into `icon`.
//
// `name` is the entry's name; null gives "misc.png". `path` is its real path. `shareLocation` is where the entry's
// folder lies within the shares, "" for entries that lie in none; with exactly one component ("/photo") the entry is at
// the top level of a share.
//
// Folders: "isomountpoint.png" or "remotemountpoint.png" for mount points of a disc image or a network file system,
// "recycle_bin.png" for "#recycle" at the top level of a share, else "folder.png". Files: the lower-case extension and
// ".png" where the web interface has such an icon, else "misc.png".
//
// The icons are looked for in "../images/files_ext" relative to the working directory: the programs run in the web
// interface's program folder. Sets no error code.
ORVEL_API void GetImgFileExt(const char* name, bool isDirectory, std::string& icon, std::string path,
                             std::string shareLocation);

#endif
