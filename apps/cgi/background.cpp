#include "background.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <initializer_list>
#include <utility>

#include "base/descriptor.h"
#include "orvel/error_state.h"

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

bool say(Descriptor where, int code) {
    ssize_t written = 0;
    do {
        written = write(where.get(), &code, sizeof code);
    } while (written < 0 && errno == EINTR);
    return written == ssize_t{sizeof code};
}

int hear(int where) {
    int code = ORV_ERR_GENERAL;
    ssize_t got = 0;
    do {
        got = read(where, &code, sizeof code);
    } while (got < 0 && errno == EINTR);
    return got == ssize_t{sizeof code} ? code : ORV_ERR_GENERAL;
}

}  // namespace

int* stopFlag() {
    return &stopRequested;
}

int startBackground(const std::function<int(const Begun& begun)>& work) {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0) return OrvParseErrnoToError(errno, nullptr, nullptr);
    const Descriptor heard(ends[0]);
    Descriptor said(ends[1]);  // in the end the new process's alone, so that its end is noticed
    fflush(nullptr);           // what the caller wrote is written once
    const pid_t child = fork();
    if (child < 0) return OrvParseErrnoToError(errno, nullptr, nullptr);
    if (child > 0) {
        said.reset();
        return hear(heard.get());
    }
    int status = 1;
    try {
        if (becomeBackground()) status = work([&said](int code) { return say(std::move(said), code); });
    } catch (...) {
        status = 1;  // memory is out: whoever waits for the work sees that its process is gone
    }
    exit(status);  // commits what the index still holds
}

}  // namespace orvel::cgi
