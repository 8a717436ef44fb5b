// CGI program "why": what decides about the asking user's own access to a path.
//
// Parameters, from the query or a form:
//   path, path_raw   what is asked about
// "data" of the reply is {"share","rule","privilege","administrator","restrictions","remote","read_only","exists",
// "permissions"}: "rule" one of "home", "no_access", "read_write", "read_only", "no_list" and "service"; "privilege" as
// OrvLibGetPrivilege answers, -1 for a home; "restrictions" of the share and "permissions" of the file as words. Real
// paths are not disclosed.
#include <json/value.h>

#include <string>

#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "orvel/privilege_reason.h"
#include "orvel/share_path.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "vexo/acl.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

const char* ruleWord(PrivilegeRule rule) {
    switch (rule) {
        case PrivilegeRule::kHome:
            return "home";
        case PrivilegeRule::kNoAccess:
            return "no_access";
        case PrivilegeRule::kReadWrite:
            return "read_write";
        case PrivilegeRule::kReadOnly:
            return "read_only";
        case PrivilegeRule::kService:
            return "service";
        case PrivilegeRule::kNoList:
            break;
    }
    return "no_list";
}

struct BitWord {
    unsigned bit;
    const char* word;
};

constexpr BitWord kRestrictions[] = {{ORV_MASK_NO_LISTING, "no_listing"},
                                     {ORV_MASK_NO_MODIFYING, "no_modifying"},
                                     {ORV_MASK_NO_DOWNLOAD, "no_download"}};
constexpr BitWord kPermissions[] = {{VEXO_ACL_READ, "read"},
                                    {VEXO_ACL_WRITE, "write"},
                                    {VEXO_ACL_EXECUTE, "enter"},
                                    {VEXO_ACL_APPEND, "append"},
                                    {VEXO_ACL_DELETE, "delete"}};

template <size_t count>
Json::Value wordsOf(unsigned bits, const BitWord (&table)[count]) {
    Json::Value words(Json::arrayValue);
    for (const BitWord& entry : table) {
        if ((bits & entry.bit) != 0) words.append(entry.word);
    }
    return words;
}

Json::Value dataOf(const PrivilegeReason& reason) {
    Json::Value data;
    putPath(data, "share", reason.shareName);
    data["rule"] = ruleWord(reason.rule);
    data["privilege"] = reason.privilege;
    data["administrator"] = reason.administrator;
    data["restrictions"] = wordsOf(reason.shareMask, kRestrictions);
    data["remote"] = reason.remote;
    data["read_only"] = reason.readOnly;
    data["exists"] = reason.exists;
    data["permissions"] = wordsOf(reason.aclBits, kPermissions);
    return data;
}

}  // namespace

void serveWhyProgram(Request& request, Output& out) {
    const User& user = request.user;
    const VEXO::WebCGI& web = request.web;
    const auto path = pathParam(web);
    if (!path || path->empty()) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, web.GetParam("path", ""));
    }
    int code = actAs(user.sid.c_str(), user.name, IsDirUserHome(*path, nullptr));
    if (code != ORV_ERR_NONE) return replyFailure(out, statusOf(code), user.cookie, code, *path);
    PrivilegeReason reason;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!ExplainPrivilege(path->c_str(), user.name.c_str(), user.sid.c_str(), reason)) {
        return replyFailure(out, Status::kOk, user.cookie, lastCode(), *path);
    }
    reply(out, Status::kOk, user.cookie, ORV_ERR_NONE, *path, dataOf(reason));
}

}  // namespace orvel::cgi
