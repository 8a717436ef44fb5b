// Processes that are recognised again: by number, start time and boot.
#ifndef VEXO_LINUX_TASK_WORKER_H
#define VEXO_LINUX_TASK_WORKER_H

#include <sys/types.h>

#include <optional>
#include <string>
#include <string_view>

namespace vexo {

struct Worker {
    pid_t pid = 0;                 // 0: nobody
    unsigned long long start = 0;  // in ticks since the boot
    std::string boot;              // identifier of the boot
};

// The calling process; nobody when the kernel does not say.
Worker thisProcess();

// True while that process runs; one that waits for its parent to take notice of its end does not. Nothing when that
// cannot be determined: neither may it be killed then, nor its task be taken for abandoned.
std::optional<bool> isRunning(const Worker& worker);

// The start time in a line of /proc/<pid>/stat; nothing for a process that has ended and for another text. Pure.
std::optional<unsigned long long> startTimeOf(std::string_view line);

}  // namespace vexo

#endif
