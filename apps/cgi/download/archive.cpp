#include "download/archive.h"

#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <clocale>
#include <cstring>
#include <ctime>
#include <memory>

#include "archive_library.h"
#include "base/owner.h"
#include "folder_names.h"
#include "orvel/error_state.h"
#include "text.h"

namespace orvel::cgi {
namespace {

constexpr size_t kPiece = size_t{256} * 1024;
constexpr int kDeepest = 256;           // descriptors stay open on the way down
constexpr size_t kMostLeftOut = 10000;  // that are said by name

constexpr ArchiveFormat kFormats[] = {
    {"zip", true}, {"tar.gz", false}, {"tar.xz", false}, {"tar.zst", false}, {"7z", false}};

}  // namespace

// What is readable of a name that is no UTF-8 would not distinguish it from others.
std::string memberName(const std::string& component) {
    return isUtf8(component) ? component : percentEncode(component);
}

const char* reasonOf(int code) {
    if (code == ORV_ERR_DENIED) return "not allowed";
    return code == ORV_ERR_MISSING ? "missing" : "could not be opened";
}

const ArchiveFormat* archiveFormatOf(std::string_view word) {
    const auto* const found = std::find_if(std::begin(kFormats), std::end(kFormats),
                                           [word](const ArchiveFormat& format) { return format.word == word; });
    return found == std::end(kFormats) ? nullptr : found;
}

ArchiveStream::ArchiveStream(int fd, ArchiveObserver* observer, std::string_view format, const std::string& password)
    : archive_(loadArchiveLibrary() ? libarchive.archive_write_new() : nullptr), observer_(observer) {
    setlocale(LC_CTYPE, "C.UTF-8");  // what names are converted from
    broken_ = archive_ == nullptr || !setUp(fd, format, password);
}

bool ArchiveStream::setUp(int fd, std::string_view format, const std::string& password) {
    int set = ARCHIVE_FATAL;
    const char* options = nullptr;
    if (format == "zip") {
        set = libarchive.archive_write_set_format_zip(archive_);
        options = password.empty() ? "zip:hdrcharset=UTF-8" : "zip:hdrcharset=UTF-8,zip:encryption=aes256";
        if (!password.empty() && libarchive.archive_write_set_passphrase(archive_, password.c_str()) != ARCHIVE_OK)
            return false;
    } else if (format == "7z") {
        set = libarchive.archive_write_set_format_7zip(archive_);
    } else {
        set = libarchive.archive_write_set_format_pax_restricted(archive_);
        const auto filter = format == "tar.gz"   ? libarchive.archive_write_add_filter_gzip
                            : format == "tar.xz" ? libarchive.archive_write_add_filter_xz
                                                 : libarchive.archive_write_add_filter_zstd;
        if (filter(archive_) != ARCHIVE_OK) return false;  // others than OK would run outside programs
    }
    return set == ARCHIVE_OK &&
           (options == nullptr || libarchive.archive_write_set_options(archive_, options) >= ARCHIVE_WARN) &&
           libarchive.archive_write_set_bytes_per_block(archive_, static_cast<int>(kPiece)) == ARCHIVE_OK &&
           libarchive.archive_write_set_bytes_in_last_block(archive_, 1) == ARCHIVE_OK &&
           libarchive.archive_write_open_fd(archive_, fd) == ARCHIVE_OK;
}

ArchiveStream::~ArchiveStream() {
    if (archive_ != nullptr) libarchive.archive_write_free(archive_);
}

bool ArchiveStream::recordFailure() {
    error_ = libarchive.archive_errno(archive_);
    return recordStop();
}

bool ArchiveStream::recordStop() {
    broken_ = true;
    return false;
}

void ArchiveStream::miss(const std::string& name, int error, const char* reason) {
    if (observer_ != nullptr) observer_->leftOut(name, error);
    leaveOut(name, reason != nullptr ? reason : strerror(error));
}

void ArchiveStream::leaveOut(const std::string& name, const std::string& reason) {
    if (leftOut_.size() < kMostLeftOut) {
        leftOut_.push_back(name + ": " + reason);
    } else {
        ++leftOutUnsaid_;
    }
}

bool ArchiveStream::begin(const std::string& name, const struct stat& status, long long size) {
    const std::unique_ptr<archive_entry, decltype(libarchive.archive_entry_free)> entry(libarchive.archive_entry_new(),
                                                                                        libarchive.archive_entry_free);
    if (entry == nullptr) return recordFailure();
    libarchive.archive_entry_set_pathname(entry.get(), name.c_str());
    libarchive.archive_entry_set_mode(entry.get(), status.st_mode & (S_IFMT | 0777));
    libarchive.archive_entry_set_mtime(entry.get(), status.st_mtim.tv_sec, status.st_mtim.tv_nsec);
    if (size >= 0) libarchive.archive_entry_set_size(entry.get(), size);
    begun_ = true;
    return libarchive.archive_write_header(archive_, entry.get()) >= ARCHIVE_WARN || recordFailure();
}

bool ArchiveStream::addFile(const Descriptor& file, const std::string& name) {
    struct stat status {};
    if (fstat(file.get(), &status) != 0) return miss(name, errno), true;
    if (!begin(name, status, status.st_size)) return false;
    std::string piece(kPiece, '\0');
    long long left = status.st_size;  // a file that grows meanwhile is cut there
    while (left > 0) {
        const ssize_t got = read(file.get(), piece.data(), std::min<size_t>(kPiece, static_cast<size_t>(left)));
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) {
            miss(name, got < 0 ? errno : EIO, got < 0 ? nullptr : "became shorter while it was read");
            break;
        }
        if (libarchive.archive_write_data(archive_, piece.data(), static_cast<size_t>(got)) < 0) return recordFailure();
        left -= got;
        bytes_ += got;
        if (observer_ != nullptr && !observer_->wrote(got)) return recordStop();
    }
    return libarchive.archive_write_finish_entry(archive_) >= ARCHIVE_WARN || recordFailure();
}

bool ArchiveStream::addChild(const Descriptor& folder, const std::string& child, const std::string& name) {
    struct stat status {};
    if (fstatat(folder.get(), child.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
        miss(name, errno);
        return true;
    }
    if (!S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) return true;
    const Descriptor opened(
        openat(folder.get(), child.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    if (opened) return add(opened, name);
    miss(name, errno);
    return true;
}

bool ArchiveStream::addFolder(const Descriptor& folder, const std::string& name) {
    struct stat status {};
    std::vector<std::string> names;
    if (fstat(folder.get(), &status) != 0) return miss(name, errno), true;
    if (!begin(name + "/", status, -1)) return false;
    if (depth_ == kDeepest) return miss(name, ENAMETOOLONG, "too deep"), true;
    if (!namesIn(folder.get(), Hidden::kLeaveOut, names)) miss(name, errno);
    ++depth_;
    const bool going = std::all_of(names.begin(), names.end(), [&](const std::string& child) {
        return addChild(folder, child, name + "/" + memberName(child));
    });
    --depth_;
    return going;
}

bool ArchiveStream::add(const Descriptor& opened, const std::string& name) {
    if (broken_) return false;
    if (observer_ != nullptr && !observer_->begins(name)) return recordStop();
    struct stat status {};
    if (fstat(opened.get(), &status) != 0) return miss(name, errno), true;
    if (S_ISDIR(status.st_mode)) return addFolder(opened, name);
    if (S_ISREG(status.st_mode)) return addFile(opened, name);
    return miss(name, EINVAL, "neither a file nor a folder"), true;
}

bool ArchiveStream::writeLeftOut() {
    std::string text = "These could not be included:\n";
    for (const std::string& line : leftOut_) text += line + "\n";
    if (leftOutUnsaid_ > 0) text += "and " + std::to_string(leftOutUnsaid_) + " more\n";
    struct stat status {};
    status.st_mode = S_IFREG | 0644;
    status.st_mtim.tv_sec = time(nullptr);
    if (!begin("_not_included.txt", status, static_cast<long long>(text.size()))) return false;
    return libarchive.archive_write_data(archive_, text.data(), text.size()) >= 0 || recordFailure();
}

bool ArchiveStream::finish() {
    if (!leftOut_.empty() && !broken_) static_cast<void>(writeLeftOut());
    return !broken_ && (libarchive.archive_write_close(archive_) == ARCHIVE_OK || recordFailure());
}

}  // namespace orvel::cgi
