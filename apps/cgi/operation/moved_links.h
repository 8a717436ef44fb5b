// Symbolic links that get another place.
#ifndef ORVEL_CGI_OPERATION_MOVED_LINKS_H
#define ORVEL_CGI_OPERATION_MOVED_LINKS_H

#include "operation/item.h"

namespace orvel::cgi {

// Whether the item, in the open folder that `info` resolved to, would hold no link that leads out of the share there
// and stayed within it where it is: a link that climbs far is harmless deep in a share alone. Links that lead out
// already make no difference.
bool linksStayInside(const Item& item, const PathInfo& info, const Descriptor& folder);

}  // namespace orvel::cgi

#endif
