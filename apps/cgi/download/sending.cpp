#include "download/sending.h"

#include <fcntl.h>
#include <sys/sendfile.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>

#include "confined.h"
#include "download/archive.h"
#include "download/range.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"
#include "text.h"

namespace orvel::cgi {
namespace {

std::string variable(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
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

// A name that no other member has: "a", "a (2)", "a (3)"...
std::string freeName(std::vector<std::string>& used, const std::string& wanted) {
    std::string name = wanted;
    for (int count = 2; std::find(used.begin(), used.end(), name) != used.end(); ++count) {
        name = wanted + " (" + std::to_string(count) + ")";
    }
    used.push_back(name);
    return name;
}

}  // namespace

int openFound(const Descriptor& found, const std::string& realPath, Source& source) {
    if (fstat(found.get(), &source.status) != 0) return refusalCode(errno, realPath);
    if (!S_ISREG(source.status.st_mode) && !S_ISDIR(source.status.st_mode)) return ORV_ERR_DENIED;
    source.opened = Descriptor(open(found.path().c_str(), O_RDONLY | O_CLOEXEC));
    return source.opened ? ORV_ERR_NONE : refusalCode(errno, realPath);
}

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
    OrvLibDoLog(user.name, source.path, sent, ORVEL_ACTION_DOWNLOAD, false);
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
        OrvLibDoLog(user.name, source.path, zip.bytes() - before, ORVEL_ACTION_DOWNLOAD,
                    S_ISDIR(source.status.st_mode));
    }
    zip.finish();
}

}  // namespace orvel::cgi
