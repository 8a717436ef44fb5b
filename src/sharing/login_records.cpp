#include "orvel/login_records.h"

#include <sys/sysinfo.h>
#include <syslog.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/owned.h"
#include "sharing/client_address.h"
#include "sharing/critical_section.h"
#include "sharing/login_record.h"
#include "sharing/record_file.h"
#include "vexo/error.h"
#include "vexo/settings.h"
#include "vexo/user.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvellogin";
constexpr const char* kSettings = "/etc/vexoinfo.conf";
constexpr std::size_t kAddressSize = 46;
constexpr long kDefaultTimeout = 900;

enum Answer : int {
    kAdministrator = 2,
    kAuthorized = 1,
    kStale = -1,
    kRefused = -2,
    kFailed = -4,
};

// What one check asks of every record.
struct Check {
    std::string_view session, link;
    char address[kAddressSize];
    char* user;
    std::size_t userSize;
    const _tag_confirm_policy& policy;
    int position;
    long now, timeout;
};

// The application whose privilege a position asks for; null for none.
const char* applicationOf(int position) {
    switch (position) {
        case CGI_POSITION_FILE_MANAGER:
            return "VEXO.QDS.App.Quorvane3.Instance";
        case CGI_POSITION_AUDIO:
            return "VEXO.QDS.Tunehall.Application";
        case CGI_POSITION_SURVEILLANCE:
            return "VEXO.QDS.Watchpost";
        case CGI_POSITION_DOWNLOAD:
            return "VEXO.QDS.Fetchyard.Application";
        default:
            return nullptr;
    }
}

int grant(int flags, bool administrator) {
    if (administrator && (flags & ORV_POLICY_ADMINISTRATOR) != 0) return kAdministrator;
    return (flags & ORV_POLICY_USER) != 0 ? kAuthorized : kRefused;
}

bool isStale(const LoginRecord& record, const Check& check) {
    if (numberOf(record.neverExpires) != 0) return false;
    const long accessTime = numberOf(record.accessTime);
    if (accessTime < 1) VLIBCErrSetEx(VEXO_ERR_PARAMETER, __FILE__, __LINE__);
    return !isFresh(accessTime, check.now, check.timeout);
}

bool mayComeFrom(std::string_view recorded, const char* address) {
    if (recorded == address) return true;
    char skip[16] = {};
    return VLIBCFileGetKeyValue(kSettings, "skip_checksrcip", skip, sizeof skip, 0) > 0 &&
           std::strcmp(skip, "yes") == 0;
}

bool matches(const LoginRecord& record, const Check& check) {
    return record.session == check.session && record.link == check.link && mayComeFrom(record.address, check.address);
}

bool hasLiveAccount(const char* user) {
    UserRecord record;
    const int found = VEXOUserGet(user, acquire(record));
    return found >= 0 && VEXOUserIsExpired(record->expiry) != 1;
}

bool isAdministrator(const char* user) {
    const int member = VEXOGroupIsAdminGroupMem(user);
    if (member < 0) {
        syslog(LOG_ERR, "%s:%d VEXOGroupIsAdminGroupMem(%s) failed. [0x%04X %s:%d]", kSource, __LINE__,
               printable(user).c_str(), static_cast<unsigned>(VLIBCErrGet()), VLIBCErrorGetFile(), VLIBCErrorGetLine());
    }
    return member > 0;
}

// Judges a matching record and reports whether it stays in the file. `answer` stays as it is for a user who is gone.
bool judge(const LoginRecord& record, const Check& check, int& answer) {
    const std::string user(record.user);
    setenv("USERNAME", user.c_str(), 1);
    snprintf(check.user, check.userSize, "%s", user.c_str());
    if (!hasLiveAccount(user.c_str())) return false;
    const char* application = applicationOf(check.position);
    if (application != nullptr) {
        answer = kRefused;
        if (VLIBUserPrivilegeHas(user.c_str(), application) != 1) return false;
    }
    answer = grant(check.policy.flags, isAdministrator(user.c_str()));
    if (!isStale(record, check)) return true;
    answer = kStale;
    return check.policy.keepAccessTime != 0;
}

// The line of a judged record: the position is that of the check, not the one recorded (kept).
void appendJudged(LoginRecord record, const Check& check, std::string& out) {
    const long accessTime = check.policy.keepAccessTime != 0 ? numberOf(record.accessTime) : check.now;
    const std::string access = std::to_string(accessTime), position = std::to_string(check.position);
    record.accessTime = access;
    record.position = position;
    record.link = check.link;
    record.line = {};
    appendLoginRecord(record, out);
}

// Lines that stay as they are, one behind the other where they were read: appended as a whole.
class UnchangedRun {
 public:
    explicit UnchangedRun(std::string& out) : out_(out) {}
    void add(std::string_view line) {
        if (line.data() != run_.data() + run_.size()) end();
        run_ = run_.empty() ? line : std::string_view(run_.data(), run_.size() + line.size());
    }
    void end() {
        out_ += run_;
        run_ = {};
    }

 private:
    std::string& out_;
    std::string_view run_;
};

// What the file shall hold of these lines after the check.
void sweep(std::string_view lines, const Check& check, int& answer, std::string& out) {
    out.clear();
    out.reserve(lines.size() + 64);
    UnchangedRun run(out);
    for (LoginRecord record; nextLoginRecord(lines, kLongestCheckedLine, record);) {
        const bool judged = matches(record, check);
        if (judged ? !judge(record, check, answer) : isStale(record, check)) continue;
        if (!judged && !record.line.empty()) {
            run.add(record.line);
            continue;
        }
        run.end();
        if (judged) {
            appendJudged(record, check, out);
        } else {
            appendLoginRecord(record, out);
        }
    }
    run.end();
}

int checkLocked(const Check& check) {
    RecordReader records(kRecordFile);
    if (!records) {
        VLIBCErrSetEx(VEXO_ERR_FILE, __FILE__, __LINE__);
        return kRefused;
    }
    RecordRewrite rewrite;
    if (!rewrite) {
        VLIBCErrSetEx(VEXO_ERR_FILE, __FILE__, __LINE__);
        syslog(LOG_ERR, "%s(%d): file open error, reason=%m", kSource, __LINE__);
        return kFailed;
    }
    int answer = kRefused;
    std::string swept;
    for (std::string_view lines; records.next(lines);) {
        sweep(lines, check, answer, swept);
        if (!rewrite.write(swept)) return kFailed;
    }
    if (records.failed()) {
        VLIBCErrSetEx(VEXO_ERR_FILE, __FILE__, __LINE__);
        return kRefused;
    }
    if (!rewrite.protect()) {
        syslog(LOG_ERR, "%s:%d current.users chmod failed. errno=[0x%04X]", kSource, __LINE__,
               static_cast<unsigned>(errno));
    }
    return rewrite.commit() ? answer : kFailed;
}

int checkSession(Check& check) {
    struct sysinfo system = {};
    if (sysinfo(&system) != 0) {
        syslog(LOG_ERR, "%s (%d) sysinfo Failed, reason=%s", kSource, __LINE__, strerror(errno));
        return kRefused;
    }
    check.now = system.uptime;
    const CriticalSection section(kRecordLock);
    if (!section) {
        syslog(LOG_ERR, "%s (%d) VexoCgiBeginCriticalSection Failed.", kSource, __LINE__);
        return kRefused;
    }
    const int minutes = VLIBCConfGetKTRTimeout();
    check.timeout = minutes < 0 ? kDefaultTimeout : minutes * 60L;
    return checkLocked(check);
}

int lookUp(_tag_VexoCgi* request, char* user, int size, std::string_view link) {
    if (request == nullptr || user == nullptr || size < 1) return 0;
    const char* cookie = VexoCgiGetInCookies(request, "id");
    if (cookie == nullptr) return 0;
    const std::string_view session = cookie;
    const CriticalSection section(request->szLockFile.c_str());
    if (!section) {
        syslog(LOG_ERR, "%s (%d) VexoCgiBeginCriticalSection Failed.", kSource, __LINE__);
        return 0;
    }
    RecordReader records(request->szRecordFile.c_str());
    if (!records) return 0;
    for (std::string_view lines; records.next(lines);) {
        for (LoginRecord record; nextLoginRecord(lines, kLongestLookedUpLine, record);) {
            if (record.session != session || record.link != link) continue;
            snprintf(user, static_cast<std::size_t>(size), "%s", std::string(record.user).c_str());
            return 1;
        }
    }
    return 0;
}

std::string_view viewOf(const char* text) {
    return text == nullptr ? std::string_view() : std::string_view(text);
}

}  // namespace
}  // namespace orvel

int IsAuthorizedByPath(VEXO::WebCGI* request, const char* sid, char* user, int size, _tag_confirm_policy* policy,
                       _tag_cgi_position position, const char* link) {
    using namespace orvel;
    return guardedQuietly(static_cast<int>(kRefused), [&] {
        if (request == nullptr || user == nullptr || size < 1 || policy == nullptr) return static_cast<int>(kFailed);
        Check check = {.session = viewOf(sid),
                       .link = viewOf(link),
                       .address = {},
                       .user = user,
                       .userSize = static_cast<std::size_t>(size),
                       .policy = *policy,
                       .position = position,
                       .now = 0,
                       .timeout = 0};
        if (GetClientIP(check.address, sizeof check.address) != 0) return static_cast<int>(kFailed);
        return checkSession(check);
    });
}

int VexoCgiHasRecord(_tag_VexoCgi* request, char* user, int size, char* link) {
    return orvel::guardedQuietly(0, [&] { return orvel::lookUp(request, user, size, orvel::viewOf(link)); });
}
