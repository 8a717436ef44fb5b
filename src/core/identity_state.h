// What a switch of identity left behind.
#ifndef ORVEL_CORE_IDENTITY_STATE_H
#define ORVEL_CORE_IDENTITY_STATE_H

namespace orvel {

// False when a switch that reported success, since it does not check, left the process something of root's although the
// user is no administrator.
[[nodiscard]] bool actsAs(const char* user);

}  // namespace orvel

#endif
