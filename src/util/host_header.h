// The text of a host header, taken apart.
#ifndef ORVEL_UTIL_HOST_HEADER_H
#define ORVEL_UTIL_HOST_HEADER_H

#include <string>

namespace orvel {

struct HostAndPort {
    std::string host, port;
};

// Splits "host", "host:port" or "[v6]:port" (the brackets stay); what follows a "/" does not count. Host and port are
// cut to 4095 characters each. Null gives two empty texts.
HostAndPort splitHostHeader(const char* text);

}  // namespace orvel

#endif
