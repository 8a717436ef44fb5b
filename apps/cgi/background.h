// Work that outlives its request.
#ifndef ORVEL_CGI_BACKGROUND_H
#define ORVEL_CGI_BACKGROUND_H

#include <sys/types.h>

namespace orvel::cgi {

// What the background process reads to know that it shall stop: SIGTERM makes it 1.
int* stopFlag();

// Goes on with `work(arg)` in a process of its own, away from the web server: a new session, standard streams on
// /dev/null, SIGTERM raising stopFlag(). The process ends with what `work` returns; an exception ends it with 1. In the
// caller: its process id, or -1 with errno.
pid_t startBackground(int (*work)(void* arg), void* arg);

}  // namespace orvel::cgi

#endif
