// The wildcard comparison in its plain recursive form, exponential but easy to judge: the oracle of the matcher's tests
// and of its fuzzer.
#ifndef ORVEL_TESTS_BASE_WILDCARD_MODEL_H
#define ORVEL_TESTS_BASE_WILDCARD_MODEL_H

#include <unicode/uchar.h>

namespace wildcard_model {

inline int decode(const char* text, UChar32& code) {
    const auto lead = static_cast<unsigned char>(*text);
    int trail = 0;
    if (lead >= 0xC0 && lead <= 0xDF) trail = 1;
    if (lead >= 0xE0 && lead <= 0xEF) trail = 2;
    if (lead >= 0xF0 && lead <= 0xF4) trail = 3;
    code = trail == 0 ? lead : lead % (1 << (6 - trail));
    int length = 1;
    for (int i = 0; i < trail; ++i) {
        const auto byte = static_cast<unsigned char>(text[length]);
        code = code * 64 + byte % 64;
        if (byte != 0) ++length;
    }
    return length;
}

inline bool compare(const char* pattern, const char* text, int escape);

// What stands behind a "*".
inline bool compareRun(const char* pattern, const char* text, int escape) {
    UChar32 ignored = 0;
    for (; *pattern == '*' || *pattern == '?'; ++pattern) {
        if (*pattern == '*') continue;
        if (*text == 0) return false;
        text += decode(text, ignored);
    }
    if (*pattern == 0) return true;
    for (; *text != 0; text += decode(text, ignored)) {
        if (compare(pattern, text, escape)) return true;
    }
    return false;
}

inline bool compare(const char* pattern, const char* text, int escape) {
    bool escaped = false;
    while (*pattern != 0) {
        UChar32 wanted = 0;
        UChar32 found = 0;
        pattern += decode(pattern, wanted);
        if (!escaped && wanted == '*') return compareRun(pattern, text, escape);
        if (!escaped && wanted == '?') {
            if (*text == 0) return false;
            text += decode(text, found);
        } else if (!escaped && wanted == escape) {
            escaped = true;
        } else {
            if (*text == 0) return false;
            text += decode(text, found);
            if (u_foldCase(wanted, U_FOLD_CASE_DEFAULT) != u_foldCase(found, U_FOLD_CASE_DEFAULT)) return false;
            escaped = false;
        }
    }
    return *text == 0;
}

}  // namespace wildcard_model

#endif
