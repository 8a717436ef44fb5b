// What is known of an account, whichever source it comes from.
#ifndef VEXO_LINUX_ACCOUNT_RECORD_H
#define VEXO_LINUX_ACCOUNT_RECORD_H

#include <sys/types.h>

#include <string>

namespace vexo {

enum class Lookup { found, missing, failed };

struct Account {
    std::string name;
    uid_t uid = 0;
    gid_t gid = 0;  // primary group
    std::string home;
};

struct Group {
    std::string name;
    gid_t gid = 0;
};

}  // namespace vexo

#endif
