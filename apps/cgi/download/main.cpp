// CGI program "download": one file with ranges, or several files and folders as one zip.
//
// Parameters, from the query or a form:
//   path, path_raw     what to fetch; each may be given more than once: several paths, or a folder, come as a zip
//   name               of the zip, without ".zip"; default is that of the only folder, else "download"
// A file answers HEAD and GET with Range, If-Range, If-None-Match and If-Modified-Since. Failures are JSON replies.
#include <fcntl.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <optional>
#include <string>
#include <vector>

#include "confined.h"
#include "download/archive.h"
#include "download/range.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "reply.h"
#include "request.h"
#include "text.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

std::string variable(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
}

struct Source {
    PathInfo info;
    std::string name;  // for the client to save it under
    Descriptor opened;
    struct stat status {};
};

std::string lastComponent(const std::string& path) {
    return path.substr(path.rfind('/') + 1);
}

// That of the path, unless it is none to save something under: ".." would lead out of the client's own folder.
std::string nameOf(const PathInfo& info, const Descriptor& found) {
    const std::string name = lastComponent(info.path);
    return name != "." && name != ".." ? name : lastComponent(realPathOf(found));
}

// Resolves, asks and opens one path as the user. 0 or a library code.
int openSource(const User& user, const std::string& path, Source& source) {
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), path, source.info)) return lastCode();
    OrvLibSetErr(ORV_ERR_NONE);
    if (!CheckShareDownloadPrivilege(user.name.c_str(), user.sid.c_str(), source.info.path.c_str())) {
        return lastCode(ORV_ERR_DENIED);
    }
    // Looked at before it is opened for reading: opening a device can already do something.
    Descriptor found;
    const int code = confinedOpen(source.info, linkPolicyOf(source.info.shareName), O_PATH, found);
    if (code != ORV_ERR_NONE) return code;
    if (fstat(found.get(), &source.status) != 0) return refusalCode(errno, source.info.realPath);
    if (!S_ISREG(source.status.st_mode) && !S_ISDIR(source.status.st_mode)) return ORV_ERR_DENIED;
    source.name = nameOf(source.info, found);
    source.opened = Descriptor(open(found.path().c_str(), O_RDONLY | O_CLOEXEC));
    return source.opened ? ORV_ERR_NONE : refusalCode(errno, source.info.realPath);
}

// A refusal must not be taken for the file: unlike in other programs it shows in the HTTP status.
Status httpStatusOf(int code) {
    switch (code) {
        case ORV_ERR_MISSING:
            return Status::kNotFound;
        case ORV_ERR_DENIED:
            return Status::kForbidden;
        case ORV_ERR_PARAMETER:
            return Status::kBadRequest;
        default:
            return Status::kBroken;
    }
}

void putHeader(Output& out, const std::string& line) {
    out.text() += line + "\r\n";
}

// The headers that every download carries: no guessing of types, nothing shown in place.
void putCommon(Output& out, const std::string& cookie, const std::string& name, const char* type) {
    putHeader(out, std::string("Content-Type: ") + type);
    putHeader(out, "X-Content-Type-Options: nosniff");
    putHeader(out, "Content-Disposition: " + attachment(name));
    putHeader(out, "Content-Security-Policy: sandbox; default-src 'none'");
    putHeader(out, "Cache-Control: private, no-cache");
    if (!cookie.empty()) putHeader(out, "Set-Cookie: " + cookie);
}

// Sends the bytes; how many arrived.
std::int64_t sendBytes(int file, ByteRange range) {
    off_t at = range.first;
    while (at <= range.last) {
        const auto wanted = static_cast<size_t>(std::min<std::int64_t>(range.last - at + 1, std::int64_t{1} << 30));
        const ssize_t sent = sendfile(STDOUT_FILENO, file, &at, wanted);
        if (sent < 0 && errno == EINTR) continue;
        if (sent <= 0) break;
    }
    return at - range.first;
}

void serveFile(Output& out, const User& user, const Source& source) {
    const struct stat& status = source.status;
    const std::int64_t modified = status.st_mtim.tv_sec;
    const std::string tag = entityTag(status.st_ino, status.st_size, modified, status.st_mtim.tv_nsec);
    const std::string method = variable("REQUEST_METHOD");
    const bool current = method != "POST" &&
                         isCurrent(variable("HTTP_IF_NONE_MATCH"), variable("HTTP_IF_MODIFIED_SINCE"), tag, modified);
    ByteRange range = {0, status.st_size - 1};
    RangeAnswer answer = RangeAnswer::kWhole;
    if (!current && method == "GET" && rangeCounts(variable("HTTP_IF_RANGE"), tag, modified)) {
        answer = judgeRange(variable("HTTP_RANGE"), status.st_size, range);
    }

    const std::string total = std::to_string(status.st_size);
    putHeader(out, current                                 ? "Status: 304 Not Modified"
                   : answer == RangeAnswer::kPart          ? "Status: 206 Partial Content"
                   : answer == RangeAnswer::kUnsatisfiable ? "Status: 416 Range Not Satisfiable"
                                                           : "Status: 200 OK");
    putCommon(out, user.cookie, source.name, "application/octet-stream");
    putHeader(out, "Accept-Ranges: bytes");
    putHeader(out, "ETag: " + tag);
    putHeader(out, "Last-Modified: " + httpDate(modified));
    const bool body = !current && answer != RangeAnswer::kUnsatisfiable;
    if (answer == RangeAnswer::kUnsatisfiable) putHeader(out, "Content-Range: bytes */" + total);
    if (answer == RangeAnswer::kPart) {
        putHeader(out, "Content-Range: bytes " + std::to_string(range.first) + "-" + std::to_string(range.last) + "/" +
                           total);
    }
    if (!current) putHeader(out, "Content-Length: " + (body ? std::to_string(range.length()) : "0"));
    out.text() += "\r\n";
    if (!body || method == "HEAD" || !out.finish()) return;
    const std::int64_t sent = sendBytes(source.opened.get(), range);
    OrvLibDoLog(user.name, source.info.path, sent, ORVEL_ACTION_DOWNLOAD, false);
}

// A name that no other member has: "a", "a (2)", "a (3)"...
std::string freeName(std::vector<std::string>& used, const std::string& wanted) {
    std::string name = wanted;
    for (int count = 2; std::find(used.begin(), used.end(), name) != used.end(); ++count) {
        name = wanted + " (" + std::to_string(count) + ")";
    }
    used.push_back(name);
    return name;
}

void serveZip(Output& out, const User& user, std::vector<Source>& sources, const std::string& name) {
    putHeader(out, "Status: 200 OK");
    putCommon(out, user.cookie, name + ".zip", "application/zip");
    out.text() += "\r\n";
    if (variable("REQUEST_METHOD") == "HEAD" || !out.finish()) return;
    ZipStream zip(STDOUT_FILENO);
    std::vector<std::string> used;
    for (Source& source : sources) {
        const long long before = zip.bytes();
        if (!zip.add(source.opened, freeName(used, memberName(source.name)))) return;
        OrvLibDoLog(user.name, source.info.path, zip.bytes() - before, ORVEL_ACTION_DOWNLOAD,
                    S_ISDIR(source.status.st_mode));
    }
    zip.finish();
}

// Every path of the request, decoded; nothing when one cannot be a path, or there is none.
std::optional<std::vector<std::string>> pathsOf(const VEXO::WebCGI& web) {
    std::vector<std::string> paths = web.GetParams("path");
    for (const std::string& text : web.GetParams("path_raw")) {
        const auto decoded = percentDecode(text);
        if (!decoded) return std::nullopt;
        paths.push_back(*decoded);
    }
    const bool whole = std::all_of(paths.begin(), paths.end(),
                                   [](const std::string& path) { return path.find('\0') == std::string::npos; });
    if (paths.empty() || !whole) return std::nullopt;
    return paths;
}

void serve(Output& out) {
    std::signal(SIGPIPE, SIG_IGN);
    User user;
    if (!begin(out, user)) return;
    const VEXO::WebCGI web;
    const auto paths = pathsOf(web);
    if (web.BodyRefused() || !paths) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, web.GetParam("path", ""));
    }
    const bool home =
        std::any_of(paths->begin(), paths->end(), [](const std::string& path) { return IsDirUserHome(path, nullptr); });
    int code = actAs(user.sid.c_str(), user.name, home);
    if (code != ORV_ERR_NONE) return replyFailure(out, httpStatusOf(code), user.cookie, code, paths->front());

    std::vector<Source> sources(paths->size());
    for (size_t i = 0; i < sources.size(); ++i) {
        code = openSource(user, (*paths)[i], sources[i]);
        if (code != ORV_ERR_NONE) return replyFailure(out, httpStatusOf(code), user.cookie, code, (*paths)[i]);
    }
    if (sources.size() == 1 && S_ISREG(sources[0].status.st_mode)) return serveFile(out, user, sources[0]);
    const std::string only = sources.size() == 1 ? sources[0].name : "download";
    serveZip(out, user, sources, web.GetParam("name", only));
}

}  // namespace
}  // namespace orvel::cgi

int main() {
    return orvel::cgi::runProgram(orvel::cgi::serve);
}
