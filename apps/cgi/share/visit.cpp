#include "share/visit.h"

#include <sys/stat.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <optional>
#include <string_view>

#include "orvel/error_state.h"
#include "reply.h"
#include "request.h"
#include "vexo/auto_block.h"
#include "vexo/error.h"
#include "vexo/system_root.h"
#include "vexo/web_record.h"

namespace orvel::cgi {
namespace {

constexpr off_t kRecordsToSweep = off_t{256} * 1024;
constexpr size_t kLongestUser = 63;

// The places where the library looks for them.
std::string linkIdOf(const VEXO::WebCGI& web) {
    const char* header = getenv("HTTP_FOLDER_SHARING");
    return header != nullptr ? header : web.GetParam("FOLDER_SHARING", "");
}

// The page's text is fixed and escapes nothing for HTML: what could end its title or its script becomes "_" there. The
// visitor's script shows the name that the listing gives.
std::string harmless(std::string path) {
    const auto ends = [](char c) {
        return c == '<' || c == '>' || c == '&' || static_cast<unsigned char>(c) < 0x20 || c == 0x7F;
    };
    std::replace_if(path.begin(), path.end(), ends, '_');
    // U+2028 and U+2029 end a line of a script.
    for (const char* separator : {"\xE2\x80\xA8", "\xE2\x80\xA9"}) {
        for (size_t at = path.find(separator); at != std::string::npos; at = path.find(separator)) {
            path.replace(at, 3, 1, '_');
        }
    }
    return path;
}

// A check of any session drops the records that have ended; log-ins alone would only add to them.
void sweepRecords(VEXO::WebCGI& web, const std::string& link) {
    _tag_VexoCgi request;
    struct stat status = {};
    if (VexoCgiInit(&request) != 0 || stat(VEXO::SystemPath(request.szRecordFile).c_str(), &status) != 0) return;
    if (status.st_size <= kRecordsToSweep) return;
    char user[kLongestUser + 1] = {};
    _tag_confirm_policy policy = {.flags = 0, .keepAccessTime = 0};
    IsAuthorizedByPath(&web, "", user, sizeof user, &policy, CGI_POSITION_FILE_MANAGER, link.c_str());
}

}  // namespace

void refuse(Output& out, Availability availability) {
    const bool blocked = availability == Availability::kBlocked, none = availability == Availability::kNone;
    const Status status = blocked ? Status::kForbidden : none ? Status::kNotFound : Status::kBroken;
    replyFailure(out, status, "", blocked ? ORV_ERR_DENIED : none ? ORV_ERR_MISSING : ORV_ERR_GENERAL, "");
}

Visit::Visit(VEXO::WebCGI& web) : web_(web), availability_(find()) {}

Availability Visit::find() {
    const int denied = VexoCgiIsDeniedIP(clientAddress().c_str());
    if (denied == 1) return Availability::kBlocked;
    // A broken list must not close every link: nobody is blocked then, and the server's log says so.
    if (denied < 0) fprintf(stderr, "share: blocked addresses cannot be read [0x%04X]\n", VLIBCErrGet());
    const std::string id = linkIdOf(web_);
    if (id.empty()) return Availability::kNone;
    std::optional<Link> found;
    LinkStore store;
    if (!store.find(id, found)) return Availability::kBroken;
    if (!found || !OrvelLogin::IsLinkOpen(found->available, found->expires, time(nullptr))) return Availability::kNone;
    const Owner owner = ownerOf(*found);
    if (owner != Owner::kThere) return owner == Owner::kGone ? Availability::kNone : Availability::kBroken;
    link_ = *found;
    if (!link_.receives) link_.path = manager_.GetSharingFolderPath(web_);
    return link_.path.empty() ? Availability::kNone : Availability::kOpen;
}

// Whether the visitor shows what only a log-in with the right password gave: the session's own cookie has no more than
// a few thousand possible values.
Session Visit::sealed() {
    const std::string shown = web_.GetCookie(sealName(), "");
    char seal[33];
    if (shown.empty()) return Session::kOut;
    if (VEXOGuessSeal((link_.id + '\n' + link_.passwordHash).c_str(), seal) != 0) return Session::kUnknown;
    if (shown == seal) return Session::kIn;
    dropCookie_ = sealName() + "=; Path=/; Max-Age=0; HttpOnly; SameSite=Lax";
    return Session::kOut;
}

bool Visit::isAuthorized() {
    // The library gives the name cut to its buffer.
    return manager_.isAuthorized(web_, link_.id) && manager_.GetLoginUserName() == link_.owner.substr(0, kLongestUser);
}

Session Visit::session() {
    if (link_.passwordHash.empty()) return Session::kIn;
    const Session seal = sealed();
    if (!dropCookie_.empty() && VEXOGuessWrong(link_.id.c_str(), clientAddress().c_str()) != 0)
        return Session::kUnknown;
    if (seal != Session::kIn) return seal;
    return isAuthorized() ? Session::kIn : Session::kOut;
}

LogIn Visit::logIn(const std::string& password, const std::string& turn) {
    if (link_.passwordHash.empty()) return LogIn::kDone;
    const Session seal = sealed();
    if (seal == Session::kUnknown) return LogIn::kBroken;
    if (seal == Session::kIn && isAuthorized()) return LogIn::kDone;
    const std::string address = clientAddress();
    const int mayJudge =
        VEXOGuessBegin(link_.id.c_str(), address.c_str(), turn.c_str(), seal == Session::kIn ? 1 : 0, &guess_);
    if (mayJudge != 1) return mayJudge == 0 ? LogIn::kWait : LogIn::kBroken;
    const bool right = passwordMatches(password, link_.passwordHash);
    const int counted = VEXOGuessEnd(link_.id.c_str(), address.c_str(), right ? 1 : 0, &guess_);
    if (!right) manager_.folderSharingFailLoginSet();
    if (counted != 1) return counted == 0 ? LogIn::kWait : LogIn::kBroken;
    if (!right) return LogIn::kWrong;
    return recordSession() ? LogIn::kDone : LogIn::kBroken;
}

bool Visit::recordSession() {
    char seal[33];
    sweepRecords(web_, link_.id);
    return VEXOGuessSeal((link_.id + '\n' + link_.passwordHash).c_str(), seal) == 0 &&
           manager_.folderSharingLogin(web_, link_.id, link_.owner) && web_.AddCookieToHeader("/", sealName(), seal);
}

// Of a link that receives no more is said than the name that its owner gave it.
void Visit::writePage() {
    const std::string shown = link_.receives ? link_.path.substr(link_.path.rfind('/')) : link_.path;
    manager_.WriteWebPage(web_, "", harmless(shown));
}

}  // namespace orvel::cgi
