// Folders of the machine's run, /run/vexo/NAME, which belong to root (or, where nothing runs as root, to the one user
// that everything runs as) and are open to nobody else.
#ifndef VEXO_LINUX_RUN_FOLDER_H
#define VEXO_LINUX_RUN_FOLDER_H

#include <string>

#include "io/file_io.h"

namespace vexo {

// Makes it where it is missing. False with errno.
[[nodiscard]] bool makeRunFolder(const std::string& name);
// Opens it; empty with errno, EACCES for one that may not be trusted.
[[nodiscard]] Descriptor openRunFolder(const std::string& name);

}  // namespace vexo

#endif
