#include <unistd.h>

#include <cstdio>

#include "command.h"
#include "orvel/error_state.h"
#include "request.h"
#include "text.h"

namespace orvel::ctl {

int becomeUser(const std::string& user, bool needsHome) {
    if (geteuid() != 0) {
        fprintf(stderr, "orvelctl: not root: share rights are those of %s, file permissions those of uid %u\n",
                terminalText(user).c_str(), geteuid());
    }
    return cgi::actAs(nullptr, user, needsHome);
}

int refused(std::string_view path, int code) {
    fprintf(stderr, "orvelctl: %s: code %d, %s\n", terminalText(path).c_str(), code,
            OrvParseErrorToKTRString(code, nullptr));
    return 1;
}

std::string terminalText(std::string_view bytes) {
    static constexpr char digits[] = "0123456789ABCDEF";
    std::string out;
    for (const char c : cgi::readable(bytes)) {
        const auto byte = static_cast<unsigned char>(c);
        // U+0080 to U+009F are controls too; their first byte is what no other character has before such a trail.
        const bool control = byte < 0x20 || byte == 0x7F || (byte < 0xA0 && !out.empty() && out.back() == '\xC2');
        if (control) {
            out += {'\\', 'x', digits[byte >> 4], digits[byte & 15]};
        } else {
            out += c;
        }
    }
    return out;
}

}  // namespace orvel::ctl
