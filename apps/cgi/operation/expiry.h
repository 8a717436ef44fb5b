// Recycle bins that are kept to an age and a size.
#ifndef ORVEL_CGI_OPERATION_EXPIRY_H
#define ORVEL_CGI_OPERATION_EXPIRY_H

#include <functional>
#include <string>

namespace orvel::cgi {

struct Expiry {
    long removed = 0;   // items
    std::string error;  // "" when it went well
};

// Removes for good what lies in a bin for longer than the setting recycle_days_SHARE says, and then the oldest until it
// holds no more than recycle_mib_SHARE; without these recycle_days and recycle_mib count, and without any nothing goes.
// The bins are those of the shares, and of homes those in which a deletion was recorded. No link is followed, and no
// other file system entered. Records of what is gone go, too. As root, until `isOver`.
Expiry expireBins(const std::function<bool()>& isOver);

}  // namespace orvel::cgi

#endif
