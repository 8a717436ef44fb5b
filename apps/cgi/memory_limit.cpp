#include "memory_limit.h"

#include <sys/resource.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>

namespace orvel::cgi {

std::uint64_t addressSpace() {
    std::uint64_t pages = 0;
    std::ifstream("/proc/self/statm") >> pages;
    return pages * static_cast<std::uint64_t>(sysconf(_SC_PAGESIZE));
}

void boundMemory(std::uint64_t more) {
    rlimit limit{};
    const std::uint64_t now = addressSpace();
    if (now == 0 || getrlimit(RLIMIT_AS, &limit) != 0) return;
    limit.rlim_cur = std::min<rlim_t>(limit.rlim_max, now + more);
    setrlimit(RLIMIT_AS, &limit);
}

}  // namespace orvel::cgi
