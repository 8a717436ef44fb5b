// The spelling of a user name says where the account comes from.
#ifndef VEXO_LINUX_ACCOUNT_NAME_H
#define VEXO_LINUX_ACCOUNT_NAME_H

#include <string>

#include "vexo/user.h"

namespace vexo {

struct AccountName {
    AUTH_TYPE type;
    std::string domain;  // in front of the backslash; "" for other than domain users
    std::string name;    // the rest
};

inline AccountName splitAccountName(const std::string& name) {
    const size_t backslash = name.find('\\');
    if (backslash != std::string::npos) return {AUTH_DOMAIN, name.substr(0, backslash), name.substr(backslash + 1)};
    return {name.find('@') != std::string::npos ? AUTH_DIRECTORY : AUTH_LOCAL, {}, name};
}

// False for what can be no account here: names become components of paths (the home folder), and "@DOMAIN" is the
// folder of a domain.
inline bool isAccountName(const std::string& name) {
    const AccountName parts = splitAccountName(name);
    const auto isComponent = [](const std::string& part) {
        return !part.empty() && part != "." && part != ".." && part.find('/') == std::string::npos;
    };
    return isComponent(parts.name) && (parts.type == AUTH_DOMAIN ? isComponent(parts.domain) : !name.starts_with('@'));
}

}  // namespace vexo

#endif
