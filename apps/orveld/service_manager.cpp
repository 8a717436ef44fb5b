#include "service_manager.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <string_view>

namespace orvel::orveld {
namespace {

constexpr long kMillion = 1000000;

}  // namespace

void notifyManager(const std::string& lines) {
    const char* value = getenv("NOTIFY_SOCKET");
    const std::string_view path = value == nullptr ? "" : value;
    sockaddr_un address = {};
    if (path.size() < 2 || path.size() > sizeof address.sun_path) return;
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, path.data(), path.size());
    if (path.front() == '@') address.sun_path[0] = '\0';
    const auto size = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + path.size());
    const int fd = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    if (fd < 0) return;
    sendto(fd, lines.data(), lines.size(), MSG_NOSIGNAL, reinterpret_cast<const sockaddr*>(&address), size);
    close(fd);
}

void notifyReloading() {
    timespec now = {};
    clock_gettime(CLOCK_MONOTONIC, &now);
    notifyManager("RELOADING=1\nMONOTONIC_USEC=" + std::to_string(now.tv_sec * kMillion + now.tv_nsec / 1000));
}

}  // namespace orvel::orveld
