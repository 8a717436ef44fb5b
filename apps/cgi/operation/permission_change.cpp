#include "operation/permission_change.h"

#include <json/value.h>
#include <unistd.h>

#include <algorithm>
#include <tuple>

#include "orvel/error_state.h"
#include "request.h"
#include "vexo/user.h"

namespace orvel::cgi {
namespace {

constexpr size_t kMostEntries = 100;

// "rwX" with what is not granted as "-". False for anything else.
bool parseRights(std::string_view text, RightsChange& rights) {
    for (const char letter : text) {
        if (letter == 'r') rights.set |= kMayRead;
        if (letter == 'w') rights.set |= kMayWrite;
        if (letter == 'x') rights.set |= kMayRun;
        if (letter == 'X') rights.runWhereSensible = true;
        if (std::string_view("rwxX-").find(letter) == std::string_view::npos) return false;
    }
    return true;
}

// One clause on top of those before it.
void add(char operation, const RightsChange& rights, RightsChange& change) {
    if (operation == '=') {
        change = rights;
        change.clear = kMayAll;
    } else if (operation == '+') {
        change.set |= rights.set;
        change.runWhereSensible = change.runWhereSensible || rights.runWhereSensible;
    } else {
        const unsigned gone = rights.set | (rights.runWhereSensible ? kMayRun : 0);
        change.clear |= gone;
        change.set &= ~gone;
        change.runWhereSensible = change.runWhereSensible && (gone & kMayRun) == 0;
    }
}

bool parseClause(std::string_view text, ModeChange& mode) {
    const size_t at = text.find_first_of("+-=");
    if (at == std::string_view::npos || at == 0) return false;
    const std::string_view who = text.substr(0, at);
    RightsChange rights;
    const std::string_view letters = text.substr(at + 1);
    if (who.find_first_not_of("ugoa") != std::string_view::npos || letters.find('-') != std::string_view::npos ||
        !parseRights(letters, rights)) {
        return false;
    }
    const auto isFor = [who](char one) { return who.find_first_of(std::string{one, 'a'}) != std::string_view::npos; };
    if (isFor('u')) add(text[at], rights, mode.owner);
    if (isFor('g')) add(text[at], rights, mode.group);
    if (isFor('o')) add(text[at], rights, mode.others);
    return true;
}

// A name, or "#" and an id. 0, 403 or 404.
int findId(bool isUser, const std::string& name, id_t& id) {
    uid_t uid = 0;
    gid_t gid = 0;
    if (name.starts_with('#')) {
        const auto number = parseNumber(std::string_view(name).substr(1));
        id = static_cast<id_t>(number.value_or(0));
        if (number && *number == id && id != static_cast<id_t>(-1)) return ORV_ERR_NONE;
    } else if (isUser && VEXOUserGetUGID(name.c_str(), &uid, &gid) == 0) {
        id = uid;
        return ORV_ERR_NONE;
    } else if (!isUser && VEXOGroupGetGID(name.c_str(), &gid) == 0) {
        id = gid;
        return ORV_ERR_NONE;
    }
    return isUser ? ORV_ERR_USER : ORV_ERR_GROUP;
}

// "user:NAME:RIGHTS", "group:NAME:RIGHTS"; without rights it goes. With `isDefault` also "user::RIGHTS",
// "group::RIGHTS" and "other::RIGHTS".
int parseEntry(const std::string& line, bool isDefault, EntryChange& entry) {
    const size_t first = line.find(':'), last = line.find(':', first == std::string::npos ? first : first + 1);
    if (first == std::string::npos) return ORV_ERR_PARAMETER;
    const std::string kind = line.substr(0, first);
    const std::string name = line.substr(first + 1, last == std::string::npos ? last : last - first - 1);
    const bool isUser = kind == "user", isOther = kind == "other";
    entry.remove = last == std::string::npos;
    const bool known = isUser || kind == "group" || (isOther && isDefault && name.empty());
    if (!known || (!entry.remove && !parseRights(std::string_view(line).substr(last + 1), entry.rights))) {
        return ORV_ERR_PARAMETER;
    }
    entry.rights.clear = kMayAll;
    if (name.empty()) {
        entry.holder = isOther ? Holder::kOthers : isUser ? Holder::kOwner : Holder::kOwningGroup;
        return isDefault && !entry.remove ? ORV_ERR_NONE : ORV_ERR_PARAMETER;
    }
    entry.holder = isUser ? Holder::kUser : Holder::kGroup;
    return findId(isUser, name, entry.id);
}

int readEntries(const std::vector<std::string>& lines, bool isDefault, std::vector<EntryChange>& entries) {
    if (lines.size() > kMostEntries) return ORV_ERR_PARAMETER;
    for (const std::string& line : lines) {
        const int code = parseEntry(line, isDefault, entries.emplace_back());
        if (code != ORV_ERR_NONE) return code;
    }
    return ORV_ERR_NONE;
}

template <class Id>
int readId(const VEXO::WebCGI& web, const char* name, bool isUser, std::optional<Id>& id) {
    const std::string text = web.GetParam(name, "");
    if (text.empty()) return ORV_ERR_NONE;
    id_t found = 0;
    const int code = findId(isUser, text, found);
    if (code == ORV_ERR_NONE) id = found;
    return code;
}

int readMode(const VEXO::WebCGI& web, const char* name, std::optional<ModeChange>& mode) {
    const std::string text = web.GetParam(name, "");
    if (text.empty()) return ORV_ERR_NONE;
    mode = parseMode(text);
    return mode ? ORV_ERR_NONE : ORV_ERR_PARAMETER;
}

bool isMasked(Holder holder) {
    return holder == Holder::kUser || holder == Holder::kOwningGroup || holder == Holder::kGroup;
}

void erase(Grants& grants, Holder holder, id_t id) {
    std::erase_if(grants, [holder, id](const Grant& grant) { return grant.holder == holder && grant.id == id; });
}

// What the mask withheld is withheld by the entries themselves from here on.
void settleMask(Grants& grants) {
    const Grants before = grants;
    for (Grant& grant : grants) grant.rights = effective(before, grant);
    erase(grants, Holder::kMask, 0);
}

// The mask that the entries need.
void renewMask(Grants& grants) {
    Grant mask = {Holder::kMask, 0, 0};
    bool named = false;
    for (const Grant& grant : grants) {
        if (isMasked(grant.holder)) mask.rights |= grant.rights;
        named = named || (isMasked(grant.holder) && grant.holder != Holder::kOwningGroup);
    }
    if (named) grants.push_back(mask);
    std::sort(grants.begin(), grants.end(),
              [](const Grant& a, const Grant& b) { return std::tie(a.holder, a.id) < std::tie(b.holder, b.id); });
}

void apply(const RightsChange& rights, Holder holder, bool runnable, Grants& grants) {
    for (Grant& grant : grants) {
        if (grant.holder == holder) grant.rights = rights.apply(grant.rights, runnable);
    }
}

void applyEntries(const std::vector<EntryChange>& entries, bool runnable, Grants& grants) {
    for (const EntryChange& entry : entries) {
        erase(grants, entry.holder, entry.id);
        if (!entry.remove) grants.push_back({entry.holder, entry.id, entry.rights.apply(0, runnable)});
    }
}

// What a folder hands down when it has not done so yet.
Grants firstDefaults(const Grants& access) {
    return {{Holder::kOwner, 0, rightsOf(access, Holder::kOwner)},
            {Holder::kOwningGroup, 0, rightsOf(access, Holder::kOwningGroup)},
            {Holder::kOthers, 0, rightsOf(access, Holder::kOthers)}};
}

bool isRunnable(const Grants& access) {
    return std::any_of(access.begin(), access.end(), [&access](const Grant& grant) {
        return grant.holder != Holder::kMask && (effective(access, grant) & kMayRun) != 0;
    });
}

}  // namespace

std::optional<ModeChange> parseMode(std::string_view text) {
    ModeChange mode;
    while (!text.empty()) {
        const size_t end = std::min(text.find(','), text.size());
        if (!parseClause(text.substr(0, end), mode)) return std::nullopt;
        text.remove_prefix(std::min(end + 1, text.size()));
    }
    return mode;
}

int readChange(const VEXO::WebCGI& web, PermissionChange& change, Json::Value& data) {
    std::vector<std::string> defaults = linesParam(web, "defaults");
    change.noDefaults = !defaults.empty() && defaults.front() == "none";
    if (change.noDefaults) defaults.erase(defaults.begin());
    std::optional<ModeChange> mode;
    change.below = web.GetParam("below", "") == "true";
    const struct {
        const char* parameter;
        int code;
    } read[] = {{"owner", readId(web, "owner", true, change.owner)},
                {"group", readId(web, "group", false, change.group)},
                {"mode", readMode(web, "mode", mode)},
                {"file_mode", readMode(web, "file_mode", change.fileMode)},
                {"entries", readEntries(linesParam(web, "entries"), false, change.entries)},
                {"defaults", readEntries(defaults, true, change.defaults)}};
    change.mode = mode.value_or(ModeChange{});
    for (const auto& one : read) {
        if (one.code == ORV_ERR_NONE) continue;
        data["parameter"] = one.parameter;
        return one.code;
    }
    return change.isAny() ? ORV_ERR_NONE : ORV_ERR_PARAMETER;
}

Permissions changed(const Permissions& now, bool isFolder, const PermissionChange& change) {
    Permissions then = now;
    then.owner = change.owner.value_or(now.owner);
    then.group = change.group.value_or(now.group);
    const bool runnable = isFolder || isRunnable(now.access);
    const ModeChange& mode = !isFolder && change.fileMode ? *change.fileMode : change.mode;
    // The mask is touched only where an entry that it bounds is.
    const bool masked = mode.group.isAny() || !change.entries.empty();
    if (masked) settleMask(then.access);
    apply(mode.owner, Holder::kOwner, runnable, then.access);
    apply(mode.group, Holder::kOwningGroup, runnable, then.access);
    apply(mode.others, Holder::kOthers, runnable, then.access);
    applyEntries(change.entries, runnable, then.access);
    if (masked) renewMask(then.access);
    if (!isFolder) return then;
    if (change.noDefaults) then.defaults.clear();
    if (change.defaults.empty()) return then;
    const bool adds = std::any_of(change.defaults.begin(), change.defaults.end(),
                                  [](const EntryChange& entry) { return !entry.remove; });
    if (then.defaults.empty() && !adds) return then;
    if (then.defaults.empty()) then.defaults = firstDefaults(then.access);
    settleMask(then.defaults);
    applyEntries(change.defaults, true, then.defaults);
    renewMask(then.defaults);
    return then;
}

Actor Actor::ofProcess() {
    Actor actor = {geteuid(), {}};
    const int count = getgroups(0, nullptr);
    actor.groups.resize(static_cast<size_t>(std::max(count, 0)));
    const int filled = getgroups(count, actor.groups.data());
    actor.groups.resize(static_cast<size_t>(std::max(filled, 0)));
    actor.groups.push_back(getegid());
    std::sort(actor.groups.begin(), actor.groups.end());
    actor.groups.erase(std::unique(actor.groups.begin(), actor.groups.end()), actor.groups.end());
    return actor;
}

bool Actor::isIn(gid_t group) const {
    return std::find(groups.begin(), groups.end(), group) != groups.end();
}

unsigned lossesOf(const Permissions& now, const Permissions& then, bool isFolder, const Actor& actor) {
    unsigned losses = then.owner != now.owner ? kLosesOwner : 0U;
    if (actor.uid == 0) return losses;
    if (then.group != now.group && !actor.isIn(now.group)) losses |= kLosesGroup;
    const unsigned needed = isFolder ? kMayRead | kMayRun : kMayRead;
    const unsigned before = rightsOf(now.access, Holder::kOwner), after = rightsOf(then.access, Holder::kOwner);
    if (now.owner == actor.uid && (before & ~after & needed) != 0) losses |= kLosesAccess;
    const bool isSet = (now.special & S_ISGID) != 0 && isFolder;
    if (isSet && then.access != now.access && !actor.isIn(then.group)) losses |= kLosesSetGid;
    return losses;
}

}  // namespace orvel::cgi
