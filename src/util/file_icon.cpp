#include "orvel/file_icon.h"

#include <sys/stat.h>
#include <syslog.h>

#include "base/printable.h"
#include "core/boundary.h"
#include "orvel/text.h"
#include "vexo/filesystem.h"

namespace {

constexpr const char* kOtherIcon = "misc.png";
constexpr const char* kFolderIcon = "folder.png";
constexpr const char* kIconFolder = "../images/files_ext";
constexpr int kLowerCaseFailed = 460;

const char* mountPointIcon(const std::string& path) {
    const int type = VEXOGetFSType(path.c_str(), 0);
    if (VEXOFSIsImageFS(type) == 1) return "isomountpoint.png";
    if (VEXOFSIsRemoteFS(type) == 1) return "remotemountpoint.png";
    return kFolderIcon;
}

const char* folderIcon(const std::string& path, const std::string& shareLocation) {
    if (WebUtils::IsMountPoint(path)) return mountPointIcon(path);
    if (shareLocation.empty() || WebUtils::StringExplode(shareLocation, "/").size() != 1) return kFolderIcon;
    const auto components = WebUtils::StringExplode(path, "/");
    return !components.empty() && components.back() == "#recycle" ? "recycle_bin.png" : kFolderIcon;
}

std::string fileIcon(const char* name) {
    const char* found = ReturnFileExt(name, 0);
    if (found == nullptr) return kOtherIcon;
    std::string extension = found;
    if (OrvLibStringToLower(extension.data()) < 0) {
        syslog(LOG_ERR, "(%d): failed to transfer %s to lowercase.", kLowerCaseFailed,
               orvel::printable(extension).c_str());
    }
    const std::string icon = extension + ".png";
    struct stat status {};
    return stat((std::string(kIconFolder) + "/" + icon).c_str(), &status) == 0 ? icon : kOtherIcon;
}

}  // namespace

void GetImgFileExt(const char* name, bool isDirectory, std::string& icon, std::string path, std::string shareLocation) {
    orvel::guardedQuietly(0, [&] {
        icon = kOtherIcon;
        if (name == nullptr) return 0;
        icon = isDirectory ? folderIcon(path, shareLocation) : fileIcon(name);
        return 0;
    });
}
