#include "reply.h"

#include <json/value.h>

#include "base/json_text.h"
#include "text.h"
#include "tus/status.h"
#include "vexo/error.h"

namespace orvel::cgi {
namespace {

std::string_view statusLine(Status status) {
    if (status == kStatusCreated) return "Status: 201 Created\r\n";
    if (status == kStatusNoContent) return "Status: 204 No Content\r\n";
    if (status == kStatusConflict) return "Status: 409 Conflict\r\n";
    if (status == kStatusLocked) return "Status: 423 Locked\r\n";
    if (status == kStatusMismatch) return "Status: 460 Checksum Mismatch\r\n";
    if (status == kStatusNoSpace) return "Status: 507 Insufficient Storage\r\n";
    switch (status) {
        case Status::kOk:
            return "Status: 200 OK\r\n";
        case Status::kBadRequest:
            return "Status: 400 Bad Request\r\n";
        case Status::kNotLoggedIn:
            return "Status: 401 Unauthorized\r\n";
        case Status::kForbidden:
            return "Status: 403 Forbidden\r\n";
        case Status::kNotFound:
            return "Status: 404 Not Found\r\n";
        case Status::kMethodNotAllowed:
            return "Status: 405 Method Not Allowed\r\n";
        case Status::kGone:
            return "Status: 410 Gone\r\n";
        case Status::kChanged:
            return "Status: 412 Precondition Failed\r\n";
        case Status::kTooLarge:
            return "Status: 413 Content Too Large\r\n";
        case Status::kUnsupportedType:
            return "Status: 415 Unsupported Media Type\r\n";
        case Status::kTooMany:
            return "Status: 429 Too Many Requests\r\n";
        case Status::kBusy:
            return "Status: 503 Service Unavailable\r\nRetry-After: 2\r\n";
        case Status::kBroken:
            break;
    }
    return "Status: 500 Internal Server Error\r\n";
}

// What a failure says, `before` being other members of the reply.
void appendFailure(std::string_view before, int code, const char* key, std::string_view path, std::string& out) {
    out.append("{").append(before).append("\"error\":{\"code\":").append(std::to_string(code)).append(",\"key\":");
    appendJsonText(key, out);
    out += ",\"path\":";
    appendJsonText(readable(path), out);
    if (!isUtf8(path)) {
        out += ",\"path_raw\":";
        appendJsonText(percentEncode(path), out);
    }
    out += "},\"success\":false}";
}

std::string dataMember(const Json::Value& data) {
    std::string text;
    if (data.isNull()) return text;
    text = "\"data\":";
    appendJson(data, text);
    return text += ',';
}

}  // namespace

void beginReply(Output& out, Status status, const std::string& cookie) {
    out.text() += statusLine(status);
    out.text() +=
        "Content-Type: application/json; charset=UTF-8\r\n"
        "X-Content-Type-Options: nosniff\r\n"
        "Cache-Control: no-store\r\n";
    if (!cookie.empty()) out.text() += "Set-Cookie: " + cookie + "\r\n";
    out.text() += "\r\n";
}

int lastCode(int fallback) {
    const int code = OrvLibGetErr();
    return code != ORV_ERR_NONE ? code : fallback;
}

int platformCode() {
    const int code = OrvParseVexoErrToError(VLIBCErrGet(), nullptr);
    return code != ORV_ERR_NONE ? code : ORV_ERR_GENERAL;
}

void putPath(Json::Value& object, const char* key, std::string_view path) {
    object[key] = readable(path);
    if (!isUtf8(path)) object[std::string(key) + "_raw"] = percentEncode(path);
}

void reply(Output& out, Status status, const std::string& cookie, int code, std::string_view path,
           const Json::Value& data) {
    if (code != ORV_ERR_NONE) {
        return replyOwnFailure(out, status, cookie, code, OrvParseErrorToKTRString(code, nullptr), path, data);
    }
    beginReply(out, status, cookie);
    out.text().append("{").append(dataMember(data)).append("\"success\":true}");
}

void replyOwnFailure(Output& out, Status status, const std::string& cookie, int code, const char* key,
                     std::string_view path, const Json::Value& data) {
    beginReply(out, status, cookie);
    appendFailure(dataMember(data), code, key, path, out.text());
}

void replyFailure(Output& out, Status status, const std::string& cookie, int code, std::string_view path) {
    beginReply(out, status, cookie);
    appendFailure("", code, OrvParseErrorToKTRString(code, nullptr), path, out.text());
}

}  // namespace orvel::cgi
