// CGI program "upload": files into a share.
//
// As a raw body (PUT, or POST of any type but a form), from the query:
//   path, path_raw   the file
// As a form (POST multipart/form-data), from the query or from fields ahead of the files:
//   path, path_raw   the folder; each file goes into it under its own name
// And for both:
//   overwrite        "error" (default), "skip" or "overwrite": what an existing file means
//   taskid           a search whose results shall show the files
//   If-Match         (header, of a raw body) stores the file only in the place of the one with this tag of download
//   If-None-Match    "*" (the same): only where there is no file
//   mtime            seconds: when the file was modified; in a form a field ahead of each file that has one
//
// "data" of the reply is {"files":[{"path","size","skipped"}]}. The first file that cannot be stored ends the request;
// those before it stay, and are listed in "data" beside the error. Folders that do not exist are made.
#include <json/value.h>

#include <cstdint>
#include <cstdlib>
#include <ctime>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "multipart.h"
#include "orvel/error_state.h"
#include "orvel/upload_check.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "search_task.h"
#include "text.h"
#include "upload/body.h"
#include "upload/store.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

constexpr size_t kLongestField = 64 * 1024;

std::optional<_tag__type_> modeOf(const std::string& word) {
    if (word == "error") return OVERWRITE_MODE_ERROR;
    if (word == "skip") return OVERWRITE_MODE_SKIP;
    if (word == "overwrite") return OVERWRITE_MODE_OVERWRITE;
    return std::nullopt;
}

bool isNoneOrTask(const std::string& search) {
    return search.empty() || isTaskId(search);
}

// The time that was asked for, none for ""; false for what is no time.
bool modifiedOf(const std::string& text, std::optional<time_t>& modified) {
    modified.reset();
    if (text.empty()) return true;
    const auto number = parseNumber(text);
    if (number && *number <= UINT32_MAX) modified = static_cast<time_t>(*number);
    return modified.has_value();
}

struct Outcome {
    Status status = Status::kOk;
    int code = ORV_ERR_NONE;
    std::string path;  // of the failure
    std::vector<Json::Value> files;

    bool fail(int libraryCode, const std::string& where, Status httpStatus = Status::kOk) {
        status = httpStatus;
        code = libraryCode;
        path = where;
        return false;
    }
    bool refuse(_tag_cgi_upload_errno_ error, const std::string& where) {
        return fail(ConvUploadErrnoToAPIErr(error), where, Status::kBadRequest);
    }
    // A condition that is not met is no failure of the library's.
    [[nodiscard]] const char* ownKey() const {
        return code == kUploadChanged ? "upload_changed" : code == kUploadInUse ? "upload_in_use" : nullptr;
    }
    bool stored(const Upload& upload) {
        Json::Value file;
        putPath(file, "path", upload.path());
        file["size"] = static_cast<Json::Int64>(upload.size());
        file["skipped"] = upload.skipped();
        if (!upload.tag().empty()) file["etag"] = upload.tag();
        files.push_back(file);
        return true;
    }
};

std::string variable(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
}

bool isConditional() {
    return !variable("HTTP_IF_MATCH").empty() || !variable("HTTP_IF_NONE_MATCH").empty();
}

// Nothing for conditions that an upload does not know.
std::optional<Condition> readCondition() {
    const std::string none = variable("HTTP_IF_NONE_MATCH");
    Condition condition = {.match = variable("HTTP_IF_MATCH"), .mustBeNew = none == "*"};
    if ((!none.empty() && !condition.mustBeNew) || (condition.mustBeNew && !condition.match.empty()))
        return std::nullopt;
    return condition;
}

void storeRaw(const User& user, const VEXO::WebCGI& web, long long length, Outcome& outcome) {
    const auto path = pathParam(web);
    const auto mode = modeOf(web.GetParam("overwrite", "error"));
    const std::string search = web.GetParam("taskid", "");
    const auto condition = readCondition();
    std::optional<time_t> modified;
    if (!path || !mode || !condition || !isNoneOrTask(search) || !modifiedOf(web.GetParam("mtime", ""), modified)) {
        outcome.fail(ORV_ERR_PARAMETER, web.GetParam("path", ""), Status::kBadRequest);
        return;
    }
    Upload upload(user, *path, *mode, search, modified, *condition);
    int code = upload.begin();
    bool whole = false;
    if (code == ORV_ERR_NONE) {
        readBody(length, whole, [&](std::string_view data) { return (code = upload.write(data)) == ORV_ERR_NONE; });
    }
    if (code == ORV_ERR_NONE && !whole) {
        outcome.refuse(CGI_UPLOAD_SIZE, upload.path());
        return;
    }
    if (code == ORV_ERR_NONE) code = upload.finish();
    static_cast<void>(code == ORV_ERR_NONE ? outcome.stored(upload) : outcome.fail(code, upload.path()));
}

// Takes the parts of a form: fields until the first file, then files.
class FormStore final : public PartSink {
 public:
    FormStore(const User& user, const VEXO::WebCGI& web, Outcome& outcome)
        : user_(user),
          folder_(pathParam(web)),
          mode_(web.GetParam("overwrite", "error")),
          search_(web.GetParam("taskid", "")),
          outcome_(outcome) {}

    bool partBegin(const PartHeader& header) override {
        field_ = header.isFile ? "" : header.name;
        value_.clear();
        if (!header.isFile || header.fileName.empty()) return true;  // a form's file field that was left empty
        const auto mode = modeOf(mode_);
        std::optional<time_t> modified;
        const bool usable =
            folder_ && !folder_->empty() && mode && isNoneOrTask(search_) && modifiedOf(mtime_, modified);
        if (!usable) return outcome_.refuse(CGI_UPLOAD_FIELD, folder_.value_or(""));
        const char* separator = folder_->ends_with('/') ? "" : "/";
        upload_ = std::make_unique<Upload>(user_, *folder_ + separator + header.fileName, *mode, search_, modified);
        mtime_.clear();
        return proceed(upload_->begin());
    }

    bool partData(std::string_view data) override {
        if (upload_ != nullptr) return proceed(upload_->write(data));
        if (field_.empty()) return true;
        value_ += data;
        return value_.size() <= kLongestField || outcome_.refuse(CGI_UPLOAD_FIELD, "");
    }

    bool partEnd() override {
        if (upload_ != nullptr) {
            if (!proceed(upload_->finish())) return false;
            outcome_.stored(*upload_);
            upload_.reset();
            return true;
        }
        if (value_.find('\0') != std::string::npos) return outcome_.refuse(CGI_UPLOAD_FIELD, "");
        if (field_ == "path") folder_ = value_;
        if (field_ == "path_raw") folder_ = percentDecode(value_);
        if (field_ == "overwrite") mode_ = value_;
        if (field_ == "taskid") search_ = value_;
        if (field_ == "mtime") mtime_ = value_;
        return true;
    }

 private:
    bool proceed(int code) { return code == ORV_ERR_NONE || outcome_.fail(code, upload_->path()); }

    const User& user_;
    std::optional<std::string> folder_;
    std::string mode_, search_;
    std::string mtime_;  // of the next file
    Outcome& outcome_;
    std::string field_, value_;
    std::unique_ptr<Upload> upload_;
};

void storeForm(const User& user, const VEXO::WebCGI& web, const std::string& boundary, long long length,
               Outcome& outcome) {
    FormStore store(user, web, outcome);
    MultipartReader reader(boundary, store);
    bool whole = false;
    readBody(length, whole, [&](std::string_view data) {
        const auto status = reader.feed(data);
        return status == MultipartReader::Status::kMore || status == MultipartReader::Status::kDone;
    });
    if (outcome.code != ORV_ERR_NONE) return;
    if (reader.status() == MultipartReader::Status::kMalformed) outcome.refuse(CGI_UPLOAD_BAD_FORM, "");
    if (reader.status() == MultipartReader::Status::kMore) outcome.refuse(CGI_UPLOAD_TORN_FORM, "");
}

void receive(const User& user, const VEXO::WebCGI& web, Outcome& outcome) {
    const std::string method = variable("REQUEST_METHOD"), type = variable("CONTENT_TYPE");
    const auto length = bodyLength();
    const bool posted = method == "POST";
    if ((!posted && method != "PUT") || (posted && isConditional() && type.starts_with("multipart/"))) {
        outcome.fail(ORV_ERR_PARAMETER, "", Status::kBadRequest);
    } else if (!length) {
        outcome.refuse(CGI_UPLOAD_SIZE, "");
    } else if (const std::string boundary = boundaryOf(type); posted && !boundary.empty()) {
        storeForm(user, web, boundary, *length, outcome);
    } else if (posted && (type.starts_with("multipart/") || type.starts_with("application/x-www-form-urlencoded"))) {
        outcome.refuse(CGI_UPLOAD_BAD_FORM, "");
    } else {
        storeRaw(user, web, *length, outcome);
    }
}

}  // namespace

void serveUploadProgram(Request& request, Output& out) {
    static_cast<void>(isCancelled());  // from here on
    const User& user = request.user;
    const VEXO::WebCGI& web = request.web;
    Outcome outcome;
    receive(user, web, outcome);
    Json::Value data;
    data["files"] = Json::Value(Json::arrayValue);
    for (const Json::Value& file : outcome.files) data["files"].append(file);
    if (const char* key = outcome.ownKey(); key != nullptr)
        return replyOwnFailure(out, Status::kChanged, user.cookie, outcome.code, key, outcome.path, data);
    reply(out, outcome.status, user.cookie, outcome.code, outcome.path, data);
}

}  // namespace orvel::cgi
