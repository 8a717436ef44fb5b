#ifndef ORVEL_CGI_FILE_SYSTEM_H
#define ORVEL_CGI_FILE_SYSTEM_H

#include <cstdint>

namespace orvel::cgi {

// Which file system an open file or folder (O_PATH will do) lies on: a number that is the same after the machine has
// been started anew, as device numbers need not be. A file system that has none to say is known by its device. 0 when
// that could not be determined.
[[nodiscard]] std::uint64_t fileSystemOf(int file);

}  // namespace orvel::cgi

#endif
