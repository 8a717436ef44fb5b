#include "vexo/process.h"

#include <spawn.h>
#include <sys/wait.h>

#include <fcntl.h>
#include <array>
#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <exception>
#include <vector>

#include "failure.h"
#include "fault_gate.h"

namespace {

constexpr int kFirstOther = 3;  // descriptor behind standard input, output and error

class Actions {
 public:
    Actions() { posix_spawn_file_actions_init(&actions_); }
    ~Actions() { posix_spawn_file_actions_destroy(&actions_); }
    Actions(const Actions&) = delete;
    Actions& operator=(const Actions&) = delete;
    // Nothing of this process's files reaches the program: its standard output is a reply under way.
    int detach() {
        for (int fd = 0; fd < kFirstOther; ++fd) {
            const int failure = posix_spawn_file_actions_addopen(&actions_, fd, "/dev/null", O_RDWR, 0);
            if (failure != 0) return failure;
        }
        return posix_spawn_file_actions_addclosefrom_np(&actions_, kFirstOther);
    }
    [[nodiscard]] const posix_spawn_file_actions_t* get() const { return &actions_; }

 private:
    posix_spawn_file_actions_t actions_{};
};

class Attributes {
 public:
    Attributes() { posix_spawnattr_init(&attributes_); }
    ~Attributes() { posix_spawnattr_destroy(&attributes_); }
    Attributes(const Attributes&) = delete;
    Attributes& operator=(const Attributes&) = delete;
    int defaultSignals() {
        sigset_t all;
        sigset_t none;
        sigfillset(&all);
        sigemptyset(&none);
        posix_spawnattr_setsigdefault(&attributes_, &all);
        posix_spawnattr_setsigmask(&attributes_, &none);
        return posix_spawnattr_setflags(&attributes_, POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK);
    }
    [[nodiscard]] const posix_spawnattr_t* get() const { return &attributes_; }

 private:
    posix_spawnattr_t attributes_{};
};

// 0 and the child, or an errno value.
int start(const std::vector<char*>& arguments, pid_t& child) {
    static char path[] = "PATH=/usr/sbin:/usr/bin:/sbin:/bin";
    static char locale[] = "LC_ALL=C";
    const std::array<char*, 3> environment = {path, locale, nullptr};
    Actions actions;
    Attributes attributes;
    int failure = actions.detach();
    if (failure == 0) failure = attributes.defaultSignals();
    if (failure != 0) return failure;
    return posix_spawn(&child, arguments[0], actions.get(), attributes.get(), arguments.data(), environment.data());
}

int waitFor(pid_t child) {
    int status = 0;
    while (waitpid(child, &status, 0) < 0) {
        if (errno != EINTR) return vexo::fail(VEXO_ERR_GENERAL);
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : vexo::fail(VEXO_ERR_GENERAL, EINTR);
}

int errorOfStart(int failure) {
    if (failure == EACCES || failure == EPERM) return VEXO_ERR_DENIED;
    return failure == ENOENT || failure == ENOTDIR ? VEXO_ERR_FILE : VEXO_ERR_GENERAL;
}

}  // namespace

int VLIBCExec(const char* program, ...) try {
    VEXO_GATE("VLIBCExec", -1);
    if (program == nullptr || *program != '/') return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    std::vector<char*> arguments{const_cast<char*>(program)};  // posix_spawn only reads them
    va_list rest;
    va_start(rest, program);
    while (arguments.back() != nullptr) arguments.push_back(va_arg(rest, char*));
    va_end(rest);
    pid_t child = -1;
    const int failure = start(arguments, child);
    if (failure != 0) return vexo::fail(errorOfStart(failure), failure);
    const int status = waitFor(child);
    if (status >= 0) errno = before;
    return status;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
