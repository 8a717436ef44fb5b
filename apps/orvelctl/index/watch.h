// Keeping an index in step with the files.
#ifndef ORVEL_ORVELCTL_INDEX_WATCH_H
#define ORVEL_ORVELCTL_INDEX_WATCH_H

#include "vexo/share.h"

namespace orvel::ctl {

// Brings the share's index in step, building one where there is none, and keeps it so until `stop` becomes nonzero.
// Where the kernel reports no changes it updates every `pause` seconds. `full`, nonzero: all is compared once, the
// insides of files too. Throws what ends it.
int watchIndex(const SDK::Share& share, unsigned long pause, int& stop, int& full);

}  // namespace orvel::ctl

#endif
