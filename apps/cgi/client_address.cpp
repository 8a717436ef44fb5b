#include "client_address.h"

#include <arpa/inet.h>
#include <netinet/in.h>

#include <algorithm>
#include <cstring>

namespace orvel::cgi {

std::string canonicalAddress(std::string_view text) {
    std::string address(text);
    char out[INET6_ADDRSTRLEN];
    in_addr four{};
    in6_addr six{};
    if (inet_pton(AF_INET, address.c_str(), &four) == 1) return address;  // taken in one spelling alone
    if (inet_pton(AF_INET6, address.c_str(), &six) != 1) return "";
    if (!IN6_IS_ADDR_V4MAPPED(&six)) return inet_ntop(AF_INET6, &six, out, sizeof out);
    std::memcpy(&four, six.s6_addr + 12, sizeof four);
    return inet_ntop(AF_INET, &four, out, sizeof out);
}

std::string clientBehind(std::string_view forwarded, const std::string& peer, const std::vector<std::string>& proxies) {
    std::string client = peer;
    while (!forwarded.empty()) {
        const size_t comma = forwarded.rfind(',');
        std::string_view part = forwarded.substr(comma == std::string_view::npos ? 0 : comma + 1);
        forwarded = forwarded.substr(0, comma == std::string_view::npos ? 0 : comma);
        part.remove_prefix(std::min(part.find_first_not_of(" \t"), part.size()));
        part = part.substr(0, part.find_last_not_of(" \t") + 1);
        const std::string address = canonicalAddress(part);
        if (address.empty()) break;
        client = address;
        if (std::find(proxies.begin(), proxies.end(), address) == proxies.end()) break;
    }
    return client;
}

}  // namespace orvel::cgi
