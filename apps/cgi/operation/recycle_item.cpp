#include "operation/recycle_item.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <syslog.h>

#include <cerrno>
#include <cstring>

#include "deleted_log.h"
#include "operation/transfer.h"
#include "orvel/error_state.h"

namespace orvel::cgi {

void noteInBin(const RecycleBin& bin, const Entry& place, const User& user) {
    struct stat status {};
    if (fstatat(place.folder, place.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) return;
    const std::string path = place.path.substr(bin.sharePath().size() + 1);
    if (noteDeletion(bin.recorded(), path, status.st_ino, user.name)) return;
    syslog(LOG_WARNING, "a deletion is not recorded: %s", strerror(errno));
}

bool recycleItem(const RecycleBin& bin, const Item& item, const User& user, Progress& progress) {
    Target folder;
    Entry place{};
    const Owner owner = ownerFor(user.name);
    const int code = bin.placeFor(item, owner, folder, place);
    if (code != ORV_ERR_NONE) {
        progress.failed(item.info.path, code);
        return false;
    }
    Transfer transfer(
        progress,
        {.conflict = Conflict::kKeepBoth, .move = true, .owner = owner, .onFat = false, .nextName = nextBinName});
    const bool gone = transfer.run(item, place);
    if (gone) {
        noteInBin(bin, place, user);
    } else {
        removeMadeFolders(folder);  // as far as nothing arrived
    }
    return gone;
}

}  // namespace orvel::cgi
