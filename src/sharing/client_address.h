// The client's address as given by the web server.
#ifndef ORVEL_SHARING_CLIENT_ADDRESS_H
#define ORVEL_SHARING_CLIENT_ADDRESS_H

#include <cstddef>

namespace orvel {

// Writes the client's address into `buffer`, cut to size - 1 bytes, and returns 0; -1, the buffer untouched, when there
// is none. In this order: HTTP_X_FORWARDED_FOR up to its first comma, HTTP_CLIENT_IP, REMOTE_ADDR. Nothing checks that
// the text is an address: the programs drop the first two before, unless a trusted proxy sent them.
int GetClientIP(char* buffer, std::size_t size);

}  // namespace orvel

#endif
