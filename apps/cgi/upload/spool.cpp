#include "upload/spool.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/random.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <ctime>

#include "orvel/error_state.h"
#include "orvel/upload_check.h"
#include "temporary_folder.h"

namespace orvel::cgi {
namespace {

constexpr const char* kPrefix = "part-";
constexpr time_t kAbandonedAfter = 3600;  // seconds

int codeOfWrite(int error) {
    switch (error) {
        case EDQUOT:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_QUOTA);
        case ENOSPC:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_NO_SPACE);
        case EROFS:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_READ_ONLY);
        case ENOENT:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_MISSING);
        case EACCES:
        case EPERM:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_DENIED);
        case EFBIG:
            return ORV_ERR_UPLOAD_TOO_LARGE;
        default:
            return ConvUploadErrnoToAPIErr(CGI_UPLOAD_WRITE);
    }
}

std::string randomName() {
    static constexpr char digits[] = "0123456789abcdef";
    std::array<std::uint8_t, 16> bytes{};
    if (getrandom(bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size())) return "";
    std::string name = kPrefix;
    for (const std::uint8_t byte : bytes) {
        name += digits[byte >> 4];
        name += digits[byte & 15];
    }
    return name;
}

// Removes what a killed process left under a name: nobody holds its lock, and it has not been written to for a while
// (a file is unlocked for a moment after it was made).
void removeAbandoned(const Descriptor& folder) {
    const int fd = openat(folder.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    DIR* names = fd < 0 ? nullptr : fdopendir(fd);
    if (names == nullptr) return;
    while (const dirent* entry = readdir(names)) {
        if (strncmp(entry->d_name, kPrefix, strlen(kPrefix)) != 0) continue;
        const Descriptor file(openat(folder.get(), entry->d_name, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
        struct stat status {};
        const bool old = file && fstat(file.get(), &status) == 0 && status.st_mtime < time(nullptr) - kAbandonedAfter;
        if (old && flock(file.get(), LOCK_EX | LOCK_NB) == 0) unlinkat(folder.get(), entry->d_name, 0);
    }
    closedir(names);
}

}  // namespace

Spool::~Spool() {
    if (!name_.empty()) unlinkat(folder_.get(), name_.c_str(), 0);
}

// "@tmp/orvel" is everybody's to write in: nothing in it is used that is not the caller's alone.
int Spool::openFolder(const std::string& volumePath) {
    const Descriptor temporary = openTemporaryFolder(volumePath);
    if (temporary) folder_ = openOwnFolder(temporary, "upload-" + std::to_string(geteuid()));
    if (folder_) return ORV_ERR_NONE;
    const bool inTheWay = errno == ENOTDIR || errno == ELOOP;
    return inTheWay ? ConvUploadErrnoToAPIErr(CGI_UPLOAD_DENIED) : codeOfWrite(errno);
}

int Spool::open(const std::string& volumePath) {
    const int code = openFolder(volumePath);
    if (code != ORV_ERR_NONE) return code;
    removeAbandoned(folder_);
    file_ = Descriptor(openat(folder_.get(), ".", O_TMPFILE | O_RDWR | O_CLOEXEC, 0600));
    if (!file_) {
        if (errno != EOPNOTSUPP && errno != EISDIR && errno != EINVAL) return codeOfWrite(errno);
        std::string name = randomName();
        file_ =
            Descriptor(openat(folder_.get(), name.c_str(), O_CREAT | O_EXCL | O_RDWR | O_NOFOLLOW | O_CLOEXEC, 0600));
        if (!file_) return codeOfWrite(errno);
        name_ = std::move(name);
    }
    flock(file_.get(), LOCK_EX | LOCK_NB);  // see removeAbandoned; where locks are unknown, age alone decides
    return ORV_ERR_NONE;
}

int Spool::write(std::string_view data) {
    while (!data.empty()) {
        const ssize_t written = ::write(file_.get(), data.data(), data.size());
        if (written < 0 && errno == EINTR) continue;
        if (written <= 0) return codeOfWrite(written < 0 ? errno : ENOSPC);
        data.remove_prefix(static_cast<size_t>(written));
        size_ += written;
    }
    return ORV_ERR_NONE;
}

std::string Spool::publish() {
    if (name_.empty()) {
        const std::string name = randomName();
        if (name.empty() ||
            linkat(AT_FDCWD, file_.path().c_str(), folder_.get(), name.c_str(), AT_SYMLINK_FOLLOW) != 0) {
            return "";
        }
        name_ = name;
    }
    return folder_.path(name_);
}

}  // namespace orvel::cgi
