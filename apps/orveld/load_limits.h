// What the settings say about orveld (docs/orveld.md).
#ifndef ORVEL_ORVELD_LOAD_LIMITS_H
#define ORVEL_ORVELD_LOAD_LIMITS_H

#include <sys/types.h>

#include <chrono>
#include <cstddef>
#include <string>
#include <vector>

namespace orvel::orveld {

struct Limits {
    size_t children = 64;           // at once
    size_t perAddress = 16;         // of them for one client: never more than a quarter, but one
    size_t queued = 256;            // requests that wait for a child
    std::chrono::seconds idle{60};  // how long a body or a reader may stand still
    std::vector<uid_t> speakers;    // whose processes may speak on the socket, besides root's and our own
    std::vector<uid_t> trusted;     // whose processes are believed who is logged in (REMOTE_USER)
};

// The settings as they are now. A value that is not one counts as absent and is reported to standard error, and so is a
// user whom nobody knows.
Limits readLimits();

// Where the socket is, without one given at the start.
std::string defaultSocket();

bool isIn(const std::vector<uid_t>& list, uid_t uid);

}  // namespace orvel::orveld

#endif
