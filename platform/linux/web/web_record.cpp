#include "vexo/web_record.h"

#include <cstdlib>
#include <exception>

#include "failure.h"
#include "fault_gate.h"
#include "web/cgi_text.h"

namespace {

constexpr const char* kRecordFile = "/tmp/foldersharing.current.users";
constexpr const char* kLockFile = "/tmp/foldersharing.current.users.lock";

}  // namespace

int VexoCgiInit(_tag_VexoCgi* request) try {
    VEXO_GATE("VexoCgiInit", -1);
    if (request == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const char* cookies = getenv("HTTP_COOKIE");
    *request = {kLockFile, kRecordFile, vexo::parseCookies(cookies == nullptr ? "" : cookies)};
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

const char* VexoCgiGetInCookies(_tag_VexoCgi* request, const char* name) {
    VEXO_GATE("VexoCgiGetInCookies", nullptr);
    if (request == nullptr || name == nullptr) return nullptr;
    const std::string called = vexo::cookieNameOf(name);
    for (const auto& [cookie, value] : request->cookies) {
        if (cookie == called) return value.c_str();
    }
    return nullptr;
}
