// Faults and waits on demand: tests ask the platform by name to fail an operation, or to hold a process before one.
// Absent from what is installed.
//
// A process is held from outside, by its environment: VEXO_GATE_HOLD="OPERATION=FILE;..." While FILE is there, whoever
// calls OPERATION adds a line to it and waits until it is gone or another file has its name, a minute at most; a signal
// lets the process go, too. Whoever holds replaces the file to let one call pass and hold the next, and removes it to
// let all pass.
#ifndef VEXO_LINUX_FAULT_GATE_H
#define VEXO_LINUX_FAULT_GATE_H

#ifdef VEXO_FAULT_GATE

#include <cerrno>

#include "vexo/error.h"
#include "vexo/export.h"

namespace vexo::gate {

struct Verdict {
    bool fail;
    int code;        // platform error to set
    int systemCode;  // errno to leave
};

// Counts one call of `operation` and says whether it must fail.
VEXO_API Verdict ask(const char* operation);

// The n-th call from now (1 is the next; 0 every call) of `operation` fails with `code` and `systemCode`. The name "*"
// stands for whichever operation comes n-th: the sweep of a caller fails call 1, 2, 3...
VEXO_API void fail(const char* operation, int code, int systemCode = 0, int nth = 0);
// Forgets every order and count.
VEXO_API void reset();
// Calls since the last reset: of one operation, or of all for "*".
VEXO_API int calls(const char* operation);

}  // namespace vexo::gate

// First statement of a gated operation: leaves it with `failure` when a test ordered so.
#define VEXO_GATE(operation, failure)                                        \
    do {                                                                     \
        const vexo::gate::Verdict gateVerdict = vexo::gate::ask(operation);  \
        if (gateVerdict.fail) {                                              \
            VLIBCErrSetEx(gateVerdict.code, __FILE__, __LINE__);             \
            if (gateVerdict.systemCode != 0) errno = gateVerdict.systemCode; \
            return failure;                                                  \
        }                                                                    \
    } while (false)

#else
#define VEXO_GATE(operation, failure) static_cast<void>(0)
#endif

#endif
