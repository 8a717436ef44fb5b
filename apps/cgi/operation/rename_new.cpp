#include "operation/rename_new.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstdio>

namespace orvel::cgi {
namespace {

bool isSameFile(int firstFolder, const std::string& a, int secondFolder, const std::string& b) {
    struct stat first {
    }, second{};
    return fstatat(firstFolder, a.c_str(), &first, AT_SYMLINK_NOFOLLOW) == 0 &&
           fstatat(secondFolder, b.c_str(), &second, AT_SYMLINK_NOFOLLOW) == 0 && first.st_dev == second.st_dev &&
           first.st_ino == second.st_ino && (S_ISDIR(first.st_mode) || first.st_nlink == 1);
}

}  // namespace

bool renameNew(int fromFolder, const std::string& from, int toFolder, const std::string& to) {
    if (renameat2(fromFolder, from.c_str(), toFolder, to.c_str(), RENAME_NOREPLACE) == 0) return true;
    const int error = errno;
    struct stat status {};
    const bool unsupported = error == EINVAL && fstatat(toFolder, to.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0;
    const bool itself = error == EEXIST && isSameFile(fromFolder, from, toFolder, to);
    if (unsupported || itself) return renameat(fromFolder, from.c_str(), toFolder, to.c_str()) == 0;
    errno = error;
    return false;
}

}  // namespace orvel::cgi
