// CGI program "share": what a visitor without an account sees of a public link.
//
// Parameters, from the query or a form:
//   FOLDER_SHARING   the link; the header Folder-Sharing comes before it
//   action           none: the page, which asks for the rest
//                    "state": {"logged_in", "password"}, the latter whether the link takes one; "downloads_left" where
//                    they are limited; "receives": {"name", "files_left", "bytes_left"} of a link by which visitors send
//                    files (see the program "send"), which nothing else of this shows
//                    "login" (posted): with `password`; sets the cookies of the link. 429 when it is not the visitor's
//                    turn, with {"wait", "turn"}: `turn` goes with the next attempt, after `wait` milliseconds
//                    "list": what the shared folder holds, or the shared file alone
//                    "download": a file with ranges, a folder or several paths as a zip
//   path, path_raw   below the shared folder (list, download)
//   look             "1": the page shows it, which does not count as a download where these are not limited
//   sort_by, sort_direction, offset, limit, additional   as for the program "list"; of the additional properties only
//                    size, time and type
// A link that is not open for whatever reason, and any path outside it, is missing. What needs a log-in answers 401
// without one; a link without a password needs none, and nothing is recorded of its visitors.
#include <json/value.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "confined.h"
#include "download/range.h"
#include "download/sending.h"
#include "listing.h"
#include "orvel/error_state.h"
#include "orvel/share_path.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "share/place.h"
#include "share/visit.h"
#include "text.h"
#include "vexo/language.h"

namespace orvel::cgi {
namespace {

// Each is looked at before the zip begins.
constexpr size_t kMostPaths = 500;
constexpr int kLinkUsedUp = 1808;
constexpr int kShown = ADDITIONAL_SIZE | ADDITIONAL_TIME | ADDITIONAL_TYPE | kAdditionalIcon;

// In front of what the library writes: nothing that the page names may come from elsewhere, nobody learns its address.
constexpr const char* kPageHeaders =
    "Cache-Control: no-store\r\n"
    "X-Content-Type-Options: nosniff\r\n"
    "Referrer-Policy: no-referrer\r\n"
    "Content-Security-Policy: default-src 'none'; script-src 'self' 'unsafe-inline'; style-src 'self'; img-src 'self'; "
    "media-src 'self'; connect-src 'self'; form-action 'self'; base-uri 'none'; frame-ancestors 'none'\r\n";

// The prefix goes into the page as it is.
bool isTunnel(const std::string& prefix) {
    const auto fits = [](char c) {
        return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '/' || c == '-' ||
               c == '_' || c == '.';
    };
    return prefix.empty() ||
           (prefix.starts_with('/') && !prefix.starts_with("//") && std::all_of(prefix.begin(), prefix.end(), fits));
}

struct Sentence {
    const char* text;
    const char* hint;
};

struct Notice {
    const char* status;
    Sentence english;
    Sentence german;
};

constexpr Notice kBadAddress = {
    "400 Bad Request", {"This address is not complete.", ""}, {"Diese Adresse ist nicht vollständig.", ""}};
constexpr Notice kBlockedNow = {"403 Forbidden",
                                {"Too many failed attempts.", "Try again later."},
                                {"Zu viele Fehlversuche.", "Versuchen Sie es später noch einmal."}};
constexpr Notice kNotThere = {
    "404 Not Found",
    {"This link is not available.", "It was withdrawn, or its time is over. Ask whoever sent it for a new one."},
    {"Dieser Link ist nicht verfügbar.",
     "Er wurde zurückgezogen oder ist abgelaufen. Bitten Sie die Person, die ihn geschickt hat, um einen neuen."}};
constexpr Notice kUsedUpNow = {
    "410 Gone",
    {"This link has been used up.", "It was made for so many downloads. Ask whoever sent it for a new one."},
    {"Dieser Link ist aufgebraucht.",
     "Er war für eine bestimmte Zahl von Downloads. Bitten Sie die Person, die ihn geschickt hat, um einen neuen."}};
constexpr Notice kBrokenNow = {"500 Internal Server Error",
                               {"This link cannot be opened now.", "Try again later."},
                               {"Dieser Link lässt sich jetzt nicht öffnen.", "Versuchen Sie es später noch einmal."}};

// A page of one sentence, in the style of the others and without a script. `tunnel` is one that fits.
void writeNotice(Output& out, const Notice& notice, const std::string& tunnel) {
    const std::string language = VexoCgiSelectDefLang();
    const Sentence& said = language == "de" ? notice.german : notice.english;
    out.text() += std::string("Status: ") + notice.status + "\r\nContent-Type: text/html; charset=UTF-8\r\n" +
                  kPageHeaders + "\r\n<!DOCTYPE html>\n<html lang='" + language + "'>\n<meta charset='utf-8'>\n" +
                  "<meta name='viewport' content='width=device-width, initial-scale=1'>\n<title>" + said.text +
                  "</title>\n<link rel='icon' href='" + tunnel + "/favicon.svg'>\n<link rel='stylesheet' href='" +
                  tunnel + "/visitor/style.css'>\n<div class='brand' role='banner'><img src='" + tunnel +
                  "/favicon.svg' alt='' width='26' height='26'>Orvel</div>\n<main><div class='notice'><h1>" +
                  said.text + "</h1><p>" + said.hint + "</p></div></main>\n</html>\n";
}

void servePage(Output& out, Visit& visit) {
    const std::string tunnel = visit.web().GetParam("tunnel", "");
    if (!isTunnel(tunnel)) return writeNotice(out, kBadAddress, "");
    switch (visit.availability()) {
        case Availability::kBlocked:
            return writeNotice(out, kBlockedNow, tunnel);
        case Availability::kNone:
            return writeNotice(out, kNotThere, tunnel);
        case Availability::kBroken:
            return writeNotice(out, kBrokenNow, tunnel);
        case Availability::kOpen:
            break;
    }
    if (isUsedUp(visit.link())) return writeNotice(out, kUsedUpNow, tunnel);
    printf("Status: 200 OK\r\n%s", kPageHeaders);
    visit.writePage();
}

void replyWait(Output& out, const VEXOGUESS& waiting) {
    Json::Value data;
    data["wait"] = waiting.wait;
    data["turn"] = waiting.turn;
    out.text() += "Retry-After: " + std::to_string((waiting.wait + 999) / 1000) + "\r\n";
    reply(out, Status::kTooMany, "", ORV_ERR_BUSY, "", data);
}

// The cookies of the log-in go out with the request's own header, so the reply takes that way.
void serveLogin(Output& out, Visit& visit) {
    if (!isPosted()) return replyFailure(out, Status::kBadRequest, "", ORV_ERR_PARAMETER, "");
    switch (visit.logIn(visit.web().GetParam("password", ""), visit.web().GetParam("turn", ""))) {
        case LogIn::kWait:
            return replyWait(out, visit.waiting());
        case LogIn::kWrong:
            return replyFailure(out, Status::kForbidden, visit.dropCookie(), ORV_ERR_DENIED, "");
        case LogIn::kBroken:
            return replyFailure(out, Status::kBroken, "", ORV_ERR_GENERAL, "");
        case LogIn::kDone:
            break;
    }
    printf("Status: 200 OK\r\nCache-Control: no-store\r\nX-Content-Type-Options: nosniff\r\n");
    visit.web().WriteHeader("application/json; charset=UTF-8");
    printf("{\"success\":true}");
    fflush(stdout);
}

// False, with the reply written, when it could not be determined.
bool findSession(Output& out, Visit& visit, Session& session) {
    session = visit.session();
    if (session == Session::kUnknown) replyFailure(out, Status::kBroken, "", ORV_ERR_GENERAL, "");
    return session != Session::kUnknown;
}

void serveState(Output& out, Visit& visit) {
    Session session = Session::kUnknown;
    if (!findSession(out, visit, session)) return;
    Json::Value state;
    state["logged_in"] = session == Session::kIn;
    state["password"] = !visit.link().passwordHash.empty();
    const Link& link = visit.link();
    if (link.most > 0) state["downloads_left"] = Json::Int64(std::max<std::int64_t>(link.most - link.used, 0));
    if (link.receives) {
        Json::Value& receives = state["receives"];
        putPath(receives, "name", link.path.substr(link.path.rfind('/') + 1));
        receives["files_left"] = Json::Int64(std::max<std::int64_t>(link.mostFiles - link.files, 0));
        receives["bytes_left"] = Json::Int64(std::max<std::int64_t>(link.mostBytes - link.bytes, 0));
    }
    reply(out, Status::kOk, visit.dropCookie(), ORV_ERR_NONE, "", state);
}

// The shared file as the only item of a list.
int listFile(const Place& place, Listing& listing) {
    struct stat status = {};
    if (fstat(place.found.get(), &status) != 0) return refusalCode(errno, place.realPath);
    if (!S_ISREG(status.st_mode)) return ORV_ERR_DENIED;
    DIRENTRY_INFO entry;
    entry.name = place.name;
    entry.size = status.st_size;
    entry.mtime = static_cast<uint32_t>(status.st_mtime);
    entry.ctime = static_cast<uint32_t>(status.st_ctime);
    entry.atime = static_cast<uint32_t>(status.st_atime);
    entry.crtime = entry.mtime;
    entry.isDirectory = false;
    listing.entries.push_back(entry);
    listing.total = 1;
    return ORV_ERR_NONE;
}

void serveList(Output& out, Visit& visit, const std::string& wanted) {
    const VEXO::WebCGI& web = visit.web();
    const auto offset = numberParam(web, "offset", 0), limit = numberParam(web, "limit", 0);
    const auto ascending = ascendingParam(web);
    if (!offset || !limit || !ascending) return replyFailure(out, Status::kBadRequest, "", ORV_ERR_PARAMETER, wanted);
    Place place;
    Listing listing;
    int code = findPlace(visit.link().owner, visit.link().path, wanted, place);
    const ListRequest request = {.user = visit.link().owner,
                                 .sid = "",
                                 .path = place.path,
                                 .sortBy = web.GetParam("sort_by", ""),
                                 .ascending = *ascending,
                                 .offset = *offset,
                                 .limit = *limit,
                                 .additional = additionalBits(web.GetParam("additional", "")) & kShown,
                                 .pattern = "",
                                 .type = DIR_ENTRY_TYPE_ALL};
    if (code == ORV_ERR_NONE) {
        code = place.isFile ? listFile(place, listing)
                            : listOpened(request, place.found, place.path, place.realPath, listing);
    }
    if (code != ORV_ERR_NONE) return replyFailure(out, Status::kOk, "", code, wanted);
    // A visitor's paths begin at the shared folder.
    for (DIRENTRY_INFO& entry : listing.entries) entry.path = place.isFile ? "" : place.within + "/" + entry.name;

    Json::Value about;
    about["file"] = place.isFile;
    putPath(about, "name", place.name);
    putPath(about, "path", place.within);
    beginReply(out, Status::kOk, "");
    out.text() += "{\"success\":true,\"place\":";
    appendJson(about, out.text());
    out.text() += ",\"data\":";
    writeListing(request, listing, appendEntry, out);
    out.text() += '}';
}

std::string variable(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
}

// Counts a download before its first byte goes out. What the page shows of a file is no download, unless the link has a
// limit: whoever saw a file has it. False with the reply written.
bool countDownload(Output& out, Visit& visit, const std::vector<Source>& sources) {
    const bool limited = visit.link().most > 0;
    if (variable("REQUEST_METHOD") == "HEAD" || (!limited && visit.web().GetParam("look", "") == "1")) return true;
    const bool oneFile = sources.size() == 1 && S_ISREG(sources[0].status.st_mode);
    const bool partly = oneFile && !variable("HTTP_RANGE").empty();
    const struct stat& status = sources[0].status;
    const std::string tag = entityTag(status.st_ino, status.st_size, status.st_mtim.tv_sec, status.st_mtim.tv_nsec);
    const bool current = oneFile && isCurrent(variable("HTTP_IF_NONE_MATCH"), variable("HTTP_IF_MODIFIED_SINCE"), tag,
                                              status.st_mtim.tv_sec);
    if (current && variable("REQUEST_METHOD") != "POST") return true;  // nothing but "304 Not Modified" goes out
    LinkTaking taking = LinkTaking::kTaken;
    LinkStore store;
    if (!store.take(visit.link().id, clientAddress(), oneFile ? tag : "zip", partly, taking)) {
        fprintf(stderr, "share: a download cannot be counted: %s\n", store.error().c_str());
        if (limited) replyFailure(out, Status::kBroken, "", ORV_ERR_GENERAL, "");
        return !limited;
    }
    if (taking == LinkTaking::kUsedUp) replyOwnFailure(out, Status::kGone, "", kLinkUsedUp, "link_used_up", "", {});
    if (taking == LinkTaking::kGone) replyFailure(out, Status::kNotFound, "", ORV_ERR_MISSING, "");
    return taking == LinkTaking::kTaken;
}

// Each place once, however often it is named: a visitor could have the same folder packed again and again.
void serveDownload(Output& out, Visit& visit, std::vector<std::string> wanted) {
    if (wanted.empty()) wanted.emplace_back();
    const OpenSource open = [&visit](Source& source) {
        Place place;
        const int code = findPlace(visit.link().owner, visit.link().path, source.asked, place);
        if (code != ORV_ERR_NONE) return code;
        source.path = place.path;
        source.name = place.name;
        return openFound(place.found, place.realPath, source);
    };
    std::vector<Source> sources;
    std::string culprit;
    const int code = findSources(wanted, open, sources, culprit);
    if (code != ORV_ERR_NONE) return replyFailure(out, httpStatusOf(code), "", code, culprit);
    if (!countDownload(out, visit, sources)) return;
    const User owner = {.name = visit.link().owner, .sid = "", .cookie = ""};
    if (sources.size() == 1 && S_ISREG(sources[0].status.st_mode)) return serveFile(out, owner, sources[0], false);
    serveZip(out, owner, sources, sources.size() == 1 ? sources[0].name : "download", open);
}

// What only a visitor who is logged in sees; from here on the process is the link's owner.
void serveInside(Output& out, Visit& visit, const std::string& action) {
    Session session = Session::kUnknown;
    if (!findSession(out, visit, session)) return;
    if (session == Session::kOut)
        return replyFailure(out, Status::kNotLoggedIn, visit.dropCookie(), ORV_ERR_DENIED, "");
    const auto paths = pathParams(visit.web());
    if (!paths || paths->size() > (action == "list" ? 1 : kMostPaths)) {
        return replyFailure(out, Status::kBadRequest, "", ORV_ERR_PARAMETER, "");
    }
    const int code = actAs(nullptr, visit.link().owner, IsDirUserHome(visit.link().path, nullptr));
    if (code != ORV_ERR_NONE) return replyFailure(out, httpStatusOf(code), "", code, "");
    if (action == "list") return serveList(out, visit, paths->empty() ? "" : paths->front());
    serveDownload(out, visit, *paths);
}

}  // namespace

void serveShareProgram(Request& request, Output& out) {
    Visit visit(request.web);
    const std::string action = visit.web().GetParam("action", "");
    if (action.empty()) return servePage(out, visit);
    if (action != "state" && action != "login" && action != "list" && action != "download") {
        return replyFailure(out, Status::kBadRequest, "", ORV_ERR_PARAMETER, "");
    }
    if (visit.availability() != Availability::kOpen) {
        return refuse(out, visit.availability());
    }
    if (action == "state") return serveState(out, visit);
    if (action == "login") return serveLogin(out, visit);
    if (visit.link().receives) return refuse(out, Availability::kNone);  // there is nothing to see
    serveInside(out, visit, action);
}

}  // namespace orvel::cgi
