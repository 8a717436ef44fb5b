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

bool offers(const VEXOSHARE& share, const char* user, bool writableOnly) {
    if ((share.fStatus & VEXO_SHARE_HIDDEN) != 0) return false;
    const PrivilegeRule rule = ruleOf(listsOf(user, share, AskLists::kUntilDecided));
    return rule == PrivilegeRule::kReadWrite || (rule == PrivilegeRule::kReadOnly && !writableOnly);
}

// False when memory is out.
[[nodiscard]] bool collect(PVEXOSHAREDB database, const char* user, bool writableOnly, StringList& names) {
    ShareRecord share;
    while (VEXOShareDBCursorGet(database, lend(share)) == 0) {
        if (!offers(*share, user, writableOnly)) continue;
        if (VLIBCSzListPush(lend(names), share->szName) < 0) return false;
    }
    return true;
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
