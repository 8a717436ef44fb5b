
#include <cerrno>
#include <ctime>
#include <exception>
#include <string>

#include "base/raised_identity.h"
#include "failure.h"
#include "fault_gate.h"
#include "io/append_line.h"
#include "io/file_io.h"
#include "transfer_entry.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"
#include "vexo/xferlog.h"

namespace {

using orvel::Descriptor;

constexpr const char* kFolder = "/var/log/vexo";
constexpr const char* kFile = "/var/log/vexo/xfer.log";

Descriptor openLog() {
    const std::string path = VEXO::SystemPath(kFile);
    constexpr int flags = O_RDWR | O_APPEND | O_CREAT | O_NOFOLLOW | O_NONBLOCK;
    Descriptor log = vexo::openFile(AT_FDCWD, path.c_str(), flags, 0600);
    if (log || errno != ENOENT) return log;
    constexpr uid_t keep = static_cast<uid_t>(-1);
    if (VEXOFSMkdirP(VEXO::SystemPath(kFolder).c_str(), nullptr, 1, keep, keep, 0755) != 0) return Descriptor();
    return vexo::openFile(AT_FDCWD, path.c_str(), flags, 0600);
}

// A log that somebody else may write, or that is another file by a second name, is not added to.
bool isOurs(int log) {
    struct stat status;
    if (fstat(log, &status) != 0) return false;
    if (vexo::isTrusted(status, S_IFREG)) return true;
    errno = EACCES;
    return false;
}

}  // namespace

int VEXOLogKTRFMXferLog(const char* address, const char* user, const char* action, long long size, const char* path,
                        bool flag) try {
    VEXO_GATE("VEXOLogKTRFMXferLog", -1);
    if (address == nullptr || user == nullptr || action == nullptr || path == nullptr) {
        return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    }
    const int before = errno;
    const std::string line = vexo::buildTransferEntry({time(nullptr), address, user, action, size, path, flag});
    const orvel::RaisedIdentity raised;
    const Descriptor log = openLog();
    if (!log || !isOurs(log.get()) || !vexo::lockFile(log.get(), LOCK_EX) || !vexo::appendLine(log.get(), line)) {
        return vexo::fail(vexo::errorOfErrno(errno));
    }
    errno = before;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
