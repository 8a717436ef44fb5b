// A kernel that refuses single system calls, for the ways that a machine at hand would never take, or that kills the
// process before one.
#ifndef ORVEL_TESTS_SUPPORT_REFUSE_CALLS_H
#define ORVEL_TESTS_SUPPORT_REFUSE_CALLS_H

#include <linux/filter.h>
#include <linux/seccomp.h>
#include <sys/prctl.h>
#include <sys/syscall.h>

#include <cstddef>
#include <cstdint>
#include <vector>

namespace support {

constexpr int kKilled = 0xFFFF;

struct Refusal {
    long call;              // SYS_...
    int systemCode;         // errno that it answers, or kKilled
    unsigned argument = 0;  // which argument is looked at, and
    uint32_t anyOf = 0;     // which of its bits make the call refused; 0: every call is
};

// From now on, for this process and its children: call it in a forked child only. False where filters are not allowed.
inline bool refuseCalls(const std::vector<Refusal>& refusals) {
    std::vector<sock_filter> program;
    const auto load = [](size_t offset) {
        return sock_filter BPF_STMT(BPF_LD | BPF_W | BPF_ABS, static_cast<uint32_t>(offset));
    };
    for (const Refusal& refusal : refusals) {
        const uint8_t skip = refusal.anyOf != 0 ? 3 : 1;
        program.push_back(load(offsetof(seccomp_data, nr)));
        program.push_back(BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<uint32_t>(refusal.call), 0, skip));
        if (refusal.anyOf != 0) {
            program.push_back(load(offsetof(seccomp_data, args) + refusal.argument * sizeof(uint64_t)));
            program.push_back(BPF_JUMP(BPF_JMP | BPF_JSET | BPF_K, refusal.anyOf, 0, 1));
        }
        const uint32_t answer = SECCOMP_RET_ERRNO | (static_cast<uint32_t>(refusal.systemCode) & 0xFFFF);
        const bool isKilled = refusal.systemCode == kKilled;
        program.push_back(BPF_STMT(BPF_RET | BPF_K, isKilled ? uint32_t{SECCOMP_RET_KILL_PROCESS} : answer));
    }
    program.push_back(BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW));
    const sock_fprog filter{static_cast<unsigned short>(program.size()), program.data()};
    return prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 && prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &filter) == 0;
}

}  // namespace support

#endif
