#include "background.h"

#include <fcntl.h>
#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <initializer_list>

namespace orvel::cgi {
namespace {

int stopRequested = 0;  // a plain int: the library reads it as one

void requestStop(int) {
    stopRequested = 1;
}

bool becomeBackground() {
    setsid();
    struct sigaction action = {};
    action.sa_handler = requestStop;
    sigemptyset(&action.sa_mask);
    if (sigaction(SIGTERM, &action, nullptr) != 0) return false;
    signal(SIGHUP, SIG_IGN);
    signal(SIGPIPE, SIG_IGN);
    // The web server waits for the end of these streams.
    const int null = open("/dev/null", O_RDWR | O_CLOEXEC);
    if (null < 0) return false;
    for (const int stream : {0, 1, 2})
        if (dup2(null, stream) < 0) return false;
    if (null > 2) close(null);
    return true;
}

}  // namespace

int* stopFlag() {
    return &stopRequested;
}

pid_t startBackground(int (*work)(void* arg), void* arg) {
    fflush(nullptr);  // what the caller wrote is written once
    const pid_t child = fork();
    if (child != 0) return child;
    int status = 1;
    try {
        if (becomeBackground()) status = work(arg);
    } catch (...) {
        status = 1;  // memory is out: whoever waits for the work sees that its process is gone
    }
    exit(status);  // commits what the index still holds
}

}  // namespace orvel::cgi
