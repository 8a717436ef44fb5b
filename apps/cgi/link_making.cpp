#include "link_making.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <limits>

#include "confined.h"
#include "free_names.h"
#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"
#include "orvel/sharing_settings.h"
#include "reply.h"
#include "request.h"
#include "target.h"
#include "text.h"
#include "vexo/user.h"

namespace orvel::cgi {
namespace {

constexpr std::int64_t kDay = 86400;
constexpr size_t kLongestNote = 400;
constexpr std::int64_t kMostDownloads = 1'000'000;
constexpr std::int64_t kMostFiles = 10'000, kUsualFiles = 100;
constexpr std::int64_t kMostBytes = std::int64_t{1} << 50, kUsualBytes = std::int64_t{1} << 30;
constexpr int kMostNames = 1000;  // that are tried beside one that is taken

// May the user, as whom the process acts, download the path? It must be there. Published is where it leads now: links
// and ".." in it could lead elsewhere later, to what the user never meant to show.
int judgePath(const LinkWish& wish, std::string& path) {
    PathInfo info;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(wish.user.c_str(), wish.path, info)) return lastCode();
    OrvLibSetErr(ORV_ERR_NONE);
    const char* sid = wish.sid.empty() ? nullptr : wish.sid.c_str();
    if (!CheckShareDownloadPrivilege(wish.user.c_str(), sid, info.path.c_str())) return lastCode(ORV_ERR_DENIED);
    Descriptor found;
    const int code = confinedOpen(info, linkPolicyOf(info.shareName), O_RDONLY | O_NONBLOCK | O_NOCTTY, found);
    if (code != ORV_ERR_NONE) return code;
    struct stat status = {};
    if (fstat(found.get(), &status) != 0) return refusalCode(errno, info.realPath);
    if (!S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) return ORV_ERR_DENIED;
    const auto within = pathInShare(info, found);
    if (!within) return ORV_ERR_MISSING;
    path = "/" + info.shareName + *within;
    return ORV_ERR_NONE;
}

// The folder of a link that receives, and how to take it back.
struct Inbox {
    Target target;
    std::string name;
    ~Inbox() {
        if (!name.empty()) unlinkat(target.folder.get(), name.c_str(), AT_REMOVEDIR);
    }
};

// Makes the folder beneath the one that was named, as the user.
int makeInbox(const LinkWish& wish, Inbox& inbox, Link& link) {
    if (wish.inbox.find('/') != std::string::npos || wish.inbox == "." || wish.inbox == "..") return ORV_ERR_PARAMETER;
    PathInfo info;
    OrvLibSetErr(ORV_ERR_NONE);
    const std::string wanted = wish.path + (wish.path.ends_with('/') ? "" : "/") + wish.inbox;
    if (!PathInfoFactory::create(wish.user.c_str(), wanted, info)) return lastCode();
    OrvLibSetErr(ORV_ERR_NONE);
    _tag__type_ rules = OVERWRITE_MODE_SKIP;
    if (!CheckShareUploadPrivilege(wish.user.c_str(), wish.sid.c_str(), info.path.c_str(), rules))
        return lastCode(ORV_ERR_DENIED);
    int code = openTarget(info, linkPolicyOf(info.shareName), wish.user, Missing::kRefuse, inbox.target);
    Descriptor made;
    std::string name = inbox.target.name;
    if (code == ORV_ERR_NONE) code = makeFolder(inbox.target.folder, name, wish.user, made);
    for (int number = 2; code == ORV_ERR_EXISTS && number <= kMostNames; ++number) {
        name = numberedName(inbox.target.name, number, true);
        code = makeFolder(inbox.target.folder, name, wish.user, made);
    }
    if (code != ORV_ERR_NONE) return code;
    inbox.name = name;
    const auto within = pathInShare(info, made);
    link.folder = folderIdentity(made.get());
    if (!within || link.folder.empty()) return ORV_ERR_GENERAL;
    link.path = "/" + info.shareName + *within;
    return ORV_ERR_NONE;
}

// From 1970 on, with a day's room above.
bool isDate(std::int64_t seconds) {
    return seconds >= 0 && seconds <= std::numeric_limits<std::int64_t>::max() - kDay;
}

bool isNote(const std::string& note) {
    const auto isControl = [](char c) { return static_cast<unsigned char>(c) < 0x20 || c == 0x7F; };
    return note.size() <= kLongestNote && isUtf8(note) && std::none_of(note.begin(), note.end(), isControl);
}

// Without an end the begin would not count.
bool isWindow(std::int64_t available, std::int64_t expires) {
    return isDate(available) && isDate(expires) && (available == 0 || (expires != 0 && expires + kDay > available));
}

// The terms as they are stored: of a password its hash, which takes its time.
int readyTerms(LinkTerms& terms) {
    if (terms.password && terms.password->size() > kLongestPassword) return ORV_ERR_PARAMETER;
    if (terms.note && !isNote(*terms.note)) return ORV_ERR_PARAMETER;
    if (terms.most && (*terms.most < 0 || *terms.most > kMostDownloads)) return ORV_ERR_PARAMETER;
    if (terms.mostFiles && (*terms.mostFiles < 1 || *terms.mostFiles > kMostFiles)) return ORV_ERR_PARAMETER;
    if (terms.mostBytes && (*terms.mostBytes < 1 || *terms.mostBytes > kMostBytes)) return ORV_ERR_PARAMETER;
    if (!terms.password || terms.password->empty()) return ORV_ERR_NONE;
    terms.password = hashPassword(*terms.password);
    return terms.password->empty() ? ORV_ERR_GENERAL : ORV_ERR_NONE;
}

// False when the dates do not go together.
bool applyTerms(const LinkTerms& ready, Link& link) {
    link.passwordHash = ready.password.value_or(link.passwordHash);
    link.available = ready.available.value_or(link.available);
    link.expires = ready.expires.value_or(link.expires);
    link.note = ready.note.value_or(link.note);
    link.most = ready.most.value_or(link.most);
    link.mostFiles = ready.mostFiles.value_or(link.mostFiles);
    link.mostBytes = ready.mostBytes.value_or(link.mostBytes);
    return isWindow(link.available, link.expires);
}

}  // namespace

int makeLink(const LinkWish& wish, Link& link) {
    // Asked while still root: whether an account has ended stands where only root reads.
    if (OrvLibUserPrivForSharing(wish.user.c_str()) != 1) return ORV_ERR_DENIED;
    gid_t gid = 0;
    const bool keepable = wish.user.find_first_of(",\r\n") == std::string::npos;
    if (!keepable || VEXOUserGetUGID(wish.user.c_str(), &link.uid, &gid) != 0) return ORV_ERR_PARAMETER;
    LinkTerms terms = wish.terms;
    link.receives = !wish.inbox.empty();
    if (link.receives) {
        link.mostFiles = kUsualFiles;
        link.mostBytes = kUsualBytes;
    }
    int code = readyTerms(terms);
    if (code == ORV_ERR_NONE && !applyTerms(terms, link)) code = ORV_ERR_PARAMETER;
    if (code == ORV_ERR_NONE)
        code = actAs(wish.sid.empty() ? nullptr : wish.sid.c_str(), wish.user, IsDirUserHome(wish.path, nullptr));
    Inbox inbox;
    if (code == ORV_ERR_NONE) code = link.receives ? makeInbox(wish, inbox, link) : judgePath(wish, link.path);
    if (code != ORV_ERR_NONE) return code;
    link.owner = wish.user;
    LinkStore store;
    if (!store.add(link)) return ORV_ERR_GENERAL;
    inbox.name.clear();  // it stays
    return ORV_ERR_NONE;
}

int changeLink(const std::string& user, const std::string& id, const LinkTerms& terms, Link& link) {
    if (OrvLibUserPrivForSharing(user.c_str()) != 1) return ORV_ERR_DENIED;
    LinkTerms ready = terms;
    int code = readyTerms(ready);
    if (code != ORV_ERR_NONE) return code;
    const auto edit = [&](Link& found) {
        code = applyTerms(ready, found) ? ORV_ERR_NONE : ORV_ERR_PARAMETER;
        return code == ORV_ERR_NONE;
    };
    std::optional<Link> changed;
    LinkStore store;
    if (!store.change(id, user, edit, changed)) return ORV_ERR_GENERAL;
    if (!changed) return ORV_ERR_MISSING;
    link = *changed;
    return code;
}

}  // namespace orvel::cgi
