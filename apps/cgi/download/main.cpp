// CGI program "download": one file with ranges, or several files and folders as one zip.
//
// Parameters, from the query or a form:
//   paths_raw, path_raw, path   what to fetch (see pathParams): several paths, or a folder, come as a zip
//   listing, ranges, except     or rows of a kept listing (see chosen_rows.h)
//   inside, inside_raw          one file in the archive at the path, with its "password" (posted), see download/member.h
//   inline                      "1": one file of a kind that a browser may show is shown (see shown_types.h)
//   name                        of the zip, without ".zip"; default is that of the only folder, else "download"
//   snapshot, snapshot_raw      one file as it was in that snapshot (see list/versions.h)
// A file answers HEAD and GET with Range, If-Range, If-None-Match and If-Modified-Since. Failures are JSON replies.
#include <json/value.h>
#include <sys/stat.h>

#include <algorithm>
#include <string>
#include <vector>

#include "chosen_rows.h"
#include "download/member.h"
#include "download/sending.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "versions/version.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

std::string lastComponent(const std::string& path) {
    return path.substr(path.rfind('/') + 1);
}

bool wantsInline(const VEXO::WebCGI& web) {
    return web.GetParam("inline", "") == "1";
}

void serveRows(const User& user, const VEXO::WebCGI& web, Output& out) {
    ChosenRows rows;
    Json::Value data;
    Source only;
    int code = actAs(user.sid.c_str(), user.name, false);
    if (code == ORV_ERR_NONE) code = rows.find(user, web);
    if (code == ORV_ERR_NONE) code = rows.openFolder(user);
    std::string culprit = rows.path();
    OrvLibSetErr(ORV_ERR_NONE);
    if (code == ORV_ERR_NONE && !CheckShareDownloadPrivilege(user.name.c_str(), user.sid.c_str(), culprit.c_str()))
        code = lastCode(ORV_ERR_DENIED);
    KeptRow row;
    if (code == ORV_ERR_NONE && rows.size() == 1) {
        code = rows.row(0, row);
        if (code == ORV_ERR_NONE) code = openRow(rows, row, only);
        culprit += "/" + row.name;
    }
    if (code != ORV_ERR_NONE) {
        rows.explain(data);
        return reply(out, httpStatusOf(code), user.cookie, code, culprit, data);
    }
    if (rows.size() == 1 && !row.isFolder) return serveFile(out, user, only, wantsInline(web));
    serveZip(out, user, rows, web.GetParam("name", rows.size() == 1 ? row.name : lastComponent(culprit)));
}

}  // namespace

void serveDownloadProgram(Request& request, Output& out) {
    const User& user = request.user;
    const VEXO::WebCGI& web = request.web;
    if (ChosenRows::isIn(web) && !namesVersion(web)) return serveRows(user, web, out);
    const auto paths = pathParams(web);
    const auto version = versionParam(web);
    const bool fits = paths && (!namesVersion(web) || (version && paths->size() == 1));
    if (!fits || paths->empty()) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, web.GetParam("path", ""));
    }
    const bool home =
        std::any_of(paths->begin(), paths->end(), [](const std::string& path) { return IsDirUserHome(path, nullptr); });
    std::string culprit = paths->front();
    std::vector<Source> sources;
    const OpenSource open = [&](Source& source) {
        return version ? openVersionToSend(user, *version, source) : openToSend(user, source);
    };
    int code = actAs(user.sid.c_str(), user.name, home);
    if (code == ORV_ERR_NONE) code = findSources(*paths, open, sources, culprit);
    if (code != ORV_ERR_NONE) return replyFailure(out, httpStatusOf(code), user.cookie, code, culprit);
    if (web.HasParam("inside") || web.HasParam("inside_raw")) return serveMember(out, user, web, sources);
    if (sources.size() == 1 && S_ISREG(sources[0].status.st_mode))
        return serveFile(out, user, sources[0], wantsInline(web));
    const std::string only = sources.size() == 1 ? sources[0].name : "download";
    serveZip(out, user, sources, web.GetParam("name", only), open);
}

}  // namespace orvel::cgi
