// CGI program "link": the public links of the logged-in user.
//
// Parameters, from the query or a form:
//   action           "create", "list", "received", "change" or "revoke"; what changes something must be posted
//   path, path_raw   what to publish (create); list: only the links of exactly that
//   folder, folder_raw  list: only the links of what lies directly in it
//   password         that a visitor must give; none without it, "" takes it away (create, change)
//   available        from when on, seconds since 1970 (create, change)
//   expires          the first or the last second of the last day; 0: for ever (create, change)
//   note             for the owner alone (create, change)
//   downloads        how many may be begun; 0: any number (create, change)
//   inbox, inbox_raw visitors send files into a new folder of this name below the path, and see nothing (create)
//   most_files, most_bytes  that may be received (create with inbox, change)
//   offset, limit    of what was received (received)
//   id               of the link (received, change, revoke); an administrator may revoke anybody's
// What "change" does not name stays as it is. "data" of the reply is the link, or {"items": [...], "total"} of them,
// the latter of all that the user has: id, address, path, has_password, available, expires, created, owner, note,
// downloads, used, last_use, and received: {"files", "bytes", "most_files", "most_bytes"} of one with an inbox. Of
// "received" it is {"items": [...]} of name, size, address, time.
#include <json/value.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "link_making.h"
#include "orvel/error_state.h"
#include "program/program.h"
#include "public_link.h"
#include "reply.h"
#include "request.h"
#include "text.h"
#include "vexo/user.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

constexpr unsigned long kUsualSent = 200, kMostSent = 1000, kMostOffset = 1'000'000;

Json::Value shown(const Link& link) {
    Json::Value item;
    item["id"] = link.id;
    item["address"] = linkAddress(link.id);
    putPath(item, "path", link.path);
    item["owner"] = link.owner;
    item["has_password"] = !link.passwordHash.empty();
    item["available"] = Json::Int64(link.available);
    item["expires"] = Json::Int64(link.expires);
    item["created"] = Json::Int64(link.created);
    item["note"] = readable(link.note);
    item["downloads"] = Json::Int64(link.most);
    item["used"] = Json::Int64(link.used);
    item["last_use"] = Json::Int64(link.lastUse);
    if (link.receives) {
        Json::Value& received = item["received"];
        received["files"] = Json::Int64(link.files);
        received["bytes"] = Json::Int64(link.bytes);
        received["most_files"] = Json::Int64(link.mostFiles);
        received["most_bytes"] = Json::Int64(link.mostBytes);
    }
    return item;
}

// False for a number that is not one.
bool readNumber(const VEXO::WebCGI& web, const char* name, std::optional<std::int64_t>& number) {
    if (!web.HasParam(name)) return true;
    const auto given = numberParam(web, name, 0);
    if (given) number = static_cast<std::int64_t>(*given);
    return given.has_value();
}

bool readTerms(const VEXO::WebCGI& web, LinkTerms& terms) {
    if (web.HasParam("password")) terms.password = web.GetParam("password", "");
    if (web.HasParam("note")) terms.note = web.GetParam("note", "");
    return readNumber(web, "available", terms.available) && readNumber(web, "expires", terms.expires) &&
           readNumber(web, "downloads", terms.most) && readNumber(web, "most_files", terms.mostFiles) &&
           readNumber(web, "most_bytes", terms.mostBytes);
}

int create(const VEXO::WebCGI& web, const User& user, Json::Value& data, std::string& path) {
    const auto given = pathParam(web);
    const auto inbox = bytesParam(web, "inbox");
    LinkTerms terms;
    if (!isPosted() || !given || !inbox || !readTerms(web, terms)) return ORV_ERR_PARAMETER;
    path = *given;
    Link link;
    const int code =
        makeLink({.user = user.name, .sid = user.sid, .path = path, .terms = terms, .inbox = *inbox}, link);
    if (code == ORV_ERR_NONE) data = shown(link);
    return code;
}

int change(const VEXO::WebCGI& web, const User& user, Json::Value& data) {
    LinkTerms terms;
    if (!isPosted() || !readTerms(web, terms)) return ORV_ERR_PARAMETER;
    Link link;
    const int code = changeLink(user.name, web.GetParam("id", ""), terms, link);
    if (code == ORV_ERR_NONE) data = shown(link);
    return code;
}

bool isGiven(const VEXO::WebCGI& web, const std::string& name) {
    return web.HasParam(name) || web.HasParam(name + "_raw");
}

int list(const VEXO::WebCGI& web, const User& user, Json::Value& data) {
    const auto path = bytesParam(web, "path"), folder = bytesParam(web, "folder");
    if (!path || !folder) return ORV_ERR_PARAMETER;
    const bool onePath = isGiven(web, "path"), oneFolder = isGiven(web, "folder");
    std::vector<Link> links;
    LinkStore store;
    if (!store.list(user.name, links)) return ORV_ERR_GENERAL;
    data["items"] = Json::Value(Json::arrayValue);
    data["total"] = static_cast<Json::UInt64>(links.size());
    for (const Link& link : links) {
        if (onePath && link.path != *path) continue;
        if (oneFolder && link.path.substr(0, link.path.rfind('/')) != *folder) continue;
        data["items"].append(shown(link));
    }
    return ORV_ERR_NONE;
}

// What visitors sent, the last first.
int listReceived(const VEXO::WebCGI& web, const User& user, Json::Value& data) {
    const auto offset = numberParam(web, "offset", 0), limit = numberParam(web, "limit", kUsualSent);
    if (!offset || !limit || *limit > kMostSent || *offset > kMostOffset) return ORV_ERR_PARAMETER;
    std::vector<VEXO::SentFile> files;
    LinkStore store;
    if (!store.listSent(web.GetParam("id", ""), user.name, static_cast<std::int64_t>(*offset),
                        static_cast<std::int64_t>(*limit), files)) {
        return ORV_ERR_GENERAL;
    }
    data["items"] = Json::Value(Json::arrayValue);
    for (const VEXO::SentFile& file : files) {
        Json::Value item;
        putPath(item, "name", file.name);
        item["address"] = readable(file.address);
        item["size"] = Json::Int64(file.size);
        item["time"] = Json::Int64(file.time);
        data["items"].append(item);
    }
    return ORV_ERR_NONE;
}

int revoke(const VEXO::WebCGI& web, const User& user) {
    if (!isPosted()) return ORV_ERR_PARAMETER;
    const bool anybodys = VEXOGroupIsAdminGroupMem(user.name.c_str()) == 1;
    bool removed = false;
    LinkStore store;
    if (!store.remove(web.GetParam("id", ""), anybodys ? "" : user.name, removed)) return ORV_ERR_GENERAL;
    return removed ? ORV_ERR_NONE : ORV_ERR_MISSING;
}

}  // namespace

void serveLinkProgram(Request& request, Output& out) {
    const User& user = request.user;
    const VEXO::WebCGI& web = request.web;
    const std::string action = web.GetParam("action", "");
    Json::Value data;
    std::string path;
    int code = ORV_ERR_PARAMETER;
    if (action == "create") code = create(web, user, data, path);
    if (action == "change") code = change(web, user, data);
    if (action == "list") code = list(web, user, data);
    if (action == "received") code = listReceived(web, user, data);
    if (action == "revoke") code = revoke(web, user);
    reply(out, statusOf(code), user.cookie, code, path, data);
}

}  // namespace orvel::cgi
