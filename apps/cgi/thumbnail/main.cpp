// CGI program "thumbnail": a small picture of an image or of a PDF document's first page.
//
// Parameters:
//   path_raw, path   the file (see pathParams)
//   size             the longest edge in pixels, 1 to 1024 (256): 128, 256, 512 or 1024, whichever is next
// Answers image/webp or image/png, upright, without what cameras write into pictures. Asks for the same privilege as a
// download. Failures are JSON replies: 415 for what is no picture, 503 while too many are being made.
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
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
#include "thumbnail/sandbox.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

constexpr unsigned kEdges[] = {128, 256, 512, 1024};
constexpr unsigned long kDefaultEdge = 256;
constexpr int kPatience = 3000;  // milliseconds for a seat
constexpr SandboxLimits kLimits = {.memory = std::uint64_t{2} << 30,
                                   .output = std::uint64_t{8} << 20,
                                   .processor = 10,
                                   .time = std::chrono::seconds(20)};

enum class Kind { kNone, kPicture, kDocument };

// By the first bytes: what a name says is not believed.
Kind kindOf(int source) {
    char begin[16] = {};
    const ssize_t got = pread(source, begin, sizeof begin, 0);
    const std::string_view bytes(begin, static_cast<size_t>(std::max<ssize_t>(got, 0)));
    if (bytes.starts_with("%PDF-")) return Kind::kDocument;
    const bool isWebp =
        bytes.starts_with("RIFF") && bytes.substr(std::min<size_t>(8, bytes.size())).starts_with("WEBP");
    const std::string_view brand = bytes.size() >= 12 && bytes.substr(4, 4) == "ftyp" ? bytes.substr(8, 4) : "";
    const std::string_view brands[] = {"avif", "avis", "heic", "heix", "heim", "heis", "hevc", "hevx", "mif1", "msf1"};
    const bool isHeif = std::find(std::begin(brands), std::end(brands), brand) != std::end(brands);
    const bool isPicture = isWebp || isHeif || bytes.starts_with("\xFF\xD8\xFF") || bytes.starts_with("\x89PNG\r\n") ||
                           bytes.starts_with("GIF8") || bytes.starts_with(std::string_view("II*\0", 4)) ||
                           bytes.starts_with(std::string_view("MM\0*", 4));
    return isPicture ? Kind::kPicture : Kind::kNone;
}

std::vector<std::string> wordsFor(Kind kind, unsigned edge) {
    const std::string pixels = std::to_string(edge);
    if (kind == Kind::kDocument) {
        return {"/usr/bin/pdftoppm", "-png", "-singlefile", "-scale-to", pixels, "-"};
    }
    // Smaller ones keep their size.
    return {"/usr/bin/vipsthumbnail", "stdin", "--size",           pixels + "x" + pixels + ">",
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

enum class Making { kMade, kImpossible, kBusy, kBroken };

// Makes the small picture and keeps it; that there is none is kept as well.
Making make(const Source& source, Kind kind, unsigned edge, const std::string& key, const ThumbnailCache& cache,
            std::string& picture) {
    const Descriptor seat = cache.takeSeat(kPatience);
    if (!seat) return Making::kBusy;
    if (const auto kept = cache.get(key)) {  // made while we waited
        picture = *kept;
        return picture.empty() ? Making::kImpossible : Making::kMade;
    }
    const Descriptor made(memfd_create("thumbnail", MFD_CLOEXEC));
    if (!made || lseek(source.opened.get(), 0, SEEK_SET) != 0) return Making::kBroken;
    const SandboxEnd end = runInSandbox(wordsFor(kind, edge), source.opened.get(), made.get(), kLimits);
    if (end == SandboxEnd::kFailed) return Making::kBroken;
    if (end == SandboxEnd::kTimeOut) return Making::kBusy;
    if (end == SandboxEnd::kDone) picture = pictureIn(made.get());
    // A file that was written to meanwhile has another name in the cache by now.
    if (thumbnailKey(source.opened.get(), edge) == key) cache.put(key, picture);
    return picture.empty() ? Making::kImpossible : Making::kMade;
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
    if (!path || path->empty() || !size || *size < 1 || *size > kEdges[3]) {
        return refuse(out, user, Status::kBadRequest, ORV_ERR_PARAMETER, request.web.GetParam("path", ""));
    }
    const unsigned edge = *std::lower_bound(std::begin(kEdges), std::end(kEdges), *size);
    Source source;
    source.asked = *path;
    int code = actAs(user.sid.c_str(), user.name, IsDirUserHome(*path, nullptr));
    if (code == ORV_ERR_NONE) code = openToSend(user, source);
    if (code != ORV_ERR_NONE) return refuse(out, user, httpStatusOf(code), code, *path);
    const Kind kind = S_ISREG(source.status.st_mode) ? kindOf(source.opened.get()) : Kind::kNone;
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
    if (made == Making::kImpossible) return refuse(out, user, Status::kUnsupportedType, ORV_ERR_PARAMETER, *path);
    putHeaders(out, user, "200 OK", tag);
    out.text() +=
        "Content-Type: " + typeOf(picture) + "\r\nContent-Length: " + std::to_string(picture.size()) + "\r\n\r\n";
    if (variable("REQUEST_METHOD") != "HEAD") out.text() += picture;
}

}  // namespace orvel::cgi
