#include "operation/new_file.h"

#include <fcntl.h>
#include <sys/random.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstdio>

#include "operation/rename_new.h"

namespace orvel::cgi {

std::string partName() {
    unsigned long long number = 0;
    if (getrandom(&number, sizeof number, 0) != static_cast<ssize_t>(sizeof number)) return "";
    std::array<char, 40> name{};
    snprintf(name.data(), name.size(), ".part-%016llx", number);
    return name.data();
}

bool putLink(int folder, const std::string& name, const char* text, bool replace) {
    if (!replace) return symlinkat(text, folder, name.c_str()) == 0;
    const std::string part = partName();
    if (part.empty() || symlinkat(text, folder, part.c_str()) != 0) return false;
    if (renameat(folder, part.c_str(), folder, name.c_str()) == 0) return true;
    const int error = errno;
    unlinkat(folder, part.c_str(), 0);
    errno = error;
    return false;
}

bool putHardLink(int fromFolder, const std::string& from, int folder, const std::string& name, bool replace) {
    if (!replace) return linkat(fromFolder, from.c_str(), folder, name.c_str(), 0) == 0;
    const std::string part = partName();
    if (part.empty() || linkat(fromFolder, from.c_str(), folder, part.c_str(), 0) != 0) return false;
    const bool renamed = renameat(folder, part.c_str(), folder, name.c_str()) == 0;
    const int error = errno;
    unlinkat(folder, part.c_str(), 0);  // still there, too, when both were names of one file
    errno = error;
    return renamed;
}

NewFile::~NewFile() {
    if (!name_.empty()) unlinkat(folder_, name_.c_str(), 0);
}

bool NewFile::create() {
    file_ = Descriptor(openat(folder_, ".", O_TMPFILE | O_RDWR | O_CLOEXEC, 0600));
    if (file_) return true;
    // What file systems answer that know no nameless files, and kernels that take the flag for O_DIRECTORY.
    if (errno != EOPNOTSUPP && errno != EISDIR && errno != EINVAL) return false;
    std::string name = partName();
    if (name.empty()) return false;
    file_ = Descriptor(openat(folder_, name.c_str(), O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600));
    if (file_) name_ = std::move(name);
    return static_cast<bool>(file_);
}

bool NewFile::giveName(const std::string& name) {
    return linkat(AT_FDCWD, file_.path().c_str(), folder_, name.c_str(), AT_SYMLINK_FOLLOW) == 0;
}

bool NewFile::publish(const std::string& name, bool replace) {
    if (!replace && name_.empty()) return giveName(name);
    // A power cut must leave the old content or the new one, not an empty file.
    if (replace && fdatasync(file_.get()) != 0) return false;
    if (name_.empty()) {
        std::string part = partName();
        if (part.empty() || !giveName(part)) return false;
        name_ = std::move(part);
    }
    const bool renamed = replace ? renameat(folder_, name_.c_str(), folder_, name.c_str()) == 0
                                 : renameNew(folder_, name_, folder_, name);
    if (renamed) name_.clear();
    return renamed;
}

}  // namespace orvel::cgi
