#include "link/within.h"

#include <vector>

#include "public_link.h"
#include "reply.h"

namespace orvel::cgi {

bool linksWithin(const std::string& user, const std::string& folder, Json::Value& data) {
    std::vector<Link> links;
    LinkStore store;
    if (!store.list(user, links)) return false;
    data["items"] = Json::Value(Json::arrayValue);
    data["total"] = static_cast<Json::UInt64>(links.size());
    for (const Link& link : links) {
        if (link.path.substr(0, link.path.rfind('/')) != folder) continue;
        Json::Value item;
        putPath(item, "path", link.path);
        data["items"].append(item);
    }
    return true;
}

}  // namespace orvel::cgi
