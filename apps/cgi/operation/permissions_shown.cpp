// What the permissions of chosen items have in common.
//
// data: {"items","folders","links","failed","left_out","owned","administrator","owner","group","entries","defaults",
// "default_folders","entries_left_out","groups"}. "items" were looked at, of which "folders" are folders; "links" are
// left alone, "failed" may not be known, "left_out" are more than are looked at; "owned": of how many the user may
// change the mode. "owner" and "group": {"id","name"}, absent where they differ. "entries": [{"kind": "user", "group",
// "mask" or "other", "id" and "name" of a named one, "all": rights that it has in every item, "any": in some, "items":
// how many have the entry}], rights as the mask leaves them, 4 read, 2 write, 1 run or enter. "defaults": the same of
// the lists that folders hand down. "groups": those that the user may give.
#include <json/value.h>
#include <unistd.h>

#include <map>
#include <tuple>

#include "operation/operation.h"
#include "operation/permission_change.h"
#include "operation/permission_item.h"
#include "orvel/error_state.h"
#include "orvel/user_directory.h"

namespace orvel::cgi {
namespace {

constexpr size_t kMostItems = 1000;
constexpr size_t kMostEntries = 500;
constexpr size_t kMostGroups = 1000;

const char* kindOf(Holder holder) {
    switch (holder) {
        case Holder::kOwner:
        case Holder::kUser:
            return "user";
        case Holder::kOwningGroup:
        case Holder::kGroup:
            return "group";
        case Holder::kMask:
            return "mask";
        case Holder::kOthers:
            break;
    }
    return "other";
}

// The entries of several lists.
class Common {
 public:
    void add(const Grants& grants) {
        for (const Grant& grant : grants) {
            const auto key = std::tuple(grant.holder, grant.id);
            if (found_.size() == kMostEntries && !found_.contains(key)) {
                ++leftOut_;
                continue;
            }
            const unsigned rights = effective(grants, grant);
            Seen& seen = found_[key];
            seen = {seen.all & rights, seen.any | rights, seen.items + 1};
        }
    }
    [[nodiscard]] Json::Value text(OrvelUserEnum& names) const {
        Json::Value entries(Json::arrayValue);
        for (const auto& [key, seen] : found_) {
            const auto& [holder, id] = key;
            Json::Value entry;
            entry["kind"] = kindOf(holder);
            if (holder == Holder::kUser || holder == Holder::kGroup) {
                entry["id"] = id;
                entry["name"] = holder == Holder::kUser ? names.GetUserNameByUID(id) : names.GetGroupNameByGID(id);
            }
            entry["all"] = seen.all;
            entry["any"] = seen.any;
            entry["items"] = seen.items;
            entries.append(entry);
        }
        return entries;
    }
    [[nodiscard]] Json::Int64 leftOut() const { return leftOut_; }

 private:
    struct Seen {
        unsigned all = kMayAll, any = 0;
        int items = 0;
    };
    std::map<std::tuple<Holder, id_t>, Seen> found_;
    Json::Int64 leftOut_ = 0;
};

template <class Id>
class Same {
 public:
    void add(Id id) {
        mixed_ = mixed_ || (known_ && id_ != id);
        known_ = true;
        id_ = id;
    }
    [[nodiscard]] bool is() const { return known_ && !mixed_; }
    [[nodiscard]] Id id() const { return id_; }

 private:
    Id id_ = 0;
    bool known_ = false, mixed_ = false;
};

Json::Value named(id_t id, const std::string& name) {
    Json::Value value;
    value["id"] = id;
    value["name"] = name;
    return value;
}

class Shown {
 public:
    void add(const Permissions& permissions, bool isFolder) {
        ++items_;
        folders_ += isFolder ? 1 : 0;
        owned_ += actor_.uid == 0 || actor_.uid == permissions.owner ? 1 : 0;
        owner_.add(permissions.owner);
        group_.add(permissions.group);
        access_.add(permissions.access);
        defaults_.add(permissions.defaults);
        defaultFolders_ += permissions.defaults.empty() ? 0 : 1;
    }
    void addLink() { ++links_; }
    void addFailed() { ++failed_; }
    [[nodiscard]] int items() const { return items_ + links_; }
    void write(Json::Value& data) {
        data["items"] = items_;
        data["folders"] = folders_;
        data["links"] = links_;
        data["failed"] = failed_;
        data["owned"] = owned_;
        data["administrator"] = actor_.uid == 0;
        if (owner_.is()) data["owner"] = named(owner_.id(), names_.GetUserNameByUID(owner_.id()));
        if (group_.is()) data["group"] = named(group_.id(), names_.GetGroupNameByGID(group_.id()));
        data["entries"] = access_.text(names_);
        data["defaults"] = defaults_.text(names_);
        data["default_folders"] = defaultFolders_;
        data["entries_left_out"] = access_.leftOut() + defaults_.leftOut();
        Json::Value& groups = data["groups"] = Json::Value(Json::arrayValue);
        for (size_t i = 0; i < std::min(actor_.groups.size(), kMostGroups); ++i) {
            const std::string name = names_.GetGroupNameByGID(actor_.groups[i]);
            if (!name.empty()) groups.append(named(actor_.groups[i], name));
        }
    }

 private:
    const Actor actor_ = Actor::ofProcess();
    OrvelUserEnum names_;
    int items_ = 0, folders_ = 0, links_ = 0, failed_ = 0, owned_ = 0, defaultFolders_ = 0;
    Same<uid_t> owner_;
    Same<gid_t> group_;
    Common access_, defaults_;
};

// Adds one of them. 0, or why it may not be known.
int look(Operation& operation, size_t position, Shown& shown) {
    Item item;
    Descriptor opened;
    Permissions permissions;
    int code = operation.chosen.open(operation.user, position, {Need::kList}, item);
    if (code != ORV_ERR_NONE) return code;
    if (S_ISLNK(item.status.st_mode)) {
        shown.addLink();
        return code;
    }
    if (!openForPermissions(item, opened)) return OrvParseErrnoToError(errno, nullptr, nullptr);
    code = readKnown(opened, permissions);
    if (code == ORV_ERR_NONE) shown.add(permissions, S_ISDIR(item.status.st_mode));
    return code;
}

}  // namespace

int permissionsOperation(Operation& operation) {
    Shown shown;
    int first = ORV_ERR_NONE;
    const size_t count = std::min(operation.chosen.size(), kMostItems);
    for (size_t i = 0; i < count; ++i) {
        const int code = look(operation, i, shown);
        if (code == ORV_ERR_NONE) continue;
        shown.addFailed();
        if (first == ORV_ERR_NONE) {
            first = code;
            operation.culprit = operation.chosen.path(i);
        }
    }
    if (shown.items() == 0 && first != ORV_ERR_NONE) return first;
    shown.write(operation.data);
    operation.data["left_out"] = Json::Int64(operation.chosen.size() - count);
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
