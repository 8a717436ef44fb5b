// Who may do what with a file or folder: owner, group, mode and POSIX access control lists.
#ifndef ORVEL_CGI_OPERATION_PERMISSIONS_H
#define ORVEL_CGI_OPERATION_PERMISSIONS_H

#include <sys/stat.h>
#include <sys/types.h>

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/descriptor.h"

namespace orvel::cgi {

// In the order in which lists are kept. Without a mask there are no named users and groups.
enum class Holder { kOwner, kUser, kOwningGroup, kGroup, kMask, kOthers };

inline constexpr unsigned kMayRead = 4, kMayWrite = 2, kMayRun = 1, kMayAll = 7;

struct Grant {
    Holder holder = Holder::kOthers;
    id_t id = 0;  // of kUser and kGroup
    unsigned rights = 0;
    friend bool operator==(const Grant&, const Grant&) = default;
};
using Grants = std::vector<Grant>;

struct Permissions {
    uid_t owner = 0;
    gid_t group = 0;
    mode_t special = 0;  // set-id and sticky bits
    Grants access;       // owner, owning group and others at least
    Grants defaults;     // what is made in a folder gets these; empty where there are none
};

// What both say that a change can set: special bits are the system's to keep or to drop.
[[nodiscard]] bool isSame(const Permissions& a, const Permissions& b);

// The entry of that holder; null when there is none.
[[nodiscard]] const Grant* grantOf(const Grants& grants, Holder holder, id_t id = 0);
[[nodiscard]] unsigned rightsOf(const Grants& grants, Holder holder, id_t id = 0);
// What the mask leaves of an entry.
[[nodiscard]] unsigned effective(const Grants& grants, const Grant& grant);

// Of what is open, be it as a place (O_PATH); not of a symbolic link. False with errno.
[[nodiscard]] bool readPermissions(const Descriptor& opened, Permissions& permissions);
// Makes `from`, which was read, `to`, by the rights of the calling identity. False with errno; some of it may be done.
[[nodiscard]] bool writePermissions(const Descriptor& opened, const Permissions& from, const Permissions& to);

// As undo records keep them: "OWNER GROUP ACCESS DEFAULTS", see docs/formats/undo.md.
[[nodiscard]] std::string textOf(const Permissions& permissions);
[[nodiscard]] std::optional<Permissions> parsePermissions(std::string_view text);

}  // namespace orvel::cgi

#endif
