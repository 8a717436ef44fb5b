// A new session of a visitor.
#ifndef ORVEL_SHARING_LOGIN_ADD_H
#define ORVEL_SHARING_LOGIN_ADD_H

#include <string>

namespace orvel {

// Draws a session identifier for `user` at the client's address and adds its record to the file; also sets the
// environment variable USERNAME. `neverExpires` other than 0 makes a record that never goes stale; `link` may be null,
// which counts as "". Takes a second at least: the pause after each look-up slows down whoever tries identifiers.
//
// True with the identifier in `session`. False, logged: no client address; a user, address or link identifier that
// would break the record's line; no identifier, no access to the file, no section within 30 seconds.
bool addLoginRecord(const char* user, std::string& session, int neverExpires, const char* link);

}  // namespace orvel

#endif
