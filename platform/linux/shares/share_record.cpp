#include "shares/share_record.h"

#include <optional>
#include <utility>
#include <vector>

#include "failure.h"
#include "field.h"
#include "settings/appliance_setting.h"
#include "shares/share_store.h"

namespace vexo {
namespace {

PVLIBCSZLIST makeList(const std::vector<std::string>& entries) {
    PVLIBCSZLIST list = VLIBCSzListAlloc(static_cast<int>(entries.size()));
    for (const std::string& entry : entries) {
        if (list == nullptr || VLIBCSzListPush(&list, entry.c_str()) >= 0) continue;
        VLIBCSzListFree(std::exchange(list, nullptr));
    }
    return list;
}

void releaseLists(VEXOSHARE& record) {
    VLIBCSzListFree(std::exchange(record.naList, nullptr));
    VLIBCSzListFree(std::exchange(record.rwList, nullptr));
    VLIBCSzListFree(std::exchange(record.roList, nullptr));
}

// Whom the share does not let in. Administrators act as root: a user's own folder, which may be exchanged for a link
// under their hands, is none for them. Nothing, with errno, when nobody knows who they are.
std::optional<std::vector<std::string>> noAccessOf(const ShareDefinition& share) {
    std::vector<std::string> entries = share.noAccess;
    if (!share.isUsers) return entries;
    const auto group = administratorsGroup();
    if (!group) return std::nullopt;
    if (!group->empty()) entries.push_back("@" + *group);
    return entries;
}

}  // namespace

bool fillShare(const ShareDefinition& share, const std::string& root, VEXOSHARE& record) {
    releaseLists(record);
    record = {};
    if (!fillField(record.szName, share.name) || !fillField(record.szPath, root)) {
        fail(VEXO_ERR_GENERAL, ENAMETOOLONG);
        return false;
    }
    record.fStatus = share.status;
    record.mask = share.mask;
    record.ftp = share.ftp;
    record.acl = static_cast<int>(share.acl);
    record.synced = static_cast<int>(share.synced);
    record.index = static_cast<int>(share.index);
    const auto noAccess = noAccessOf(share);
    if (!noAccess) return fail(VEXO_ERR_GENERAL) == 0;
    record.naList = makeList(*noAccess);
    record.rwList = makeList(share.readWrite);
    record.roList = makeList(share.readOnly);
    return record.naList != nullptr && record.rwList != nullptr && record.roList != nullptr;
}

ShareRecord loadShare(const char* name) {
    const auto shares = currentShares();
    if (shares == nullptr) {
        fail(VEXO_ERR_GENERAL);
        return nullptr;
    }
    const ShareDefinition* share = shares->find(name);
    const std::optional<std::string> root = share == nullptr ? std::nullopt : rootOf(*share);
    if (!root) {
        fail(VEXO_ERR_SHARE_MISSING);
        return nullptr;
    }
    ShareRecord record(new VEXOSHARE());
    if (!fillShare(*share, *root, *record)) return nullptr;
    return record;
}

}  // namespace vexo
