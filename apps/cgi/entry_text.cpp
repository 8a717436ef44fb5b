#include <json/value.h>

#include "base/json_text.h"
#include "listing.h"
#include "orvel/file_icon.h"
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

// The member "icon" at the end of the object that was appended last.
void appendIcon(const DIRENTRY_INFO& entry, std::string& out) {
    std::string icon;
    GetImgFileExt(entry.name.c_str(), entry.isDirectory, icon, entry.realPath,
                  entry.path.substr(0, entry.path.rfind('/')));
    out.pop_back();
    out += ",\"icon\":";
    appendJsonText(readable(icon), out);
    out += '}';
}

void dump(const DIRENTRY_INFO& entry, int additional, Json::Value& item) {
    DumpFileInfo(additional & ~kAdditionalIcon, readableEntry(entry), item);
    if (isUtf8(entry.name) && isUtf8(entry.path)) return;
    item["name_raw"] = percentEncode(entry.name);
    item["path_raw"] = percentEncode(entry.path);
}

}  // namespace

void appendEntry(const DIRENTRY_INFO& entry, int additional, std::string& out) {
    const size_t before = out.size();
    if (isClean(entry)) {
        AppendFileInfoText(additional & ~kAdditionalIcon, entry, out);
    } else {
        Json::Value item(Json::objectValue);
        dump(entry, additional, item);
        appendJson(item, out);
    }
    if ((additional & kAdditionalIcon) != 0 && out.size() > before) appendIcon(entry, out);
}

void appendShare(const DIRENTRY_INFO& entry, int additional, std::string& out) {
    const int own = additional & (ADDITIONAL_PERM | ADDITIONAL_SYNC_SHARE);
    if (own == 0) return appendEntry(entry, additional & ~kAdditionalIcon, out);
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
