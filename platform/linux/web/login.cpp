#include "vexo/login.h"

#include <syslog.h>

#include <cerrno>
#include <cstring>
#include <exception>
#include <memory>
#include <string>
#include <string_view>

#include "accounts/account_source.h"
#include "accounts/user_list.h"
#include "base/owner.h"
#include "base/printable.h"
#include "failure.h"
#include "fault_gate.h"
#include "vexo/auto_block.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"
#include "vexo/user.h"
#include "web/auto_block_rules.h"
#include "web/guess_rules.h"
#include "web/login_conversations.h"
#include "web/login_packet.h"
#include "web/login_rules.h"

namespace {

constexpr const char* kTag = "login";
constexpr const char* kPlatformSettings = "/etc/login.defs";
constexpr size_t kLongestSettings = size_t{1} << 20;
constexpr int kPatience = vexo::kConversationSeconds + 5;
constexpr int kBusySeconds = 2;
constexpr size_t kLoggedName = 256;

// What a line of the log says of a name: one line however it is spelled, and no more of it than a name can be.
std::string shown(const char* name) {
    return orvel::printable(std::string_view(name).substr(0, kLoggedName));
}

std::string addressOf(const char* address) {
    return vexo::normaliseAddress(address).value_or("unknown");
}

const char* wordOf(int reason) {
    switch (reason) {
        case VEXO_LOGIN_WRONG:
            return "wrong";
        case VEXO_LOGIN_EXPIRED:
            return "expired";
        case VEXO_LOGIN_LOCKED:
            return "locked";
        case VEXO_LOGIN_BLOCKED:
            return "blocked";
        case VEXO_LOGIN_BUSY:
            return "busy";
        default:
            return "service";
    }
}

// The packaged filter of fail2ban reads these lines: the address stands before what a stranger writes.
void logRefusal(const VEXOLOGIN& step, const char* address) {
    if (step.reason == VEXO_LOGIN_OVER || step.reason == VEXO_LOGIN_TWICE) return;
    syslog(LOG_AUTHPRIV | LOG_NOTICE, "log-in from %s refused (%s): \"%s\"", addressOf(address).c_str(),
           wordOf(step.reason), shown(step.user).c_str());
}

int refuse(VEXOLOGIN* out, int reason, int wait = 0) {
    out->step = VEXO_LOGIN_REFUSED;
    out->reason = reason;
    out->wait = wait;
    out->id[0] = '\0';
    return out->step;
}

// What the conversation says next; it is over unless it asks something.
int hear(int connection, const char* address, VEXOLOGIN* out) {
    if (!vexo::receivePacket(connection, *out, kPatience)) {
        *out = {};
        refuse(out, VEXO_LOGIN_SERVICE);
    }
    if (out->step != VEXO_LOGIN_REFUSED) return out->step;
    if (out->reason == VEXO_LOGIN_WRONG) {
        // A count that is lost lets nobody in; who looks after the machine learns of it.
        if (AutoBlockFailLoginSet(addressOf(address).c_str(), kTag) != 0 && VLIBCErrGet() != VEXO_ERR_PARAMETER) {
            syslog(LOG_ERR, "log-in: a failure could not be counted [0x%04X]", VLIBCErrGet());
        }
    }
    logRefusal(*out, address);
    out->user[0] = '\0';
    return out->step;
}

bool isBlocked(const char* address, VEXOLOGIN* out) {
    const int wait = VEXOAutoBlockWait(address);
    if (wait > 0) refuse(out, VEXO_LOGIN_BLOCKED, wait);
    // A broken list must not lock everybody out.
    if (wait < 0 && VLIBCErrGet() != VEXO_ERR_PARAMETER) {
        syslog(LOG_ERR, "log-in: blocked addresses cannot be read [0x%04X]", VLIBCErrGet());
    }
    return wait > 0;
}

int begin(const char* user, const char* address, VEXOLOGIN* out) {
    vexo::LogInPacket packet = {};
    packet.word = vexo::LogInWord::kBegin;
    // What can be no name goes along for the log alone.
    packet.size = vexo::isLogInName(user) ? 1 : 0;
    snprintf(packet.user, sizeof packet.user, "%s", user);
    snprintf(out->user, sizeof out->user, "%s", user);
    if (isBlocked(address, out)) {
        logRefusal(*out, address);
        return out->step;
    }
    std::string id;
    vexo::Descriptor connection;
    const vexo::Conversation started = vexo::startConversation(vexo::clientOf(address), id, connection);
    if (started == vexo::Conversation::kTooMany) {
        refuse(out, VEXO_LOGIN_BUSY, kBusySeconds);
        logRefusal(*out, address);
        return out->step;
    }
    snprintf(packet.client, sizeof packet.client, "%s", addressOf(address).c_str());
    snprintf(packet.id, sizeof packet.id, "%s", id.c_str());
    if (started == vexo::Conversation::kFailed || !vexo::sendPacket(connection.get(), packet)) {
        syslog(LOG_ERR, "log-in: no conversation could be started, reason=%s", strerror(errno));
        return refuse(out, VEXO_LOGIN_SERVICE);
    }
    return hear(connection.get(), address, out);
}

int answer(const char* id, const char* address, std::string_view text, VEXOLOGIN* out) {
    const vexo::Descriptor connection = vexo::joinConversation(id);
    if (!connection) return refuse(out, VEXO_LOGIN_OVER);
    vexo::LogInPacket packet = {};
    packet.word = vexo::LogInWord::kAnswer;
    // What no password can be is handed on as an answer that none is.
    const bool fits = text.size() <= vexo::kLongestAnswer && text.find('\0') == std::string_view::npos;
    packet.size = fits ? static_cast<std::uint32_t>(text.size()) : vexo::kNoAnswer;
    if (fits) text.copy(packet.text, vexo::kLongestAnswer);
    snprintf(packet.client, sizeof packet.client, "%s", addressOf(address).c_str());
    const bool sent = vexo::sendPacket(connection.get(), packet);
    explicit_bzero(&packet, sizeof packet);
    return sent ? hear(connection.get(), address, out) : refuse(out, VEXO_LOGIN_OVER);
}

// The least uid of a person. Missing login.defs: the usual one; one that cannot be read: nobody can tell.
bool findUidMin(uid_t& least) {
    std::string text;
    vexo::FileVersion version;
    if (!vexo::readRegularFile(VEXO::SystemPath(kPlatformSettings), kLongestSettings, text, version) &&
        errno != ENOENT) {
        return false;
    }
    least = vexo::parseUidMin(text);
    return true;
}

int allowed(const char* user) {
    std::unique_ptr<VEXOUSER, orvel::Releaser<VEXOUserFree>> record;
    if (VEXOUserGet(user, orvel::acquire(record)) < 0) {
        return VLIBCErrGet() == VEXO_ERR_USER_MISSING ? VEXO_LOGIN_WRONG : VEXO_LOGIN_SERVICE;
    }
    uid_t least = 0;
    if (!findUidMin(least)) return VEXO_LOGIN_SERVICE;
    if (!vexo::isPersonsUid(record->uid, least)) return VEXO_LOGIN_WRONG;
    const auto groups = vexo::parseLogInGroups(VexoConf::Info().Get("log_in_groups", ""));
    vexo::ListedUser listed(user);
    bool member = groups.empty();
    for (const std::string& group : groups) member = member || listed.matches(group);
    if (!member) return listed.failed() ? VEXO_LOGIN_SERVICE : VEXO_LOGIN_WRONG;
    if (VEXOUserIsExpired(record->expiry) == 1) return VEXO_LOGIN_EXPIRED;
    const auto validity = vexo::AccountSource::instance().validity(user);
    if (!validity) return VEXO_LOGIN_SERVICE;
    return validity->locked ? VEXO_LOGIN_LOCKED : 0;
}

}  // namespace

int VEXOLogInBegin(const char* user, const char* address, VEXOLOGIN* out) try {
    *out = {};
    VEXO_GATE("VEXOLogInBegin", refuse(out, VEXO_LOGIN_SERVICE));
    if (user == nullptr || address == nullptr) return refuse(out, VEXO_LOGIN_SERVICE);
    return begin(user, address, out);
} catch (const std::exception&) {
    return refuse(out, VEXO_LOGIN_SERVICE);
}

int VEXOLogInAnswer(const char* id, const char* address, const char* text, unsigned long size, VEXOLOGIN* out) try {
    *out = {};
    if (id == nullptr || address == nullptr || text == nullptr) return refuse(out, VEXO_LOGIN_OVER);
    return answer(id, address, std::string_view(text, size), out);
} catch (const std::exception&) {
    return refuse(out, VEXO_LOGIN_SERVICE);
}

void VEXOLogInEnd(const char* id, const char* address) try {
    if (id == nullptr || address == nullptr) return;
    const vexo::Descriptor connection = vexo::joinConversation(id);
    vexo::LogInPacket packet = {};
    packet.word = vexo::LogInWord::kEnd;
    snprintf(packet.client, sizeof packet.client, "%s", addressOf(address).c_str());
    VEXOLOGIN heard;
    // Its end frees the client's place: that is waited for, so that another can begin at once.
    if (connection && vexo::sendPacket(connection.get(), packet)) {
        static_cast<void>(vexo::receivePacket(connection.get(), heard, 1));
    }
} catch (const std::exception&) {
    return;
}

int VEXOLogInAllowed(const char* user) try {
    VEXO_GATE("VEXOLogInAllowed", VEXO_LOGIN_SERVICE);
    return user == nullptr ? static_cast<int>(VEXO_LOGIN_WRONG) : allowed(user);
} catch (const std::exception&) {
    return VEXO_LOGIN_SERVICE;
}
