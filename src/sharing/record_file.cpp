#include "sharing/record_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>

#include "base/file.h"
#include "vexo/line_file.h"
#include "vexo/system_root.h"

namespace orvel {
namespace {

bool isOurs(const struct stat& status) {
    return S_ISREG(status.st_mode) && status.st_nlink == 1 && (status.st_uid == 0 || status.st_uid == geteuid()) &&
           (status.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

// Opens the file for reading once it is known to be ours; empty with errno.
Descriptor openRecord(const char* name, struct stat& status) {
    Descriptor file = openFile(VEXO::SystemPath(name), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
    if (!file || fstat(file.get(), &status) != 0) return Descriptor();
    if (!isOurs(status)) {
        errno = EACCES;
        return Descriptor();
    }
    return file;
}

}  // namespace

RecordReader::RecordReader(const char* name) {
    struct stat status = {};
    file_ = openRecord(name, status);
    if (file_) blocks_.emplace(file_.get(), static_cast<std::size_t>(status.st_size));
}

bool protectRecordFile() {
    struct stat status = {};
    const Descriptor file = openRecord(kRecordFile, status);
    return file && fchmod(file.get(), 0600) == 0;
}

RecordRewrite::RecordRewrite() : path_(VEXO::SystemPath(kRecordTemporary)) {
    constexpr int kFlags = O_WRONLY | O_CREAT | O_EXCL;
    file_ = openFile(path_, kFlags, 0600);
    if (!file_ && errno == EEXIST && unlink(path_.c_str()) == 0) file_ = openFile(path_, kFlags, 0600);
    left_ = static_cast<bool>(file_);
}

RecordRewrite::~RecordRewrite() {
    if (left_) unlink(path_.c_str());
}

bool RecordRewrite::protect() {
    return fchmod(file_.get(), 0600) == 0;
}

bool RecordRewrite::write(std::string_view text) {
    return writeAll(file_.get(), text);
}

bool RecordRewrite::commit() {
    if (close(file_.release()) != 0) return false;
    if (VLIBCSysRename(kRecordTemporary, kRecordFile) != 0) return false;
    left_ = false;
    return true;
}

}  // namespace orvel
