// How the outside world reaches the appliance.
#ifndef ORVEL_EXTERNAL_HOST_H
#define ORVEL_EXTERNAL_HOST_H

#include <string>

#include "orvel/export.h"

// Puts the base address for links that are handed out into `address` and returns it: "http://host" or
// "https://host:port", without a trailing slash.
//
// The scheme is that of the request (environment variable HTTPS is "on" in any case). The host is, in this order, the
// external host of the settings, the name at the chosen dynamic-DNS provider, the host of the request (HTTP_HOST, as
// the client sent it). The port is the external one of the settings for this scheme, else that of HTTP_HOST, which may
// be none. Settings of dynamic DNS that cannot be read are logged. Sets no error code; "" when memory runs out.
ORVEL_API std::string& GetRemoteAddr(std::string& address);

#endif
