// What a switch of identity left behind.
#ifndef ORVEL_CORE_IDENTITY_STATE_H
#define ORVEL_CORE_IDENTITY_STATE_H

namespace orvel {

// True when the process acts as root for a user who is no administrator: a switch that reported success, since it does
// not check, but changed nothing.
[[nodiscard]] bool stillRoot(const char* user);

}  // namespace orvel

#endif
