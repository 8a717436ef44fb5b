// Permissions as people read them.
#include <string>
#include <string_view>

#include "orvel/privilege.h"

namespace {

constexpr std::string_view kLetters = "rwxrwxrwx";
constexpr unsigned kFirstBit = 0400;  // the owner's "r"; each further letter is the next lower bit

}  // namespace

std::string GetPrivilegeStr(unsigned int mode) {
    std::string text(kLetters);  // nine characters need no memory of their own
    for (size_t i = 0; i < text.size(); ++i) {
        if ((mode & (kFirstBit >> i)) == 0) text[i] = '-';
    }
    return text;
}

int GetPrivilege(const char* permString) {
    unsigned mode = 0;
    for (size_t i = 0; permString != nullptr && i < kLetters.size() && permString[i] != '\0'; ++i) {
        if (permString[i] == kLetters[i]) mode |= kFirstBit >> i;
    }
    return GetPrivilege(mode);
}

int GetPrivilege(unsigned int mode) {
    const unsigned digits = ((mode >> 6) & 7) * 100 + ((mode >> 3) & 7) * 10 + (mode & 7);
    return static_cast<int>(digits);
}
