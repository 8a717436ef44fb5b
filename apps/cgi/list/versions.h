// What a file or folder was like before, where the file system keeps snapshots.
//
// Action "versions": the versions of "path", the latest first. data: {"present":{"exists","isdir","size","mtime"},
// "items":[{"snapshot","time","dated","size","mtime","same","oldest","current"}],"snapshots","cut","closed"}. A file
// that is the same in snapshots that follow each other is one item, of "same" snapshots down to that of "oldest".
// "snapshot" is its name; "time" is of when it is, and is missing where "dated" is "none". "snapshots": how many were
// looked at; "cut": there are more; "closed": there are some that the user may not read.
//
// Action "folder" with "snapshot" or "snapshot_raw": what the folder held in that snapshot.
#ifndef ORVEL_CGI_LIST_VERSIONS_H
#define ORVEL_CGI_LIST_VERSIONS_H

#include "listing.h"
#include "request.h"

namespace orvel::cgi {

void serveVersions(Request& request, const ListRequest& wanted, Output& out);

void serveEarlierFolder(Request& request, const ListRequest& wanted, Output& out);

}  // namespace orvel::cgi

#endif
