#include <json/value.h>

#include "listing.h"
#include "orvel/file_info.h"
#include "text.h"

namespace orvel::cgi {
namespace {

bool isClean(const DIRENTRY_INFO& entry) {
    return isUtf8(entry.path) && isUtf8(entry.name) && isUtf8(entry.realPath) && isUtf8(entry.type) &&
           isUtf8(entry.owner) && isUtf8(entry.group);
}

DIRENTRY_INFO readableEntry(const DIRENTRY_INFO& entry) {
    DIRENTRY_INFO shown = entry;
    for (std::string* text : {&shown.name, &shown.path, &shown.realPath, &shown.type, &shown.owner, &shown.group}) {
        *text = readable(*text);
    }
    return shown;
}

void dump(const DIRENTRY_INFO& entry, int additional, Json::Value& item) {
    DumpFileInfo(additional, readableEntry(entry), item);
    if (isUtf8(entry.name) && isUtf8(entry.path)) return;
    item["name_raw"] = percentEncode(entry.name);
    item["path_raw"] = percentEncode(entry.path);
}

}  // namespace

void appendEntry(const DIRENTRY_INFO& entry, int additional, std::string& out) {
    if (isClean(entry)) {
        AppendFileInfoText(additional, entry, out);
        return;
    }
    Json::Value item(Json::objectValue);
    dump(entry, additional, item);
    appendJson(item, out);
}

void appendShare(const DIRENTRY_INFO& entry, int additional, std::string& out) {
    Json::Value item(Json::objectValue);
    // DumpFileInfo keeps what "perm" holds already.
    if ((additional & ADDITIONAL_PERM) != 0) {
        Json::Value& perm = item["additional"]["perm"];
        perm["share_right"] = entry.shareAccessRight;
        perm["ftp_privilege"] = entry.ftpPrivilege;
        perm["acl_enabled"] = entry.aclEnabled;
    }
    if ((additional & ADDITIONAL_SYNC_SHARE) != 0) item["additional"]["sync_share"] = entry.syncedShare;
    dump(entry, additional, item);
    appendJson(item, out);
}

}  // namespace orvel::cgi
