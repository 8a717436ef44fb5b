#include "tasks/task_worker.h"

#include <unistd.h>

#include <charconv>

#include "failure.h"
#include "io/file_io.h"

namespace vexo {
namespace {

constexpr int kStartField = 22;  // counted from 1, the process number
constexpr size_t kLongestLine = 4096;

// "" for a file that is not there, as of a process that has ended; nothing for one that cannot be read.
std::optional<std::string> contentOf(const std::string& path) {
    const KeepErrno keep;
    std::string text;
    const Descriptor fd = openFile(path, O_RDONLY);
    if (fd && readAll(fd.get(), text, kLongestLine)) return text;
    return errno == ENOENT || errno == ESRCH ? std::optional(std::string()) : std::nullopt;
}

// "" when the kernel does not say.
const std::string& bootId() {
    static std::string id;
    if (id.empty()) {
        const std::string text = contentOf("/proc/sys/kernel/random/boot_id").value_or("");
        id = text.substr(0, text.find('\n'));
    }
    return id;
}

std::string statusPath(pid_t pid) {
    return "/proc/" + std::to_string(pid) + "/stat";
}

}  // namespace

std::optional<unsigned long long> startTimeOf(std::string_view line) {
    // The second field, a name in parentheses, may itself hold blanks and parentheses.
    const size_t nameEnd = line.rfind(") ");
    if (nameEnd == std::string_view::npos) return std::nullopt;
    std::string_view rest = line.substr(nameEnd + 2);
    const char state = rest.empty() ? 'X' : rest[0];
    if (state == 'Z' || state == 'X' || state == 'x') return std::nullopt;
    for (int field = 3; field < kStartField; ++field) {
        const size_t blank = rest.find(' ');
        if (blank == std::string_view::npos) return std::nullopt;
        rest.remove_prefix(blank + 1);
    }
    unsigned long long start = 0;
    const auto [end, error] = std::from_chars(rest.data(), rest.data() + rest.size(), start);
    if (error != std::errc()) return std::nullopt;
    return start;
}

Worker thisProcess() {
    const auto start = startTimeOf(contentOf(statusPath(getpid())).value_or(""));
    if (!start || bootId().empty()) return {};
    return {getpid(), *start, bootId()};
}

std::optional<bool> isRunning(const Worker& worker) {
    if (worker.pid < 1) return false;
    if (bootId().empty()) return std::nullopt;
    if (worker.boot != bootId()) return false;
    const auto line = contentOf(statusPath(worker.pid));
    if (!line) return std::nullopt;
    const auto start = startTimeOf(*line);
    return start && *start == worker.start;
}

}  // namespace vexo
