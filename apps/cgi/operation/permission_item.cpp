#include "operation/permission_item.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

#include "orvel/error_state.h"

namespace orvel::cgi {

bool openForPermissions(const Item& item, Descriptor& opened) {
    opened = Descriptor(openat(item.place.folder.get(), item.place.name.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
    return static_cast<bool>(opened);
}

int readKnown(const Descriptor& opened, Permissions& permissions) {
    struct stat status {};
    const bool known =
        fstat(opened.get(), &status) == 0 &&
        (status.st_uid == geteuid() || faccessat(AT_FDCWD, opened.path().c_str(), R_OK, AT_EACCESS) == 0);
    if (known && readPermissions(opened, permissions)) return ORV_ERR_NONE;
    return OrvParseErrnoToError(errno, nullptr, nullptr);
}

}  // namespace orvel::cgi
