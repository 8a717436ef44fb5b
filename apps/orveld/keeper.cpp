// Holds a socket and keeps a server on it, as a service manager does; for trying and testing.
//
//   orveld-keeper SOCKET PROGRAM [ARGUMENT...]
//
// PROGRAM finds the listening socket as LISTEN_FDS says. When it ends it is started again, while requests wait in the
// socket. SIGTERM ends both, SIGHUP is passed on.
#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <string>

#include "listener.h"

namespace {

constexpr int kHandedOver = 3;
constexpr timespec kPause = {0, 100000000};  // before a program that ended is started again

[[noreturn]] void become(int listener, char** words, const sigset_t& signals) {
    sigprocmask(SIG_SETMASK, &signals, nullptr);
    if (listener == kHandedOver) {
        fcntl(listener, F_SETFD, 0);
    } else {
        dup2(listener, kHandedOver);
    }
    setenv("LISTEN_PID", std::to_string(getpid()).c_str(), 1);
    setenv("LISTEN_FDS", "1", 1);
    setenv("LD_BIND_NOW", "1", 1);  // once in the parent, not again in each child
    execv(words[0], words);
    std::perror(words[0]);
    _exit(127);
}

}  // namespace

int main(int count, char** words) {
    if (count < 3) {
        std::fputs("usage: orveld-keeper SOCKET PROGRAM [ARGUMENT...]\n", stderr);
        return 2;
    }
    std::string error;
    const int listener = orvel::orveld::ownListener(words[1], error);
    if (listener < 0) {
        std::fprintf(stderr, "orveld-keeper: %s\n", error.c_str());
        return 1;
    }
    sigset_t taken, before;
    sigemptyset(&taken);
    for (const int signal : {SIGCHLD, SIGTERM, SIGINT, SIGHUP}) sigaddset(&taken, signal);
    sigprocmask(SIG_BLOCK, &taken, &before);
    bool ending = false;
    for (pid_t child = 0; !ending || child > 0;) {
        if (child == 0) child = fork();
        if (child == 0) become(listener, words + 2, before);
        const int signal = sigwaitinfo(&taken, nullptr);
        if (signal == SIGTERM || signal == SIGINT) ending = true;
        if (signal > 0 && signal != SIGCHLD && child > 0) kill(child, signal);
        if (child < 0 || waitpid(child, nullptr, WNOHANG) == child) {
            child = 0;
            if (!ending) nanosleep(&kPause, nullptr);
        }
    }
    unlink(words[1]);
    return 0;
}
