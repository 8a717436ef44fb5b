// CGI program "send": a file from a visitor without an account, by a public link that receives.
//
// The body is the file, POST or PUT of the type application/octet-stream. Parameters, from the query:
//   FOLDER_SHARING   the link; the header Folder-Sharing comes before it
//   name, name_raw   of the file
// The file goes into the link's folder, beside what is there; the reply says nothing but that it did. A link that is
// not open, and one that receives nothing, is missing; 401 where a password is needed. 429 while too many send, 413 for
// what is more than the link still takes.
#include <json/value.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <optional>
#include <string>

#include "orvel/error_state.h"
#include "orvel/sharing_link.h"
#include "orvel/upload_check.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "send/pace.h"
#include "share/visit.h"
#include "upload/body.h"
#include "upload/store.h"
#include "vexo/link_seat.h"

namespace orvel::cgi {
namespace {

constexpr int kLinkFull = 1809;
constexpr size_t kLongestName = 255;

std::string variable(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
}

// A name, and no way to another folder. What a user's file may not be called is refused with the upload.
bool isName(const std::string& name) {
    const auto isOdd = [](char c) { return static_cast<unsigned char>(c) < 0x20 || c == 0x7F || c == '/'; };
    return !name.empty() && name.size() <= kLongestName && name != "." && name != ".." &&
           std::none_of(name.begin(), name.end(), isOdd);
}

bool isFull(const Link& link, const VEXO::LinkSeat::Others& others, long long size) {
    return link.files + others.files >= link.mostFiles || size > link.mostBytes ||
           link.bytes + others.bytes > link.mostBytes - size;
}

void replyFull(Output& out) {
    replyOwnFailure(out, Status::kTooLarge, "", kLinkFull, "link_full", "", {});
}

// What the link is when the file gets its name decides, whatever it was when the upload began.
class Receiving {
 public:
    Receiving(const Link& link, long long size, VEXO::LinkSeat& seat) : link_(link), size_(size), seat_(seat) {}

    // Before the first name is tried; false with code().
    bool begin() {
        std::optional<Link> now;
        if (!store_.beginReceiving(link_.id, now)) return fail(ORV_ERR_GENERAL);
        if (!now || !OrvelLogin::IsLinkOpen(now->available, now->expires, time(nullptr))) return fail(ORV_ERR_MISSING);
        seat_.leave();  // or others would take it into account twice
        return !isFull(*now, {}, size_) || fail(kLinkFull);
    }
    void end(const std::string& name) {
        if (store_.endReceiving(link_.id, {.name = name, .address = clientAddress(), .size = size_, .time = 0})) return;
        fprintf(stderr, "send: a file that came is not listed: %s\n", store_.error().c_str());
        fail(ORV_ERR_GENERAL);
    }
    [[nodiscard]] int code() const { return code_; }

 private:
    bool fail(int code) {
        code_ = code;
        errno = EIO;
        return false;
    }

    const Link& link_;
    long long size_;
    VEXO::LinkSeat& seat_;
    LinkStore store_;
    int code_ = ORV_ERR_NONE;
};

// Takes in the body. 0 or a library code.
int readFile(Upload& upload, long long length) {
    int code = ORV_ERR_NONE;
    bool whole = false;
    Pace pace;
    readBody(length, whole, [&](std::string_view data) {
        code = pace.isTooSlow(data.size()) ? ConvUploadErrnoToAPIErr(CGI_UPLOAD_SIZE) : upload.write(data);
        return code == ORV_ERR_NONE;
    });
    if (code == ORV_ERR_NONE && !whole) code = ConvUploadErrnoToAPIErr(CGI_UPLOAD_SIZE);
    // What takes long is over before the link is held.
    if (code == ORV_ERR_NONE && !upload.spool().sync()) code = uploadCodeOf(errno);
    return code;
}

int store(const Link& link, const std::string& name, long long length, VEXO::LinkSeat& seat) {
    const User owner = {.name = link.owner, .sid = "", .cookie = ""};
    Upload upload(owner, link.path + "/" + name, OVERWRITE_MODE_ERROR, "", std::nullopt);
    upload.keepBoth();
    upload.expectFolder(link.folder);
    int code = upload.begin();
    if (code == ORV_ERR_NONE && upload.folderNow() != link.folder) code = ORV_ERR_MISSING;
    if (code == ORV_ERR_NONE) code = readFile(upload, length);
    if (code != ORV_ERR_NONE) return code;
    Receiving receiving(link, length, seat);
    code = upload.finish([&](int number) { return number > 1 || receiving.begin(); });
    if (code == ORV_ERR_NONE) receiving.end(upload.path().substr(upload.path().rfind('/') + 1));
    return receiving.code() != ORV_ERR_NONE ? receiving.code() : code;
}

Status statusFor(int code) {
    switch (code) {
        case ORV_ERR_NONE:
            return Status::kOk;
        case ORV_ERR_MISSING:
            return Status::kNotFound;
        case ORV_ERR_GENERAL:
            return Status::kBroken;
        default:
            return Status::kBadRequest;
    }
}

void receive(Output& out, const Link& link, const std::string& name, long long length) {
    VEXO::LinkSeat seat;
    VEXO::LinkSeat::Others others;
    const VEXO::LinkSeat::Taking taking = seat.take(link.id, clientAddress(), length, others);
    if (taking == VEXO::LinkSeat::Taking::kFailed) return replyFailure(out, Status::kBroken, "", ORV_ERR_GENERAL, "");
    if (taking == VEXO::LinkSeat::Taking::kNone) {
        out.text() += "Retry-After: 5\r\n";
        return replyFailure(out, Status::kTooMany, "", ORV_ERR_BUSY, "");
    }
    if (isFull(link, others, length)) return replyFull(out);
    const int code = store(link, name, length, seat);
    if (code == kLinkFull) return replyFull(out);
    // A path would say where the file went.
    code == ORV_ERR_NONE ? reply(out, Status::kOk, "", code, "", {}) : replyFailure(out, statusFor(code), "", code, "");
}

}  // namespace

void serveSendProgram(Request& request, Output& out) {
    Visit visit(request.web);
    if (visit.availability() != Availability::kOpen) return refuse(out, visit.availability());
    if (!visit.link().receives) return refuse(out, Availability::kNone);
    const Session session = visit.session();
    if (session == Session::kUnknown) return replyFailure(out, Status::kBroken, "", ORV_ERR_GENERAL, "");
    if (session == Session::kOut)
        return replyFailure(out, Status::kNotLoggedIn, visit.dropCookie(), ORV_ERR_DENIED, "");
    // No form, which another site's page could send, and which could hold any number of files.
    const std::string type = variable("CONTENT_TYPE");
    if (type.substr(0, type.find(';')) != "application/octet-stream")
        return replyFailure(out, Status::kUnsupportedType, "", ORV_ERR_PARAMETER, "");
    const auto name = bytesParam(request.web, "name");
    if (!name || !isName(*name)) return replyFailure(out, Status::kBadRequest, "", ORV_ERR_PARAMETER, "");
    const auto length = bodyLength();
    if (!length) return replyFailure(out, Status::kBadRequest, "", ConvUploadErrnoToAPIErr(CGI_UPLOAD_SIZE), "");
    receive(out, visit.link(), *name, *length);
}

}  // namespace orvel::cgi
