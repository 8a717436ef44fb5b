// The row of a sharing link.
#ifndef ORVEL_SHARING_LINK_LOOKUP_H
#define ORVEL_SHARING_LINK_LOOKUP_H

#include <string>

namespace orvel {

// The shared path of a link, "" when there is none; whatever is wrong with the link is only logged.
std::string sharedPathOf(const std::string& link);

}  // namespace orvel

#endif
