// The class through which listings read a share.
#include <exception>

#include "accounts/user_list.h"
#include "failure.h"
#include "fault_gate.h"
#include "shares/share_record.h"
#include "vexo/share.h"

namespace SDK {

Share* Share::LoadShare(const char* name) try {
    VEXO_GATE("SDK::Share::LoadShare", nullptr);
    if (name == nullptr) {
        vexo::fail(VEXO_ERR_PARAMETER);
        return nullptr;
    }
    vexo::ShareRecord record = vexo::loadShare(name);
    if (record == nullptr) return nullptr;
    auto* share = new Share(record.get());
    static_cast<void>(record.release());
    return share;
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return nullptr;
}

Share::~Share() {
    VEXOShareFree(record_);
}

void Share::Release(Share* share) {
    delete share;
}

int Share::GetStatus() const {
    return static_cast<int>(record_->fStatus);
}

int Share::GetAccessRight(const char* user) const try {
    VEXO_GATE("SDK::Share::GetAccessRight", 0);
    if (user == nullptr) return 0;
    vexo::ListedUser listed(user);
    const int right = listed.rightOn(*record_);
    return listed.failed() ? 0 : right;
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return 0;
}

int Share::GetFTPPrivilege() const {
    return record_->ftp;
}

bool Share::GetACLEnable() const {
    return record_->acl != 0;
}

const char* Share::GetName() const {
    return record_->szName;
}

const char* Share::GetFullPath() const {
    return record_->szPath;
}

}  // namespace SDK
