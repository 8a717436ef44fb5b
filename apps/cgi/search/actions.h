// The actions of the program "search". Each answers the request.
#ifndef ORVEL_CGI_SEARCH_ACTIONS_H
#define ORVEL_CGI_SEARCH_ACTIONS_H

#include <json/value.h>

#include <optional>
#include <string>

#include "listing.h"
#include "request.h"
#include "search_task.h"
#include "vexo/web.h"

namespace orvel::cgi {

// "path", "path_raw" (several): the folders. "recursive": "true" (default) or "false", the folders' own entries alone.
// Criteria: see criteria.h. data: {"taskid"}; of a refused criterion {"parameter"}, its name. A request with "limit" is
// one for a page as well: data also has "first", as listResults answers, where the first rows came soon enough.
void startSearch(Output& out, const User& user, const VEXO::WebCGI& web);

// A page of what was found. "offset", "limit" (1 to 10,000, 100 without it), "sort_by" as for
// OrvSearchDBTask::queryResult, "sort_direction", "filetype", "additional" as in a listing, "filter": what the name
// must contain, wildcards allowed. data: {"total","offset","items"} as in a listing, with "finished", "stopped",
// "failed" (then also "failure":{"code","key"}), "shares":{name: "index" or "walk"} and "indexes":{name: {"updated",
// "live"}}.
void listResults(Output& out, const User& user, const VEXO::WebCGI& web, const SearchTask& task);

// What such a request asks for; nothing when a parameter is not what it should be.
std::optional<ListRequest> parsePage(const User& user, const VEXO::WebCGI& web);

// A page that was read.
struct ResultPage {
    Json::Value state;
    Listing listing;
    std::string culprit;  // path to name when it is refused
};
// 0 or a library code; 407 once one of the shares has been closed to the user.
int readPage(const ListRequest& request, const SearchTask& task, ResultPage& page);
void writeResults(const ListRequest& request, const ResultPage& page, Output& out);

}  // namespace orvel::cgi

#endif
