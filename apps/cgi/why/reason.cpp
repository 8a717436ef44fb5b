#include "why/reason.h"

#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "reply.h"
#include "vexo/acl.h"

namespace orvel::cgi {
namespace {

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

}  // namespace

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

bool explainAccess(const std::string& path, const User& user, Json::Value& data) {
    PrivilegeReason reason;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!ExplainPrivilege(path.c_str(), user.name.c_str(), user.sid.c_str(), reason)) return false;
    putPath(data, "share", reason.shareName);
    data["rule"] = ruleWord(reason.rule);
    data["privilege"] = reason.privilege;
    data["administrator"] = reason.administrator;
    data["restrictions"] = wordsOf(reason.shareMask, kRestrictions);
    data["remote"] = reason.remote;
    data["read_only"] = reason.readOnly;
    data["exists"] = reason.exists;
    data["permissions"] = wordsOf(reason.aclBits, kPermissions);
    return true;
}

}  // namespace orvel::cgi
