// Group ids as the platform lists them: decimal text.
#ifndef ORVEL_ENUM_GROUP_IDS_H
#define ORVEL_ENUM_GROUP_IDS_H

#include <list>

#include "vexo/list.h"

namespace orvel {

// Appends the number of each string. False (logged) at the first that is missing or no number as a whole; what was
// appended before stays.
bool appendGroupIds(PVLIBCSZLIST list, std::list<unsigned int>& gids);

}  // namespace orvel

#endif
