// Linked into the programs when they are built with AddressSanitizer.
#include <sys/prctl.h>
#include <unistd.h>

// Leaks are looked for by a process that traces this one, which the kernel forbids once rights were dropped; trying
// ends in a fatal error.
extern "C" __attribute__((visibility("default"))) int __lsan_is_turned_off();
extern "C" int __lsan_is_turned_off() {
    return geteuid() != 0 && prctl(PR_GET_DUMPABLE) != 1 ? 1 : 0;
}
