// orveld: serves the programs over SCGI on a Unix socket, a child for each request. It stays in the foreground.
//
//   orveld [--socket PATH]
//
// The socket is the one that the service manager hands over, else PATH, else the setting "orveld_socket". SIGTERM ends
// it when what is under way is served, SIGHUP makes it read the settings again. docs/orveld.md says the rest.
#include <fcntl.h>
#include <sqlite3.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <string>
#include <string_view>

#include "base/printable.h"
#include "child.h"
#include "descriptors.h"
#include "listener.h"
#include "load_limits.h"
#include "natural_order.h"
#include "oom.h"
#include "server.h"
#include "vexo/process.h"
#include "vexo/volume.h"

namespace orvel::orveld {
namespace {

constexpr int kUsage = 2;

// Programs find the icons of listings beside their folder (../images).
void enterOwnFolder() {
    std::error_code error;
    const auto program = std::filesystem::read_symlink("/proc/self/exe", error);
    if (!error) std::filesystem::current_path(program.parent_path(), error);
}

// Standard input is a request's in each child, so here it is nobody's.
bool closeOthers(int listener) {
    const int null = open("/dev/null", O_RDWR | O_CLOEXEC);
    if (null < 0) return false;
    dup2(null, STDIN_FILENO);
    dup2(null, STDOUT_FILENO);
    if (fcntl(STDERR_FILENO, F_GETFD) < 0) dup2(null, STDERR_FILENO);
    const unsigned after = listener < 0 ? STDERR_FILENO + 1 : static_cast<unsigned>(listener) + 1;
    return close_range(after, ~0U, 0) == 0;
}

// In a process of its own: a disk that does not answer must not keep requests waiting, and what is missing is made by
// who needs it.
void prepareVolumes() {
    if (fork() != 0) return;
    close_range(STDERR_FILENO + 1, ~0U, 0);
    const auto report = [](const VEXOVOLUMENOTE* note, void*) {
        if (note->error == 0) return;
        syslog(LOG_ERR, "orveld: %s: %s", printable(note->folder).c_str(), std::strerror(note->error));
    };
    _exit(VEXOVolumesPrepare(report, nullptr) == 0 ? 0 : 1);
}

int serve(std::string path) {
    int listener = inheritedListener();
    if (!closeOthers(listener)) return 1;
    prepareChildren();
    tzset();
    VEXOWarm();
    orvel::cgi::warmNaturalOrder();
    closelog();
    prepareVolumes();
    std::string error;
    const bool own = listener < 0;
    if (own) {
        if (path.empty()) path = defaultSocket();
        listener = ownListener(path, error);
    }
    if (listener < 0) {
        std::fprintf(stderr, "orveld: %s\n", error.c_str());
        return 1;
    }
    Server server(listener, own ? path : "");
    if (!server.prepare()) {
        std::fprintf(stderr, "orveld: %s\n", std::strerror(errno));
        return 1;
    }
    // A descriptor that nobody named, say of a service that was asked about users, would be shared by all children.
    const auto others = otherDescriptors(server.descriptors());
    for (const std::string& other : others) std::fprintf(stderr, "orveld: open without need: %s\n", other.c_str());
    if (!others.empty()) return 1;
    enterProtection();
    server.run();
    return 0;
}

}  // namespace
}  // namespace orvel::orveld

int main(int count, char** words) {
    sqlite3_config(SQLITE_CONFIG_MEMSTATUS, 0);  // nobody reads the count, which takes a lock for each allocation
    std::string path;
    if (count == 3 && std::string_view(words[1]) == "--socket") {
        path = std::filesystem::absolute(words[2]);
    } else if (count != 1) {
        std::fputs("usage: orveld [--socket PATH]\n", stderr);
        return orvel::orveld::kUsage;
    }
    orvel::orveld::enterOwnFolder();
    return orvel::orveld::serve(path);
}
