// What lies in the recycle bins of all shares that the user may see, as one list.
//
//   offset, limit    the page; limit 1 to 10,000, 100 without it
//   sort_by          "deleted" (default), "name", "size", "deleter", "from" (the folder, its share first)
//   sort_direction   "asc", "desc"; without it "desc" for "deleted", else "asc"
//   pattern          names to show: patterns with "*" and "?", separated by commas
//   filetype         "dir", "file" or "all" (default)
// Each page looks at all of the bins, at most 100,000 entries; what is kept for it grows with what is found.
#ifndef ORVEL_CGI_LIST_DELETED_H
#define ORVEL_CGI_LIST_DELETED_H

#include "listing.h"
#include "request.h"

namespace orvel::cgi {

void serveDeleted(Request& request, const ListRequest& wanted, Output& out);

}  // namespace orvel::cgi

#endif
