#include "sharing/login_add.h"

#include <crypt.h>
#include <sys/sysinfo.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "sharing/client_address.h"
#include "sharing/critical_section.h"
#include "sharing/login_record.h"
#include "sharing/record_file.h"
#include "vexo/error.h"
#include "vexo/line_file.h"
#include "vexo/user.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvellogin";
constexpr std::size_t kAddressSize = 46;
constexpr std::size_t kLongestKey = 555;
constexpr int kLongestLine = 512;
constexpr useconds_t kBeforeNextDraw = 10000;

struct Drawn {
    std::string session;
    long uptime = 0;
};

// What would end a field or the line.
bool breaksLine(std::string_view field) {
    return field.find_first_of(",\r\n") != std::string_view::npos;
}

void waitOneSecond() {
    for (unsigned left = 1; left > 0;) left = sleep(left);
}

// One identifier for `key`; the generator is seeded with the uptime, so within a second each draw is the same. False
// when none could be made.
bool draw(const std::string& key, Drawn& drawn) {
    struct sysinfo system = {};
    if (sysinfo(&system) != 0) {
        syslog(LOG_ERR, "%s (%d) sysinfo Failed, reason=%s", kSource, __LINE__, strerror(errno));
        return false;
    }
    drawn.uptime = system.uptime;
    srand(static_cast<unsigned>(system.uptime));
    const char salt[] = {VEXOUserRandomNumMap2Seed(system.uptime), VEXOUserRandomNumMap2Seed(rand()), '\0'};
    crypt_data work = {};
    const char* session = crypt_rn(key.c_str(), salt, &work, sizeof work);
    if (session == nullptr || session[0] == '*') return false;
    drawn.session = session;
    return true;
}

// Draws until an identifier is fit to stand in a line and not in use.
bool drawUnused(const std::string& key, Drawn& drawn) {
    while (draw(key, drawn)) {
        if (drawn.session.find_first_of("/:") != std::string::npos) {
            usleep(kBeforeNextDraw);
            continue;
        }
        char line[kLongestLookedUpLine + 1];
        const int found = VLIBCFileGetLine(kRecordFile, drawn.session.c_str(), line, sizeof line, ",");
        if (found < 0 && VLIBCErrGet() != VEXO_ERR_FILE) return false;
        waitOneSecond();
        if (found <= 0) return true;
    }
    return false;
}

bool addLine(const std::string& line) {
    const CriticalSection section(kRecordLock);
    if (!section) {
        syslog(LOG_ERR, "%s (%d) VexoCgiBeginCriticalSection Failed.", kSource, __LINE__);
        return false;
    }
    if (VLIBCFileAddLine(kRecordFile, line.c_str(), kLongestLine) != 0) {
        syslog(LOG_ERR, "%s (%d) VLIBCFileAddLine Failed.", kSource, __LINE__);
        return false;
    }
    if (!protectRecordFile()) {
        syslog(LOG_ERR, "%s:%d current.users chmod failed. errno=[0x%04X]", kSource, __LINE__,
               static_cast<unsigned>(errno));
    }
    return true;
}

}  // namespace

bool addLoginRecord(const char* user, std::string& session, int neverExpires, const char* link) {
    char address[kAddressSize];
    const std::string_view linkId = link == nullptr ? "" : link;
    if (user == nullptr || GetClientIP(address, sizeof address) != 0 || *user == '\0' || *address == '\0' ||
        breaksLine(user) || breaksLine(address) || breaksLine(linkId)) {
        syslog(LOG_ERR, "%s (%d) Bad parameter.", kSource, __LINE__);
        return false;
    }
    setenv("USERNAME", user, 1);
    Drawn drawn;
    if (!drawUnused((std::string(user) + address).substr(0, kLongestKey), drawn)) return false;

    const std::string uptime = std::to_string(drawn.uptime), never = std::to_string(neverExpires);
    std::string line;
    appendLoginRecord({.address = address,
                       .user = user,
                       .session = drawn.session,
                       .loginTime = uptime,
                       .accessTime = uptime,
                       .position = "1",
                       .neverExpires = never,
                       .link = linkId,
                       .line = {}},
                      line);
    line.pop_back();  // the platform adds the end
    if (!addLine(line)) return false;
    session = drawn.session;
    return true;
}

}  // namespace orvel
