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

// For a process that stays and forks a child for each request: reads what children would read again and again
// (settings, share definitions, account files, the mount table where it is a file, folding tables), or nothing where it
// is unchanged. Children find it in their memory and check it by the versions of the files. No descriptor stays open,
// no lock is taken, no directory or name service is asked. What fails here fails again, with its error, where it is
// needed.
VEXO_API void VEXOWarm(void);

// For a process that serves one request: a central file (settings, share definitions, account files, applications) that
// was found unchanged counts as unchanged for the next 50 ms, in which a request asks for each of them a dozen times.
// What was changed before this call is seen after it, and what this process changes itself is seen at once.
VEXO_API void VEXORequestBegin(void);
VEXO_END_C

#endif
