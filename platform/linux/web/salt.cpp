// Characters for the salts of passwords.
#include <string_view>

#include "vexo/user.h"

char VEXOUserRandomNumMap2Seed(long number) {
    constexpr std::string_view alphabet = ".0123456789ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz";
    return alphabet[static_cast<unsigned long>(number) % alphabet.size()];
}
