// CGI program "thumbnail": a small picture of an image, a film, a camera's RAW file or a PDF document's first page.
//
// Parameters:
//   path_raw, path   the file (see pathParams)
//   size             the longest edge in pixels, 1 to 2048 (256): 128, 256, 512, 1024 or 2048, whichever is next
//   snapshot, snapshot_raw the file as it was in that snapshot (see list/versions.h)
// Answers image/webp or image/png, upright, without what cameras write into pictures. Asks for the same privilege as a
// download. Failures are JSON replies: 415 for what is no picture, 503 while too many are being made.
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

#include "download/range.h"
#include "download/sending.h"
#include "orvel/error_state.h"
#include "orvel/share_path.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "thumbnail/cache.h"
#include "thumbnail/kind.h"
#include "thumbnail/sandbox.h"
#include "versions/version.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

constexpr unsigned kEdges[] = {128, 256, 512, 1024, 2048};
constexpr unsigned long kDefaultEdge = 256;
constexpr int kPatience = 3000;  // milliseconds for a seat
constexpr std::uint64_t kMiB = 1 << 20;
constexpr SandboxLimits kLimits = {
    .memory = 2048 * kMiB, .output = 16 * kMiB, .processor = 10, .time = std::chrono::seconds(20)};
constexpr std::uint64_t kMostWithin = 64 * kMiB;  // of the preview in a camera's file

unsigned edgeFor(unsigned long size) {
    for (const unsigned edge : kEdges) {
        if (edge >= size) return edge;
    }
    return *std::rbegin(kEdges);
}

// One of ours, which lie beside the folder that this program was started from.
std::string ownProgram(const char* name) {
    std::error_code error;
    const auto self = std::filesystem::read_symlink("/proc/self/exe", error);
    return self.parent_path().parent_path() / "decoders" / name;
}

std::string pictureWord(unsigned edge) {
    return std::to_string(edge) + "x" + std::to_string(edge) + ">";
}

// What draws it, or takes the picture to be drawn out of it.
std::vector<std::string> wordsFor(Kind kind, unsigned edge) {
    if (kind == Kind::kFilm) return {ownProgram("film-picture"), std::to_string(edge)};
    if (kind == Kind::kRaw || kind == Kind::kPictureOrRaw) return {ownProgram("raw-picture")};
    if (kind == Kind::kDocument) {
        return {"/usr/bin/pdftoppm", "-png", "-singlefile", "-scale-to", std::to_string(edge), "-"};
    }
    // Smaller ones keep their size.
    return {"/usr/bin/vipsthumbnail", "stdin", "--size",           pictureWord(edge),
            "--eprofile=srgb",        "-o",    ".webp[Q=75,strip]"};
}

std::string typeOf(std::string_view picture) {
    if (picture.starts_with("RIFF")) return "image/webp";
    return picture.starts_with("\x89PNG") ? "image/png" : "";
}

// What was written to `file`; "" where it is no picture.
std::string pictureIn(int file) {
    struct stat status {};
    if (fstat(file, &status) != 0) return "";
    std::string picture(static_cast<size_t>(status.st_size), '\0');
    const ssize_t got = pread(file, picture.data(), picture.size(), 0);
    if (got != static_cast<ssize_t>(picture.size()) || typeOf(picture).empty()) picture.clear();
    return picture;
}

enum class Making { kMade, kImpossible, kNoDecoder, kBusy, kBroken };

// Runs what `wordsFor` says on a file, and leaves what it makes in `made`.
SandboxEnd decode(Kind kind, unsigned edge, int source, std::uint64_t most, Descriptor& made) {
    made = Descriptor(memfd_create("thumbnail", MFD_CLOEXEC));
    if (!made || lseek(source, 0, SEEK_SET) != 0) return SandboxEnd::kFailed;
    SandboxLimits limits = kLimits;
    limits.output = most;
    return runInSandbox(wordsFor(kind, edge), source, made.get(), limits);
}

Making draw(Kind kind, unsigned edge, int source, std::string& picture) {
    Descriptor made;
    if (kind != Kind::kPicture && kind != Kind::kDocument) {
        const SandboxEnd end = decode(kind, edge, source, kMostWithin, made);
        if (end == SandboxEnd::kDone) return draw(Kind::kPicture, edge, made.get(), picture);
        if (end == SandboxEnd::kFailed) return Making::kBroken;
        if (end == SandboxEnd::kTimeOut) return Making::kBusy;
        if (kind != Kind::kPictureOrRaw) {
            return end == SandboxEnd::kMissing ? Making::kNoDecoder : Making::kImpossible;
        }
        kind = Kind::kPicture;
    }
    const SandboxEnd end = decode(kind, edge, source, kLimits.output, made);
    if (end == SandboxEnd::kMissing) syslog(LOG_ERR, "%s could not be started", wordsFor(kind, edge)[0].c_str());
    if (end == SandboxEnd::kFailed || end == SandboxEnd::kMissing) return Making::kBroken;
    if (end == SandboxEnd::kTimeOut) return Making::kBusy;
    if (end == SandboxEnd::kDone) picture = pictureIn(made.get());
    return picture.empty() ? Making::kImpossible : Making::kMade;
}

// Makes the small picture and keeps it; that there is none is kept as well.
Making make(const Source& source, Kind kind, unsigned edge, const std::string& key, const ThumbnailCache& cache,
            std::string& picture) {
    const Descriptor seat = cache.takeSeat(kPatience);
    if (!seat) return Making::kBusy;
    if (const auto kept = cache.get(key)) {  // made while we waited
        picture = *kept;
        return picture.empty() ? Making::kImpossible : Making::kMade;
    }
    const Making made = draw(kind, edge, source.opened.get(), picture);
    // A file that was written to meanwhile has another name in the cache by now.
    if ((made == Making::kMade || made == Making::kImpossible) && thumbnailKey(source.opened.get(), edge) == key) {
        cache.put(key, picture);
    }
    return made;
}

std::string variable(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
}

void putHeaders(Output& out, const User& user, const char* status, const std::string& tag) {
    out.text() += std::string("Status: ") + status + "\r\nETag: " + tag +
                  "\r\nX-Content-Type-Options: nosniff\r\nContent-Security-Policy: sandbox; default-src 'none'\r\n"
                  "Cache-Control: private, max-age=600\r\nVary: Cookie\r\n";
    if (!user.cookie.empty()) out.text() += "Set-Cookie: " + user.cookie + "\r\n";
}

void refuse(Output& out, const User& user, Status status, int code, const std::string& path) {
    if (status == Status::kBusy) out.text() += "Retry-After: 2\r\n";
    replyFailure(out, status, user.cookie, code, path);
}

}  // namespace

void serveThumbnailProgram(Request& request, Output& out) {
    const User& user = request.user;
    const auto path = pathParam(request.web);
    const auto size = numberParam(request.web, "size", kDefaultEdge);
    const auto version = versionParam(request.web);
    const bool fits = path && !path->empty() && (!namesVersion(request.web) || version);
    if (!fits || !size || *size < 1 || *size > *std::rbegin(kEdges)) {
        return refuse(out, user, Status::kBadRequest, ORV_ERR_PARAMETER, request.web.GetParam("path", ""));
    }
    const unsigned edge = edgeFor(*size);
    Source source;
    source.asked = *path;
    int code = actAs(user.sid.c_str(), user.name, IsDirUserHome(*path, nullptr));
    if (code == ORV_ERR_NONE) code = version ? openVersionToSend(user, *version, source) : openToSend(user, source);
    if (code != ORV_ERR_NONE) return refuse(out, user, httpStatusOf(code), code, *path);
    char begin[kKindBytes];
    const ssize_t got = S_ISREG(source.status.st_mode) ? pread(source.opened.get(), begin, sizeof begin, 0) : 0;
    const Kind kind = kindOf({begin, static_cast<size_t>(std::max<ssize_t>(got, 0))});
    const std::string key = kind == Kind::kNone ? "" : thumbnailKey(source.opened.get(), edge);
    if (key.empty()) return refuse(out, user, Status::kUnsupportedType, ORV_ERR_PARAMETER, *path);
    const std::string tag = '"' + key + '"';
    if (isCurrent(variable("HTTP_IF_NONE_MATCH"), "", tag, 0)) {
        putHeaders(out, user, "304 Not Modified", tag);
        out.text() += "\r\n";
        return;
    }
    const ThumbnailCache cache;
    if (!cache) return refuse(out, user, Status::kBroken, ORV_ERR_GENERAL, *path);
    std::string picture;
    Making made = Making::kMade;
    if (const auto kept = cache.get(key)) {
        picture = *kept;
        if (picture.empty()) made = Making::kImpossible;
    } else {
        made = make(source, kind, edge, key, cache, picture);
    }
    if (made == Making::kBusy) return refuse(out, user, Status::kBusy, ORV_ERR_BUSY, *path);
    if (made == Making::kBroken) return refuse(out, user, Status::kBroken, ORV_ERR_GENERAL, *path);
    if (made != Making::kMade) return refuse(out, user, Status::kUnsupportedType, ORV_ERR_PARAMETER, *path);
    putHeaders(out, user, "200 OK", tag);
    out.text() +=
        "Content-Type: " + typeOf(picture) + "\r\nContent-Length: " + std::to_string(picture.size()) + "\r\n\r\n";
    if (variable("REQUEST_METHOD") != "HEAD") out.text() += picture;
}

}  // namespace orvel::cgi
