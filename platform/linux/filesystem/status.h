// Status records for the platform's own use: no fault gate, no error slot.
#ifndef VEXO_LINUX_STATUS_H
#define VEXO_LINUX_STATUS_H

#include "vexo/stat.h"

namespace vexo {

// Fills `status` by statx(2) with these AT_ flags; false with errno and the record as it was.
[[nodiscard]] bool readStatus(int dirfd, const char* path, int atFlags, bool withCreateTime, _tag_VEXOSTAT_& status);

}  // namespace vexo

#endif
