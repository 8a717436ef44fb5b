#include "listener.h"

#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <string_view>

namespace orvel::orveld {
namespace {

constexpr int kFirstHandedOver = 3;
constexpr int kBacklog = 4096;  // the kernel's own limit, net.core.somaxconn, holds below it

bool addressOf(const std::string& path, sockaddr_un& address) {
    address = {};
    address.sun_family = AF_UNIX;
    if (path.empty() || path.size() >= sizeof address.sun_path) {
        errno = ENAMETOOLONG;
        return false;
    }
    std::memcpy(address.sun_path, path.data(), path.size());
    return true;
}

int openSocket(int flags) {
    return socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | flags, 0);
}

bool isListening(int fd) {
    int listens = 0;
    socklen_t size = sizeof listens;
    return getsockopt(fd, SOL_SOCKET, SO_ACCEPTCONN, &listens, &size) == 0 && listens == 1;
}

// False with `error` when something is at the path that must stay.
bool makeRoom(const std::string& path, std::string& error) {
    struct stat status {};
    if (lstat(path.c_str(), &status) != 0) return true;
    if (!S_ISSOCK(status.st_mode)) {
        error = path + " is there and is not a socket";
        return false;
    }
    const int probe = connectTo(path);
    if (probe >= 0 || errno != ECONNREFUSED) {
        error = probe >= 0 ? path + " is in use" : path + ": " + std::strerror(errno);
        if (probe >= 0) close(probe);
        return false;
    }
    unlink(path.c_str());
    return true;
}

}  // namespace

int inheritedListener() {
    const char* process = getenv("LISTEN_PID");
    const char* count = getenv("LISTEN_FDS");
    const bool ours =
        process != nullptr && count != nullptr && process == std::to_string(getpid()) && std::string_view(count) == "1";
    unsetenv("LISTEN_PID");
    unsetenv("LISTEN_FDS");
    unsetenv("LISTEN_FDNAMES");
    if (!ours || !isListening(kFirstHandedOver)) return -1;
    fcntl(kFirstHandedOver, F_SETFD, FD_CLOEXEC);
    fcntl(kFirstHandedOver, F_SETFL, O_NONBLOCK);
    return kFirstHandedOver;
}

int ownListener(const std::string& path, std::string& error) {
    sockaddr_un address;
    if (!addressOf(path, address)) {
        error = path + ": the path of a socket has at most 107 bytes";
        return -1;
    }
    if (!makeRoom(path, error)) return -1;
    const int fd = openSocket(SOCK_NONBLOCK);
    const mode_t before = umask(0);  // who may speak is decided by who connects
    const bool bound = fd >= 0 && bind(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    umask(before);
    if (bound && listen(fd, kBacklog) == 0) return fd;
    error = path + ": " + std::strerror(errno);
    if (fd >= 0) close(fd);
    return -1;
}

int connectTo(const std::string& path) {
    sockaddr_un address;
    if (!addressOf(path, address)) return -1;
    const int fd = openSocket(0);
    if (fd < 0 || connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0) return fd;
    const int reason = errno;
    close(fd);
    errno = reason;
    return -1;
}

}  // namespace orvel::orveld
