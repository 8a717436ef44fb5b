// What is known of an account, whichever source it comes from.
#ifndef VEXO_LINUX_ACCOUNT_RECORD_H
#define VEXO_LINUX_ACCOUNT_RECORD_H

#include <sys/types.h>

#include <string>
#include <string_view>

namespace vexo {

enum class Lookup { found, missing, failed };

struct Account {
    std::string name;
    uid_t uid = 0;
    gid_t gid = 0;  // primary group
    std::string home;
};

// What shadow(5) says of an account.
struct Validity {
    long expiry = -1;     // the day on which it ends; -1 never or unknown
    bool locked = false;  // its password is there and locked
};

// Whether the password field is one that was locked: "!" in front of a hash. "!" alone, which a new account has, locks
// nothing: its password may be kept elsewhere.
[[nodiscard]] inline bool isLockedPassword(std::string_view field) {
    const size_t marks = field.find_first_not_of('!');
    return marks != 0 && marks != std::string_view::npos && field[marks] != '*';
}

struct Group {
    std::string name;
    gid_t gid = 0;
};

}  // namespace vexo

#endif
