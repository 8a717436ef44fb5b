// Putting something into the recycle bin of its share.
#ifndef ORVEL_CGI_OPERATION_RECYCLE_ITEM_H
#define ORVEL_CGI_OPERATION_RECYCLE_ITEM_H

#include "operation/recycle.h"

namespace orvel::cgi {

// True when all of it is there; it is recorded then who did it, and when. What goes wrong is reported to the progress.
bool recycleItem(const RecycleBin& bin, const Item& item, const User& user, Progress& progress);

// Records that the user has put what lies at `place` in the bin there.
void noteInBin(const RecycleBin& bin, const Entry& place, const User& user);

}  // namespace orvel::cgi

#endif
