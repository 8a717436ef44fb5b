// Shares: definitions in smb.conf grammar, read once a process and again when a file of them changed.
#ifndef VEXO_SHARE_H
#define VEXO_SHARE_H

#include <string>

#include "vexo/export.h"
#include "vexo/list.h"
#include "vexo/user.h"

enum { VEXO_SHARE_HIDDEN = 0x1, VEXO_SHARE_ENCRYPTED = 0x2 };

struct VEXOSHARE {
    char szName[256];
    char szPath[4096];    // a real path of one component or more: /data, /volume1/photo, /srv/samba/team
    unsigned fStatus;     // VEXO_SHARE_...
    PVLIBCSZLIST naList;  // no access
    PVLIBCSZLIST rwList;  // read-write
    PVLIBCSZLIST roList;  // read-only
    unsigned mask;        // restriction: 0x1 no listing or download, 0x2 no modifying, 0x4 no download
    int ftp;
    int acl;
    int synced;
    int index;
};
typedef VEXOSHARE* PVEXOSHARE;
typedef struct VEXOSHAREDB* PVEXOSHAREDB;

VEXO_BEGIN_C
// Fills a new record (the caller's). Names compare without case. 0, or nonzero with 0x1400 missing, 0x8100 when the
// definitions cannot be read, and `*out` null.
VEXO_API int VEXOShareGet(const char* name, PVEXOSHARE* out);
VEXO_API void VEXOShareFree(PVEXOSHARE share);  // null is accepted

// Every share in the order of the definitions. Open: null with the slot set on failure. CursorGet: 0 while it delivers
// a record into `*share` (allocated at the first call and reused; the caller frees the last), >0 at the end, <0 with
// the slot set on failure.
VEXO_API PVEXOSHAREDB VEXOShareDBOpen(void);
VEXO_API int VEXOShareDBCursorGet(PVEXOSHAREDB db, PVEXOSHARE* share);
VEXO_API void VEXOShareDBClose(PVEXOSHAREDB db);

// 1 when the share is replicated to another appliance (option vexo:synced), else 0.
VEXO_API int VEXOS2SIsSyncedShare(const char* name);
// 1 when `realPath` is the recycle bin in a share's root, "#recycle" or what VEXOShareRecyclePath says (its first
// component), 0 when not, <0 on failure.
VEXO_API int VEXOShareIsShareRecycle(const char* realPath);

// The privilege (0 none, 1 read, 2 read-write) of a domain or directory user on a share, from the share's lists and the
// user's NSS groups. >=0; -1 failure; -2 when the lookup fails other than by "not found" (server not reachable).
VEXO_API int VexoCgiDomGetPrivilege(const char* share, const char* user, const char* sid, int* privilege);
VEXO_API int VexoCgiLDAPGetPrivilege(const char* share, const char* user, const char* sid, int* privilege);
// The names of the shares that such a user may use (write to, when `writable` is nonzero), sorted when `sort` is
// nonzero. `context` is the session identifier. The caller frees the list; null on failure.
VEXO_API PVLIBCSZLIST VexoCgiDomValidShareGen(const char* context, const char* user, int sort, int writable);
VEXO_API PVLIBCSZLIST VexoCgiLDAPValidShareGen(const char* context, const char* user, int sort, int writable);

// User homes: setting "userhome_enable". 1 on, 0 off (likewise when there is no share "homes").
VEXO_API int VEXOServiceUserHomeIsEnabled(int authType, uid_t uid);
// 0 and the home's path in `path` when the service is on and the home exists; else nonzero. Creates nothing.
VEXO_API int VEXOServiceHomePathGet(const char* user, char* path, int size);
VEXO_END_C

namespace SDK {

class VEXO_API Share {
 public:
    static Share* LoadShare(const char* name);  // null when missing; given back with Release
    static void Release(Share* share);          // null is accepted
    Share(const Share&) = delete;
    Share& operator=(const Share&) = delete;

    int GetStatus() const;  // VEXO_SHARE_... bits
    // 0 none, 1 read, 2 read-write, decided by the share's lists: no access beats read-write beats read-only.
    int GetAccessRight(const char* user) const;
    int GetFTPPrivilege() const;
    bool GetACLEnable() const;
    const char* GetName() const;
    const char* GetFullPath() const;

 private:
    explicit Share(PVEXOSHARE share) : record_(share) {}
    ~Share();
    PVEXOSHARE record_;
};

}  // namespace SDK

#endif
