// Bounds for the memory of a process that works on a stranger's bytes: how much those take is theirs to say.
#ifndef ORVEL_CGI_MEMORY_LIMIT_H
#define ORVEL_CGI_MEMORY_LIMIT_H

#include <cstdint>

namespace orvel::cgi {

// How large this process's address space is, in bytes; 0 where the kernel does not say.
[[nodiscard]] std::uint64_t addressSpace();

// From here on the process gets `more` bytes and no others.
void boundMemory(std::uint64_t more);

}  // namespace orvel::cgi

#endif
