#include "operation/item.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "background.h"
#include "orvel/directory_walker.h"
#include "orvel/error_state.h"
#include "snapshots.h"
#include "vexo/filesystem.h"
#include "vexo/user.h"

namespace orvel::cgi {
namespace {

struct Sum : OrvDirectoryWalkerCallBack {
    long long items = 0, bytes = 0;
    bool operator()(const std::string&, const std::string&, const std::string&, const std::string&,
                    _tag_VEXOSTAT_& status, const std::string*) override {
        ++items;
        if (S_ISREG(status.st_mode)) bytes += status.st_size;
        return true;
    }
};

}  // namespace

int checkChangeable(std::initializer_list<Need> needs, const Descriptor& folder, const std::string& name) {
    const bool changes = std::find(needs.begin(), needs.end(), Need::kModify) != needs.end();
    return changes && isInSnapshot(folder, name) ? ORV_ERR_READ_ONLY : ORV_ERR_NONE;
}

int openItem(const User& user, const std::string& path, std::initializer_list<Need> needs, Item& item) {
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), path, item.info)) return lastCode();
    int code = ORV_ERR_NONE;
    for (const Need need : needs) {
        code = judge(user, item.info.path, need);
        if (code != ORV_ERR_NONE) return code;
    }
    code = openPresent(item.info, item.place);
    if (code != ORV_ERR_NONE) return code;
    code = checkChangeable(needs, item.place.folder, item.place.name);
    if (code != ORV_ERR_NONE) return code;
    item.realFolder = realPathOf(item.place.folder);
    const bool there = !item.realFolder.empty() && fstatat(item.place.folder.get(), item.place.name.c_str(),
                                                           &item.status, AT_SYMLINK_NOFOLLOW) == 0;
    return there ? ORV_ERR_NONE : refusalCode(errno, item.info.realPath);
}

int openFolder(const User& user, const std::string& path, PathInfo& info, Descriptor& folder) {
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), path, info)) return lastCode();
    return confinedOpen(info, linkPolicyOf(info.shareName), O_PATH | O_DIRECTORY, folder);
}

Owner ownerFor(const std::string& user) {
    Owner owner;
    uid_t uid = 0;
    gid_t gid = 0;
    if (geteuid() == 0 && VEXOUserGetUGID(user.c_str(), &uid, &gid) == 0) owner = {uid, gid};
    return owner;
}

static Sum sumOf(const Item& item) {
    Sum sum;
    sum.items = 1;
    sum.bytes = S_ISREG(item.status.st_mode) ? item.status.st_size : 0;
    if (S_ISDIR(item.status.st_mode)) {
        const Descriptor top(
            openat(item.place.folder.get(), item.place.name.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
        OrvDirectoryWalker walker(ENUM_IGNORE_ALL_ERR, stopFlag());
        if (top) walker.Walk_TopDown(item.info.path, "", top.path(), sum, nullptr, false);
        // A walk stays in its last folder, which would keep a volume busy.
        [[maybe_unused]] const int ignored = chdir("/");
    }
    return sum;
}

void measure(const Item& item, Progress& progress) {
    const Sum sum = sumOf(item);
    progress.expect(sum.items, sum.bytes);
}

void countItems(const Item& item, Progress& progress) {
    progress.expect(sumOf(item).items, 0);
}

}  // namespace orvel::cgi
