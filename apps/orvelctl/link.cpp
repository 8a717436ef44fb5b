#include <cstdio>
#include <ctime>

#include "arguments.h"
#include "base/random.h"
#include "command.h"
#include "link_making.h"
#include "orvel/sharing_link.h"
#include "public_link.h"

namespace orvel::ctl {
namespace {

constexpr size_t kProposedBytes = 10;  // 80 bits

// A date as seconds: a number of them, or a day (2024-12-31) as its first second here. 0 for "".
std::int64_t dateOf(const std::string& text) {
    if (text.empty()) return 0;
    tm day = {};
    const char* end = strptime(text.c_str(), "%Y-%m-%d", &day);
    if (end != nullptr && *end == '\0') {
        day.tm_isdst = -1;
        return mktime(&day);
    }
    char* rest = nullptr;
    const long long seconds = strtoll(text.c_str(), &rest, 10);
    if (*rest != '\0' || seconds < 0) throw UsageError(text + " is no day (2024-12-31) and no number of seconds");
    return seconds;
}

std::int64_t countOf(const std::string& text) {
    char* rest = nullptr;
    const long long count = strtoll(text.c_str(), &rest, 10);
    if (text.empty() || *rest != '\0' || count < 0) throw UsageError(text + " is not a number of downloads");
    return count;
}

// How many downloads were begun, or files received, and of how many.
std::string usesText(const cgi::Link& link) {
    if (link.receives) return "<" + std::to_string(link.files) + "/" + std::to_string(link.mostFiles);
    return std::to_string(link.used) + (link.most == 0 ? "" : "/" + std::to_string(link.most));
}

std::string dayText(std::int64_t seconds) {
    const auto time = static_cast<time_t>(seconds);
    tm parts = {};
    char text[32];
    if (seconds == 0) return "-";
    if (localtime_r(&time, &parts) == nullptr || strftime(text, sizeof text, "%Y-%m-%d", &parts) == 0) return "?";
    return text;
}

const char* stateOf(const cgi::Link& link) {
    const cgi::Owner owner = cgi::ownerOf(link);
    if (owner != cgi::Owner::kThere) return owner == cgi::Owner::kGone ? "owner gone" : "owner?";
    if (link.receives && (link.files >= link.mostFiles || link.bytes >= link.mostBytes)) return "full";
    if (link.most > 0 && link.used >= link.most) return "used up";
    if (OrvelLogin::IsLinkOpen(link.available, link.expires, time(nullptr))) return "open";
    return link.available > time(nullptr) ? "not yet" : "expired";
}

int broken(const cgi::LinkStore& store) {
    fprintf(stderr, "orvelctl: the link database: %s\n", store.error().c_str());
    return 1;
}

int create(const std::vector<std::string>& words) {
    const Arguments arguments(words, "link", "create", 1);
    const std::string proposed = arguments.has("--propose") ? orvel::draw<kProposedBytes>() : "";
    if (arguments.has("--propose") && (proposed.empty() || arguments.has("--password"))) {
        throw UsageError("--propose draws a password, and --password gives one");
    }
    cgi::LinkWish wish = {.user = arguments.required("--user"), .sid = "", .path = arguments.position(0), .terms = {}};
    wish.terms.password = arguments.value("--password", proposed);
    wish.terms.available = dateOf(arguments.value("--from", ""));
    wish.terms.expires = dateOf(arguments.value("--until", ""));
    wish.inbox = arguments.value("--receive", "");
    wish.terms.most = countOf(arguments.value("--downloads", "0"));
    cgi::Link link;
    const int code = cgi::makeLink(wish, link);
    if (code != 0) return refused(wish.path, code);
    printf("%s\n%s\n", link.id.c_str(), cgi::linkAddress(link.id).c_str());
    if (!proposed.empty()) printf("%s\n", proposed.c_str());
    return 0;
}

int list(const std::vector<std::string>& words) {
    const Arguments arguments(words, "link", "list", 0);
    std::vector<cgi::Link> links;
    cgi::LinkStore store;
    if (!store.list(arguments.value("--user", ""), links)) return broken(store);
    for (const cgi::Link& link : links) {
        printf("%s  %-10s  %-10s  %-10s  %-10s  %-8s  %-6s  %s\n", link.id.c_str(), terminalText(link.owner).c_str(),
               stateOf(link), dayText(link.available).c_str(), dayText(link.expires).c_str(),
               link.passwordHash.empty() ? "" : "password", usesText(link).c_str(), terminalText(link.path).c_str());
    }
    return 0;
}

int revoke(const std::vector<std::string>& words) {
    const Arguments arguments(words, "link", "revoke", 1);
    bool removed = false;
    cgi::LinkStore store;
    if (!store.remove(arguments.position(0), arguments.value("--user", ""), removed)) return broken(store);
    if (!removed) fprintf(stderr, "orvelctl: no such link\n");
    return removed ? 0 : 1;
}

}  // namespace

int link(const std::vector<std::string>& words) {
    std::vector<std::string> rest = words;
    const std::string form = takeForm("link", rest);
    if (form == "create") return create(rest);
    return form == "list" ? list(rest) : revoke(rest);
}

}  // namespace orvel::ctl
