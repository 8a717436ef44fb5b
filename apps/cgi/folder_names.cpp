#include "folder_names.h"

#include <dirent.h>
#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <memory>

#include "vexo/filesystem.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

struct CloseDirectory {
    void operator()(DIR* directory) const { closedir(directory); }
};

bool isWanted(const char* name, Hidden hidden) {
    if (hidden == Hidden::kInclude) return strcmp(name, ".") != 0 && strcmp(name, "..") != 0;
    return VEXOEAIsHiddenFile(name) == 0;
}

}  // namespace

bool namesIn(int folder, Hidden hidden, std::vector<std::string>& names) {
    const int fd = openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    const std::unique_ptr<DIR, CloseDirectory> directory(fd < 0 ? nullptr : fdopendir(fd));
    if (directory == nullptr) return false;
    VEXOShareNamesOf(fd);
    for (;;) {
        errno = 0;
        const dirent* entry = readdir(directory.get());
        if (entry == nullptr) break;
        if (isWanted(entry->d_name, hidden)) names.emplace_back(entry->d_name);
    }
    const int error = errno;
    std::sort(names.begin(), names.end());
    errno = error;
    return error == 0;
}

}  // namespace orvel::cgi
