#include "upload/spool.h"

#include <fcntl.h>
#include <sys/random.h>
#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <cstdint>

#include "orvel/error_state.h"
#include "orvel/upload_check.h"

namespace orvel::cgi {
namespace {

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
    std::string name = "part-";
    for (const std::uint8_t byte : bytes) {
        name += digits[byte >> 4];
        name += digits[byte & 15];
    }
    return name;
}

bool isOnlyOurs(const Descriptor& folder) {
    struct stat status {};
    return fstat(folder.get(), &status) == 0 && S_ISDIR(status.st_mode) && status.st_uid == geteuid() &&
           (status.st_mode & 0077) == 0;
}

}  // namespace

Spool::~Spool() {
    if (!name_.empty()) unlinkat(folder_.get(), name_.c_str(), 0);
}

// "@tmp/orvel" is everybody's to write in: nothing in it is used that is not the caller's alone.
int Spool::openFolder(const std::string& volumePath) {
    const std::string path = volumePath + "/@tmp/orvel/upload-" + std::to_string(geteuid());
    if (mkdir(path.c_str(), 0700) != 0 && errno != EEXIST) return codeOfWrite(errno);
    folder_ = Descriptor(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!folder_) return codeOfWrite(errno);
    return isOnlyOurs(folder_) ? ORV_ERR_NONE : ConvUploadErrnoToAPIErr(CGI_UPLOAD_DENIED);
}

int Spool::open(const std::string& volumePath) {
    const int code = openFolder(volumePath);
    if (code != ORV_ERR_NONE) return code;
    file_ = Descriptor(openat(folder_.get(), ".", O_TMPFILE | O_RDWR | O_CLOEXEC, 0600));
    if (file_) return ORV_ERR_NONE;
    if (errno != EOPNOTSUPP && errno != EISDIR) return codeOfWrite(errno);
    const std::string name = randomName();
    file_ = Descriptor(openat(folder_.get(), name.c_str(), O_CREAT | O_EXCL | O_RDWR | O_NOFOLLOW | O_CLOEXEC, 0600));
    if (!file_) return codeOfWrite(errno);
    name_ = name;
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
