#include "base/new_file.h"

#include <linux/fs.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <ctime>

#include "base/file.h"
#include "base/hex.h"
#include "base/keep_errno.h"
#include "base/random.h"

namespace orvel {
namespace {

constexpr size_t kDigits = 16;
constexpr int kAttempts = 100;
constexpr time_t kLinkAbandonedAfter = 60;  // seconds

// The hidden name for what will be called `name`: always the same (FNV-1a), so that a later attempt meets it.
std::string partOf(const std::string& name) {
    std::uint64_t hash = 0xcbf29ce484222325U;
    for (const char byte : name) hash = (hash ^ static_cast<unsigned char>(byte)) * 0x100000001b3U;
    char digits[kDigits + 1];
    snprintf(digits, sizeof digits, "%016llx", static_cast<unsigned long long>(hash));
    return std::string(kPartPrefix) + digits;
}

// Makes something under a hidden name by `make`, which answers false with EEXIST for one that is taken. That name, or
// "" with errno.
template <class Make>
std::string makePart(int folder, const std::string& name, Make make) {
    std::string part = partOf(name);
    for (int attempt = 0; attempt < kAttempts && !part.empty(); ++attempt) {
        if (make(part)) return part;
        if (errno != EEXIST) return "";
        // Somebody is at work on the same name.
        if (attempt > 0 || !removeAbandonedPart(folder, part)) part = drawPartName();
    }
    return "";
}

void removeIfStill(int folder, const std::string& name, const struct stat& status) {
    const KeepErrno keep;
    struct stat now = {};
    if (fstatat(folder, name.c_str(), &now, AT_SYMLINK_NOFOLLOW) != 0 || !isSameFile(status, now)) return;
    unlinkat(folder, name.c_str(), S_ISDIR(now.st_mode) ? AT_REMOVEDIR : 0);
}

bool renameOver(int folder, const std::string& part, const std::string& name) {
    if (renameat(folder, part.c_str(), folder, name.c_str()) == 0) return true;
    const KeepErrno keep;
    unlinkat(folder, part.c_str(), 0);
    return false;
}

// Whether both names are spellings of one name, not two names of one file.
bool isOneName(int fromFolder, const std::string& from, int toFolder, const std::string& to) {
    struct stat first = {}, second = {};
    return fstatat(fromFolder, from.c_str(), &first, AT_SYMLINK_NOFOLLOW) == 0 &&
           fstatat(toFolder, to.c_str(), &second, AT_SYMLINK_NOFOLLOW) == 0 && isSameFile(first, second) &&
           (S_ISDIR(first.st_mode) || first.st_nlink == 1);
}

// Takes the name by something empty of our own, which a rename then replaces: nobody else's can be lost.
bool renameOntoClaim(int fromFolder, const std::string& from, int toFolder, const std::string& to, bool isFolder) {
    struct stat claimed = {};
    if (isFolder) {
        if (mkdirat(toFolder, to.c_str(), 0700) != 0) return false;
        if (fstatat(toFolder, to.c_str(), &claimed, AT_SYMLINK_NOFOLLOW) != 0) return false;
    } else {
        const Descriptor claim = openFile(toFolder, to.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW, 0600);
        if (!claim || fstat(claim.get(), &claimed) != 0) return false;
    }
    if (renameat(fromFolder, from.c_str(), toFolder, to.c_str()) == 0) return true;
    removeIfStill(toFolder, to, claimed);
    return false;
}

// renameNew where the file system cannot do it in one step.
bool renameInSteps(int fromFolder, const std::string& from, int toFolder, const std::string& to) {
    struct stat status = {};
    if (fstatat(fromFolder, from.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) return false;
    if (S_ISDIR(status.st_mode)) return renameOntoClaim(fromFolder, from, toFolder, to, true);
    if (linkat(fromFolder, from.c_str(), toFolder, to.c_str(), 0) != 0) {
        return errno != EEXIST && renameOntoClaim(fromFolder, from, toFolder, to, false);
    }
    if (unlinkat(fromFolder, from.c_str(), 0) == 0) return true;
    removeIfStill(toFolder, to, status);
    return false;
}

// Whether somebody has the file open for writing: then no lease for reading is to be had. One that another opening
// breaks meanwhile is announced by a signal that nobody minds. What the file system or the owner does not allow to ask
// counts as no.
bool isBeingWritten(int folder, const std::string& name) {
    const Descriptor file = openFile(folder, name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
    if (!file || fcntl(file.get(), F_SETSIG, SIGURG) != 0) return false;
    return fcntl(file.get(), F_SETLEASE, F_RDLCK) != 0 && errno == EAGAIN;
}

// 0 for the file that is to be replaced, else the errno value. Asked about again once it is known that nobody writes.
int judgeReplaced(int folder, const std::string& name, const NewFile::IsExpected& isExpected) {
    for (const bool first : {true, false}) {
        struct stat status = {};
        if (fstatat(folder, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) return errno == ENOENT ? ESTALE : errno;
        if (!S_ISREG(status.st_mode) || !isExpected(status)) return ESTALE;
        if (first && isBeingWritten(folder, name)) return ETXTBSY;
    }
    return 0;
}

}  // namespace

std::string drawPartName() {
    const std::string digits = draw<kDigits / 2>();
    return digits.empty() ? "" : std::string(kPartPrefix) + digits;
}

bool removeAbandonedPart(int folder, const std::string& name) {
    struct stat status = {};
    if (fstatat(folder, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) return errno == ENOENT;
    Descriptor file;
    bool abandoned = S_ISLNK(status.st_mode) && status.st_ctim.tv_sec < time(nullptr) - kLinkAbandonedAfter;
    const bool isFolder = S_ISDIR(status.st_mode);
    if (S_ISREG(status.st_mode) || isFolder) {
        file = openFile(folder, name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
        abandoned = file && lockFile(file.get(), LOCK_EX | LOCK_NB);
    }
    return abandoned && unlinkat(folder, name.c_str(), isFolder ? AT_REMOVEDIR : 0) == 0;
}

Descriptor makeFolderPart(int folder, const std::string& name, mode_t mode, std::string& part) {
    for (int attempt = 0; attempt < kAttempts; ++attempt) {
        part =
            makePart(folder, name, [&](const std::string& drawn) { return mkdirat(folder, drawn.c_str(), mode) == 0; });
        if (part.empty()) return Descriptor();
        Descriptor made = openFile(folder, part.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
        // Until it was locked it looked abandoned. A file system without locks knows nothing abandoned.
        const bool ours = made && (lockFile(made.get(), LOCK_EX | LOCK_NB) || errno != EWOULDBLOCK);
        struct stat status = {};
        if (ours && fstat(made.get(), &status) == 0 && status.st_nlink > 0) return made;
        if (made || errno == ENOENT) continue;  // taken for abandoned
        const KeepErrno keep;
        unlinkat(folder, part.c_str(), AT_REMOVEDIR);
        return Descriptor();
    }
    errno = EEXIST;
    return Descriptor();
}

bool renameNew(int fromFolder, const std::string& from, int toFolder, const std::string& to) {
    if (renameat2(fromFolder, from.c_str(), toFolder, to.c_str(), RENAME_NOREPLACE) == 0) return true;
    const int refusal = errno;
    const bool unsupported = refusal == EINVAL || refusal == ENOSYS;
    if (refusal != EEXIST && !unsupported) return false;
    if (isOneName(fromFolder, from, toFolder, to)) {
        return renameat(fromFolder, from.c_str(), toFolder, to.c_str()) == 0;
    }
    errno = refusal;
    return unsupported && renameInSteps(fromFolder, from, toFolder, to);
}

bool putLink(int folder, const std::string& name, const char* text, bool replace) {
    if (!replace) return symlinkat(text, folder, name.c_str()) == 0;
    const std::string part =
        makePart(folder, name, [&](const std::string& drawn) { return symlinkat(text, folder, drawn.c_str()) == 0; });
    return !part.empty() && renameOver(folder, part, name);
}

bool putHardLink(int fromFolder, const std::string& from, int folder, const std::string& name, bool replace) {
    if (!replace) return linkat(fromFolder, from.c_str(), folder, name.c_str(), 0) == 0;
    const Descriptor file = openFile(fromFolder, from.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
    if (file)
        static_cast<void>(lockFile(
            file.get(), LOCK_SH | LOCK_NB));  // see removeAbandonedPart; at worst the name has to be made again
    const std::string part = makePart(folder, name, [&](const std::string& drawn) {
        return linkat(fromFolder, from.c_str(), folder, drawn.c_str(), 0) == 0;
    });
    if (part.empty() || !renameOver(folder, part, name)) return false;
    unlinkat(folder, part.c_str(), 0);  // still there when both were names of one file
    return true;
}

bool syncName(int folder, const std::string& name) {
    Descriptor waiting = openFile(folder, ".", O_RDONLY | O_DIRECTORY);
    if (!waiting && errno == EACCES) {
        waiting = openFile(folder, name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
        if (!waiting && (errno == EACCES || errno == ELOOP)) return true;
    }
    if (!waiting) return false;
    return fsync(waiting.get()) == 0 || errno == EINVAL || errno == ENOTSUP || errno == ENOSYS;
}

bool NewFile::create(const std::string& name, mode_t mode) {
    fd_ = openFile(folder_, ".", O_TMPFILE | O_RDWR, mode);
    if (fd_) return true;
    // What file systems answer that know no nameless files, and kernels that take the flag for O_DIRECTORY.
    if (errno != EOPNOTSUPP && errno != EISDIR && errno != EINVAL) return false;
    return createNamed(name, mode);
}

bool NewFile::createNamed(const std::string& name, mode_t mode) {
    for (int attempt = 0; attempt < kAttempts; ++attempt) {
        part_ = makePart(folder_, name, [&](const std::string& drawn) {
            fd_ = openFile(folder_, drawn.c_str(), O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW, mode);
            return static_cast<bool>(fd_);
        });
        if (part_.empty()) return false;
        // Until it was locked it looked abandoned. A file system without locks knows nothing abandoned.
        struct stat status = {};
        const bool ours = lockFile(fd_.get(), LOCK_EX | LOCK_NB) || errno != EWOULDBLOCK;
        if (fstat(fd_.get(), &status) != 0) return false;
        if (ours && status.st_nlink > 0) return true;
        removePart();
    }
    errno = EEXIST;
    return false;
}

bool NewFile::adopt(int fd) {
    fd_ = Descriptor(fcntl(fd, F_DUPFD_CLOEXEC, 0));
    return static_cast<bool>(fd_);
}

bool NewFile::giveName(const std::string& name) {
    return linkat(AT_FDCWD, fd_.path().c_str(), folder_, name.c_str(), AT_SYMLINK_FOLLOW) == 0;
}

bool NewFile::takePart(const std::string& name) {
    static_cast<void>(lockFile(fd_.get(), LOCK_EX | LOCK_NB));
    part_ = makePart(folder_, name, [&](const std::string& drawn) { return giveName(drawn); });
    return !part_.empty();
}

bool NewFile::publish(const std::string& name, bool replace) {
    if (!replace && part_.empty()) return giveName(name);
    bool named = false;
    if (replace) {
        if (fdatasync(fd_.get()) != 0 || (part_.empty() && !takePart(name))) return false;
        named = renameat(folder_, part_.c_str(), folder_, name.c_str()) == 0;
    } else {
        named = renameNew(folder_, part_, folder_, name);
    }
    if (named) part_.clear();
    return named;
}

// A name that nobody else comes to and takes for abandoned.
bool NewFile::takeDrawnPart() {
    const std::string drawn = drawPartName();
    if (drawn.empty()) return false;
    const bool taken = part_.empty() ? giveName(drawn) : renameNew(folder_, part_, folder_, drawn);
    if (taken) part_ = drawn;
    return taken;
}

// Gives the file under the hidden name its name again. Whoever took that meanwhile replaced what was put there last,
// and comes after it: what they put there goes back in its turn.
void NewFile::putBack(const std::string& name) {
    struct stat last = {}, hidden = {}, out = {};
    if (fstat(fd_.get(), &last) != 0) return part_.clear();
    for (int attempt = 0; attempt < kAttempts; ++attempt) {
        if (fstatat(folder_, part_.c_str(), &hidden, AT_SYMLINK_NOFOLLOW) != 0) break;
        if (renameat2(folder_, part_.c_str(), folder_, name.c_str(), RENAME_EXCHANGE) != 0) {
            if (errno == ENOENT) return removePart();  // removed meanwhile: it is there no more either way
            break;
        }
        if (fstatat(folder_, part_.c_str(), &out, AT_SYMLINK_NOFOLLOW) != 0) break;
        if (isSameFile(out, last)) return removePart();
        last = hidden;
    }
    part_.clear();  // somebody's file: better left than lost
}

bool NewFile::publishInPlaceOf(const std::string& name, const IsExpected& isExpected) {
    if (fdatasync(fd_.get()) != 0) return false;
    errno = judgeReplaced(folder_, name, isExpected);
    if (errno != 0 || !takeDrawnPart()) return false;
    if (renameat2(folder_, part_.c_str(), folder_, name.c_str(), RENAME_EXCHANGE) != 0) {
        if (errno == ENOENT) errno = ESTALE;
        if (errno != EINVAL && errno != ENOSYS) return false;
        if (renameat(folder_, part_.c_str(), folder_, name.c_str()) != 0) return false;
        part_.clear();
        return true;
    }
    const int refusal = judgeReplaced(folder_, part_, isExpected);
    if (refusal == 0) {
        removePart();
        return true;
    }
    putBack(name);
    errno = refusal;
    return false;
}

void NewFile::removePart() {
    const KeepErrno keep;
    if (!part_.empty()) unlinkat(folder_, part_.c_str(), 0);
    part_.clear();
}

}  // namespace orvel
