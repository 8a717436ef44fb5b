// Work that outlives its request.
#ifndef ORVEL_CGI_BACKGROUND_H
#define ORVEL_CGI_BACKGROUND_H

#include <functional>

namespace orvel::cgi {

// What the background process reads to know that it shall stop: SIGTERM makes it 1.
int* stopFlag();

// How work reports, once, that it is under way (0) or cannot be done (a library code). False when nobody hears it: then
// it does not begin.
using Begun = std::function<bool(int code)>;

// Goes on with `work` in a process of its own, away from the web server: a new session, standard streams on /dev/null,
// SIGTERM raising stopFlag(). The process ends with what `work` returns; an exception ends it with 1. In the caller,
// once the work has reported: its code; 401 when its process ended without a word, else what kept it from being made.
int startBackground(const std::function<int(const Begun& begun)>& work);

}  // namespace orvel::cgi

#endif
