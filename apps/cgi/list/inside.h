// What a folder within an archive holds.
//
//   path             the archive
//   inside           the folder in it, "inside_raw" as of paths; "" for its top
//   index            the id that an answer to such a request gave: the archive is not looked into again
//   offset, limit    the page; limit 1 to 10,000, 1,000 without it
//   sort_by          "name" (default), "size", "mtime"; folders come first
//   sort_direction   "asc" (default), "desc"
//   natural          the language in which names are ordered as people expect them
#ifndef ORVEL_CGI_LIST_INSIDE_H
#define ORVEL_CGI_LIST_INSIDE_H

#include "listing.h"
#include "request.h"

namespace orvel::cgi {

void serveInside(Request& request, const ListRequest& wanted, Output& out);

}  // namespace orvel::cgi

#endif
