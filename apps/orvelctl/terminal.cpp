#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <string_view>

#include "base/hex.h"
#include "command.h"
#include "orvel/error_state.h"
#include "request.h"
#include "text.h"

namespace orvel::ctl {
namespace {

// Length of the character at the end of `text` when it steers the terminal instead of showing itself: a control, or one
// that turns the direction of the text around it. 0 for any other.
size_t hiddenAtEnd(std::string_view text) {
    const auto last = static_cast<unsigned char>(text.back());
    if (last < 0x20 || last == 0x7F) return 1;
    const std::string_view lead = text.substr(0, text.size() - 1);
    if (last >= 0x80 && last <= 0x9F && lead.ends_with("\xC2")) return 2;       // U+0080 to U+009F
    if (last >= 0xAA && last <= 0xAE && lead.ends_with("\xE2\x80")) return 3;   // U+202A to U+202E
    return last >= 0xA6 && last <= 0xA9 && lead.ends_with("\xE2\x81") ? 3 : 0;  // U+2066 to U+2069
}

}  // namespace

int becomeUser(const std::string& user, bool needsHome) {
    if (geteuid() != 0) {
        fprintf(stderr, "orvelctl: not root: share rights are those of %s, file permissions those of uid %u\n",
                terminalText(user).c_str(), geteuid());
    }
    setenv("REMOTE_USER", user.c_str(), 1);  // whom "%U" in share definitions stands for
    return cgi::actAs(nullptr, user, needsHome);
}

int refused(std::string_view path, int code) {
    fprintf(stderr, "orvelctl: %s: code %d, %s\n", terminalText(path).c_str(), code,
            OrvParseErrorToKTRString(code, nullptr));
    return 1;
}

std::string terminalText(std::string_view bytes) {
    std::string out;
    for (const char c : cgi::readable(bytes)) {
        out += c;
        const size_t length = hiddenAtEnd(out);
        if (length == 0) continue;
        const std::string hidden = out.substr(out.size() - length);
        out.resize(out.size() - length);
        for (const char part : hidden) {
            out += "\\x";
            appendHex(part, out, kUpperHex);
        }
    }
    return out;
}

std::string timeText(int64_t seconds, bool exact) {
    const auto time = static_cast<time_t>(seconds);
    tm parts = {};
    char text[32] = "?";
    if (localtime_r(&time, &parts) == nullptr) return text;
    const size_t length = exact ? strftime(text, sizeof text, "%Y-%m-%d %H:%M:%S", &parts)
                                : strftime(text, sizeof text, "%Y-%m-%d %H:%M", &parts);
    return length == 0 ? "?" : text;
}

}  // namespace orvel::ctl
