// The content of one file into another.
#ifndef VEXO_LINUX_COPY_DATA_H
#define VEXO_LINUX_COPY_DATA_H

#include <sys/types.h>

namespace vexo {

// Makes the empty file `target` hold the first `size` bytes of `source`, by sharing data, inside the kernel or through
// a buffer, whichever works first; holes stay holes where the file system reports them. `isCancelled` (may be null) is
// asked before each piece. False with errno: ECANCELED when cancelled, EIO when the source ends before `size`.
[[nodiscard]] bool copyData(int source, int target, off_t size, int (*isCancelled)());

// How far the copy under way is, or the last one came.
off_t copiedBytes();

}  // namespace vexo

#endif
