// What a user chose in the page, kept for all browsers: names with values of JSON, in a file of the user's own,
// /var/lib/vexo/preferences/<uid>/values.json below the system root.
#ifndef ORVEL_CGI_PREFERENCES_STORE_H
#define ORVEL_CGI_PREFERENCES_STORE_H

#include <json/value.h>

#include <cstddef>
#include <string>

namespace orvel::cgi {

inline constexpr size_t kMostPreferences = size_t{64} << 10;  // bytes of the file

// The text as an object whose names are 1 to 64 of a-z, 0-9, "_" and "."; false for anything else.
[[nodiscard]] bool parsePreferences(const std::string& text, Json::Value& values);

// Both are called as root, where the process is root's, and answer 0 or a library code. A file that is not ours to
// understand (damaged, or a later version's) is a failure and stays as it is; one of somebody else who had the same uid
// counts as none.
[[nodiscard]] int readPreferences(const std::string& user, Json::Value& values);
// Takes over each member of `changes`, which null removes; what others changed meanwhile stays. `values` is all of them
// then. ORV_ERR_FILE_TOO_BIG when that is more than kMostPreferences, and nothing is changed.
[[nodiscard]] int changePreferences(const std::string& user, const Json::Value& changes, Json::Value& values);

}  // namespace orvel::cgi

#endif
