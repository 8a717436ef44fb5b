#include "accounts/user_list.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <exception>
#include <utility>

#include "accounts/account_source.h"
#include "failure.h"
#include "fault_gate.h"
#include "shares/share_options.h"
#include "vexo/text.h"

namespace vexo {
namespace {

constexpr std::string_view kEverybody = "*";
constexpr std::string_view kGroupMarks = "@+&";

bool areEqual(const std::string& a, const std::string& b) {
    return VLIBCUnicodeUTF8StrCaseCmp(a.c_str(), b.c_str()) == 0;
}

}  // namespace

bool ListedUser::isIn(PVLIBCSZLIST list) {
    for (int i = 0; list != nullptr && i < list->nItem; ++i) {
        if (matches(VLIBCSzListGet(list, i))) return true;
    }
    return false;
}

// All of its conditions must hold. What cannot be determined does not, neither way.
bool ListedUser::matches(std::string_view entry) {
    while (true) {
        const size_t end = entry.find(kListAnd);
        std::string_view condition = entry.substr(0, end);
        const bool isNot = condition.starts_with(kListNot);
        if (isNot) condition.remove_prefix(1);
        if (holds(condition) == isNot || failed_ || name_.empty()) return false;
        if (end == std::string_view::npos) return true;
        entry.remove_prefix(end + 1);
    }
}

bool ListedUser::holds(std::string_view entry) {
    if (entry == kEverybody) return true;
    if (entry.starts_with(kListId)) return hasId(entry.substr(1));
    const size_t marks = std::min(entry.find_first_not_of(kGroupMarks), entry.size());
    const std::string name(entry.substr(marks));
    return marks > 0 ? isInGroup(name) : areEqual(name, name_);
}

// "uNUMBER" is the user's own number, "gNUMBER" that of a group he is in.
bool ListedUser::hasId(std::string_view text) {
    unsigned id = 0;
    const char* const end = text.data() + text.size();
    if (text.size() < 2 || std::from_chars(text.data() + 1, end, id).ptr != end) return false;
    if (text.front() == 'g') {
        const std::vector<gid_t>& mine = groups();
        return std::find(mine.begin(), mine.end(), id) != mine.end();
    }
    Account account;
    const Lookup answer = AccountSource::instance().user(name_, account);
    if (answer == Lookup::failed) {
        failed_ = true;
        fail(VEXO_ERR_GENERAL);
    }
    return answer == Lookup::found && account.uid == id;
}

int ListedUser::rightOn(const VEXOSHARE& share) {
    if (isIn(share.naList)) return 0;
    if (isIn(share.rwList)) return 2;
    return isIn(share.roList) ? 1 : 0;
}

// The name as it stands decides where there is such a group; else case does not count for one of a domain.
bool ListedUser::isInGroup(const std::string& group) {
    const std::vector<gid_t>& mine = groups();
    if (mine.empty() || group.empty()) return false;
    AccountSource& accounts = AccountSource::instance();
    Group record;
    Lookup answer = accounts.group(group, record);
    if (answer == Lookup::found) return std::find(mine.begin(), mine.end(), record.gid) != mine.end();
    const bool ofDomain = group.find('\\') != std::string::npos;
    for (size_t i = 0; ofDomain && i < mine.size() && answer != Lookup::failed; ++i) {
        answer = accounts.group(mine[i], record);
        if (answer == Lookup::found && areEqual(record.name, group)) return true;
    }
    if (answer == Lookup::failed) {
        failed_ = true;
        fail(VEXO_ERR_GENERAL);
    }
    return false;
}

const std::vector<gid_t>& ListedUser::groups() {
    if (groups_) return *groups_;
    groups_.emplace();
    AccountSource& accounts = AccountSource::instance();
    Account account;
    const Lookup answer = accounts.user(name_, account);
    const bool known = answer == Lookup::found && accounts.groupsOf(name_, account.gid, *groups_);
    if (!known && answer != Lookup::missing) {
        failed_ = true;
        fail(VEXO_ERR_GENERAL);
    }
    return *groups_;
}

}  // namespace vexo

int BlSDKUserIsInList(const char* user, PVLIBCSZLIST list) try {
    VEXO_GATE("BlSDKUserIsInList", 0);
    if (user == nullptr || list == nullptr) {
        vexo::fail(VEXO_ERR_PARAMETER);
        return 0;
    }
    return static_cast<int>(vexo::ListedUser(user).isIn(list));
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return 0;
}
