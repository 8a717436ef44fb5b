// The two replace functions and their fixed oddities; the header says what callers get.
#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <initializer_list>
#include <limits>
#include <string>
#include <string_view>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/owned.h"
#include "orvel/text.h"

namespace {

constexpr const char* kSource = "orvelmisc";

long long countOccurrences(std::string_view text, std::string_view search) {
    long long count = 0;
    for (auto hit = text.find(search); hit != text.npos; hit = text.find(search, hit + search.size())) ++count;
    return count;
}

long long growth(long long count, std::string_view search, std::string_view replacement) {
    const auto each = static_cast<long long>(replacement.size()) - static_cast<long long>(search.size());
    long long all = 0;
    return __builtin_mul_overflow(count, each, &all) ? std::numeric_limits<long long>::max() / 4 : all;
}

bool anyEmpty(std::initializer_list<const char*> texts) {
    return std::any_of(texts.begin(), texts.end(), [](const char* text) { return text == nullptr || *text == '\0'; });
}

// Nothing to replace: the result is a copy.
int copyOut(const char* source, char** out) {
    char* copy = strdup(source);
    if (copy == nullptr) {
        const int err = errno;
        syslog(LOG_ERR, "%s(%d) failed to strdup input %s, reason=%s", kSource, __LINE__,
               orvel::printable(source).c_str(), strerror(err));
        return -1;
    }
    *out = copy;
    return 0;
}

// A zero-filled buffer for the text and its NUL; null, and logged, when memory runs out.
orvel::CString workingBuffer(long long size) {
    orvel::CString buffer(static_cast<char*>(calloc(static_cast<std::size_t>(size), 1)));
    if (buffer == nullptr) syslog(LOG_ERR, "%s(%d): failed to calloc, errno=%s", kSource, __LINE__, strerror(errno));
    return buffer;
}

// Appends to the text of `length` bytes in `buffer`, cut to `capacity` bytes. `more` does not overlap what is written.
std::size_t append(char* buffer, std::size_t length, std::size_t capacity, std::string_view more) {
    const std::size_t fits = std::min(more.size(), capacity - length);
    memcpy(buffer + length, more.data(), fits);
    return length + fits;
}

// What a formatter without arguments makes of `text`, as far as that is defined: "%%" is "%". Cut to `capacity` bytes.
std::string formatted(std::string_view text, std::size_t capacity) {
    std::string result;
    for (std::size_t i = 0; i < text.size() && result.size() < capacity; ++i) {
        result += text[i];
        if (text.substr(i, 2) == "%%") ++i;
    }
    return result;
}

int replaceOne(const char* source, std::string_view search, std::string_view replacement, char** out) {
    const long long count = countOccurrences(source, search);
    if (count == 0) return copyOut(source, out);
    const auto plain = static_cast<long long>(strlen(source));
    const auto capacity = static_cast<std::size_t>(plain + std::max(0LL, growth(count, search, replacement)));
    orvel::CString buffer = workingBuffer(static_cast<long long>(capacity) + 1);
    if (buffer == nullptr) return -1;
    char* text = buffer.get();
    std::size_t length = append(text, 0, capacity, source);
    // The text is never cut at the occurrence (kept: the search relies on it), so it only grows at its end, and a full
    // buffer no longer changes.
    std::size_t resume = 0;
    while (length < capacity) {
        const std::string_view all(text, length);
        const std::size_t position = all.find(search, resume);
        if (position == all.npos) break;
        const std::string_view rest = all.substr(position + search.size());
        length = append(text, length, capacity, replacement);
        length = append(text, length, capacity, rest);
        resume = std::min(position + replacement.size(), length);
    }
    *out = buffer.release();
    return 1;
}

struct Replacement {
    std::string_view search, text;
};

int replaceTwo(const char* source, const Replacement& first, const Replacement& second, char** out) {
    const long long count1 = countOccurrences(source, first.search);
    const long long count2 = countOccurrences(source, second.search);
    if (count1 == 0 && count2 == 0) return copyOut(source, out);
    const auto plain = static_cast<long long>(strlen(source));
    const long long added = growth(count1, first.search, first.text) + growth(count2, second.search, second.text);
    const auto capacity = static_cast<std::size_t>(plain + std::max(0LL, added));
    orvel::CString buffer = workingBuffer(static_cast<long long>(capacity) + 1);
    if (buffer == nullptr) return -1;
    std::string text = formatted(source, capacity);
    for (std::size_t position = 0; position < text.size();) {
        const std::string_view rest = std::string_view(text).substr(position);
        const bool isFirst = rest.starts_with(first.search);
        if (!isFirst && !rest.starts_with(second.search)) return -1;  // a scan that only moves across occurrences
        const Replacement& hit = isFirst ? first : second;
        std::string next = text.substr(0, position);
        next.append(hit.text).append(rest.substr(hit.search.size()));
        next.resize(std::min(next.size(), capacity));
        text = formatted(next, capacity);
        position += hit.text.size();
    }
    append(buffer.get(), 0, capacity, text);
    *out = buffer.release();
    return 1;
}

}  // namespace

int OrvLibStrReplace(const char* source, const char* search, const char* replacement, char** out) {
    return orvel::guardedQuietly(-1, [&] {
        if (out == nullptr || anyEmpty({source, search, replacement})) return -1;
        return replaceOne(source, search, replacement, out);
    });
}

int OrvLibTwoStrReplace(const char* source, const char* search1, const char* replacement1, const char* search2,
                        const char* replacement2, char** out) {
    return orvel::guardedQuietly(-1, [&] {
        if (out == nullptr || anyEmpty({source, search1, replacement1, search2, replacement2})) return -1;
        return replaceTwo(source, {search1, replacement1}, {search2, replacement2}, out);
    });
}
