// The sessions that are alive, one file each in /run/vexo/sessions. A central store: it belongs to root (or, where
// nothing runs as root, to the one user that everything runs as), whoever the process acts for at the moment.
#ifndef VEXO_LINUX_SESSION_STORE_H
#define VEXO_LINUX_SESSION_STORE_H

#include <ctime>
#include <string>

namespace vexo {

// True when a session whose last noted use is `lastUse` is alive at `now`, for `timeout` seconds of idleness. Uses are
// noted once a minute only, so that minute is granted on top: a session never ends early.
bool isSessionAlive(time_t lastUse, time_t now, long long timeout);

// A new session. Its identifier, or "" with the slot filled: 0x0300 a store that may not be trusted, 0x0D00 a user or
// address that no record holds, else as errno says.
std::string createSession(const std::string& user, const std::string& address);

// True when `sid` is alive and belongs to `user`; counts as a use. The slot stays as it is.
bool useSession(const std::string& sid, const std::string& user);

// Removes every session that has ended, and counts them; -1 with errno. createSession does so now and then.
long sweepSessions();

}  // namespace vexo

#endif
