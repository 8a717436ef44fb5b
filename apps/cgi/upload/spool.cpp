#include "upload/spool.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>

#include <array>
#include <cerrno>
#include <ctime>
#include <vector>

#include "base/file.h"
#include "base/random.h"
#include "folder_names.h"
#include "orvel/error_state.h"
#include "orvel/upload_check.h"
#include "temporary_folder.h"

namespace orvel::cgi {
namespace {

constexpr std::string_view kPrefix = "part-";
constexpr time_t kAbandonedAfter = 3600;  // seconds

}  // namespace

// What nobody holds the lock of and has not been written to for a while (a file is unlocked for a moment after it was
// made).
long removeAbandonedUploads(const Descriptor& folder, const std::function<bool(const std::string& id)>& isKept) {
    std::vector<std::string> names;
    if (!namesIn(folder.get(), Hidden::kInclude, names)) return -1;
    long removed = 0;
    for (const std::string& name : names) {
        const bool between = name.starts_with(kKeptPrefix);
        if (between && (isKept == nullptr || isKept(name.substr(kKeptPrefix.size())))) continue;
        if (!between && !name.starts_with(kPrefix) && !isPartName(name)) continue;
        const Descriptor file(openat(folder.get(), name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
        struct stat status {};
        const bool old = file && fstat(file.get(), &status) == 0 && status.st_mtime < time(nullptr) - kAbandonedAfter;
        if (!old || !lockFile(file.get(), LOCK_EX | LOCK_NB)) continue;
        if (unlinkat(folder.get(), name.c_str(), 0) == 0) ++removed;
    }
    return removed;
}

int uploadCodeOf(int error) {
    switch (error) {
        case EDQUOT:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_QUOTA);
        case ENOSPC:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_NO_SPACE);
        case EROFS:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_READ_ONLY);
        case ENOENT:
        case ENOTDIR:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_MISSING);
        case EACCES:
        case EPERM:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_DENIED);
        case EFBIG:
            return ORV_ERR_UPLOAD_TOO_LARGE;
        case ECANCELED:
            return ORV_ERR_UPLOAD_CANCELLED;
        case EEXIST:
        case EISDIR:
            return ORV_ERR_EXISTS;
        case ENAMETOOLONG:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_NAME_TOO_LONG);
        case EINVAL:  // of a name that was accepted before: the file system cannot hold it
            return ORV_ERR_FAT_NAME;
        default:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_WRITE);
    }
}

Spool::~Spool() {
    if (named_) unlinkat(folder_.get(), name_.c_str(), 0);
}

// "@tmp/orvel" is everybody's to write in: nothing in it is used that is not the caller's alone.
int Spool::openFolder(const std::string& volumePath) {
    const Descriptor temporary = openTemporaryFolder(volumePath);
    if (temporary) folder_ = openOwnFolder(temporary, "upload-" + std::to_string(geteuid()));
    if (folder_) return ORV_ERR_NONE;
    const bool inTheWay = errno == ENOTDIR || errno == ELOOP;
    return inTheWay ? ConvUploadErrnoToAPIErr(CGI_UPLOAD_DENIED) : uploadCodeOf(errno);
}

int Spool::open(const std::string& volumePath) {
    const int code = openFolder(volumePath);
    if (code != ORV_ERR_NONE) return code;
    static_cast<void>(removeAbandonedUploads(folder_));
    const std::string drawn = draw<16>();
    if (drawn.empty()) return uploadCodeOf(errno);
    name_ = std::string(kPrefix) + drawn;
    file_.emplace(folder_.get());
    if (!file_->create(name_, 0600)) return uploadCodeOf(errno);
    static_cast<void>(
        lockFile(file_->get(), LOCK_EX | LOCK_NB));  // see removeAbandoned; where locks are unknown, age alone decides
    return ORV_ERR_NONE;
}

int Spool::openKept(const std::string& volumePath, const std::string& id, bool make) {
    const int code = openFolder(volumePath);
    if (code != ORV_ERR_NONE) return code;
    if (make) static_cast<void>(removeAbandonedUploads(folder_));
    name_.assign(kKeptPrefix).append(id);
    const int how = make ? O_CREAT | O_EXCL : 0;
    kept_ = openFile(folder_.get(), name_.c_str(), O_RDWR | O_APPEND | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | how, 0600);
    struct stat status {};
    if (!kept_ || fstat(kept_.get(), &status) != 0) return uploadCodeOf(errno);
    if (!S_ISREG(status.st_mode)) return ORV_ERR_MISSING;
    size_ = status.st_size;
    return ORV_ERR_NONE;
}

void Spool::removeKept() {
    if (kept_) unlinkat(folder_.get(), name_.c_str(), 0);
}

bool Spool::cut(long long size) {
    if (ftruncate(fd(), size) != 0) return false;
    size_ = size;
    return true;
}

long long Spool::freeBytes() const {
    struct statvfs system {};
    if (fstatvfs(fd(), &system) != 0) return -1;
    const auto blocks = static_cast<long long>(geteuid() == 0 ? system.f_bfree : system.f_bavail);
    return blocks * static_cast<long long>(system.f_frsize);
}

int Spool::write(std::string_view data) {
    if (!writeAll(fd(), data)) return uploadCodeOf(errno);
    size_ += static_cast<off_t>(data.size());
    return ORV_ERR_NONE;
}

bool Spool::setModified(time_t time) const {
    const std::array<timespec, 2> times = {{{.tv_sec = 0, .tv_nsec = UTIME_OMIT}, {.tv_sec = time, .tv_nsec = 0}}};
    return futimens(fd(), times.data()) == 0;
}

std::string Spool::publish() {
    if (kept_) return folder_.path(name_);
    if (!named_) named_ = file_->publish(name_, false);
    return named_ ? folder_.path(name_) : "";
}

}  // namespace orvel::cgi
