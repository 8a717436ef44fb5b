#include "share/visit.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <optional>
#include <string_view>

#include "vexo/auto_block.h"
#include "vexo/error.h"

namespace orvel::cgi {
namespace {

// The places where the library looks for them.
std::string linkIdOf(const VEXO::WebCGI& web) {
    const char* header = getenv("HTTP_FOLDER_SHARING");
    return header != nullptr ? header : web.GetParam("FOLDER_SHARING", "");
}

std::string clientAddress() {
    for (const char* name : {"HTTP_X_FORWARDED_FOR", "HTTP_CLIENT_IP", "REMOTE_ADDR"}) {
        const char* value = getenv(name);
        if (value == nullptr) continue;
        const std::string_view address = value;
        return std::string(address.substr(0, address.find(',')));
    }
    return "";
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

}  // namespace

Visit::Visit(VEXO::WebCGI& web) : web_(web), availability_(find()) {}

Availability Visit::find() {
    const int denied = VexoCgiIsDeniedIP(clientAddress().c_str());
    if (denied == 1) return Availability::kBlocked;
    // A broken list must not close every link: nobody is blocked then, and the server's log says so.
    if (denied < 0) fprintf(stderr, "share: blocked addresses cannot be told [0x%04X]\n", VLIBCErrGet());
    const std::string id = linkIdOf(web_);
    if (id.empty()) return Availability::kNone;
    std::optional<Link> found;
    LinkStore store;
    if (!store.find(id, found)) return Availability::kBroken;
    if (!found || !OrvelLogin::IsLinkOpen(found->available, found->expires, time(nullptr)) || !ownerIsThere(*found)) {
        return Availability::kNone;
    }
    link_ = *found;
    link_.path = manager_.GetSharingFolderPath(web_);
    return link_.path.empty() ? Availability::kNone : Availability::kOpen;
}

bool Visit::isLoggedIn() {
    return manager_.isAuthorized(web_, link_.id) && manager_.GetLoginUserName() == link_.owner;
}

bool Visit::logIn(const std::string& password) {
    if (!link_.passwordHash.empty() && !passwordMatches(password, link_.passwordHash)) {
        manager_.folderSharingFailLoginSet();
        return false;
    }
    return manager_.folderSharingLogin(web_, link_.id, link_.owner);
}

void Visit::writePage() {
    manager_.WriteWebPage(web_, "", harmless(link_.path));
}

}  // namespace orvel::cgi
