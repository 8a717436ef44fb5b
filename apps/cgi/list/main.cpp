// CGI program "list": what a folder holds, and which shares there are.
//
// Parameters, from the query or a form:
//   action           "shares", "folder", "deleted" (see list/deleted.h), "archive" (see list/inside.h), or one
//                    on a kept listing
//   path, path_raw   the folder (folder only)
//   sort_by          as for OrvEnum; without it folders come by name, shares with the home folder first
//   sort_direction   "asc" (default) or "desc"
//   offset, limit    the page; limit 0, the default, means everything
//   additional       words as for additionalBits
//   pattern          comma-separated name patterns (folder only)
//   filetype         "dir", "file" or "all" (default; folder only)
//   with             see list/beside.h (shares, folder)
// and those of kept listings: see list/kept.h; "versions", and "snapshot" with a folder: see list/versions.h.
// "data" of the reply is {"total","offset","items"}; beside that of the shares stands "user", who is logged in.
#include <optional>
#include <string>

#include "base/json_text.h"
#include "list/beside.h"
#include "list/deleted.h"
#include "list/inside.h"
#include "list/kept.h"
#include "list/versions.h"
#include "listing.h"
#include "orvel/error_state.h"
#include "orvel/share_path.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "text.h"
#include "versions/version.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

// Nothing when a parameter is not what it should be.
std::optional<ListRequest> parse(const VEXO::WebCGI& web, const User& user) {
    const auto path = pathParam(web);
    const auto offset = numberParam(web, "offset", 0);
    const auto limit = numberParam(web, "limit", 0);
    const auto type = typeParam(web);
    const auto ascending = ascendingParam(web);
    if (!path || !offset || !limit || !type || !ascending) return std::nullopt;
    return ListRequest{.user = user.name,
                       .sid = user.sid,
                       .path = *path,
                       .sortBy = web.GetParam("sort_by", ""),
                       .ascending = *ascending,
                       .offset = *offset,
                       .limit = *limit,
                       .additional = additionalBits(web.GetParam("additional", "")),
                       .pattern = web.GetParam("pattern", ""),
                       .type = *type};
}

}  // namespace

void serveListProgram(Request& request, Output& out) {
    const User& user = request.user;
    const VEXO::WebCGI& web = request.web;
    const std::string action = web.GetParam("action", "");
    const auto wanted = parse(web, user);
    const bool known = action == "shares" || action == "folder" || action == "deleted" || action == "versions" ||
                       action == "archive" || isKeptAction(action);
    if (!wanted || !known) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, web.GetParam("path", ""));
    }

    if (action == "versions") return serveVersions(request, *wanted, out);
    if (action == "folder" && namesVersion(web)) return serveEarlierFolder(request, *wanted, out);
    if (action == "deleted") return serveDeleted(request, *wanted, out);
    if (action == "archive") return serveInside(request, *wanted, out);
    if (isKeptAction(action)) return serveKept(request, action, *wanted, out);
    if (action == "folder" && wantsToKeep(web)) return serveKeeping(request, *wanted, out);

    const bool shares = action == "shares";
    Listing listing;
    int code = actAs(user.sid.c_str(), user.name, shares || IsDirUserHome(wanted->path, nullptr));
    if (code == ORV_ERR_NONE) code = shares ? listShares(*wanted, listing) : listFolder(*wanted, listing);
    if (code != ORV_ERR_NONE) return replyFailure(out, statusOf(code), user.cookie, code, wanted->path);

    beginReply(out, Status::kOk, user.cookie);
    out.text() += "{\"success\":true,";
    if (shares) {
        out.text() += "\"user\":";
        appendJsonText(readable(user.name), out.text());
        out.text() += ',';
    }
    out.text() += "\"data\":";
    out.text() += '{';
    writePage(*wanted, listing, shares ? appendShare : appendEntry, out);
    appendBeside(request, shares ? "" : wanted->path, out);
    out.text() += "}}";
}

}  // namespace orvel::cgi
