// Files at fixed names in folders where others may put one first.
#ifndef VEXO_LINUX_TRUSTED_FILE_H
#define VEXO_LINUX_TRUSTED_FILE_H

#include <sys/types.h>

#include <string>

#include "io/file_io.h"

namespace vexo {

// openFile for such a name: follows no link and waits for nothing. What may not be trusted (isTrusted) is not opened:
// empty with EACCES. A file that is replaced meanwhile is not met: what has the name then is opened.
[[nodiscard]] Descriptor openTrusted(const std::string& path, int flags, mode_t mode = 0);

// Whether what is at `path` may be trusted, by name and without opening it: to close a database's file by another
// descriptor drops the locks of its connections. False with errno.
[[nodiscard]] bool isTrustedFile(const std::string& path);

// The platform error number for an errno value of such a file.
int errorOfFile(int systemCode);

}  // namespace vexo

#endif
