// The sessions that are alive, one file each in /run/vexo/sessions. A central store: it belongs to root (or, where
// nothing runs as root, to the one user that everything runs as), whoever the process acts for at the moment.
#ifndef VEXO_LINUX_SESSION_STORE_H
#define VEXO_LINUX_SESSION_STORE_H

#include <ctime>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "web/session_record.h"

namespace vexo {

// In seconds: how long a session lives without use, and in any case.
struct SessionLimits {
    long long idle;
    long long whole;
};
SessionLimits sessionLimits();

// True when a session whose last noted use is `lastUse`, begun at `begun`, is alive at `now`. Uses are noted once a
// minute only, so that minute is granted on top: a session never ends early.
bool isSessionAlive(time_t lastUse, time_t begun, time_t now, const SessionLimits& limits);

// A new session of this record, whose time, and name where it is a log-in's, are filled in. Its identifier, or "" with
// the slot filled: 0x0300 a store that may not be trusted, 0x0D00 a user or address that no record holds, else as errno
// says.
std::string createSession(SessionRecord record);

// The record of the session `sid` if that is alive; counts as a use. The slot stays as it is.
std::optional<SessionRecord> useSession(const std::string& sid);
// True when it is alive and belongs to `user`.
bool useSession(const std::string& sid, const std::string& user);

struct KeptSession {
    std::string sid;
    SessionRecord record;
    time_t lastUse = 0;
};
// The sessions of `user` that a log-in made and that are alive, last used first.
std::vector<KeptSession> sessionsOf(const std::string& user);

// Removes a session. True when there was one.
bool endSession(const std::string& sid);

// Removes every session that has ended, and counts them; -1 with errno. createSession does so now and then.
long sweepSessions();

}  // namespace vexo

#endif
