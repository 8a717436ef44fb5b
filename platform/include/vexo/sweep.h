// What is over goes when somebody comes across it; a sweep, now and then, sees to the rest. The stores' own operations
// for it stand with them (VEXOAutoBlockSweep, FILEIDXSweep, VEXOVolumesPrepare); here is what holds a sweep together.
#ifndef VEXO_SWEEP_H
#define VEXO_SWEEP_H

#include "vexo/export.h"

struct VEXOSWEEP {
    long long time;  // when it ended, seconds since the epoch
    int failures;    // how many of its parts failed
};

VEXO_BEGIN_C
// One sweep at a time. A handle >= 0, or -1 with the slot and errno: ETIMEDOUT while another process is at it.
VEXO_API int VEXOSweepBegin(void);
// Notes that a sweep has ended, in /var/lib/vexo/sweep below the system root, unless `failures` is negative (it was
// broken off), and lets others begin. 0, or -1 with errno and the slot.
VEXO_API int VEXOSweepEnd(int handle, int failures);
// The sweep that ended last: 1 with `*last` filled, 0 when there was none, -1 with errno and the slot.
VEXO_API int VEXOSweepLast(struct VEXOSWEEP* last);

// Removes the sessions that have ended, and counts them; -1 with errno and the slot.
VEXO_API long VEXOSessionsSweep(void);
VEXO_END_C

#endif
