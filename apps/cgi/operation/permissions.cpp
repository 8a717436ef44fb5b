#include "operation/permissions.h"

#include <acl/libacl.h>
#include <fcntl.h>
#include <sys/acl.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <memory>
#include <tuple>

#include "base/owner.h"

namespace orvel::cgi {
namespace {

using OwnedList = std::unique_ptr<std::remove_pointer_t<acl_t>, Releaser<acl_free>>;

constexpr struct {
    Holder holder;
    acl_tag_t tag;
    char letter;
} kHolders[] = {
    {Holder::kOwner, ACL_USER_OBJ, 'u'}, {Holder::kUser, ACL_USER, 'U'}, {Holder::kOwningGroup, ACL_GROUP_OBJ, 'g'},
    {Holder::kGroup, ACL_GROUP, 'G'},    {Holder::kMask, ACL_MASK, 'm'}, {Holder::kOthers, ACL_OTHER, 'o'}};

constexpr std::pair<unsigned, acl_perm_t> kRights[] = {
    {kMayRead, ACL_READ}, {kMayWrite, ACL_WRITE}, {kMayRun, ACL_EXECUTE}};

bool isNamed(Holder holder) {
    return holder == Holder::kUser || holder == Holder::kGroup;
}

void sort(Grants& grants) {
    std::sort(grants.begin(), grants.end(),
              [](const Grant& a, const Grant& b) { return std::tie(a.holder, a.id) < std::tie(b.holder, b.id); });
}

std::optional<Grant> grantOfEntry(acl_entry_t entry) {
    acl_tag_t tag = ACL_UNDEFINED_TAG;
    acl_permset_t rights = nullptr;
    if (acl_get_tag_type(entry, &tag) != 0 || acl_get_permset(entry, &rights) != 0) return std::nullopt;
    Grant grant;
    const auto* found =
        std::find_if(std::begin(kHolders), std::end(kHolders), [tag](const auto& known) { return known.tag == tag; });
    if (found == std::end(kHolders)) return std::nullopt;
    grant.holder = found->holder;
    if (isNamed(grant.holder)) {
        const std::unique_ptr<void, Releaser<acl_free>> id(acl_get_qualifier(entry));
        if (id == nullptr) return std::nullopt;
        grant.id = *static_cast<id_t*>(id.get());
    }
    for (const auto& [right, bit] : kRights) grant.rights |= acl_get_perm(rights, bit) == 1 ? right : 0;
    return grant;
}

bool readList(const std::string& path, acl_type_t type, Grants& grants) {
    const OwnedList list(acl_get_file(path.c_str(), type));
    if (list == nullptr) return false;
    acl_entry_t entry = nullptr;
    for (int which = ACL_FIRST_ENTRY;; which = ACL_NEXT_ENTRY) {
        const int more = acl_get_entry(list.get(), which, &entry);
        if (more == 0) break;
        const auto grant = more == 1 ? grantOfEntry(entry) : std::nullopt;
        if (!grant) return false;
        grants.push_back(*grant);
    }
    sort(grants);
    return true;
}

bool fillEntry(acl_entry_t entry, const Grant& grant) {
    acl_permset_t rights = nullptr;
    const auto& known = kHolders[static_cast<size_t>(grant.holder)];
    if (acl_set_tag_type(entry, known.tag) != 0 || acl_get_permset(entry, &rights) != 0) return false;
    if (isNamed(grant.holder) && acl_set_qualifier(entry, &grant.id) != 0) return false;
    for (const auto& [right, bit] : kRights) {
        if ((grant.rights & right) != 0 && acl_add_perm(rights, bit) != 0) return false;
    }
    return true;
}

bool writeList(const std::string& path, acl_type_t type, const Grants& grants) {
    acl_t list = acl_init(static_cast<int>(grants.size()));
    bool whole = list != nullptr;
    for (size_t i = 0; whole && i < grants.size(); ++i) {
        acl_entry_t entry = nullptr;
        whole = acl_create_entry(&list, &entry) == 0 && fillEntry(entry, grants[i]);  // the list may move
    }
    const OwnedList owned(list);
    return whole && acl_set_file(path.c_str(), type, list) == 0;
}

bool writeAccess(const Descriptor& opened, const Permissions& from, const Permissions& to) {
    // What is open as a place is changed by its path in /proc, which leads there and nowhere else.
    if (grantOf(from.access, Holder::kMask) != nullptr || grantOf(to.access, Holder::kMask) != nullptr) {
        return writeList(opened.path(), ACL_TYPE_ACCESS, to.access);
    }
    struct stat status {};
    if (fstat(opened.get(), &status) != 0) return false;
    const mode_t mode = rightsOf(to.access, Holder::kOwner) << 6 | rightsOf(to.access, Holder::kOwningGroup) << 3 |
                        rightsOf(to.access, Holder::kOthers);
    return fchmodat(AT_FDCWD, opened.path().c_str(), (status.st_mode & 07000) | mode, 0) == 0;
}

bool writeDefaults(const Descriptor& opened, const Grants& grants) {
    const std::string path = opened.path();
    return grants.empty() ? acl_delete_def_file(path.c_str()) == 0 : writeList(path, ACL_TYPE_DEFAULT, grants);
}

std::string textOf(const Grants& grants) {
    std::string text;
    for (const Grant& grant : grants) {
        text += text.empty() ? "" : ",";
        text += kHolders[static_cast<size_t>(grant.holder)].letter;
        if (isNamed(grant.holder)) text += std::to_string(grant.id);
        text += "=" + std::to_string(grant.rights);
    }
    return text.empty() ? "-" : text;
}

std::string_view pieceOf(std::string_view& text, char end) {
    const size_t length = std::min(text.find(end), text.size());
    const std::string_view piece = text.substr(0, length);
    text.remove_prefix(std::min(length + 1, text.size()));
    return piece;
}

template <class Number>
bool parseWhole(std::string_view text, Number& number) {
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    return error == std::errc() && end == text.data() + text.size();
}

bool parseGrants(std::string_view text, Grants& grants) {
    if (text == "-") return true;
    while (!text.empty()) {
        std::string_view rest = pieceOf(text, ',');
        const auto* known = std::find_if(std::begin(kHolders), std::end(kHolders), [rest](const auto& one) {
            return !rest.empty() && one.letter == rest.front();
        });
        if (known == std::end(kHolders)) return false;
        rest.remove_prefix(1);
        Grant grant = {known->holder, 0, 0};
        const std::string_view id = pieceOf(rest, '=');
        if (isNamed(grant.holder) ? !parseWhole(id, grant.id) : !id.empty()) return false;
        if (!parseWhole(rest, grant.rights) || grant.rights > kMayAll) return false;
        grants.push_back(grant);
    }
    return true;
}

}  // namespace

bool isSame(const Permissions& a, const Permissions& b) {
    return a.owner == b.owner && a.group == b.group && a.access == b.access && a.defaults == b.defaults;
}

const Grant* grantOf(const Grants& grants, Holder holder, id_t id) {
    const auto found = std::find_if(grants.begin(), grants.end(), [holder, id](const Grant& grant) {
        return grant.holder == holder && grant.id == id;
    });
    return found == grants.end() ? nullptr : &*found;
}

unsigned rightsOf(const Grants& grants, Holder holder, id_t id) {
    const Grant* grant = grantOf(grants, holder, id);
    return grant == nullptr ? 0 : grant->rights;
}

unsigned effective(const Grants& grants, const Grant& grant) {
    const Grant* mask = grantOf(grants, Holder::kMask);
    const bool masked = isNamed(grant.holder) || grant.holder == Holder::kOwningGroup;
    return mask != nullptr && masked ? grant.rights & mask->rights : grant.rights;
}

bool readPermissions(const Descriptor& opened, Permissions& permissions) {
    struct stat status {};
    if (fstat(opened.get(), &status) != 0) return false;
    permissions = {status.st_uid, status.st_gid, status.st_mode & 07000, {}, {}};
    return readList(opened.path(), ACL_TYPE_ACCESS, permissions.access) &&
           (!S_ISDIR(status.st_mode) || readList(opened.path(), ACL_TYPE_DEFAULT, permissions.defaults));
}

bool writePermissions(const Descriptor& opened, const Permissions& from, const Permissions& to) {
    const uid_t owner = to.owner == from.owner ? static_cast<uid_t>(-1) : to.owner;
    const gid_t group = to.group == from.group ? static_cast<gid_t>(-1) : to.group;
    const bool handed = to.owner != from.owner || to.group != from.group;
    if (handed && fchownat(opened.get(), "", owner, group, AT_EMPTY_PATH) != 0) return false;
    if (to.access != from.access && !writeAccess(opened, from, to)) return false;
    return to.defaults == from.defaults || writeDefaults(opened, to.defaults);
}

std::string textOf(const Permissions& permissions) {
    return std::to_string(permissions.owner) + " " + std::to_string(permissions.group) + " " +
           textOf(permissions.access) + " " + textOf(permissions.defaults);
}

std::optional<Permissions> parsePermissions(std::string_view text) {
    Permissions permissions;
    const bool whole = parseWhole(pieceOf(text, ' '), permissions.owner) &&
                       parseWhole(pieceOf(text, ' '), permissions.group) &&
                       parseGrants(pieceOf(text, ' '), permissions.access) && parseGrants(text, permissions.defaults);
    return whole && !permissions.access.empty() ? std::optional(permissions) : std::nullopt;
}

}  // namespace orvel::cgi
