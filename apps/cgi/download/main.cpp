// CGI program "download": one file with ranges, or several files and folders as one zip.
//
// Parameters, from the query or a form:
//   paths_raw, path_raw, path   what to fetch (see pathParams): several paths, or a folder, come as a zip
//   name                        of the zip, without ".zip"; default is that of the only folder, else "download"
// A file answers HEAD and GET with Range, If-Range, If-None-Match and If-Modified-Since. Failures are JSON replies.
#include <sys/stat.h>

#include <algorithm>
#include <string>
#include <vector>

#include "download/sending.h"
#include "orvel/error_state.h"
#include "orvel/share_path.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "vexo/web.h"

namespace orvel::cgi {
void serveDownloadProgram(Request& request, Output& out) {
    const User& user = request.user;
    const VEXO::WebCGI& web = request.web;
    const auto paths = pathParams(web);
    if (!paths || paths->empty()) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, web.GetParam("path", ""));
    }
    const bool home =
        std::any_of(paths->begin(), paths->end(), [](const std::string& path) { return IsDirUserHome(path, nullptr); });
    std::string culprit = paths->front();
    std::vector<Source> sources;
    const OpenSource open = [&user](Source& source) { return openToSend(user, source); };
    int code = actAs(user.sid.c_str(), user.name, home);
    if (code == ORV_ERR_NONE) code = findSources(*paths, open, sources, culprit);
    if (code != ORV_ERR_NONE) return replyFailure(out, httpStatusOf(code), user.cookie, code, culprit);
    if (sources.size() == 1 && S_ISREG(sources[0].status.st_mode)) return serveFile(out, user, sources[0]);
    const std::string only = sources.size() == 1 ? sources[0].name : "download";
    serveZip(out, user, sources, web.GetParam("name", only), open);
}

}  // namespace orvel::cgi
