#include "download/sending.h"

#include <fcntl.h>
#include <sys/sendfile.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <ctime>
#include <unordered_set>
#include <utility>

#include "confined.h"
#include "download/archive.h"
#include "download/range.h"
#include "download/shown_types.h"
#include "free_names.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "text.h"
#include "versions/version.h"

namespace orvel::cgi {
namespace {

std::string variable(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
}

void putHeader(Output& out, const std::string& line) {
    out.text() += line + "\r\n";
}

// A document of its own runs nothing, is nobody's origin, fetches nothing but itself and stands in no frame. Browsers
// dress pictures and texts with styles of their own.
constexpr const char* kShownPolicy =
    "sandbox; default-src 'none'; img-src 'self'; style-src 'unsafe-inline'; frame-ancestors 'none'";

// A file written within the clock's current tick could be written once more and keep its time, and so its tag.
struct stat settledStatus(const Source& source) {
    struct stat status = source.status;
    timespec now{}, tick{};
    if (clock_gettime(CLOCK_REALTIME_COARSE, &now) != 0 || clock_getres(CLOCK_REALTIME_COARSE, &tick) != 0)
        return status;
    const auto age = (now.tv_sec - status.st_mtim.tv_sec) * 1'000'000'000L + now.tv_nsec - status.st_mtim.tv_nsec;
    if (age < 0 || age >= tick.tv_nsec || tick.tv_sec != 0) return status;
    tick.tv_nsec *= 2;
    nanosleep(&tick, nullptr);
    static_cast<void>(fstat(source.opened.get(), &status));
    return status;
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

// Opens what was looked at when the request came. False, and said in the zip, when it is not that any more.
bool openAgain(Source& source, const std::string& name, const OpenSource& open, ArchiveStream& zip) {
    const struct stat before = source.status;
    const int code = open(source);
    const bool same = code == ORV_ERR_NONE && source.status.st_dev == before.st_dev &&
                      source.status.st_ino == before.st_ino &&
                      (source.status.st_mode & S_IFMT) == (before.st_mode & S_IFMT);
    if (!same) zip.leaveOut(name, code != ORV_ERR_NONE ? reasonOf(code) : "replaced by something else meanwhile");
    return same;
}

std::string lastComponent(const std::string& path) {
    return path.substr(path.rfind('/') + 1);
}

// The path's last component, unless it cannot be a file name: ".." would lead out of the client's own folder.
std::string nameOf(const PathInfo& info, const Descriptor& found) {
    const std::string name = lastComponent(info.path);
    return name != "." && name != ".." ? name : lastComponent(realPathOf(found));
}

// False when the head is all that there is to send.
bool beginZip(Output& out, const User& user, const std::string& name) {
    putHeader(out, "Status: 200 OK");
    putCommon(out, user.cookie, name + ".zip", "application/zip");
    out.text() += "\r\n";
    return variable("REQUEST_METHOD") != "HEAD" && out.finish();
}

}  // namespace

void putCommon(Output& out, const std::string& cookie, const std::string& name, const char* type, bool shown) {
    putHeader(out, std::string("Content-Type: ") + type);
    putHeader(out, "X-Content-Type-Options: nosniff");
    putHeader(out, "Content-Disposition: " + disposition(shown ? "inline" : "attachment", name));
    putHeader(out, std::string("Content-Security-Policy: ") + (shown ? kShownPolicy : "sandbox; default-src 'none'"));
    putHeader(out, "Cache-Control: private, no-cache");
    if (!cookie.empty()) putHeader(out, "Set-Cookie: " + cookie);
}

int openToSend(const User& user, Source& source) {
    PathInfo info;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), source.asked, info)) return lastCode();
    OrvLibSetErr(ORV_ERR_NONE);
    if (!CheckShareDownloadPrivilege(user.name.c_str(), user.sid.c_str(), info.path.c_str())) {
        return lastCode(ORV_ERR_DENIED);
    }
    Descriptor found;
    const int code = confinedOpen(info, linkPolicyOf(info.shareName), O_PATH, found);
    if (code != ORV_ERR_NONE) return code;
    source.path = info.path;
    source.name = nameOf(info, found);
    return openFound(found, info.realPath, source);
}

int openVersionToSend(const User& user, const std::string& name, Source& source) {
    Version version;
    int code = openVersion(user, source.asked, name, Need::kRead, version);
    if (code == ORV_ERR_NONE) code = openFound(version.opened, version.present.info().realPath, source);
    if (code == ORV_ERR_NONE && !S_ISREG(source.status.st_mode)) code = ORV_ERR_PARAMETER;
    if (code != ORV_ERR_NONE) return code;
    source.path = version.present.info().path;
    source.name = versionName(lastComponent(version.present.realPath()), version.snapshot, false);
    return ORV_ERR_NONE;
}

int openRow(const ChosenRows& rows, const KeptRow& row, Source& source) {
    const OpenedFolder& opened = rows.opened();
    source.name = row.name;
    source.path = opened.info.path + "/" + row.name;
    const int code = rows.look(row, source.status);
    if (code != ORV_ERR_NONE) return code;
    const Descriptor found(openat(opened.folder.get(), row.name.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
    return found ? openFound(found, opened.realPath + "/" + row.name, source) : refusalCode(errno, opened.realPath);
}

int openFound(const Descriptor& found, const std::string& realPath, Source& source) {
    if (fstat(found.get(), &source.status) != 0) return refusalCode(errno, realPath);
    if (!S_ISREG(source.status.st_mode) && !S_ISDIR(source.status.st_mode)) return ORV_ERR_DENIED;
    source.opened = Descriptor(open(found.path().c_str(), O_RDONLY | O_CLOEXEC));
    return source.opened ? ORV_ERR_NONE : refusalCode(errno, realPath);
}

int findSources(const std::vector<std::string>& paths, const OpenSource& open, std::vector<Source>& sources,
                std::string& culprit) {
    std::unordered_set<std::string> known;
    for (const std::string& asked : paths) {
        if (!known.insert(asked).second) continue;
        Source source;
        source.asked = culprit = asked;
        const int code = open(source);
        if (code != ORV_ERR_NONE) return code;
        if (source.path != asked && !known.insert(source.path).second) continue;  // by another spelling
        if (!sources.empty()) sources.front().opened.reset();
        if (!sources.empty()) source.opened.reset();
        sources.push_back(std::move(source));
    }
    return ORV_ERR_NONE;
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

void serveFile(Output& out, const User& user, const Source& source, bool show) {
    const struct stat status = settledStatus(source);
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
    const char* shown = show ? shownType(source.name) : nullptr;
    putCommon(out, user.cookie, source.name, shown != nullptr ? shown : "application/octet-stream", shown != nullptr);
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

void serveZip(Output& out, const User& user, std::vector<Source>& sources, const std::string& name,
              const OpenSource& open) {
    if (!beginZip(out, user, name)) return;
    ArchiveStream zip(STDOUT_FILENO);
    FreeNames names;
    for (Source& source : sources) {
        const long long before = zip.bytes();
        const bool isFolder = S_ISDIR(source.status.st_mode);
        const std::string member = names.take(memberName(source.name), isFolder);
        if (!source.opened && !openAgain(source, member, open, zip)) continue;
        const bool going = zip.add(source.opened, member);
        source.opened.reset();
        if (!going) return;
        OrvLibDoLog(user.name, source.path, zip.bytes() - before, ORVEL_ACTION_DOWNLOAD, isFolder);
    }
    zip.finish();
}

void serveZip(Output& out, const User& user, ChosenRows& rows, const std::string& name) {
    if (!beginZip(out, user, name)) return;
    ArchiveStream zip(STDOUT_FILENO);
    FreeNames names;
    for (size_t i = 0; i < rows.size(); ++i) {
        KeptRow row;
        Source source;
        int code = rows.row(i, row);
        if (code == ORV_ERR_NONE) code = openRow(rows, row, source);
        const std::string member = names.take(memberName(row.name), row.isFolder);
        if (code != ORV_ERR_NONE) {
            zip.leaveOut(member, reasonOf(code));
            continue;
        }
        const long long before = zip.bytes();
        if (!zip.add(source.opened, member)) return;
        OrvLibDoLog(user.name, source.path, zip.bytes() - before, ORVEL_ACTION_DOWNLOAD, row.isFolder);
    }
    zip.finish();
}

}  // namespace orvel::cgi
