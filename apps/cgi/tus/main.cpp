// CGI program "tus": uploads that go on after an interruption, by the protocol tus 1.0.0 (tus.io) with its extensions
// creation, creation-with-upload, termination, expiration and checksum.
//
//   OPTIONS  what is known
//   POST     begins an upload; from the query:
//              path, path_raw   the file, or with a "filename" in Upload-Metadata the folder that it goes into
//              conflict         "error" (default), "skip", "overwrite" or "keep_both": what an existing file means
//              mtime            seconds: when the file was modified
//              taskid           a search whose results shall show the file
//   HEAD     how much of it is there (?id=); where that is all of it the file has its name after this
//   PATCH    appends; with the last piece the file gets its name
//   DELETE   ends it and removes what is there; while another request is at work on it, that one is waited for: as many
//            seconds as "wait" says
//   GET      the user's uploads that are not over; not of the protocol
#include <json/value.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <memory>
#include <optional>
#include <string>

#include "download/range.h"
#include "orvel/error_state.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "search_task.h"
#include "text.h"
#include "tus/resumable.h"
#include "tus/status.h"
#include "tus/unfinished.h"
#include "upload/body.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

constexpr const char* kVersion = "1.0.0";
constexpr const char* kExtensions = "creation,creation-with-upload,termination,expiration,checksum";
constexpr unsigned long kLongestWait = 10;  // seconds
constexpr const char* kPieceType = "application/offset+octet-stream";

std::string variable(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
}

std::optional<long long> lengthHeader(const char* name) {
    const auto number = parseNumber(variable(name));
    if (!number || *number > static_cast<unsigned long>(INT64_MAX)) return std::nullopt;
    return static_cast<long long>(*number);
}

// How a refusal shows to a client that knows the protocol alone. Such a client takes 404 for an upload that is gone,
// and tries again after 409, 423 and all from 500 on.
Status refusalStatus(int code) {
    switch (code) {
        case ORV_ERR_PARAMETER:
        case ORV_ERR_LONG_PATH:
        case ORV_ERR_RESERVED_NAME:
        case ORV_ERR_FAT_NAME:
        case ORV_ERR_UPLOAD_SIZE:
            return Status::kBadRequest;
        case ORV_ERR_EXISTS:
            return Status::kChanged;
        case ORV_ERR_QUOTA:
        case ORV_ERR_NO_SPACE:
            return kStatusNoSpace;
        case ORV_ERR_UPLOAD_TOO_LARGE:
            return Status::kTooLarge;
        case ORV_ERR_BUSY:
            return kStatusLocked;
        case ORV_ERR_MISSING:
        case ORV_ERR_DENIED:
        case ORV_ERR_READ_ONLY:
            return Status::kForbidden;
        default:
            return Status::kBroken;
    }
}

class TusRequest {
 public:
    TusRequest(Request& request, Output& out)
        : user_(request.user), web_(request.web), out_(out), resumable_(request.user) {}

    void serve(const std::string& method) {
        header("Tus-Resumable", kVersion);
        if (method == "OPTIONS") return options();
        if (method == "GET") return list();
        if (variable("HTTP_TUS_RESUMABLE") != kVersion) {
            header("Tus-Version", kVersion);
            return refuse(Status::kChanged, ORV_ERR_PARAMETER, "");
        }
        if (method == "POST") return create();
        if (method == "HEAD") return look();
        if (method == "PATCH") return append();
        if (method == "DELETE") return remove();
        header("Allow", "OPTIONS, GET, HEAD, POST, PATCH, DELETE");
        refuse(Status::kMethodNotAllowed, ORV_ERR_PARAMETER, "");
    }

 private:
    void header(const char* name, const std::string& value) {
        out_.text().append(name).append(": ").append(value).append("\r\n");
    }
    void refuse(Status status, int code, const std::string& path) {
        replyFailure(out_, status, user_.cookie, code, path);
    }
    void refuse(int code) { refuse(refusalStatus(code), code, resumable_.path()); }

    void options() {
        header("Tus-Version", kVersion);
        header("Tus-Extension", kExtensions);
        header("Tus-Max-Size", std::to_string(mostUnfinishedBytes()));
        header("Tus-Checksum-Algorithm", kChecksums);
        beginReply(out_, kStatusNoContent, user_.cookie);
    }

    // What each reply about an upload says of it.
    void describe() {
        const UploadRecord& record = resumable_.record();
        header("Upload-Offset", std::to_string(resumable_.offset()));
        header("Upload-Expires", httpDate(record.expires()));
        if (!record.isOver()) return;
        if (record.state() == UploadState::kSkipped) header("Orvel-Skipped", "1");
        if (record.state() == UploadState::kDone) header("Orvel-Path", percentEncode(resumable_.path()));
    }

    // False for metadata that cannot be read. A name in them is that of the file.
    static bool readMetadata(const std::string& metadata, std::string& fileName) {
        if (metadata.size() > kLongestMetadata) return false;
        for (size_t begin = 0; begin < metadata.size();) {
            const size_t end = std::min(metadata.find(',', begin), metadata.size());
            const size_t blank = std::min(metadata.find(' ', begin), end);
            const std::string key = metadata.substr(begin, blank - begin);
            const auto value = base64Decode(
                std::string_view(metadata).substr(std::min(blank + 1, end), end - std::min(blank + 1, end)));
            const bool plain = std::all_of(key.begin(), key.end(), [](char c) { return c > ' ' && c < 0x7F; });
            if (key.empty() || !plain || !value) return false;
            if (key == "filename") fileName = *value;
            begin = metadata.find_first_not_of(' ', end + 1);
        }
        return true;
    }

    bool readFacts(UploadFacts& facts) const {
        const auto path = pathParam(web_);
        const auto length = lengthHeader("HTTP_UPLOAD_LENGTH");
        const std::string modified = web_.GetParam("mtime", "");
        std::string name;
        facts.conflict = web_.GetParam("conflict", "error");
        facts.search = web_.GetParam("taskid", "");
        facts.metadata = variable("HTTP_UPLOAD_METADATA");
        if (!path || path->empty() || !length || !isConflict(facts.conflict) ||
            (!facts.search.empty() && !isTaskId(facts.search)))
            return false;
        if (!readMetadata(facts.metadata, name) || name.find('/') != std::string::npos) return false;
        facts.path = *path;
        facts.size = *length;
        if (!name.empty()) facts.path += (path->ends_with('/') ? "" : "/") + name;
        if (modified.empty()) return true;
        const auto seconds = parseNumber(modified);
        if (seconds && *seconds <= UINT32_MAX) facts.modified = static_cast<time_t>(*seconds);
        return facts.modified.has_value();
    }

    void create() {
        UploadFacts facts;
        if (!readFacts(facts)) return refuse(Status::kBadRequest, ORV_ERR_PARAMETER, web_.GetParam("path", ""));
        if (facts.size > mostUnfinishedBytes()) return refuse(Status::kTooLarge, ORV_ERR_UPLOAD_TOO_LARGE, facts.path);
        const bool withPiece = variable("CONTENT_TYPE") == kPieceType;
        std::optional<Checksum> checksum;
        if (withPiece && !readChecksum(checksum)) return refuse(Status::kBadRequest, ORV_ERR_PARAMETER, facts.path);
        const std::string path = facts.path;
        const int code = resumable_.create(std::move(facts));
        if (code != ORV_ERR_NONE) {
            const Status status = code == ORV_ERR_MISSING ? Status::kNotFound : refusalStatus(code);
            return refuse(status, code, path);
        }
        // Relative to the address of the request, which is another one to a client behind a proxy.
        header("Location", "?id=" + resumable_.record().id());
        // What became of a piece that came along is in the offset; a file that cannot have its name is told so when it
        // is asked about.
        Piece piece = Piece::kTaken;
        if (withPiece) {
            static_cast<void>(resumable_.append(0, bodyLength().value_or(0), std::move(checksum), piece));
        } else if (resumable_.isWhole()) {
            static_cast<void>(resumable_.complete());
        }
        describe();
        Json::Value data;
        data["id"] = resumable_.record().id();
        data["offset"] = static_cast<Json::Int64>(resumable_.offset());
        reply(out_, kStatusCreated, user_.cookie, ORV_ERR_NONE, "", data);
    }

    // False when it was refused.
    bool open(bool lock) {
        // A name that was found to be taken may be answered by now.
        const std::string conflict = web_.GetParam("conflict", "");
        if (!conflict.empty() && !isConflict(conflict))
            return refuse(Status::kBadRequest, ORV_ERR_PARAMETER, ""), false;
        resumable_.answer(conflict);
        const int code = resumable_.open(web_.GetParam("id", ""), lock);
        if (code == ORV_ERR_NONE) return true;
        refuse(code == ORV_ERR_MISSING ? Status::kNotFound : refusalStatus(code), code,
               resumable_.record().facts().path);
        return false;
    }

    void look() {
        if (!open(false)) return;
        // A client asks no further once all is there, so this is when the name is given, if the piece did not come to
        // it.
        if (resumable_.isWhole() && !resumable_.record().isOver()) {
            if (!open(true)) return;
            const int code = resumable_.complete();
            if (code != ORV_ERR_NONE) {
                describe();
                return refuse(code);
            }
        }
        header("Upload-Length", std::to_string(resumable_.record().facts().size));
        const std::string& metadata = resumable_.record().facts().metadata;
        if (!metadata.empty()) header("Upload-Metadata", metadata);
        describe();
        beginReply(out_, Status::kOk, user_.cookie);
    }

    // False for a checksum that cannot be read, or of an algorithm that is not known.
    static bool readChecksum(std::optional<Checksum>& checksum) {
        const std::string header = variable("HTTP_UPLOAD_CHECKSUM");
        checksum = Checksum::parse(header);
        return header.empty() || checksum;
    }

    void append() {
        const auto offset = lengthHeader("HTTP_UPLOAD_OFFSET"), length = bodyLength();
        std::optional<Checksum> checksum;
        if (variable("CONTENT_TYPE") != kPieceType) return refuse(Status::kUnsupportedType, ORV_ERR_PARAMETER, "");
        if (!offset || !length || !readChecksum(checksum)) return refuse(Status::kBadRequest, ORV_ERR_PARAMETER, "");
        if (!open(true)) return;
        Piece piece = Piece::kTaken;
        const int code = resumable_.append(*offset, *length, std::move(checksum), piece);
        describe();
        switch (piece) {
            case Piece::kTaken:
                return beginReply(out_, kStatusNoContent, user_.cookie);
            case Piece::kTooLong:
                return refuse(Status::kTooLarge, ORV_ERR_UPLOAD_SIZE, resumable_.path());
            case Piece::kOtherOffset:
                return refuse(kStatusConflict, ORV_ERR_UPLOAD_SIZE, resumable_.path());
            case Piece::kCut:
                return refuse(Status::kBadRequest, ORV_ERR_UPLOAD_SIZE, resumable_.path());
            case Piece::kMismatch:
                return refuse(kStatusMismatch, ORV_ERR_UPLOAD_OTHER, resumable_.path());
            case Piece::kFailed:
                return refuse(code);
        }
    }

    void remove() {
        const auto wait = parseNumber(web_.GetParam("wait", "0"));
        if (!wait || *wait > kLongestWait) return refuse(Status::kBadRequest, ORV_ERR_PARAMETER, "");
        const int code = resumable_.open(web_.GetParam("id", ""), true, std::chrono::seconds(*wait));
        // Where its share is gone it can be ended all the same.
        if (code != ORV_ERR_NONE && !resumable_.isLocked()) {
            return refuse(code == ORV_ERR_MISSING ? Status::kNotFound : refusalStatus(code), code, "");
        }
        resumable_.remove();
        beginReply(out_, kStatusNoContent, user_.cookie);
    }

    void list() {
        const int code = actAs(user_.sid.c_str(), user_.name, false);
        if (code != ORV_ERR_NONE) return refuse(Status::kBroken, code, "");
        reply(out_, Status::kOk, user_.cookie, ORV_ERR_NONE, "", unfinishedReply(user_));
    }

    const User& user_;
    const VEXO::WebCGI& web_;
    Output& out_;
    Resumable resumable_;
};

}  // namespace

void serveTusProgram(Request& request, Output& out) {
    static_cast<void>(isCancelled());  // from here on
    std::string method = variable("HTTP_X_HTTP_METHOD_OVERRIDE");
    if (method.empty()) method = variable("REQUEST_METHOD");
    TusRequest(request, out).serve(method);
}

}  // namespace orvel::cgi
