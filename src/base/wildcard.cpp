#include "base/wildcard.h"

#include <unicode/uchar.h>
#include <unicode/utf8.h>

namespace orvel {
namespace {

int trailBytes(unsigned char lead) {
    if (lead < 0xC0 || lead > 0xF4) return 0;
    // U8_COUNT_TRAIL_BYTES gives the never valid leads 0xC0 and 0xC1 none; here every lead byte takes at least one.
    return 1 + (lead >= 0xE0 ? 1 : 0) + (lead >= 0xF0 ? 1 : 0);
}

// Decodes the character at `at`, which lies before `end`, and returns the position behind it.
const char* decodeMultibyte(const char* at, const char* end, UChar32& code) {
    const auto lead = static_cast<unsigned char>(*at++);
    const int trail = trailBytes(lead);
    code = trail == 0 ? lead : lead & ((1 << (6 - trail)) - 1);
    for (int i = 0; i < trail; ++i) {
        const unsigned bits = at < end ? static_cast<unsigned char>(*at++) & 0x3FU : 0U;
        code = static_cast<UChar32>((static_cast<unsigned>(code) << 6) | bits);
    }
    return at;
}

const char* decode(const char* at, const char* end, UChar32& code) {
    const auto byte = static_cast<unsigned char>(*at);
    if (byte >= 0x80) return decodeMultibyte(at, end, code);
    code = byte;
    return at + 1;
}

const char* decodeFolded(const char* at, const char* end, UChar32& code) {
    const auto byte = static_cast<unsigned char>(*at);
    if (byte < 0x80) {
        code = byte >= 'A' && byte <= 'Z' ? byte + ('a' - 'A') : byte;
        return at + 1;
    }
    at = decodeMultibyte(at, end, code);
    code = u_foldCase(code, U_FOLD_CASE_DEFAULT);
    return at;
}

// The code is of a folded character.
void appendWellFormed(UChar32 code, std::string& out) {
    constexpr UChar32 replacement = 0xFFFD;
    if (code == 0 || code > UCHAR_MAX_VALUE || U_IS_SURROGATE(code)) code = replacement;
    char encoded[U8_MAX_LENGTH];
    std::size_t length = 0;
    U8_APPEND_UNSAFE(encoded, length, code);
    out.append(encoded, length);
}

// The next position from which the elements behind a run, the first of them `first`, can match; `end` when none.
const char* skipToCandidate(const char* at, const char* end, UChar32 first) {
    if (first < 0) return at;  // no single character that it could begin with
    const UChar32 upper = first >= 'a' && first <= 'z' ? first - ('a' - 'A') : first;
    while (at < end) {
        const auto byte = static_cast<unsigned char>(*at);
        if (byte < 0x80) {
            if (byte == first || byte == upper) break;
            ++at;
            continue;
        }
        UChar32 code = 0;
        const char* next = decodeFolded(at, end, code);
        if (code == first) break;
        at = next;
    }
    return at;
}

}  // namespace

Wildcard::Wildcard(std::string_view pattern, int escape) {
    elements_.reserve(pattern.size() + 1);
    bool escaped = false;
    for (std::size_t at = 0; at < pattern.size();) {
        UChar32 code = 0;
        const char* next = decode(pattern.data() + at, pattern.data() + pattern.size(), code);
        at = static_cast<std::size_t>(next - pattern.data());
        if (escaped) {
            elements_.push_back(u_foldCase(code, U_FOLD_CASE_DEFAULT));
            escaped = false;
        } else if (code == '*') {
            at = compileRun(pattern, at);
        } else if (code == '?') {
            elements_.push_back(kAny);
        } else if (code == escape) {
            escaped = true;
        } else {
            elements_.push_back(u_foldCase(code, U_FOLD_CASE_DEFAULT));
        }
    }
    // A final escape character fits the empty remainder alone, which is never tried behind a run.
    matchesNothing_ = escaped && !elements_.empty() && elements_.back() == kRun;
}

// Compiles the run whose first "*" ends at `at`: each "?" in it takes a character, then the run takes the rest.
std::size_t Wildcard::compileRun(std::string_view pattern, std::size_t at) {
    const bool behindRun = !elements_.empty() && elements_.back() == kRun;
    bool single = false;
    for (; at < pattern.size() && (pattern[at] == '*' || pattern[at] == '?'); ++at) {
        if (pattern[at] == '*') continue;
        elements_.push_back(kAny);
        single = true;
    }
    // An over-long "*" begins a run of its own behind another. As the end of the pattern it still needs one character,
    // since the first run does not try the empty remainder.
    if (behindRun && !single && at == pattern.size()) elements_.push_back(kAny);
    elements_.push_back(kRun);
    return at;
}

std::vector<std::string> Wildcard::literals() const {
    std::vector<std::string> found;
    bool behindLiteral = false;
    for (const UChar32 element : elements_) {
        if (element >= 0) {
            if (!behindLiteral) found.emplace_back();
            appendWellFormed(element, found.back());
        }
        behindLiteral = element >= 0;
    }
    return found;
}

bool Wildcard::match(std::string_view text) const {
    if (matchesNothing_) return false;
    const char* at = text.data();
    const char* const end = at + text.size();
    const UChar32* element = elements_.data();
    const UChar32* const last = element + elements_.size();
    const UChar32* behindRun = nullptr;  // where to go on after a mismatch: the elements behind the latest run...
    const char* candidate = nullptr;     // ...from the character behind this one
    while (element != last || at != end) {
        if (element != last && *element == kRun) {
            if (++element == last) return true;
            behindRun = element;
            candidate = at = skipToCandidate(at, end, *element);
            continue;
        }
        if (element != last) {
            // Every element takes a character: a later candidate leaves even fewer.
            if (at == end) return false;
            UChar32 code = 0;
            const char* next = decodeFolded(at, end, code);
            if (*element == kAny || *element == code) {
                at = next;
                ++element;
                continue;
            }
        }
        if (behindRun == nullptr) return false;
        // An earlier run need not take more: the latest one makes up for whatever that could give.
        UChar32 skipped = 0;
        candidate = decode(candidate, end, skipped);
        candidate = at = skipToCandidate(candidate, end, *behindRun);
        element = behindRun;
    }
    return true;
}

void appendComparable(std::string_view text, std::string& out) {
    const char* at = text.data();
    for (const char* const end = at + text.size(); at < end;) {
        UChar32 code = 0;
        at = decodeFolded(at, end, code);
        appendWellFormed(code, out);
    }
}

}  // namespace orvel
