// The transfer log: who did what with which file.
#ifndef VEXO_XFERLOG_H
#define VEXO_XFERLOG_H

#include "vexo/export.h"

VEXO_BEGIN_C
// Appends one entry with the present time to /var/log/vexo/xfer.log of the system root (docs/formats/xferlog.md), as a
// whole line or not at all, even if several processes log at once. `address` of the client, `user` and `action` are
// texts, `path` is the share-relative path; bytes that are no UTF-8 are kept beside a readable form. `size` in bytes.
// `flag` is kept as it is given (the callers': the entry is a folder). The file and its folder are made when they are
// missing. Raises to the saved uid 0 for itself.
//
// 0, or -1 with errno and the slot: 0x0D00 a null text, 0x0300 denied or a log that others could have forged, 0x2900
// and 0x2400 no room, 0x8100 else.
VEXO_API int VEXOLogKTRFMXferLog(const char* address, const char* user, const char* action, long long size,
                                 const char* path, bool flag);
VEXO_END_C

#endif
