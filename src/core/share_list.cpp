// The shares that a user may use.
#include <syslog.h>

#include "core/boundary.h"
#include "core/owned.h"
#include "core/privilege_facts.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "vexo/error.h"
#include "vexo/list.h"
#include "vexo/share.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orveldir";
constexpr int kListSize = 1024;
constexpr int kSortAscending = 16;

bool offers(PrivilegeRule rule, bool writableOnly) {
    return rule == PrivilegeRule::kReadWrite || (rule == PrivilegeRule::kReadOnly && !writableOnly);
}

// False when not every share could be asked about: a shorter list would look like the whole one.
[[nodiscard]] bool collect(PVEXOSHAREDB database, const char* user, bool writableOnly, StringList& names) {
    ShareRecord share;
    int delivered = 0;
    while ((delivered = VEXOShareDBCursorGet(database, lend(share))) == 0) {
        if ((share->fStatus & VEXO_SHARE_HIDDEN) != 0) continue;
        const ListMembership lists = listsOf(user, *share, AskLists::kUntilDecided);
        if (lists.failed) return false;
        if (!offers(ruleOf(lists), writableOnly)) continue;
        if (VLIBCSzListPush(lend(names), share->szName) < 0) return false;
    }
    return delivered > 0;
}

// Null on failure.
StringList usableShares(const char* user, bool sort, bool writableOnly) {
    if (user == nullptr) {
        syslog(LOG_ERR, "%s(%d) bad parameter", kSource, __LINE__);
        return nullptr;
    }
    StringList names(VLIBCSzListAlloc(kListSize));
    if (names == nullptr) {
        syslog(LOG_ERR, "%s(%d) malloc fail", kSource, __LINE__);
        return nullptr;
    }
    const ShareDatabase database(VEXOShareDBOpen());
    if (database == nullptr) {
        syslog(LOG_ERR, "%s:%d VEXOShareDBOpenFile Error[%X]\n", kSource, __LINE__,
               static_cast<unsigned>(VLIBCErrGet()));
        return nullptr;
    }
    if (!collect(database.get(), user, writableOnly, names)) return nullptr;
    if (sort) VLIBCSzListSortItems(names.get(), kSortAscending);
    return names;
}

}  // namespace
}  // namespace orvel

PVLIBCSZLIST OrvLibValidShareGen(const char* user, int sort, int writableOnly) {
    return orvel::guarded<PVLIBCSZLIST>(nullptr, [&] {
        orvel::StringList names = orvel::usableShares(user, sort != 0, writableOnly != 0);
        OrvLibSetErr(names == nullptr ? ORV_ERR_GENERAL : ORV_ERR_NONE);
        return names.release();
    });
}
