#include "load_limits.h"

#include <fcntl.h>
#include <poll.h>
#include <pwd.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <optional>

#include "request.h"
#include "slots.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

namespace orvel::orveld {
namespace {

constexpr const char* kSocket = "/run/vexo/orveld.socket";
constexpr size_t kMostQueued = 100000;
constexpr size_t kMostSeconds = 24 * 60 * 60;
constexpr int kPatience = 5000;  // milliseconds for the services that know users

size_t number(const char* name, size_t fallback, size_t most) {
    const std::string text = VexoConf::Info().Get(name, "");
    if (text.empty()) return fallback;
    const auto value = cgi::parseNumber(text);
    if (value && *value >= 1 && *value <= most) return *value;
    std::fprintf(stderr, "orveld: setting %s is not a number from 1 to %zu; %zu is taken\n", name, most, fallback);
    return fallback;
}

std::vector<std::string> words(const std::string& text) {
    std::vector<std::string> list;
    for (size_t at = 0; (at = text.find_first_not_of(", ", at)) != std::string::npos;) {
        const size_t end = std::min(text.find_first_of(", ", at), text.size());
        list.push_back(text.substr(at, end - at));
        at = end;
    }
    return list;
}

std::optional<uid_t> uidOf(const std::string& name) {
    if (const auto number = cgi::parseNumber(name); number && *number <= 0xFFFFFFFEU)
        return static_cast<uid_t>(*number);
    const passwd* record = getpwnam(name.c_str());
    return record == nullptr ? std::nullopt : std::optional(record->pw_uid);
}

// Runs in a process of its own: asking who is who opens connections and maps files that must not stay in the parent.
[[noreturn]] void reportUids(const std::vector<std::string>& names, int pipe) {
    for (const std::string& name : names) {
        const auto uid = uidOf(name);
        if (!uid) std::fprintf(stderr, "orveld: no user \"%s\"\n", name.c_str());
        if (uid && write(pipe, &*uid, sizeof *uid) != sizeof *uid) _exit(1);
    }
    _exit(0);
}

std::vector<uid_t> receiveUids(int pipe, size_t most) {
    std::vector<uid_t> list;
    pollfd watched = {pipe, POLLIN, 0};
    uid_t uid = 0;
    while (list.size() < most && poll(&watched, 1, kPatience) == 1 && read(pipe, &uid, sizeof uid) == sizeof uid) {
        list.push_back(uid);
    }
    return list;
}

std::vector<uid_t> users(const char* setting) {
    const std::vector<std::string> names = words(VexoConf::Info().Get(setting, ""));
    int ends[2];
    if (names.empty() || pipe2(ends, O_CLOEXEC) != 0) return {};
    const pid_t child = fork();
    if (child == 0) reportUids(names, ends[1]);
    close(ends[1]);
    std::vector<uid_t> list = child > 0 ? receiveUids(ends[0], names.size()) : std::vector<uid_t>();
    close(ends[0]);
    if (child > 0) {
        kill(child, SIGKILL);
        while (waitpid(child, nullptr, 0) < 0 && errno == EINTR) {
        }
    }
    return list;
}

}  // namespace

Limits readLimits() {
    Limits limits;
    limits.children = number("orveld_children", limits.children, Slots::kMost);
    const size_t quarter = std::max<size_t>(1, limits.children / 4);
    limits.perAddress = std::min(number("orveld_children_per_address", quarter, Slots::kMost), quarter);
    limits.queued = number("orveld_queue", 4 * limits.children, kMostQueued);
    limits.idle = std::chrono::seconds(number("orveld_idle_seconds", limits.idle.count(), kMostSeconds));
    limits.speakers = users("orveld_web_servers");
    limits.trusted = users("orveld_trusted_logins");
    return limits;
}

std::string defaultSocket() {
    const std::string set = VexoConf::Info().Get("orveld_socket", "");
    return set.empty() ? VEXO::SystemPath(kSocket) : set;
}

bool isIn(const std::vector<uid_t>& list, uid_t uid) {
    return std::find(list.begin(), list.end(), uid) != list.end();
}

}  // namespace orvel::orveld
