#include "vexo/process.h"

#include <sys/wait.h>

#include <cerrno>
#include <cstdarg>
#include <exception>

#include "failure.h"
#include "fault_gate.h"
#include "start_program.h"

namespace {

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
    vexo::ProgramStart start = {.words = {program},
                                .environment = {"PATH=/usr/sbin:/usr/bin:/sbin:/bin", "LC_ALL=C"},
                                .descriptors = {},
                                .session = false};
    va_list rest;
    va_start(rest, program);
    while (const char* word = va_arg(rest, char*)) start.words.emplace_back(word);
    va_end(rest);
    pid_t child = -1;
    const int failure = vexo::startProgram(start, child);
    if (failure != 0) return vexo::fail(errorOfStart(failure), failure);
    const int status = waitFor(child);
    if (status >= 0) errno = before;
    return status;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
