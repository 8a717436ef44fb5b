// Names of users and groups by their numeric ids, remembered for the time of one listing.
#ifndef ORVEL_USER_DIRECTORY_H
#define ORVEL_USER_DIRECTORY_H

#include <cstdint>
#include <map>
#include <string>

#include "orvel/export.h"

// The two further fields are the caller's; enumerations and the cache create them as 0 and leave them alone after.
struct _tag_USER_INFO_ {
    std::string name;
    uint32_t reserved1 = 0;
    uint32_t reserved2 = 0;
};

struct _tag_GROUP_INFO_ {
    std::string name;
    uint32_t reserved1 = 0;
    uint32_t reserved2 = 0;
};

class ORVEL_API OrvelUserEnum {
 public:
    // The name, or "" for an id that the platform does not know. Known ids are asked for once, unknown ones each time.
    // Sets no library code and logs nothing.
    std::string GetUserNameByUID(unsigned int uid);
    std::string GetGroupNameByGID(unsigned int gid);

    // Asks the platform for one id and stores or replaces its name. False when the platform does not know it. The flag
    // has no effect: the platform's record calls take none.
    bool UpdateUserInfoMap(unsigned int uid, bool flag);
    bool UpdateGroupInfoMap(unsigned int gid, bool flag);

 private:
    std::map<unsigned int, _tag_USER_INFO_> users_;
    std::map<unsigned int, _tag_GROUP_INFO_> groups_;
};

#endif
