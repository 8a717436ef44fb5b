// Random bytes of the kernel, for names and identifiers that nobody guesses.
#ifndef ORVEL_BASE_RANDOM_H
#define ORVEL_BASE_RANDOM_H

#include <sys/random.h>

#include <cerrno>
#include <string>

#include "base/hex.h"

namespace orvel {

// `bytes` (1 to 256) random bytes as twice as many lower-case hexadecimal digits. "" with errno when the kernel gives
// none: the caller fails then, rather than use a name that can be guessed.
template <size_t bytes>
[[nodiscard]] std::string draw() {
    static_assert(bytes > 0 && bytes <= 256, "the kernel gives more only in pieces");
    char drawn[bytes];
    ssize_t got = 0;
    do {
        got = getrandom(drawn, bytes, 0);
    } while (got < 0 && errno == EINTR);
    std::string digits;
    if (got != static_cast<ssize_t>(bytes)) return digits;
    for (const char byte : drawn) appendHex(byte, digits);
    return digits;
}

}  // namespace orvel

#endif
