// Adding a line to a file that others add to as well.
#ifndef VEXO_LINUX_APPEND_LINE_H
#define VEXO_LINUX_APPEND_LINE_H

#include <string>

namespace vexo {

// Adds `line`, which ends in a newline, to `fd`, open for reading and appending, by one write; the caller keeps other
// writers out. A line that a killed writer left unfinished is ended before it, and what a full disk cut short is taken
// back. False with errno.
[[nodiscard]] bool appendLine(int fd, std::string line);

}  // namespace vexo

#endif
