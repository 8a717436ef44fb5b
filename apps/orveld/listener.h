// The socket that requests come through.
#ifndef ORVEL_ORVELD_LISTENER_H
#define ORVEL_ORVELD_LISTENER_H

#include <string>

namespace orvel::orveld {

// The socket that the service manager (or the keeper) holds and hands over, LISTEN_FDS; -1 when there is none. Call
// before anything else opens a descriptor.
int inheritedListener();

// A socket of our own at `path`; -1, the reason being in `error`, when something else is there or somebody listens. A
// socket that nobody listens on any more is replaced.
int ownListener(const std::string& path, std::string& error);

// A connection to the socket at `path`; -1 with errno.
int connectTo(const std::string& path);

}  // namespace orvel::orveld

#endif
