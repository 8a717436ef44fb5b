// Shares of domain and directory users. The services answer through NSS (winbind, sssd): a user's groups come from
// there, and the lists of the shares decide.
#include <cerrno>
#include <exception>
#include <memory>
#include <string>

#include "accounts/account_name.h"
#include "accounts/account_source.h"
#include "accounts/user_list.h"
#include "failure.h"
#include "fault_gate.h"
#include "shares/share_record.h"
#include "shares/share_store.h"
#include "vexo/share.h"

namespace {

constexpr int kUnreachable = -2;
constexpr int kAscendingWithoutCase = 16;

// 0 when the service knows the user; else with the slot filled kUnreachable, or -1 for a user who does not exist.
int findUser(const char* user) {
    VEXO_GATE("DirectoryServer", kUnreachable);
    vexo::Account account;
    if (!vexo::isAccountName(user)) return vexo::fail(VEXO_ERR_USER_MISSING);
    switch (vexo::AccountSource::instance().user(user, account)) {
        case vexo::Lookup::found:
            return 0;
        case vexo::Lookup::missing:
            return vexo::fail(VEXO_ERR_USER_MISSING);
        default:
            vexo::fail(VEXO_ERR_GENERAL);
            return kUnreachable;
    }
}

int privilegeOf(const char* share, const char* user, int* privilege) {
    if (share == nullptr || user == nullptr || privilege == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    const int known = findUser(user);
    if (known < 0) return known;
    const vexo::ShareRecord record = vexo::loadShare(share);
    if (record == nullptr) return -1;
    vexo::ListedUser listed(user);
    const int right = listed.rightOn(*record);
    if (listed.failed()) return kUnreachable;
    *privilege = right;
    return 0;
}

using List = std::unique_ptr<VLIBCSZLIST, orvel::Releaser<VLIBCSzListFree>>;

bool push(List& list, const char* text) {
    return VLIBCSzListPush(orvel::lend(list), text) >= 0;
}

// Appends the names of the shares that the user may use; false with the slot filled.
bool addShares(const char* user, int leastRight, List& names) {
    const auto shares = vexo::currentShares();
    if (shares == nullptr) {
        vexo::fail(VEXO_ERR_GENERAL);
        return false;
    }
    vexo::ListedUser listed(user);
    VEXOSHARE* const record = new VEXOSHARE();
    const vexo::ShareRecord owner(record);
    for (const vexo::ShareDefinition& share : shares->all()) {
        const std::optional<std::string> root = vexo::rootOf(share);
        if (!root || (share.status & VEXO_SHARE_HIDDEN) != 0) continue;
        if (!vexo::fillShare(share, *root, *record)) return false;
        const bool usable = listed.rightOn(*record) >= leastRight;
        if (listed.failed() || (usable && !push(names, record->szName))) return false;
    }
    return true;
}

PVLIBCSZLIST sharesOf(const char* user, int sort, int writable) {
    if (user == nullptr) {
        vexo::fail(VEXO_ERR_PARAMETER);
        return nullptr;
    }
    if (findUser(user) < 0) return nullptr;
    List names(VLIBCSzListAlloc(1024));
    if (names == nullptr || !addShares(user, writable != 0 ? 2 : 1, names)) return nullptr;
    if (sort != 0) VLIBCSzListSortItems(names.get(), kAscendingWithoutCase);
    return names.release();
}

int failOnMemory() {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

}  // namespace

int VexoCgiDomGetPrivilege(const char* share, const char* user, const char* sid, int* privilege) try {
    VEXO_GATE("VexoCgiDomGetPrivilege", -1);
    static_cast<void>(sid);  // the services know their users without it
    return privilegeOf(share, user, privilege);
} catch (const std::exception&) {
    return failOnMemory();
}

int VexoCgiLDAPGetPrivilege(const char* share, const char* user, const char* sid, int* privilege) try {
    VEXO_GATE("VexoCgiLDAPGetPrivilege", -1);
    static_cast<void>(sid);
    return privilegeOf(share, user, privilege);
} catch (const std::exception&) {
    return failOnMemory();
}

PVLIBCSZLIST VexoCgiDomValidShareGen(const char* context, const char* user, int sort, int writable) try {
    VEXO_GATE("VexoCgiDomValidShareGen", nullptr);
    static_cast<void>(context);
    return sharesOf(user, sort, writable);
} catch (const std::exception&) {
    failOnMemory();
    return nullptr;
}

PVLIBCSZLIST VexoCgiLDAPValidShareGen(const char* context, const char* user, int sort, int writable) try {
    VEXO_GATE("VexoCgiLDAPValidShareGen", nullptr);
    static_cast<void>(context);
    return sharesOf(user, sort, writable);
} catch (const std::exception&) {
    failOnMemory();
    return nullptr;
}
