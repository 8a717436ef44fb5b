// Records of a search as the entries that a listing has.
#ifndef ORVEL_CGI_FOUND_ENTRY_H
#define ORVEL_CGI_FOUND_ENTRY_H

#include "listing.h"
#include "orvel/search_task.h"

namespace orvel::cgi {

// Reads the page that `request` asks for; its pattern is what the names must contain. Paths begin with "/home" below
// the user's own home. What the user may do (ADDITIONAL_PERM) is asked of the file system, as the calling identity, all
// else is what the search found. 0 or a library code; what a failure leaves in `listing` is to be thrown away.
int readResults(const ListRequest& request, FileSearch::OrvSearchDBTask& results, Listing& listing);

}  // namespace orvel::cgi

#endif
