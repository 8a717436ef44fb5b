// Programs started with nothing of this process's but what they are given.
#ifndef VEXO_LINUX_START_PROGRAM_H
#define VEXO_LINUX_START_PROGRAM_H

#include <sys/types.h>

#include <string>
#include <vector>

namespace vexo {

struct ProgramStart {
    std::vector<std::string> words;        // the program's absolute path and its arguments
    std::vector<std::string> environment;  // whole
    std::vector<int> descriptors;          // become 3, 4, ...; standard streams are /dev/null
    bool session = false;                  // a new one of its own
};

// Starts it with default signals, none of them blocked. 0 and the child, or an errno value.
[[nodiscard]] int startProgram(const ProgramStart& what, pid_t& child);

}  // namespace vexo

#endif
