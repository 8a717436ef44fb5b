// Items whose permissions are read or changed.
#ifndef ORVEL_CGI_OPERATION_PERMISSION_ITEM_H
#define ORVEL_CGI_OPERATION_PERMISSION_ITEM_H

#include "operation/item.h"
#include "operation/permissions.h"

namespace orvel::cgi {

// Opens the item itself, as a place; a link is not followed. False with errno.
[[nodiscard]] bool openForPermissions(const Item& item, Descriptor& opened);
// Reads what is open if the calling identity may know it: its owner does, and who may read it. 0 or a library code.
[[nodiscard]] int readKnown(const Descriptor& opened, Permissions& permissions);

}  // namespace orvel::cgi

#endif
