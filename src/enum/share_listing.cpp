// The listing of the top level: the user's home folder and the shares that the user may use.
#include <dirent.h>
#include <sys/statfs.h>
#include <syslog.h>

#include <cstring>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/owned.h"
#include "enum/entry_fill.h"
#include "enum/entry_order.h"
#include "enum/page.h"
#include "orvel/listing.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "vexo/settings.h"
#include "vexo/share.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelenum";
constexpr int kPathSize = 4096;
constexpr uint32_t kReadWrite = 2;

StringList usableShares(const char* user, const char* context, bool writableOnly) {
    const int writable = writableOnly ? 1 : 0;
    if (strchr(user, '\\') != nullptr) return StringList(VexoCgiDomValidShareGen(context, user, 0, writable));
    if (strchr(user, '@') != nullptr) return StringList(VexoCgiLDAPValidShareGen(context, user, 0, writable));
    return StringList(OrvLibValidShareGen(user, 0, writable));
}

class ShareLister {
 public:
    ShareLister(OrvEnum& listing, OrvelMountStatus& mounts, const char* user, int additional, bool canSync)
        : listing_(listing), mounts_(mounts), user_(user), additional_(additional), canSync_(canSync) {}

    // False when the user has a home that cannot be resolved (logged, the code set).
    bool appendHome(std::list<DIRENTRY_INFO>& entries) {
        char home[kPathSize] = "";
        char resolved[kPathSize] = "";
        if (VEXOServiceHomePathGet(user_, home, sizeof home) != 0) return true;
        if (OrvLibRealFullPathGet(home, resolved, kPathSize - 1) == 0) {
            syslog(LOG_ERR, "%s:%d Failed to get real path (%s)", kSource, __LINE__, printable(home).c_str());
            return false;
        }
        DIRENTRY_INFO info;
        // Shown even when its status cannot be read: kept, a user sees a home that is there.
        listing_.FillFileInfo("/home", resolved, "home", DIR_ENTRY_TYPE_DIR, DT_DIR, additional_, info);
        if (wants(ADDITIONAL_PERM)) {
            info.shareAccessRight = kReadWrite;
            info.ftpPrivilege = 0;
            info.aclEnabled = false;
        }
        fillVolume(resolved, info);
        entries.push_back(std::move(info));
        return true;
    }

    void appendShare(const char* name, std::list<DIRENTRY_INFO>& entries) {
        const LoadedShare share(SDK::Share::LoadShare(name));
        if (!share || (share->GetStatus() & VEXO_SHARE_HIDDEN) != 0) return;
        DIRENTRY_INFO info;
        if (wants(ADDITIONAL_PERM)) {
            info.shareAccessRight = static_cast<uint32_t>(share->GetAccessRight(user_));
            info.ftpPrivilege = static_cast<uint32_t>(share->GetFTPPrivilege());
            info.aclEnabled = share->GetACLEnable();
        }
        if (wants(ADDITIONAL_SYNC_SHARE) && canSync_) info.syncedShare = VEXOS2SIsSyncedShare(share->GetName()) == 1;
        const std::string path = std::string("/") + name;
        const int filled = listing_.FillFileInfo(path.c_str(), share->GetFullPath(), share->GetName(),
                                                 DIR_ENTRY_TYPE_DIR, DT_DIR, additional_, info);
        if (filled != 0 && info.mountPointType != kUnreachable) return;
        fillVolume(share->GetFullPath(), info);
        entries.push_back(std::move(info));
    }

 private:
    [[nodiscard]] bool wants(int bit) const { return (additional_ & bit) != 0; }

    // A server that does not answer would be waited for, so its volume is not asked.
    void fillVolume(const char* realPath, DIRENTRY_INFO& info) {
        if (!wants(ADDITIONAL_VOLUME_STATUS) || info.mountPointType == kUnreachable) return;
        struct statfs64 volume = {};
        if (statfs64(realPath, &volume) == 0) {
            const auto block = static_cast<uint64_t>(volume.f_bsize);
            info.freeSpace = volume.f_bavail * block;
            info.totalSpace = volume.f_blocks * block;
        }
        info.readOnly = mounts_.IsReadOnly(realPath);
    }

    OrvEnum& listing_;
    OrvelMountStatus& mounts_;
    const char* user_;
    int additional_;
    bool canSync_;
};

}  // namespace
}  // namespace orvel

bool OrvEnum::OrvLibShareEntryListEnum(const char* user, const char* context, bool writableOnly, const char* sortBy,
                                       int additional, unsigned long offset, unsigned long limit, bool ascending,
                                       std::list<DIRENTRY_INFO>& entries, unsigned long* total) {
    return orvel::guarded(false, [&] {
        const bool canSync = VLIBCSupportGet("support_s2s") != 0;
        if (user == nullptr) {
            OrvLibSetErr(ORV_ERR_USER);
            syslog(LOG_ERR, "%s:%d Failed to get user (%s)", orvel::kSource, __LINE__, "(null)");
            return false;
        }
        if (total == nullptr) {
            OrvLibSetErr(ORV_ERR_PARAMETER);
            return false;
        }
        const orvel::StringList shares = orvel::usableShares(user, context, writableOnly);
        if (!shares) {
            syslog(LOG_ERR, "%s:%d Failed to enum valid shares", orvel::kSource, __LINE__);
            OrvLibSetErr(ORV_ERR_GENERAL);
            return false;
        }
        orvel::ShareLister lister(*this, mounts_, user, orvel::widened(additional, sortBy), canSync);
        if (!lister.appendHome(entries)) return false;
        for (int i = 0; i < shares->nItem; ++i) lister.appendShare(VLIBCSzListGet(shares.get(), i), entries);
        orvel::arrange(entries, {sortBy, ascending, offset, limit}, *total);
        return true;
    });
}
