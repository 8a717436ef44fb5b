#include "vexo/session.h"

#include <cstdlib>
#include <memory>
#include <new>
#include <string>

#include "base/owner.h"
#include "failure.h"
#include "fault_gate.h"
#include "vexo/user.h"
#include "web/cgi_text.h"
#include "web/session_store.h"

namespace {

constexpr const char* kSessionCookie = "id";
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
    std::string remoteUser;
    std::string address;
    std::string offeredSid;
    bool secure = false;
    std::string sid;  // "" until authorised
    std::string newCookie;
};

WebMan::WebMan() {
    auto impl = std::make_unique<Impl>();
    impl->remoteUser = environment("REMOTE_USER");
    impl->address = environment("REMOTE_ADDR");
    impl->offeredSid = vexo::findCookie(environment("HTTP_COOKIE"), kSessionCookie).value_or("");
    impl->secure = environment("HTTPS") == "on";
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
    if (!isKnownUser(impl_->remoteUser)) return false;
    if (vexo::useSession(impl_->offeredSid, impl_->remoteUser)) {
        impl_->sid = impl_->offeredSid;
        return true;
    }
    impl_->sid = vexo::createSession(impl_->remoteUser, impl_->address);
    if (impl_->sid.empty()) return false;
    impl_->newCookie = std::string(kSessionCookie) + "=" + impl_->sid + "; Path=/; HttpOnly; SameSite=Strict" +
                       (impl_->secure ? "; Secure" : "");
    return true;
}

std::string WebMan::GetLoginUserName() const {
    return impl_->sid.empty() ? "" : impl_->remoteUser;
}

std::string WebMan::GetSessionId() const {
    return impl_->sid;
}

std::string WebMan::GetNewCookie() const {
    return impl_->newCookie;
}
