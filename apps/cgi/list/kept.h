// The actions of the program "list" that have to do with kept listings.
#ifndef ORVEL_CGI_LIST_KEPT_H
#define ORVEL_CGI_LIST_KEPT_H

#include "listing.h"
#include "output.h"
#include "request.h"

namespace orvel::cgi {

// "keep" = "1" with the action "folder": the order is kept, and named by "listing" beside the page ("not_kept", why,
// where it could not be). "natural": the language whose people expect the names so; "folders_first" = "1".
[[nodiscard]] bool wantsToKeep(const VEXO::WebCGI& web);
void serveKeeping(Request& request, const ListRequest& wanted, Output& out);

// Whether `action` is one of these on the listing "listing":
//   page    as the action "folder", of the kept order: data also has "listing", "path", "changed"; an item may be "gone"
//   changes "state", of the same rows ("offset", "limit" of 1 to 100) when they were asked about before: data: {"changed",
//           "state","items"}: the rows where they are not as they were and the folder has the same names
//   renew   "listing" may be several, separated by commas: data: {"listings":[those that are there]}
//   find    "prefix", "prefix_raw", "from": data: {"row"}, -1 for none
//   rows    "names_raw": data: {"rows":[...]}, -1 for a name that it lacks
//   carry   "ranges", "except", "into": the same names as rows of another listing of the same folder: data: {"ranges",
//           "count","left","names"}: how many it lacks, and the first of them
[[nodiscard]] bool isKeptAction(const std::string& action);
void serveKept(Request& request, const std::string& action, ListRequest wanted, Output& out);

}  // namespace orvel::cgi

#endif
