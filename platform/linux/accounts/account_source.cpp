#include "accounts/account_source.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "accounts/account_nss.h"
#include "vexo/system_root.h"

namespace vexo {
namespace {

// Answers from `memory`, or asks and remembers whatever is certain.
template <class Key, class Record, class Ask>
Lookup remembered(std::unordered_map<Key, std::optional<Record>>& memory, const Key& key, Record& out, const Ask& ask) {
    auto place = memory.find(key);
    if (place == memory.end()) {
        Record record;
        const Lookup answer = ask(key, record);
        if (answer == Lookup::failed) return answer;
        place = memory.emplace(key, answer == Lookup::found ? std::optional(std::move(record)) : std::nullopt).first;
    }
    if (!place->second) return Lookup::missing;
    out = *place->second;
    return Lookup::found;
}

}  // namespace

AccountSource& AccountSource::instance() {
    static AccountSource& source = *new AccountSource;  // still asked at exit
    return source;
}

// A root whose files cannot be read has no users: the machine's own must not stand in for them.
AccountSource::Origin AccountSource::refresh() {
    if (VEXO::SystemRoot().empty()) return Origin::nss;
    const int before = errno;
    const bool read = files_.refresh(VEXO::SystemPath("/etc/passwd"), VEXO::SystemPath("/etc/group"));
    if (readings_ != files_.readings()) {
        readings_ = files_.readings();
        unknownUids_.clear();
        unknownGids_.clear();
    }
    if (!read && errno != ENOENT && errno != ENOTDIR) return Origin::unreadable;
    errno = before;
    return read ? Origin::files : Origin::nss;
}

void AccountSource::refreshFiles() {
    static_cast<void>(refresh());
}

template <class Key, class Record, class Nss>
Lookup AccountSource::find(Memory<Key, Record>& memory, const Key& key, Record& out,
                           const Record* (AccountFiles::*inFiles)(Arg<Key>) const, const Nss& nss) {
    const Origin origin = refresh();
    if (origin == Origin::unreadable) return Lookup::failed;
    if (origin == Origin::nss) return remembered(memory, key, out, nss);
    const Record* record = (files_.*inFiles)(key);
    if (record == nullptr) return Lookup::missing;
    out = *record;
    return Lookup::found;
}

Lookup AccountSource::user(const std::string& name, Account& out) {
    return find(userByName_, name, out, &AccountFiles::user,
                [](const std::string& key, Account& record) { return nss::user(key, record); });
}

Lookup AccountSource::user(uid_t uid, Account& out) {
    if (unknownUids_.contains(uid)) return Lookup::missing;
    const Lookup answer = find(userByUid_, uid, out, &AccountFiles::user,
                               [](uid_t key, Account& record) { return nss::user(key, record); });
    if (answer == Lookup::missing) unknownUids_.insert(uid);
    return answer;
}

Lookup AccountSource::group(const std::string& name, Group& out) {
    return find(groupByName_, name, out, &AccountFiles::group,
                [](const std::string& key, Group& record) { return nss::group(key, record); });
}

Lookup AccountSource::group(gid_t gid, Group& out) {
    if (unknownGids_.contains(gid)) return Lookup::missing;
    const Lookup answer = find(groupByGid_, gid, out, &AccountFiles::group,
                               [](gid_t key, Group& record) { return nss::group(key, record); });
    if (answer == Lookup::missing) unknownGids_.insert(gid);
    return answer;
}

bool AccountSource::groupsOf(const std::string& user, gid_t primary, std::vector<gid_t>& out) {
    const Origin origin = refresh();
    if (origin == Origin::unreadable) return false;
    if (origin == Origin::nss) {
        const std::string key = std::to_string(primary) + ' ' + user;
        auto place = groupsOfUser_.find(key);
        if (place == groupsOfUser_.end()) place = groupsOfUser_.emplace(key, nss::groupsOf(user, primary)).first;
        out = place->second;
        return true;
    }
    out = {primary};
    for (const gid_t gid : files_.listing(user)) {
        if (std::find(out.begin(), out.end(), gid) == out.end()) out.push_back(gid);
    }
    return true;
}

std::optional<Validity> AccountSource::validity(const std::string& user) {
    const Origin origin = refresh();
    if (origin == Origin::files) return files_.validity(VEXO::SystemPath("/etc/shadow"), user);
    if (origin == Origin::unreadable) return std::nullopt;
    if (const auto known = validityOfUser_.find(user); known != validityOfUser_.end()) return known->second;
    const std::optional<Validity> found = nss::validity(user);
    if (found) validityOfUser_.emplace(user, *found);
    return found;
}

bool AccountSource::users(std::vector<Account>& out) {
    const Origin origin = refresh();
    if (origin == Origin::files) out = files_.users();
    return origin == Origin::files || (origin == Origin::nss && nss::users(out));
}

bool AccountSource::groups(std::vector<Group>& out) {
    const Origin origin = refresh();
    if (origin == Origin::files) out = files_.groups();
    return origin == Origin::files || (origin == Origin::nss && nss::groups(out));
}

}  // namespace vexo
