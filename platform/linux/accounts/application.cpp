// Who may use an application of the appliance.
#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <exception>
#include <optional>
#include <string>
#include <utility>

#include "accounts/application_list.h"
#include "accounts/user_list.h"
#include "ask_again.h"
#include "failure.h"
#include "fault_gate.h"
#include "io/file_io.h"
#include "vexo/system_root.h"
#include "vexo/user.h"

namespace {

constexpr const char* kSource = "application";
constexpr const char* kApplications = "/etc/vexo/applications";
constexpr size_t kMaxFile = size_t{1} << 20;

struct Remembered {
    vexo::FileVersion version;
    struct stat logged {};  // the state of the file whose malformed lines are in the log
    vexo::ApplicationList list;
};

bool isSameState(const struct stat& a, const struct stat& b) {
    return a.st_ino == b.st_ino && a.st_size == b.st_size && a.st_mtim.tv_sec == b.st_mtim.tv_sec &&
           a.st_mtim.tv_nsec == b.st_mtim.tv_nsec;
}

void logMalformed(Remembered& file, const struct stat& status) {
    if (isSameState(file.logged, status)) return;
    file.logged = status;
    for (const int line : file.list.malformed) {
        syslog(LOG_ERR, "%s:%d line %d of %s has no \"identifier:\"", kSource, __LINE__, line, kApplications);
    }
}

// The file as it is now: an empty list without a file, null with errno when it cannot be read.
const vexo::ApplicationList* load() {
    static auto& file = *new Remembered;  // still asked at exit
    const std::string path = VEXO::SystemPath(kApplications);
    struct stat status {};
    if (stat(path.c_str(), &status) == 0) {
        if (file.version.isCurrent(status)) return &file.list;
    } else if (errno != ENOENT && errno != ENOTDIR) {
        return nullptr;
    } else {
        file = {};
        return &file.list;
    }
    std::string text;
    vexo::FileVersion version;
    if (!vexo::readRegularFile(path, kMaxFile, text, version)) return nullptr;
    file.list = vexo::parseApplications(text);
    file.version = version;
    logMalformed(file, status);
    return &file.list;
}

// Nothing, with errno, when it could not be determined.
std::optional<bool> isAllowed(const char* user, const char* appId) {
    const vexo::ApplicationList* list = load();
    if (list == nullptr) return std::nullopt;
    const auto found = list->users.find(appId);
    if (found == list->users.end()) return true;
    vexo::ListedUser listed(user);
    const bool allowed = std::any_of(found->second.begin(), found->second.end(),
                                     [&](const std::string& entry) { return listed.matches(entry); });
    return allowed || !listed.failed() ? std::optional(allowed) : std::nullopt;
}

}  // namespace

int VLIBUserPrivilegeHas(const char* user, const char* appId) try {
    VEXO_GATE("VLIBUserPrivilegeHas", 0);
    if (user == nullptr || *user == '\0' || appId == nullptr) {
        vexo::fail(VEXO_ERR_PARAMETER);
        return 0;
    }
    const int before = errno;
    const auto allowed = vexo::askAgain([&] { return isAllowed(user, appId); },
                                        [](const std::optional<bool>& answer) { return !answer.has_value(); });
    if (allowed) {
        errno = before;
    } else {
        vexo::fail(vexo::errorOfErrno(errno));
    }
    return static_cast<int>(allowed.value_or(false));
} catch (const std::exception&) {
    vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
    return 0;
}
