// The actions of the program "search". Each answers the request.
#ifndef ORVEL_CGI_SEARCH_ACTIONS_H
#define ORVEL_CGI_SEARCH_ACTIONS_H

#include "request.h"
#include "search_task.h"
#include "vexo/web.h"

namespace orvel::cgi {

// "path", "path_raw" (several): the folders. "recursive": "true" (default) or "false", the folders' own entries alone.
// Criteria: see criteria.h. data: {"taskid"}; of a refused criterion {"parameter"}, its name.
void startSearch(Output& out, const User& user, const VEXO::WebCGI& web);

// A page of what was found. "offset", "limit" (1 to 10,000, 100 without it), "sort_by" as for
// OrvSearchDBTask::queryResult, "sort_direction", "filetype", "additional" as in a listing, "filter": what the name
// must contain, wildcards allowed. data: {"total","offset","items"} as in a listing, with "finished", "stopped",
// "failed" (then also "failure":{"code","key"}) and "shares":{name: "index" or "walk"}.
void listResults(Output& out, const User& user, const VEXO::WebCGI& web, const SearchTask& task);

}  // namespace orvel::cgi

#endif
