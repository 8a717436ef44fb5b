// CGI program "link": the public links of the logged-in user.
//
// Parameters, from the query or a form:
//   action           "create", "list" or "revoke"; what changes something must be posted
//   path, path_raw   what to publish (create)
//   password         that a visitor must give (create); none without it
//   available        from when on, seconds since 1970 (create)
//   expires          the first or the last second of the last day (create); 0 or none: for ever
//   id               of the link (revoke); an administrator may revoke anybody's
// "data" of the reply is the link, or {"items": [...]} of them: id, address, path, has_password, available, expires,
// created, owner.
#include <json/value.h>

#include <optional>
#include <string>
#include <vector>

#include "link_making.h"
#include "orvel/error_state.h"
#include "program/program.h"
#include "public_link.h"
#include "reply.h"
#include "request.h"
#include "vexo/user.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

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
    return item;
}

int create(const VEXO::WebCGI& web, const User& user, Json::Value& data, std::string& path) {
    const auto given = pathParam(web);
    const auto available = numberParam(web, "available", 0);
    const auto expires = numberParam(web, "expires", 0);
    if (!isPosted() || !given || !available || !expires) return ORV_ERR_PARAMETER;
    path = *given;
    Link link;
    const int code = makeLink({.user = user.name,
                               .sid = user.sid,
                               .path = path,
                               .password = web.GetParam("password", ""),
                               .available = static_cast<std::int64_t>(*available),
                               .expires = static_cast<std::int64_t>(*expires)},
                              link);
    if (code == ORV_ERR_NONE) data = shown(link);
    return code;
}

int list(const User& user, Json::Value& data) {
    std::vector<Link> links;
    LinkStore store;
    if (!store.list(user.name, links)) return ORV_ERR_GENERAL;
    data["items"] = Json::Value(Json::arrayValue);
    for (const Link& link : links) data["items"].append(shown(link));
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
    if (action == "list") code = list(user, data);
    if (action == "revoke") code = revoke(web, user);
    reply(out, statusOf(code), user.cookie, code, path, data);
}

}  // namespace orvel::cgi
