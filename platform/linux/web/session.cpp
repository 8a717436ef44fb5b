#include "vexo/session.h"

#include <cstdlib>
#include <memory>
#include <new>
#include <string>
#include <utility>

#include "base/owner.h"
#include "failure.h"
#include "fault_gate.h"
#include "vexo/login.h"
#include "vexo/settings.h"
#include "vexo/user.h"
#include "web/cgi_text.h"
#include "web/session_store.h"

namespace {

constexpr uid_t kNoId = 0xFFFFFFFF;

struct Ids {
    uid_t uid = kNoId;
    gid_t gid = kNoId;
};

// The ids of the user of a session, both unknown with the slot filled on failure.
Ids idsOf(const char* sid, const char* user) try {
    Ids ids;
    if (sid == nullptr || user == nullptr || *user == '\0') {
        vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    } else if (!vexo::useSession(sid, user)) {
        vexo::fail(VEXO_ERR_DENIED, EACCES);
    } else {
        VEXOUserGetUGID(user, &ids.uid, &ids.gid);
    }
    return ids;
} catch (const std::bad_alloc&) {
    vexo::fail(VEXO_ERR_GENERAL);
    return {};
}

std::string environment(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
}

bool isKnownUser(const std::string& user) {
    if (user.empty()) {
        vexo::fail(VEXO_ERR_DENIED, EACCES);
        return false;
    }
    std::unique_ptr<VEXOUSER, orvel::Releaser<VEXOUserFree>> record;
    return VEXOUserGet(user.c_str(), orvel::acquire(record)) >= 0;
}

}  // namespace

uid_t VexoCgiUIDGet(const char* sid, const char* user) {
    VEXO_GATE("VexoCgiUIDGet", kNoId);
    return idsOf(sid, user).uid;
}

gid_t VexoCgiGIDGet(const char* sid, const char* user) {
    VEXO_GATE("VexoCgiGIDGet", kNoId);
    return idsOf(sid, user).gid;
}

struct WebMan::Impl {
    std::string remoteUser;  // "" unless the web server is trusted for it
    std::string address;
    std::string browser;
    std::string offeredSid;
    bool secure = false;
    std::string user, sid;  // "" until authorised
    std::string newCookie;

    void setCookie(const std::string& value, const char* more);
    bool enterTrusted();
    bool enterLoggedIn();
};

void WebMan::Impl::setCookie(const std::string& value, const char* more) {
    newCookie = vexo::sessionCookieName() + "=" + value + "; Path=/; HttpOnly; SameSite=Strict" + more +
                (secure ? "; Secure" : "");
}

// For the user whom the web server has let in: his session, or a new one.
bool WebMan::Impl::enterTrusted() {
    if (!isKnownUser(remoteUser)) return false;
    if (vexo::useSession(offeredSid, remoteUser)) {
        sid = offeredSid;
    } else {
        vexo::SessionRecord record;
        record.user = remoteUser;
        record.address = address;
        sid = vexo::createSession(std::move(record));
        if (!sid.empty()) setCookie(sid, "");
    }
    if (!sid.empty()) user = remoteUser;
    return !sid.empty();
}

// For the user of a session that a log-in made, as long as he may log in. A lookup that fails ends no session.
bool WebMan::Impl::enterLoggedIn() {
    const auto record = vexo::useSession(offeredSid);
    const bool usable = record && record->loggedIn;
    const int refused = usable ? VEXOLogInAllowed(record->user.c_str()) : 0;
    uid_t uid = kNoId;
    gid_t gid = kNoId;
    const bool same =
        usable && refused == 0 && VEXOUserGetUGID(record->user.c_str(), &uid, &gid) == 0 && uid == record->uid;
    if (!same) {
        const bool another = refused == 0 && uid != kNoId;
        if (usable && (another || (refused != 0 && refused != VEXO_LOGIN_SERVICE))) vexo::endSession(offeredSid);
        vexo::fail(VEXO_ERR_DENIED, EACCES);
        return false;
    }
    sid = offeredSid;
    user = record->user;
    return true;
}

WebMan::WebMan() {
    auto impl = std::make_unique<Impl>();
    if (VexoConf::Info().Get("trusted_log_in", "") == "yes") impl->remoteUser = environment("REMOTE_USER");
    impl->address = environment("HTTP_X_FORWARDED_FOR");
    if (impl->address.empty()) impl->address = environment("REMOTE_ADDR");
    impl->browser = environment("HTTP_USER_AGENT");
    impl->offeredSid = vexo::findCookie(environment("HTTP_COOKIE"), vexo::sessionCookieName()).value_or("");
    impl->secure = vexo::isSecureRequest();
    impl_ = impl.release();
}

WebMan::~WebMan() {
    delete impl_;
}

bool WebMan::IsAuthorized(const char* appId, int flags, _tag_cgi_position position) {
    VEXO_GATE("WebMan::IsAuthorized", false);
    static_cast<void>(appId);
    static_cast<void>(flags);
    static_cast<void>(position);
    if (!impl_->sid.empty()) return true;
    return impl_->remoteUser.empty() ? impl_->enterLoggedIn() : impl_->enterTrusted();
}

bool WebMan::LogIn(const std::string& user) {
    VEXO_GATE("WebMan::LogIn", false);
    vexo::SessionRecord record;
    gid_t gid = kNoId;
    if (VEXOUserGetUGID(user.c_str(), &record.uid, &gid) != 0) return false;
    record.user = user;
    record.address = impl_->address;
    record.browser = impl_->browser;
    record.loggedIn = true;
    const std::string sid = vexo::createSession(std::move(record));
    if (sid.empty()) return false;
    // What somebody may have planted in the browser, or seen there, is worth nothing from here on.
    vexo::endSession(impl_->offeredSid);
    impl_->sid = sid;
    impl_->user = user;
    impl_->setCookie(sid, "");
    return true;
}

int WebMan::LogOut(const std::string& which) {
    const bool own = which == "this" || which == "all";
    int ended = 0;
    for (const vexo::KeptSession& kept : vexo::sessionsOf(impl_->user)) {
        const bool current = kept.sid == impl_->sid;
        const bool meant = which == "all" || which == (current ? "this" : "others") || which == kept.record.name;
        if (meant && vexo::endSession(kept.sid)) {
            ++ended;
            if (current) impl_->setCookie("", "; Max-Age=0");
        }
    }
    if (!own) return ended;
    // One that a trusted web server's word made is in no list.
    if (vexo::endSession(impl_->offeredSid)) ++ended;
    impl_->setCookie("", "; Max-Age=0");
    return ended;
}

std::vector<WebSession> WebMan::Sessions() const {
    std::vector<WebSession> list;
    for (const vexo::KeptSession& kept : vexo::sessionsOf(impl_->user)) {
        list.push_back({.id = kept.record.name,
                        .address = kept.record.address,
                        .browser = kept.record.browser,
                        .since = kept.record.time,
                        .used = kept.lastUse,
                        .current = kept.sid == impl_->sid});
    }
    return list;
}

std::string WebMan::GetLoginUserName() const {
    return impl_->user;
}

std::string WebMan::GetSessionId() const {
    return impl_->sid;
}

std::string WebMan::GetNewCookie() const {
    return impl_->newCookie;
}
