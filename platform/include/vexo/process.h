// Running another program.
#ifndef VEXO_PROCESS_H
#define VEXO_PROCESS_H

#include "vexo/export.h"

VEXO_BEGIN_C
// Runs the program at the absolute path `program` and waits for it. The arguments after it are strings, ended by a
// null: VLIBCExec("/bin/mkdir", "-p", folder, nullptr). No shell sees them. The program gets a small fixed environment
// (PATH and LC_ALL=C), no open file but /dev/null as standard input, output and error, default signals, the caller's
// identity and working directory.
//
// Its exit status (0 to 255), or -1 with errno and the slot: 0x0D00 null or no absolute path, 0x0900 the program is
// missing, 0x0300 denied, 0x8100 else, a program that a signal ended included.
VEXO_API int VLIBCExec(const char* program, ...) __attribute__((sentinel));
VEXO_END_C

#endif
