// What the programs ask of a public link beside its row: its password, its owner, its address.
#ifndef ORVEL_CGI_PUBLIC_LINK_H
#define ORVEL_CGI_PUBLIC_LINK_H

#include <string>

#include "vexo/link_store.h"

namespace orvel::cgi {

using VEXO::Link;
using VEXO::LinkStore;
using VEXO::LinkTaking;

inline constexpr size_t kLongestPassword = 511;

// What is stored of a password; "" when it is too long, and when memory is out.
std::string hashPassword(const std::string& password);
bool passwordMatches(const std::string& password, const std::string& hash);

enum class Owner {
    kThere,
    kGone,    // no account of that name and id, one that has ended, or one that may no longer use the file manager
    kUnknown  // could not be determined
};
Owner ownerOf(const Link& link);

// Whether as many downloads were begun as may be.
inline bool isUsedUp(const Link& link) {
    return link.most > 0 && link.used >= link.most;
}

// Where a visitor opens the link: the appliance's outside address and the program, or without an address the program.
std::string linkAddress(const std::string& id);

}  // namespace orvel::cgi

#endif
