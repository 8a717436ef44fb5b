#include "tus/unfinished.h"

#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "reply.h"
#include "tus/record.h"
#include "upload/spool.h"

namespace orvel::cgi {

Json::Value unfinishedReply(const User& user) {
    Json::Value data;
    data["items"] = Json::Value(Json::arrayValue);
    for (const UploadRecord& record : unfinishedUploads(user.name)) {
        const UploadFacts& facts = record.facts();
        PathInfo info;
        Spool spool;
        if (!PathInfoFactory::create(user.name.c_str(), facts.path, info)) continue;
        if (spool.openKept(info.volumePath, record.id(), false) != ORV_ERR_NONE) continue;
        Json::Value item;
        item["id"] = record.id();
        putPath(item, "path", facts.path);
        item["size"] = static_cast<Json::Int64>(facts.size);
        item["offset"] = static_cast<Json::Int64>(record.counted(spool.size()));
        if (facts.modified) item["mtime"] = static_cast<Json::Int64>(*facts.modified);
        item["conflict"] = facts.conflict;
        item["created"] = static_cast<Json::Int64>(facts.created);
        item["expires"] = static_cast<Json::Int64>(record.expires());
        data["items"].append(item);
    }
    return data;
}

}  // namespace orvel::cgi
