#include "io/file_io.h"

#include <ctime>

namespace vexo {
namespace {

constexpr std::int64_t kRecent = 50'000'000;  // nanoseconds

unsigned lookGeneration = 0;  // 0: no request is served

std::int64_t coarseNow() {
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
    return std::int64_t{now.tv_sec} * 1'000'000'000 + now.tv_nsec;
}

bool isBefore(const timespec& a, const timespec& b) {
    return a.tv_sec != b.tv_sec ? a.tv_sec < b.tv_sec : a.tv_nsec < b.tv_nsec;
}

}  // namespace

bool readRegularFile(const std::string& path, size_t limit, std::string& text, FileVersion& version) {
    const Descriptor fd = openFile(path, O_RDONLY | O_NONBLOCK | O_NOCTTY);
    struct stat status {};
    if (!fd || fstat(fd.get(), &status) != 0) return false;
    if (!S_ISREG(status.st_mode)) {
        errno = EINVAL;
        return false;
    }
    version = FileVersion(status);
    text.clear();
    return readAll(fd.get(), text, limit);
}

bool isTrusted(const struct stat& status, mode_t type) {
    const bool ours = status.st_uid == 0 || status.st_uid == geteuid();
    const bool oneName = type != S_IFREG || status.st_nlink == 1;
    return (status.st_mode & S_IFMT) == type && ours && oneName && (status.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

bool RecentLook::isRecent() const {
    return generation_ != 0 && generation_ == lookGeneration && coarseNow() - time_ < kRecent;
}

void RecentLook::note() {
    generation_ = lookGeneration;
    time_ = coarseNow();
}

void RecentLook::forgetAll() {
    if (lookGeneration != 0) ++lookGeneration;
}

void RecentLook::beginRequest() {
    ++lookGeneration;
}

FileVersion::FileVersion(const struct stat& status)
    : device_(status.st_dev), inode_(status.st_ino), size_(status.st_size), modified_(status.st_mtim) {
    // File times come from this clock, so a write after the read gets this time or a later one.
    timespec now{};
    settled_ = clock_gettime(CLOCK_REALTIME_COARSE, &now) == 0 && isBefore(modified_, now);
}

bool FileVersion::isCurrent(const struct stat& status) const {
    return settled_ && isSame(status);
}

bool FileVersion::isCurrentAt(const std::string& path) const {
    if (look_.isRecent()) return true;
    struct stat status {};
    if (stat(path.c_str(), &status) != 0 || !isCurrent(status)) return false;
    look_.note();
    return true;
}

bool FileVersion::isSame(const struct stat& status) const {
    return device_ == status.st_dev && inode_ == status.st_ino && size_ == status.st_size &&
           modified_.tv_sec == status.st_mtim.tv_sec && modified_.tv_nsec == status.st_mtim.tv_nsec;
}

}  // namespace vexo
