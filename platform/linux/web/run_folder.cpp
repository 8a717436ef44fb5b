#include "web/run_folder.h"

#include <sys/stat.h>

#include <cerrno>

#include "vexo/system_root.h"

namespace vexo {
namespace {

constexpr const char* kRunFolder = "/run";
constexpr const char* kPlatformFolder = "/run/vexo";

bool makeFolder(const std::string& path, mode_t mode) {
    return mkdir(VEXO::SystemPath(path).c_str(), mode) == 0 || errno == EEXIST;
}

std::string pathOf(const std::string& name) {
    return std::string(kPlatformFolder) + "/" + name;
}

}  // namespace

bool makeRunFolder(const std::string& name) {
    return makeFolder(kRunFolder, 0755) && makeFolder(kPlatformFolder, 0755) && makeFolder(pathOf(name), 0700);
}

Descriptor openRunFolder(const std::string& name) {
    Descriptor folder = openFile(VEXO::SystemPath(pathOf(name)), O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
    struct stat status {};
    if (folder && (fstat(folder.get(), &status) != 0 || !isTrusted(status, S_IFDIR))) {
        errno = EACCES;
        return Descriptor();
    }
    return folder;
}

}  // namespace vexo
