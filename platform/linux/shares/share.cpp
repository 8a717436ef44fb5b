// Shares: single records, all of them in order, and questions about one.
#include "vexo/share.h"

#include <exception>
#include <memory>
#include <string>

#include "failure.h"
#include "fault_gate.h"
#include "shares/share_record.h"
#include "shares/share_store.h"

struct VEXOSHAREDB {
    std::shared_ptr<const vexo::ShareTable> table;
    size_t next = 0;
};

int VEXOShareGet(const char* name, PVEXOSHARE* out) try {
    if (out != nullptr) *out = nullptr;
    VEXO_GATE("VEXOShareGet", -1);
    if (name == nullptr || out == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    *out = vexo::loadShare(name).release();
    return *out == nullptr ? -1 : 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

void VEXOShareFree(PVEXOSHARE share) {
    if (share == nullptr) return;
    VLIBCSzListFree(share->naList);
    VLIBCSzListFree(share->rwList);
    VLIBCSzListFree(share->roList);
    delete share;
}

PVEXOSHAREDB VEXOShareDBOpen() try {
    VEXO_GATE("VEXOShareDBOpen", nullptr);
    auto db = std::make_unique<VEXOSHAREDB>();
    db->table = vexo::currentShares();
    if (db->table != nullptr) return db.release();
    vexo::fail(VEXO_ERR_GENERAL);
    return nullptr;
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return nullptr;
}

int VEXOShareDBCursorGet(PVEXOSHAREDB db, PVEXOSHARE* share) try {
    VEXO_GATE("VEXOShareDBCursorGet", -1);
    if (db == nullptr || share == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    while (db->next < db->table->all().size()) {
        const vexo::ShareDefinition& definition = db->table->all()[db->next++];
        const std::optional<std::string> root = vexo::rootOf(definition);
        if (!root) continue;  // there is no such share for this user
        if (*share == nullptr) *share = new VEXOSHARE();
        return vexo::fillShare(definition, *root, **share) ? 0 : -1;
    }
    return 1;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

void VEXOShareDBClose(PVEXOSHAREDB db) {
    delete db;
}

int VEXOS2SIsSyncedShare(const char* name) try {
    VEXO_GATE("VEXOS2SIsSyncedShare", 0);
    if (name == nullptr) {
        vexo::fail(VEXO_ERR_PARAMETER);
        return 0;
    }
    const auto shares = vexo::currentShares();
    const vexo::ShareDefinition* share = shares == nullptr ? nullptr : shares->find(name);
    if (share == nullptr) vexo::fail(shares == nullptr ? VEXO_ERR_GENERAL : VEXO_ERR_SHARE_MISSING);
    return static_cast<int>(share != nullptr && share->synced);
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return 0;
}

int VEXOShareIsShareRecycle(const char* realPath) try {
    VEXO_GATE("VEXOShareIsShareRecycle", -1);
    if (realPath == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    const auto shares = vexo::currentShares();
    if (shares == nullptr) return vexo::fail(VEXO_ERR_GENERAL);
    return static_cast<int>(shares->isRecycle(realPath));
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
