// The sub-folders of one folder, for the tree view.
#include <fcntl.h>
#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <iterator>
#include <string>
#include <vector>

#include "core/boundary.h"
#include "core/given_folder.h"
#include "enum/folder_reader.h"
#include "orvel/directory_walker.h"
#include "orvel/error_state.h"
#include "vexo/filesystem.h"
#include "vexo/share_files.h"
#include "vexo/text.h"

namespace {

constexpr const char* kSource = "orveldir";

using SubDirs = std::vector<_tag_SUBDIR_ENTRY_INFO_>;

bool fail(int code) {
    OrvLibSetErr(code);
    return false;
}

bool isRemoteMount(const std::string& path) {
    return VEXOFSIsInMountTable(path.c_str()) != -1 && VEXOFSIsRemoteFS() == 1;
}

void appendFolder(SubDirs& found, const char* name, std::string path, const struct stat& status) {
    const bool isMountPoint = WebUtils::IsMountPoint(path);
    std::string type = isMountPoint ? WebUtils::getMountType(path) : std::string();
    found.push_back({name, std::move(path), status.st_size, status.st_mode, static_cast<int32_t>(status.st_mtime),
                     status.st_uid, status.st_gid, isMountPoint, std::move(type)});
}

void appendIfFolder(SubDirs& found, int folder, const std::string& parent, const char* name) {
    std::string path = parent + "/" + name;
    struct stat status;
    if (fstatat(folder, name, &status, AT_SYMLINK_NOFOLLOW) == 0) {
        if (S_ISDIR(status.st_mode)) appendFolder(found, name, std::move(path), status);
    } else if (isRemoteMount(path)) {
        // A server that does not answer still shows in the tree, marked as failed.
        found.push_back({name, std::move(path), 0, 0, 0, 0, 0, true, "remotefail"});
    }
}

bool enumerate(const orvel::GivenFolder& given, SubDirs& subDirs) {
    const orvel::EnteredFolder entered = given.enter();
    if (!entered.folder) return fail(orvel::folderCodeOf(entered.error));

    SubDirs found;
    const int folder = entered.folder.get();
    VEXOShareNamesAt(given.text().c_str());
    const int error = orvel::FolderReader().forEach(folder, [&](const char* name, unsigned char type) {
        const bool maybeFolder = type == DT_DIR || type == DT_UNKNOWN;
        if (maybeFolder && VEXOEAIsHiddenFile(name) == 0) appendIfFolder(found, folder, given.text(), name);
        return true;
    });
    if (error != 0) return fail(orvel::folderCodeOf(error));  // half a folder must not pass for the whole

    subDirs.insert(subDirs.end(), std::make_move_iterator(found.begin()), std::make_move_iterator(found.end()));
    // Kept: what the caller's vector held before is sorted with the rest.
    std::sort(subDirs.begin(), subDirs.end(), [](const auto& a, const auto& b) {
        return VLIBCUnicodeUTF8StrCaseCmp(a.name.c_str(), b.name.c_str()) < 0;
    });
    return true;
}

}  // namespace

bool OrvLibEnumSubDir(std::string realPath, std::vector<_tag_SUBDIR_ENTRY_INFO_>& subDirs) {
    return orvel::guarded(false, [&] {
        if (realPath.empty()) {
            syslog(LOG_ERR, "%s:%d Bad parameter", kSource, __LINE__);
            return fail(ORV_ERR_PARAMETER);
        }
        OrvLibSetErr(ORV_ERR_NONE);
        return enumerate(orvel::GivenFolder(realPath), subDirs);
    });
}
