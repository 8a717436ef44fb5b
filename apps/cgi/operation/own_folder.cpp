#include "operation/own_folder.h"

#include <fcntl.h>
#include <strings.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <vector>

#include "base/new_file.h"
#include "folder_names.h"
#include "free_names.h"
#include "orvel/error_state.h"
#include "target.h"

namespace orvel::cgi {
namespace {

constexpr int kMostNumbers = 9999;

}  // namespace

std::string folderNameOf(const std::string& archive) {
    const size_t end = archive.rfind('.');
    if (end == std::string::npos || end == 0) return archive;
    const std::string stem = archive.substr(0, end);
    const bool packed = stem.size() > 4 && strcasecmp(stem.c_str() + stem.size() - 4, ".tar") == 0;
    return packed ? stem.substr(0, stem.size() - 4) : stem;
}

int OwnFolder::make(const std::string& wanted, const std::string& user) {
    int code = checkNewName(above_, wanted);
    if (code != ORV_ERR_NONE) return code;
    name_ = wanted;
    code = makeFolder(above_, name_, user, folder_);
    for (int number = 2; code == ORV_ERR_EXISTS && number <= kMostNumbers; ++number) {
        name_ = numberedName(wanted, number, true);
        code = makeFolder(above_, name_, user, folder_);
    }
    if (code != ORV_ERR_NONE) name_.clear();
    return code;
}

void OwnFolder::settle(bool whole) {
    std::vector<std::string> names;
    struct stat only {};
    if (unlinkat(above_.get(), name_.c_str(), AT_REMOVEDIR) == 0) return name_.clear();
    if (!whole || !namesIn(folder_.get(), Hidden::kInclude, names) || names.size() != 1) return;
    const std::string& name = names.front();
    if (fstatat(folder_.get(), name.c_str(), &only, AT_SYMLINK_NOFOLLOW) != 0 || !S_ISDIR(only.st_mode)) return;
    for (int number = 1; number <= kMostNumbers; ++number) {
        const std::string wanted = number == 1 ? name : numberedName(name, number, true);
        if (wanted == name_ && !moveAside(numberedName(name, number + 1, true))) return;
        if (renameNew(folder_.get(), name, above_.get(), wanted)) {
            unlinkat(above_.get(), name_.c_str(), AT_REMOVEDIR);
            name_ = wanted;
            return;
        }
        if (errno != EEXIST) return;
    }
}

// It has the name that what it holds is to have.
bool OwnFolder::moveAside(const std::string& wanted) {
    std::string given = wanted;
    for (int number = 2; !renameNew(above_.get(), name_, above_.get(), given); ++number) {
        if (errno != EEXIST || number > kMostNumbers) return false;
        given = numberedName(wanted, number, true);
    }
    name_ = given;
    return true;
}

}  // namespace orvel::cgi
