#include "vexo/text.h"

#include <unicode/uchar.h>
#include <unicode/utf8.h>

#include <cstddef>

namespace {

// A byte outside every well-formed sequence compares as this plus itself: above all code points.
constexpr UChar32 kBrokenByte = 0x110000;
// For texts that a NUL ends: no sequence reaches over a NUL, so the length is never asked for.
constexpr size_t kNulTerminated = static_cast<size_t>(-1);
// In a key, what stands before a broken byte; no UTF-8 sequence begins so high.
constexpr char kBrokenMark = '\xFF';

constexpr bool isAscii(char c) {
    return static_cast<unsigned char>(c) < 0x80;
}

constexpr char foldAscii(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c;
}

// The folded code point at `at`, or the value of a broken byte; moves `at` behind it.
UChar32 takeFolded(const char* text, size_t& at, size_t length) {
    const size_t start = at;
    UChar32 c = 0;
    U8_NEXT(text, at, length, c);
    if (c >= 0) return u_foldCase(c, U_FOLD_CASE_DEFAULT);
    at = start + 1;
    return kBrokenByte + static_cast<unsigned char>(text[start]);
}

// Bytes of UTF-8 order as their code points do, so the key of a folded code point is its own encoding.
void appendKey(UChar32 c, std::string& out) {
    if (c >= kBrokenByte) {
        out += kBrokenMark;
        out += static_cast<char>(c - kBrokenByte);
        return;
    }
    char encoded[U8_MAX_LENGTH];
    size_t length = 0;
    U8_APPEND_UNSAFE(encoded, length, c);
    out.append(encoded, length);
}

}  // namespace

int VLIBCUnicodeUTF8StrCaseCmp(const char* a, const char* b) {
    size_t i = 0;
    size_t j = 0;
    while (a[i] != '\0' && b[j] != '\0') {
        if (isAscii(a[i]) && isAscii(b[j])) {
            const int difference = foldAscii(a[i++]) - foldAscii(b[j++]);
            if (difference != 0) return difference;
            continue;
        }
        const UChar32 difference = takeFolded(a, i, kNulTerminated) - takeFolded(b, j, kNulTerminated);
        if (difference != 0) return difference;
    }
    return static_cast<int>(a[i] != '\0') - static_cast<int>(b[j] != '\0');
}

namespace VEXO {

void AppendFoldKey(std::string_view name, std::string& out) {
    size_t at = 0;
    while (at < name.size()) {
        if (isAscii(name[at])) {
            out += foldAscii(name[at++]);
        } else {
            appendKey(takeFolded(name.data(), at, name.size()), out);
        }
    }
}

}  // namespace VEXO
