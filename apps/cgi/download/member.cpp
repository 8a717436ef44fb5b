#include "download/member.h"

#include <cstdlib>

#include "archive_library.h"
#include "archive_reader.h"
#include "base/file.h"
#include "memory_limit.h"
#include "operation/member_path.h"
#include "operation/unpack.h"
#include "orvel/activity_log.h"
#include "orvel/error_state.h"

namespace orvel::cgi {
namespace {

// A walk through the members of an archive, to one of them.
class MemberReader {
 public:
    MemberReader(const Source& source, const std::string& password)
        : source_(openArchive(source.opened.get(), password, code_)),
          limits_(UnpackLimits::of(source.status.st_size)),
          hasPassword_(!password.empty()) {}

    // Stands on the file, whose first piece is read: what is wrong with it shows. 0 or a code.
    int find(const std::vector<std::string>& wanted);
    [[nodiscard]] archive_entry* entry() const { return entry_; }
    // Takes one piece after the other until the file ends (0) or cannot be read on (a code). `take` says whether to go
    // on.
    template <class Take>
    int each(Take take);

 private:
    int next();
    int readPiece();

    int code_ = 0;
    OpenedArchive source_;
    UnpackLimits limits_;
    bool hasPassword_;
    archive_entry* entry_ = nullptr;
    const void* piece_ = nullptr;
    size_t size_ = 0;
    la_int64_t offset_ = 0;
    long long bytes_ = 0, members_ = 0;
    bool ended_ = false;
};

int MemberReader::next() {
    for (;;) {
        const int result = libarchive.archive_read_next_header(source_.get(), &entry_);
        if (result == ARCHIVE_RETRY) continue;
        if (result == ARCHIVE_EOF) return ORV_ERR_MISSING;
        if (result >= ARCHIVE_WARN) break;
        if (wantsTooMuchMemory(source_.get())) return kArchiveDemanding.code;
        if (members_ == 0 && hidesNames(source_.get())) return kArchiveLocked.code;
        return members_ == 0 ? ORV_ERR_ARCHIVE : ORV_ERR_ARCHIVE_DATA;
    }
    return ++members_ > limits_.members ? static_cast<int>(ORV_ERR_FILE_TOO_BIG) : ORV_ERR_NONE;
}

int MemberReader::readPiece() {
    for (;;) {
        const int result = libarchive.archive_read_data_block(source_.get(), &piece_, &size_, &offset_);
        if (result == ARCHIVE_RETRY) continue;
        ended_ = result == ARCHIVE_EOF;
        if (ended_) size_ = 0;
        if (ended_ || result >= ARCHIVE_WARN) break;
        if (wantsTooMuchMemory(source_.get())) return kArchiveDemanding.code;
        const bool locked = libarchive.archive_entry_is_encrypted(entry_) != 0;
        return locked ? ORV_ERR_ARCHIVE_PASSWORD : ORV_ERR_ARCHIVE_DATA;
    }
    bytes_ += static_cast<long long>(size_);
    // A hole counts as what it is read as.
    const bool tooFar = offset_ < 0 || offset_ > limits_.bytes - static_cast<long long>(size_);
    return tooFar || bytes_ > limits_.bytes ? static_cast<int>(ORV_ERR_FILE_TOO_BIG) : ORV_ERR_NONE;
}

int MemberReader::find(const std::vector<std::string>& wanted) {
    if (source_ == nullptr) return code_;
    for (;;) {
        int code = next();
        if (code != ORV_ERR_NONE) return code;
        const bool isFile = libarchive.archive_entry_filetype(entry_) == AE_IFREG &&
                            libarchive.archive_entry_hardlink(entry_) == nullptr;
        if (isFile && memberComponents(nameOfMember(source_.get(), entry_)) == wanted) break;
        while (readsThrough(source_.get()) && code == ORV_ERR_NONE && !ended_) code = readPiece();
        if (code == ORV_ERR_FILE_TOO_BIG) return code;
        ended_ = false;
    }
    bytes_ = 0;
    if (libarchive.archive_entry_is_encrypted(entry_) != 0) {
        if (!takesPassword(source_.get())) return kArchiveLocked.code;
        if (!hasPassword_) return ORV_ERR_ARCHIVE_PASSWORD;
    }
    if (libarchive.archive_entry_size(entry_) > limits_.bytes) return ORV_ERR_FILE_TOO_BIG;
    return readPiece();
}

template <class Take>
int MemberReader::each(Take take) {
    for (;;) {
        if (ended_) return ORV_ERR_NONE;
        if (!take(static_cast<const char*>(piece_), size_, static_cast<long long>(offset_))) return ORV_ERR_NONE;
        const int code = readPiece();
        if (code != ORV_ERR_NONE) return code;
    }
}

void refuse(Output& out, const User& user, int code, const std::string& path) {
    for (const ArchiveRefusal& own : {kArchiveLocked, kArchiveDemanding}) {
        if (code == own.code) return replyOwnFailure(out, Status::kBroken, user.cookie, code, own.key, path, {});
    }
    replyFailure(out, httpStatusOf(code), user.cookie, code, path);
}

// What the archive leaves out between two pieces is zero.
bool writeZeros(long long count) {
    const std::string zeros(64 * 1024, '\0');
    for (; count > 0; count -= static_cast<long long>(zeros.size())) {
        const auto size = std::min<size_t>(zeros.size(), static_cast<size_t>(count));
        if (!writeAll(STDOUT_FILENO, std::string_view(zeros).substr(0, size))) return false;
    }
    return true;
}

}  // namespace

void serveMember(Output& out, const User& user, const VEXO::WebCGI& web, const std::vector<Source>& sources) {
    const auto inside = bytesParam(web, "inside");
    const auto wanted = memberComponents(inside.value_or(""));
    const std::string password = web.GetParam("password", "");
    const Source& source = sources.front();
    if (!wanted || sources.size() != 1 || !isArchivePassword(password) || (!password.empty() && !isPosted()))
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, source.asked);
    if (!S_ISREG(source.status.st_mode)) return refuse(out, user, ORV_ERR_ARCHIVE, source.path);
    boundMemory(kArchiveMemory);
    MemberReader reader(source, password);
    const int code = reader.find(*wanted);
    if (code == ORV_ERR_MISSING) return refuse(out, user, code, source.path + "/" + *inside);
    if (code != ORV_ERR_NONE) return refuse(out, user, code, source.path);
    out.text() += "Status: 200 OK\r\n";
    putCommon(out, user.cookie, wanted->back(), "application/octet-stream");
    const bool sized = libarchive.archive_entry_size_is_set(reader.entry()) != 0;
    const long long size = sized ? libarchive.archive_entry_size(reader.entry()) : -1;
    if (sized) out.text() += "Content-Length: " + std::to_string(size) + "\r\n";
    out.text() += "\r\n";
    if (std::string_view(getenv("REQUEST_METHOD")) == "HEAD" || !out.finish()) return;
    long long sent = 0;
    const auto take = [&](const char* piece, size_t length, long long offset) {
        if (offset < sent || !writeZeros(offset - sent)) return false;
        sent = offset;
        // No more than was announced.
        const long long rest =
            sized ? std::min(size - sent, static_cast<long long>(length)) : static_cast<long long>(length);
        if (rest < 0 || !writeAll(STDOUT_FILENO, std::string_view(piece, static_cast<size_t>(rest)))) return false;
        sent += rest;
        return true;
    };
    if (reader.each(take) == ORV_ERR_NONE && sized && sent < size) static_cast<void>(writeZeros(size - sent));
    OrvLibDoLog(user.name, source.path, sent, ORVEL_ACTION_DOWNLOAD, false);
}

}  // namespace orvel::cgi
