// Whose request it is, where trusted proxies stand between. Pure.
#ifndef ORVEL_CGI_CLIENT_ADDRESS_H
#define ORVEL_CGI_CLIENT_ADDRESS_H

#include <string>
#include <string_view>
#include <vector>

namespace orvel::cgi {

// The one spelling of an IPv4 or IPv6 address, an IPv4-mapped one as IPv4; "" for any other text.
std::string canonicalAddress(std::string_view text);

// The client's address of a request that the trusted proxy `peer` handed on. `forwarded` is its header of addresses, to
// which each proxy appends the one that asked it: from the right, the first that is not a trusted proxy. What stands
// left of that is the client's own text. Where that part is not an address, the client is the proxy that wrote it.
std::string clientBehind(std::string_view forwarded, const std::string& peer, const std::vector<std::string>& proxies);

}  // namespace orvel::cgi

#endif
