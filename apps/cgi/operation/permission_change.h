// A change of permissions as a request asks for it, and what it makes of those that are there.
#ifndef ORVEL_CGI_OPERATION_PERMISSION_CHANGE_H
#define ORVEL_CGI_OPERATION_PERMISSION_CHANGE_H

#include <json/forwards.h>

#include <optional>
#include <string_view>
#include <vector>

#include "operation/permissions.h"
#include "vexo/web.h"

namespace orvel::cgi {

struct RightsChange {
    unsigned clear = 0, set = 0;
    bool runWhereSensible = false;  // "X": of folders, and of files that somebody may run
    [[nodiscard]] unsigned apply(unsigned rights, bool runnable) const {
        return (rights & ~clear) | set | (runWhereSensible && runnable ? kMayRun : 0);
    }
    [[nodiscard]] bool isAny() const { return clear != 0 || set != 0 || runWhereSensible; }
};

struct ModeChange {
    RightsChange owner, group, others;
    [[nodiscard]] bool isAny() const { return owner.isAny() || group.isAny() || others.isAny(); }
};

struct EntryChange {
    Holder holder = Holder::kUser;
    id_t id = 0;
    bool remove = false;
    RightsChange rights;
};

struct PermissionChange {
    std::optional<uid_t> owner;
    std::optional<gid_t> group;
    ModeChange mode;                     // of folders, and of files where these have none of their own
    std::optional<ModeChange> fileMode;  // of everything but folders
    std::vector<EntryChange> entries;
    std::vector<EntryChange> defaults;  // of folders
    bool noDefaults = false;
    bool below = false;

    [[nodiscard]] bool isAny() const {
        return owner || group || mode.isAny() || fileMode || !entries.empty() || !defaults.empty() || noDefaults;
    }
};

// "u=rwX,go-w": clauses of any of u, g, o and a, one of +, - and =, and any of r, w, x and X. Nothing for other text.
[[nodiscard]] std::optional<ModeChange> parseMode(std::string_view text);

// The parameters "owner", "group", "mode", "file_mode", "entries", "defaults" and "below". 0; 400, 403 for an unknown
// user and 404 for an unknown group, with "parameter" in `data`.
[[nodiscard]] int readChange(const VEXO::WebCGI& web, PermissionChange& change, Json::Value& data);

// What the change makes of `now`. The mask of a list becomes what its entries need; what it withheld from an entry that
// the change leaves alone stays withheld.
[[nodiscard]] Permissions changed(const Permissions& now, bool isFolder, const PermissionChange& change);

// Who changes something.
struct Actor {
    uid_t uid = 0;
    std::vector<gid_t> groups;
    [[nodiscard]] static Actor ofProcess();
    [[nodiscard]] bool isIn(gid_t group) const;
};

// What somebody gives up by a change.
enum Loss : unsigned {
    kLosesOwner = 1,   // it belongs to somebody else: its owner cannot take it back
    kLosesGroup = 2,   // the actor is not in the group that it had and cannot give it back
    kLosesAccess = 4,  // the actor can no longer read the file, or list or enter the folder
    kLosesSetGid = 8   // the system drops the set-group-id bit of a group that the actor is not in
};
[[nodiscard]] unsigned lossesOf(const Permissions& now, const Permissions& then, bool isFolder, const Actor& actor);

}  // namespace orvel::cgi

#endif
