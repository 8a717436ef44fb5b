#include "thumbnail/sandbox.h"

#include <dlfcn.h>
#include <fcntl.h>
#include <grp.h>
#include <linux/landlock.h>
#include <poll.h>
#include <sched.h>
#include <seccomp.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>

#include "base/descriptor.h"
#include "base/raised_identity.h"
#include "memory_limit.h"

namespace orvel::cgi {
namespace {

constexpr int kNotConfined = 126;
constexpr int kNotStarted = 127;  // the loader's word for a missing library, too
constexpr uid_t kNobody = 65534;
constexpr int kProgram = 3;  // where what is to be run is open

// libseccomp, loaded in the process that needs it: no other request pays for it.
struct SeccompLibrary {
    decltype(&::seccomp_init) init = nullptr;
    decltype(&::seccomp_rule_add_array) add = nullptr;
    decltype(&::seccomp_load) load = nullptr;
    decltype(&::seccomp_syscall_resolve_name) resolve = nullptr;
};

template <class Function>
bool find(void* library, const char* name, Function& function) {
    function = reinterpret_cast<Function>(dlsym(library, name));
    return function != nullptr;
}

bool loadLibrary(SeccompLibrary& seccomp) {
    void* library = dlopen("libseccomp.so.2", RTLD_NOW | RTLD_LOCAL);
    return library != nullptr && find(library, "seccomp_init", seccomp.init) &&
           find(library, "seccomp_rule_add_array", seccomp.add) && find(library, "seccomp_load", seccomp.load) &&
           find(library, "seccomp_syscall_resolve_name", seccomp.resolve);
}

// What a decoder needs: its memory, its threads, the files that it may open, and time. All else fails with EPERM.
constexpr const char* kAllowed[] = {"access",
                                    "arch_prctl",
                                    "brk",
                                    "clock_getres",
                                    "clock_gettime",
                                    "clock_nanosleep",
                                    "close",
                                    "close_range",
                                    "dup",
                                    "dup2",
                                    "dup3",
                                    "eventfd2",
                                    "execve",
                                    "execveat",
                                    "exit",
                                    "exit_group",
                                    "faccessat",
                                    "faccessat2",
                                    "fadvise64",
                                    "fcntl",
                                    "fstat",
                                    "fstatfs",
                                    "ftruncate",
                                    "futex",
                                    "getcwd",
                                    "getdents64",
                                    "getegid",
                                    "geteuid",
                                    "getgid",
                                    "getpid",
                                    "getrandom",
                                    "getrlimit",
                                    "getrusage",
                                    "gettid",
                                    "gettimeofday",
                                    "getuid",
                                    "lseek",
                                    "madvise",
                                    "membarrier",
                                    "mmap",
                                    "mprotect",
                                    "mremap",
                                    "munmap",
                                    "nanosleep",
                                    "newfstatat",
                                    "open",
                                    "openat",
                                    "pipe2",
                                    "poll",
                                    "ppoll",
                                    "pread64",
                                    "prlimit64",
                                    "pwrite64",
                                    "read",
                                    "readlink",
                                    "readlinkat",
                                    "readv",
                                    "restart_syscall",
                                    "rseq",
                                    "rt_sigaction",
                                    "rt_sigprocmask",
                                    "rt_sigreturn",
                                    "sched_getaffinity",
                                    "sched_yield",
                                    "set_robust_list",
                                    "set_tid_address",
                                    "sigaltstack",
                                    "stat",
                                    "statfs",
                                    "statx",
                                    "sysinfo",
                                    "tgkill",
                                    "time",
                                    "uname",
                                    "write",
                                    "writev"};

bool allow(const SeccompLibrary& seccomp, scmp_filter_ctx filter, const char* name) {
    const int number = seccomp.resolve(name);
    return number < 0 || seccomp.add(filter, SCMP_ACT_ALLOW, number, 0, nullptr) == 0;  // not on this architecture
}

// From here on the process makes the calls above and no other.
bool confineCalls() {
    SeccompLibrary seccomp;
    if (!loadLibrary(seccomp)) return false;
    const scmp_filter_ctx filter = seccomp.init(SCMP_ACT_ERRNO(EPERM));
    if (filter == nullptr) return false;
    for (const char* name : kAllowed) {
        if (!allow(seccomp, filter, name)) return false;
    }
    // Threads, but no processes; the C library falls back to clone() where clone3() is not there.
    constexpr scmp_arg_cmp kThread = {
        .arg = 0, .op = SCMP_CMP_MASKED_EQ, .datum_a = CLONE_THREAD, .datum_b = CLONE_THREAD};
    constexpr scmp_arg_cmp kNamed = {.arg = 0, .op = SCMP_CMP_EQ, .datum_a = PR_SET_NAME, .datum_b = 0};
    return seccomp.add(filter, SCMP_ACT_ALLOW, SCMP_SYS(clone), 1, &kThread) == 0 &&
           seccomp.add(filter, SCMP_ACT_ALLOW, SCMP_SYS(prctl), 1, &kNamed) == 0 &&
           seccomp.add(filter, SCMP_ACT_ERRNO(ENOSYS), SCMP_SYS(clone3), 0, nullptr) == 0 && seccomp.load(filter) == 0;
}

bool allowBelow(int rules, int place, std::uint64_t access) {
    landlock_path_beneath_attr beneath = {};
    beneath.allowed_access = access;
    beneath.parent_fd = place;
    return syscall(SYS_landlock_add_rule, rules, LANDLOCK_RULE_PATH_BENEATH, &beneath, 0) == 0;
}

bool allowBelow(int rules, const char* path, std::uint64_t access) {
    const Descriptor place(open(path, O_PATH | O_CLOEXEC));
    return place ? allowBelow(rules, place.get(), access) : errno == ENOENT;
}

// No file but the program and what is installed, where the kernel can see to that. False when it can and did not.
bool confineFiles(bool withProgram) {
    const long version = syscall(SYS_landlock_create_ruleset, nullptr, 0, LANDLOCK_CREATE_RULESET_VERSION);
    if (version < 1) return true;
    constexpr std::uint64_t kEvery = (LANDLOCK_ACCESS_FS_MAKE_SYM << 1) - 1;  // all of the first version
    constexpr std::uint64_t kReadable = LANDLOCK_ACCESS_FS_READ_FILE | LANDLOCK_ACCESS_FS_READ_DIR;
    landlock_ruleset_attr attributes = {};
    attributes.handled_access_fs = kEvery;
    const Descriptor rules(static_cast<int>(syscall(SYS_landlock_create_ruleset, &attributes, sizeof attributes, 0)));
    return rules &&
           (!withProgram ||
            allowBelow(rules.get(), kProgram, LANDLOCK_ACCESS_FS_READ_FILE | LANDLOCK_ACCESS_FS_EXECUTE)) &&
           allowBelow(rules.get(), "/usr", kReadable | LANDLOCK_ACCESS_FS_EXECUTE) &&
           allowBelow(rules.get(), "/lib", kReadable | LANDLOCK_ACCESS_FS_EXECUTE) &&
           allowBelow(rules.get(), "/lib64", kReadable | LANDLOCK_ACCESS_FS_EXECUTE) &&
           allowBelow(rules.get(), "/etc/fonts", kReadable) &&
           allowBelow(rules.get(), "/var/cache/fontconfig", kReadable) &&
           allowBelow(rules.get(), "/etc/ld.so.cache", LANDLOCK_ACCESS_FS_READ_FILE) &&
           allowBelow(rules.get(), "/dev/null", LANDLOCK_ACCESS_FS_READ_FILE | LANDLOCK_ACCESS_FS_WRITE_FILE) &&
           allowBelow(rules.get(), "/dev/urandom", LANDLOCK_ACCESS_FS_READ_FILE) &&
           syscall(SYS_landlock_restrict_self, rules.get(), 0) == 0;
}

// Nobody, for good, where the process is root or can become so again.
bool giveUpIdentity() {
    uid_t real = 0, effective = 0, saved = 0;
    if (getresuid(&real, &effective, &saved) != 0) return false;
    if (real != 0 && effective != 0 && saved != 0) return true;
    return (effective == 0 || seteuid(0) == 0) && setgroups(0, nullptr) == 0 &&
           setresgid(kNobody, kNobody, kNobody) == 0 && setresuid(kNobody, kNobody, kNobody) == 0;
}

bool limitTo(decltype(RLIMIT_AS) resource, std::uint64_t most) {
    const rlimit limit = {.rlim_cur = most, .rlim_max = most};
    return setrlimit(resource, &limit) == 0;
}

bool setLimits(const SandboxLimits& limits) {
    return limitTo(RLIMIT_AS, limits.memory) && limitTo(RLIMIT_FSIZE, limits.output) &&
           limitTo(RLIMIT_CPU, limits.processor) && limitTo(RLIMIT_NOFILE, 64) && limitTo(RLIMIT_CORE, 0);
}

bool setDescriptors(int program, int input, int output) {
    const int null = open("/dev/null", O_RDWR | O_CLOEXEC);
    return null >= 0 && dup2(input, STDIN_FILENO) == STDIN_FILENO && dup2(output, STDOUT_FILENO) == STDOUT_FILENO &&
           dup2(null, STDERR_FILENO) == STDERR_FILENO &&
           (program < 0 || program == kProgram || dup3(program, kProgram, O_CLOEXEC) == kProgram) &&
           syscall(SYS_close_range, program < 0 ? kProgram : kProgram + 1, ~0U, 0) == 0;
}

// Goes on with `work` where it can do nothing but that; `program` is a file that it keeps, or none (-1).
[[noreturn]] void become(const std::function<int()>& work, int program, int input, int output,
                         const SandboxLimits& limits) {
    sigset_t none;
    sigemptyset(&none);
    const bool confined = prctl(PR_SET_PDEATHSIG, SIGKILL) == 0 && sigprocmask(SIG_SETMASK, &none, nullptr) == 0 &&
                          std::signal(SIGPIPE, SIG_DFL) != SIG_ERR && chdir("/") == 0 &&
                          setDescriptors(program, input, output) && giveUpIdentity() &&
                          prctl(PR_SET_PDEATHSIG, SIGKILL) == 0 &&  // a change of identity took it away
                          prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 && confineFiles(program >= 0) && confineCalls() &&
                          setLimits(limits);  // last: this process may have more memory already
    _exit(confined ? work() : kNotConfined);
}

int start(const std::vector<char*>& words) {
    char blocked[] = "VIPS_BLOCK_UNTRUSTED=1", threads[] = "VIPS_CONCURRENCY=1", arenas[] = "MALLOC_ARENA_MAX=1",
         locale[] = "LC_ALL=C.UTF-8", home[] = "HOME=/nonexistent";
    char* environment[] = {blocked, threads, arenas, locale, home, nullptr};
    execveat(kProgram, "", words.data(), environment, AT_EMPTY_PATH);
    return kNotStarted;
}

bool waitFor(pid_t child, std::chrono::milliseconds time) {
    const Descriptor handle(static_cast<int>(syscall(SYS_pidfd_open, child, 0)));
    pollfd end = {.fd = handle.get(), .events = POLLIN, .revents = 0};
    const auto last = std::chrono::steady_clock::now() + time;
    for (;;) {
        const auto left =
            std::chrono::duration_cast<std::chrono::milliseconds>(last - std::chrono::steady_clock::now()).count();
        const int ended = handle ? poll(&end, 1, left < 0 ? 0 : static_cast<int>(left)) : 0;
        if (ended >= 0 || errno != EINTR) return ended > 0;
    }
}

// Nobody may be barred from the folders above it.
Descriptor openProgram(const std::string& path) {
    const RaisedIdentity root;
    return Descriptor(open(path.c_str(), O_PATH | O_CLOEXEC));
}

SandboxEnd runConfined(const std::function<int()>& work, int program, int input, int output,
                       const SandboxLimits& limits, const char* what) {
    const pid_t child = fork();
    if (child < 0) return SandboxEnd::kFailed;
    if (child == 0) become(work, program, input, output, limits);
    const bool ended = waitFor(child, limits.time);
    if (!ended) kill(child, SIGKILL);
    int status = 0;
    while (waitpid(child, &status, 0) < 0 && errno == EINTR) {
    }
    if (!ended) return SandboxEnd::kTimeOut;
    if (WIFEXITED(status) && WEXITSTATUS(status) == kNotConfined) {
        syslog(LOG_ERR, "%s could not be confined", what);
        return SandboxEnd::kFailed;
    }
    if (WIFEXITED(status) && WEXITSTATUS(status) == kNotStarted) return SandboxEnd::kMissing;
    return WIFEXITED(status) && WEXITSTATUS(status) == 0 ? SandboxEnd::kDone : SandboxEnd::kRefused;
}

}  // namespace

SandboxEnd runInSandbox(const std::vector<std::string>& words, int input, int output, const SandboxLimits& limits) {
    std::vector<char*> pointers;
    pointers.reserve(words.size() + 1);
    for (const std::string& word : words) pointers.push_back(const_cast<char*>(word.c_str()));
    pointers.push_back(nullptr);
    const Descriptor program = openProgram(words[0]);
    if (!program) return SandboxEnd::kMissing;
    return runConfined([&pointers] { return start(pointers); }, program.get(), input, output, limits, words[0].c_str());
}

SandboxEnd runInSandbox(const std::function<int()>& work, int input, int output, const SandboxLimits& limits) {
    SandboxLimits all = limits;
    all.memory += addressSpace();
    const auto guarded = [&work] {
        try {
            return work();
        } catch (...) {
            return 1;  // memory is out
        }
    };
    return runConfined(guarded, -1, input, output, all, "work on a file");
}

}  // namespace orvel::cgi
