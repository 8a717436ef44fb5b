#include "index/index_room.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <string_view>

#include "settings/appliance_setting.h"

namespace vexo::fileindex {
namespace {

constexpr int64_t kUsualMiB = 1024, kMostMiB = int64_t{1} << 30;

int64_t boundOfResults() {
    const std::string text = readSetting("search_results_mib", "").value_or("");
    char* end = nullptr;
    const long long wanted = strtoll(text.c_str(), &end, 10);
    const bool set = !text.empty() && *end == '\0' && wanted >= 0;
    return (set ? std::min<int64_t>(wanted, kMostMiB) : kUsualMiB) << 20;
}

}  // namespace

int64_t roomForResults(const std::string& path) {
    const size_t slash = path.rfind('/');
    const std::string folder = slash == std::string::npos ? "." : path.substr(0, slash + 1);
    const std::string_view own = std::string_view(path).substr(slash == std::string::npos ? 0 : slash + 1);
    const std::unique_ptr<DIR, int (*)(DIR*)> open(opendir(folder.c_str()), closedir);
    if (open == nullptr) return 0;
    int64_t room = boundOfResults();
    const uid_t user = geteuid();
    while (const dirent* entry = readdir(open.get())) {
        struct stat status {};
        if (entry->d_name == own) continue;
        if (fstatat(dirfd(open.get()), entry->d_name, &status, AT_SYMLINK_NOFOLLOW) != 0) continue;
        if (status.st_uid == user && S_ISREG(status.st_mode)) room -= status.st_size;
    }
    return std::max<int64_t>(room, 0);
}

}  // namespace vexo::fileindex
