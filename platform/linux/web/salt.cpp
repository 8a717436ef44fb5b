// Characters for the salts of passwords.
#include <sys/random.h>

#include <cerrno>
#include <string_view>

#include "vexo/user.h"
#include "web/keyed_hash.h"

namespace {

// Zeros without random bytes, which a running kernel always has.
vexo::HashKey drawKey() {
    vexo::HashKey key{};
    while (getrandom(key.data(), sizeof key, 0) < 0 && errno == EINTR) {
    }
    return key;
}

}  // namespace

char VEXOUserRandomNumMap2Seed(long number) {
    constexpr std::string_view alphabet = ".0123456789ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz";
    static const vexo::HashKey key = drawKey();
    const std::string_view bytes(reinterpret_cast<const char*>(&number), sizeof number);
    return alphabet[vexo::keyedHash(key, bytes)[0] % alphabet.size()];
}
