// A foreign program that works on a stranger's bytes: it has those, a place for what it makes of them, and nothing
// else.
#ifndef ORVEL_CGI_THUMBNAIL_SANDBOX_H
#define ORVEL_CGI_THUMBNAIL_SANDBOX_H

#include <chrono>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

namespace orvel::cgi {

struct SandboxLimits {
    std::uint64_t memory;  // bytes of address space
    std::uint64_t output;  // bytes
    unsigned processor;    // seconds
    std::chrono::milliseconds time;
};

enum class SandboxEnd {
    kDone,
    kRefused,  // it ended by itself, or at a limit that the same bytes meet again: memory, output, processor time
    kTimeOut,  // it was stopped: how busy the machine is counts, too
    kMissing,  // it is not installed, or a library of its own is not
    kFailed    // it could not be confined
};

// Runs `words` (an absolute path and its arguments) with `input` and `output` as its standard input and output. Where
// the caller was root it is nobody: real, effective and saved, without a group. It cannot get more rights, make
// processes or sockets, or signal others, and where the kernel has Landlock it can read what is installed (/usr, fonts)
// and no other file but the program itself. Both descriptors stay the caller's.
SandboxEnd runInSandbox(const std::vector<std::string>& words, int input, int output, const SandboxLimits& limits);

// The same for a piece of this program, which says with 0 that it is done; `memory` is what it may have beside what
// there is. No descriptor but the two is left to it.
SandboxEnd runInSandbox(const std::function<int()>& work, int input, int output, const SandboxLimits& limits);

}  // namespace orvel::cgi

#endif
