#include "sharing/client_address.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace orvel {

int GetClientIP(char* buffer, std::size_t size) {
    std::size_t length = 0;
    const char* text = getenv("HTTP_X_FORWARDED_FOR");
    if (text != nullptr) {
        length = std::strcspn(text, ",");
    } else {
        text = getenv("HTTP_CLIENT_IP");
        if (text == nullptr) text = getenv("REMOTE_ADDR");
        if (text == nullptr) return -1;
        length = std::strlen(text);
    }
    if (length >= size) length = size - 1;
    std::memcpy(buffer, text, length);
    buffer[length] = '\0';
    return 0;
}

}  // namespace orvel
