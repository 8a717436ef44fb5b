// The auto-block service: addresses from which too many log-ins failed are denied for a while.
#ifndef VEXO_AUTO_BLOCK_H
#define VEXO_AUTO_BLOCK_H

#include "vexo/export.h"

// Addresses are numeric, IPv4 or IPv6; an IPv4 address mapped into IPv6 is the IPv4 address. The store is one file,
// /var/lib/vexo/autoblock.db below the system root, which belongs to root; every operation reaches it as root in a
// process that may become root. Settings of /etc/vexoinfo.conf: autoblock_enable ("no" turns the service off),
// autoblock_attempts (10), autoblock_minutes (5), autoblock_expire_minutes (1440; 0 never).
//
// -1 sets errno and the slot: 0x0D00 no address or a bad tag, 0x0300 a store that is not trusted, 0x2900 no space,
// 0x8100 else.

VEXO_BEGIN_C
// 1 when the address is denied, 0 when not (always while the service is off), -1 on failure.
VEXO_API int VexoCgiIsDeniedIP(const char* address);
// For how many seconds more the address is denied: 0 not at all, a day where it is for good; -1 on failure.
VEXO_API int VEXOAutoBlockWait(const char* address);
// Forgets the address: its failures and its denial. 0, or -1.
VEXO_API int VEXOAutoBlockResetByIP(const char* address);
// Counts one failed log-in at the service `tag` (1 to 64 bytes, no control bytes). As many of one address and tag as
// autoblock_attempts says within autoblock_minutes deny the address. 0 (also while the service is off), or -1.
VEXO_API int AutoBlockFailLoginSet(const char* address, const char* tag);
// Forgets what has ended, and counts it; -1 on failure.
VEXO_API long VEXOAutoBlockSweep(void);
VEXO_END_C

#endif
