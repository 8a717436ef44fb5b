// One process at a time, by the name of a lock file.
#ifndef VEXO_CRITICAL_SECTION_H
#define VEXO_CRITICAL_SECTION_H

#include "vexo/export.h"

VEXO_BEGIN_C
// Enters the critical section `name`, the path of a lock file ("/tmp/foldersharing.current.users.lock", taken below the
// system root; made with mode 0600, never removed), and waits for it at most `milliseconds` of the monotonic clock (0
// or less: not at all). A handle >= 0, or -1 with errno and the slot: 0x8100 with ETIMEDOUT when the time is over,
// 0x0300 for a lock file that is not regular, has a second name, is a symbolic link, belongs neither to root nor to the
// effective user or can be written by others (never waited for), 0x0D00 null, 0x0900 no such folder, 0x8100 else.
//
// The death of the holder, however it comes, frees the section. Programs that are started while it is held do not get
// it; a forked child shares it, so it is free when the holder leaves it or both have ended. It is not recursive: a
// second entry waits for the first. The lock file is opened as root in a process that may become root, so that it is
// root's whoever comes first. Who waits longest is not preferred, but each has the same chance every few milliseconds.
VEXO_API int VexoCgiBeginCriticalSection(const char* name, int milliseconds);
// Leaves the section; a negative handle is accepted. errno stays.
VEXO_API void VexoCgiEndCriticalSection(int handle);
VEXO_END_C

#endif
