// Preloaded by tests: the n-th system call that a program and its children make, counted over all of them, fails, or
// kills who makes it; or every call that changes something waits a little first. Calls that the C library makes for
// itself are not seen.
//
//   ORVEL_CALLS=FILE     FILE holds a struct Calls (calls.h), shared with the test
//   ORVEL_CALLS_DELAY=N  milliseconds before every call that changes something
#define _GNU_SOURCE
#include "support/calls.h"

#include <dirent.h>
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <linux/openat2.h>
#include <signal.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/syscall.h>
#include <sys/sysinfo.h>
#include <sys/types.h>
#include <sys/uio.h>
#include <sys/xattr.h>
#include <time.h>
#include <unistd.h>

static struct Calls* calls;
static long delay;  // milliseconds

__attribute__((constructor)) static void begin(void) {
    const char* file = getenv("ORVEL_CALLS");
    const char* wait = getenv("ORVEL_CALLS_DELAY");
    delay = wait != NULL ? atol(wait) : 0;
    const long fd = file != NULL ? syscall(SYS_openat, AT_FDCWD, file, O_RDWR | O_CLOEXEC) : -1;
    if (fd < 0) return;
    void* shared = mmap(NULL, sizeof *calls, PROT_READ | PROT_WRITE, MAP_SHARED, (int)fd, 0);
    if (shared != MAP_FAILED) calls = shared;
    syscall(SYS_close, fd);
}

static unsigned long long mix(unsigned long long hash, const char* text) {
    for (; text != NULL && *text != 0; ++text) hash = (hash ^ (unsigned char)*text) * 0x100000001b3ULL;
    return hash * 31 + 7;
}

// The error that this call must fail with, or 0.
static int strike(const char* name, const char* about, int changes) {
    if (changes && delay > 0) {
        const struct timespec rest = {delay / 1000, delay % 1000 * 1000000};
        syscall(SYS_nanosleep, &rest, NULL);
    }
    if (calls == NULL || (calls->changesOnly && !changes)) return 0;
    if (calls->only[0] != 0 && strcmp(calls->only, name) != 0) return 0;
    const long nth = __atomic_add_fetch(&calls->count, 1, __ATOMIC_SEQ_CST);
    if (nth < kMostCalls) {
        calls->trace[nth] =
            mix(mix(calls->trace[nth - 1], name), about) + (changes ? (unsigned long long)calls->work : 0);
    }
    if (nth != calls->target) return 0;
    snprintf(calls->struck, sizeof calls->struck, "%s %s", name, about != NULL ? about : "");
    if (calls->error == 0) syscall(SYS_kill, syscall(SYS_getpid), SIGKILL);
    return calls->error;
}

#define REAL(name)                                                  \
    __extension__({                                                 \
        static __typeof__(&name) real;                              \
        if (real == NULL) *(void**)&real = dlsym(RTLD_NEXT, #name); \
        real;                                                       \
    })

#define CALL(result, name, parameters, arguments, about, changes)   \
    __attribute__((visibility("default"))) result name parameters { \
        const int error = strike(#name, about, changes);            \
        if (error != 0) {                                           \
            errno = error;                                          \
            return (result)-1;                                      \
        }                                                           \
        return REAL(name) arguments;                                \
    }

#define OPENS(flags) (((flags) & (O_CREAT | O_TRUNC)) != 0 || ((flags)&O_TMPFILE) == O_TMPFILE)
#define OPEN(name, parameters, arguments)                            \
    __attribute__((visibility("default"))) int name parameters {     \
        va_list list;                                                \
        va_start(list, flags);                                       \
        const mode_t mode = OPENS(flags) ? va_arg(list, mode_t) : 0; \
        va_end(list);                                                \
        const int error = strike(#name, path, OPENS(flags));         \
        if (error != 0) {                                            \
            errno = error;                                           \
            return -1;                                               \
        }                                                            \
        return REAL(name) arguments;                                 \
    }
OPEN(open, (const char* path, int flags, ...), (path, flags, mode))
OPEN(open64, (const char* path, int flags, ...), (path, flags, mode))
OPEN(openat, (int fd, const char* path, int flags, ...), (fd, path, flags, mode))
OPEN(openat64, (int fd, const char* path, int flags, ...), (fd, path, flags, mode))

// What changes something.
CALL(ssize_t, write, (int fd, const void* data, size_t n), (fd, data, n), NULL, 1)
CALL(ssize_t, writev, (int fd, const struct iovec* data, int n), (fd, data, n), NULL, 1)
CALL(ssize_t, pwrite, (int fd, const void* data, size_t n, off_t at), (fd, data, n, at), NULL, 1)
CALL(ssize_t, pwrite64, (int fd, const void* data, size_t n, off64_t at), (fd, data, n, at), NULL, 1)
CALL(ssize_t, copy_file_range, (int a, off64_t* x, int b, off64_t* y, size_t n, unsigned f), (a, x, b, y, n, f), NULL,
     1)
CALL(int, ftruncate, (int fd, off_t n), (fd, n), NULL, 1)
CALL(int, ftruncate64, (int fd, off64_t n), (fd, n), NULL, 1)
CALL(int, fsync, (int fd), (fd), NULL, 1)
CALL(int, fdatasync, (int fd), (fd), NULL, 1)
CALL(int, rename, (const char* a, const char* b), (a, b), b, 1)
CALL(int, renameat, (int x, const char* a, int y, const char* b), (x, a, y, b), b, 1)
CALL(int, renameat2, (int x, const char* a, int y, const char* b, unsigned f), (x, a, y, b, f), b, 1)
CALL(int, link, (const char* a, const char* b), (a, b), b, 1)
CALL(int, linkat, (int x, const char* a, int y, const char* b, int f), (x, a, y, b, f), b, 1)
CALL(int, symlinkat, (const char* a, int y, const char* b), (a, y, b), b, 1)
CALL(int, unlink, (const char* a), (a), a, 1)
CALL(int, unlinkat, (int x, const char* a, int f), (x, a, f), a, 1)
CALL(int, rmdir, (const char* a), (a), a, 1)
CALL(int, mkdir, (const char* a, mode_t m), (a, m), a, 1)
CALL(int, mkdirat, (int x, const char* a, mode_t m), (x, a, m), a, 1)
CALL(int, chmod, (const char* a, mode_t m), (a, m), a, 1)
CALL(int, fchmod, (int fd, mode_t m), (fd, m), NULL, 1)
CALL(int, fchmodat, (int x, const char* a, mode_t m, int f), (x, a, m, f), a, 1)
CALL(int, chown, (const char* a, uid_t u, gid_t g), (a, u, g), a, 1)
CALL(int, fchown, (int fd, uid_t u, gid_t g), (fd, u, g), NULL, 1)
CALL(int, fchownat, (int x, const char* a, uid_t u, gid_t g, int f), (x, a, u, g, f), a, 1)
CALL(int, futimens, (int fd, const struct timespec t[2]), (fd, t), NULL, 1)
CALL(int, utimensat, (int x, const char* a, const struct timespec t[2], int f), (x, a, t, f), a, 1)
CALL(int, fsetxattr, (int fd, const char* n, const void* v, size_t s, int f), (fd, n, v, s, f), n, 1)
CALL(int, fremovexattr, (int fd, const char* n), (fd, n), n, 1)
CALL(pid_t, fork, (void), (), NULL, 1)

// What only looks.
CALL(ssize_t, read, (int fd, void* data, size_t n), (fd, data, n), NULL, 0)
CALL(ssize_t, pread, (int fd, void* data, size_t n, off_t at), (fd, data, n, at), NULL, 0)
CALL(ssize_t, pread64, (int fd, void* data, size_t n, off64_t at), (fd, data, n, at), NULL, 0)
CALL(int, fstat, (int fd, struct stat* s), (fd, s), NULL, 0)
CALL(int, fstat64, (int fd, struct stat64* s), (fd, s), NULL, 0)
CALL(int, stat, (const char* a, struct stat* s), (a, s), a, 0)
CALL(int, stat64, (const char* a, struct stat64* s), (a, s), a, 0)
CALL(int, lstat, (const char* a, struct stat* s), (a, s), a, 0)
CALL(int, lstat64, (const char* a, struct stat64* s), (a, s), a, 0)
CALL(int, fstatat, (int x, const char* a, struct stat* s, int f), (x, a, s, f), a, 0)
CALL(int, fstatat64, (int x, const char* a, struct stat64* s, int f), (x, a, s, f), a, 0)
CALL(int, statx, (int x, const char* a, int f, unsigned m, struct statx* s), (x, a, f, m, s), a, 0)
CALL(int, access, (const char* a, int m), (a, m), a, 0)
CALL(int, faccessat, (int x, const char* a, int m, int f), (x, a, m, f), a, 0)
CALL(ssize_t, readlink, (const char* a, char* b, size_t n), (a, b, n), a, 0)
CALL(ssize_t, readlinkat, (int x, const char* a, char* b, size_t n), (x, a, b, n), a, 0)
CALL(ssize_t, getdents64, (int fd, void* b, size_t n), (fd, b, n), NULL, 0)
CALL(ssize_t, getxattr, (const char* a, const char* n, void* v, size_t s), (a, n, v, s), n, 0)
CALL(ssize_t, fgetxattr, (int fd, const char* n, void* v, size_t s), (fd, n, v, s), n, 0)
CALL(int, statfs, (const char* a, struct statfs* s), (a, s), a, 0)
CALL(int, fstatfs, (int fd, struct statfs* s), (fd, s), NULL, 0)
CALL(int, flock, (int fd, int how), (fd, how), NULL, 0)
CALL(int, chdir, (const char* a), (a), a, 0)
CALL(int, fchdir, (int fd), (fd), NULL, 0)
CALL(int, dup, (int fd), (fd), NULL, 0)
CALL(off_t, lseek, (int fd, off_t at, int how), (fd, at, how), NULL, 0)
CALL(ssize_t, getrandom, (void* b, size_t n, unsigned f), (b, n, f), NULL, 0)

#define NULL_CALL(result, name, parameters, arguments, about)       \
    __attribute__((visibility("default"))) result name parameters { \
        const int error = strike(#name, about, 0);                  \
        if (error != 0) {                                           \
            errno = error;                                          \
            return NULL;                                            \
        }                                                           \
        return REAL(name) arguments;                                \
    }
NULL_CALL(DIR*, opendir, (const char* a), (a), a)
NULL_CALL(DIR*, fdopendir, (int fd), (fd), NULL)
NULL_CALL(struct dirent*, readdir, (DIR * d), (d), NULL)
NULL_CALL(char*, realpath, (const char* a, char* b), (a, b), a)
NULL_CALL(FILE*, fopen, (const char* a, const char* m), (a, m), a)

// Nobody waits where calls are counted: the clock goes on instead.
static long passed;  // microseconds
__attribute__((visibility("default"))) unsigned sleep(unsigned seconds) {
    if (calls == NULL) return REAL(sleep)(seconds);
    passed += seconds * 1000000L;
    return 0;
}
__attribute__((visibility("default"))) int usleep(useconds_t microseconds) {
    if (calls == NULL) return REAL(usleep)(microseconds);
    passed += microseconds;
    return 0;
}
__attribute__((visibility("default"))) int clock_gettime(clockid_t clock, struct timespec* time) {
    const int result = REAL(clock_gettime)(clock, time);
    const long all = time->tv_nsec / 1000 + passed;
    time->tv_sec += all / 1000000;
    time->tv_nsec = all % 1000000 * 1000 + time->tv_nsec % 1000;
    return result;
}
__attribute__((visibility("default"))) int sysinfo(struct sysinfo* info) {
    const int result = REAL(sysinfo)(info);
    info->uptime += passed / 1000000;
    return result;
}

// The descriptor is closed whatever is reported.
__attribute__((visibility("default"))) int close(int fd) {
    const int error = strike("close", NULL, 0), result = REAL(close)(fd);
    if (error == 0) return result;
    errno = error;
    return -1;
}

__attribute__((visibility("default"))) long syscall(long number, ...) {
    va_list list;
    va_start(list, number);
    long a[6];
    for (int i = 0; i < 6; ++i) a[i] = va_arg(list, long);
    va_end(list);
    if (number == SYS_openat2) {
        const struct open_how* how = (const struct open_how*)a[2];  // NOLINT
        const int error = strike("openat2", (const char*)a[1], OPENS((int)how->flags));
        if (error != 0) {
            errno = error;
            return -1;
        }
    }
    return REAL(syscall)(number, a[0], a[1], a[2], a[3], a[4], a[5]);
}
