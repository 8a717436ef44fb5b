#include "sharing/login_record.h"

#ifdef __SSE2__
#include <emmintrin.h>
#endif

#include <algorithm>
#include <charconv>
#include <climits>
#include <cstdint>
#include <initializer_list>

namespace orvel {
namespace {

constexpr std::size_t kSeparators = 8;  // of a line as it is written: commas, and its end

// What ends a field: the comma, and for the sixth and the eighth also the end of a line.
enum class Ends { kComma, kCommaOrLineEnd };

template <Ends ends>
bool endsField(char c) {
    return c == ',' || (ends == Ends::kCommaOrLineEnd && (c == '\r' || c == '\n'));
}

// Takes the next field off `rest` as strtok_r does: separators in front of it are skipped, so no field is empty, and
// the one behind it is taken along. False when nothing is left.
template <Ends ends>
bool takeField(std::string_view& rest, std::string_view& field) {
    const char* const stop = rest.data() + rest.size();
    const char* first = rest.data();
    while (first != stop && endsField<ends>(*first)) ++first;
    const char* last = first;
    while (last != stop && !endsField<ends>(*last)) ++last;
    field = {first, static_cast<std::size_t>(last - first)};
    rest = last == stop ? std::string_view() : std::string_view(last + 1, static_cast<std::size_t>(stop - last - 1));
    return !field.empty();
}

bool parseLine(std::string_view line, LoginRecord& record) {
    if (!takeField<Ends::kComma>(line, record.address) || !takeField<Ends::kComma>(line, record.user) ||
        !takeField<Ends::kComma>(line, record.session) || !takeField<Ends::kComma>(line, record.loginTime) ||
        !takeField<Ends::kComma>(line, record.accessTime) || !takeField<Ends::kCommaOrLineEnd>(line, record.position)) {
        return false;
    }
    if (!takeField<Ends::kComma>(line, record.neverExpires)) record.neverExpires = "0";
    if (!takeField<Ends::kCommaOrLineEnd>(line, record.link)) record.link = "0";
    return true;
}

// Are these bytes, a whole line with its end, what would be written for the record?
bool isAsWritten(std::string_view bytes, const LoginRecord& record) {
    const std::size_t fields = record.address.size() + record.user.size() + record.session.size() +
                               record.loginTime.size() + record.accessTime.size() + record.position.size() +
                               record.neverExpires.size() + record.link.size();
    return bytes.size() == fields + kSeparators && bytes.ends_with('\n') && record.position.end()[0] == ',' &&
           record.link.end() == bytes.end() - 1;
}

// Takes the first line off `text`, whatever its form. False when it is no record.
bool takeLine(std::string_view& text, std::size_t longest, LoginRecord& record) {
    const std::size_t end = std::min(text.find('\n'), text.size());
    const std::string_view line = text.substr(0, end);
    const std::string_view bytes = text.substr(0, end + 1);
    text.remove_prefix(bytes.size());
    // A NUL ends what is read of a line.
    if (line.size() > longest || !parseLine(line.substr(0, line.find('\0')), record)) return false;
    record.line = isAsWritten(bytes, record) ? bytes : std::string_view();
    return true;
}

#ifdef __SSE2__
constexpr std::size_t kBlock = 16;

// Whether the bytes at `at`, one bit for each, are what ends a field, a line, or what is read of one.
unsigned separatorsAt(const char* at) {
    const __m128i block = _mm_loadu_si128(reinterpret_cast<const __m128i*>(at));
    const auto are = [&block](char c) { return _mm_cmpeq_epi8(block, _mm_set1_epi8(c)); };
    const __m128i found = _mm_or_si128(_mm_or_si128(are(','), are('\n')), _mm_or_si128(are('\r'), are('\0')));
    return static_cast<unsigned>(_mm_movemask_epi8(found));
}

// Where the separators of the first line stand; false for a line that is not as it is written.
bool findSeparators(std::string_view text, const char* (&ends)[kSeparators]) {
    std::size_t count = 0;
    const char* begin = text.data();  // of the field
    for (std::size_t at = 0; text.size() - at >= kBlock; at += kBlock) {
        for (unsigned found = separatorsAt(text.data() + at); found != 0; found &= found - 1) {
            const char* const end = text.data() + at + __builtin_ctz(found);
            const bool last = count == kSeparators - 1;
            if (*end != (last ? '\n' : ',') || end == begin) return false;
            ends[count++] = end;
            if (last) return true;
            begin = end + 1;
        }
    }
    return false;
}

// Takes the first line off `text` when it is as it is written, as nearly all are; else nothing.
bool takeWrittenLine(std::string_view& text, std::size_t longest, LoginRecord& record) {
    const char* ends[kSeparators];
    if (!findSeparators(text, ends)) return false;
    const std::size_t length = static_cast<std::size_t>(ends[kSeparators - 1] - text.data());
    if (length > longest) return false;
    const auto field = [&](std::size_t number) {
        const char* const begin = number == 0 ? text.data() : ends[number - 1] + 1;
        return std::string_view(begin, static_cast<std::size_t>(ends[number] - begin));
    };
    record = {field(0), field(1), field(2), field(3), field(4), field(5), field(6), field(7), {}};
    record.line = text.substr(0, length + 1);
    text.remove_prefix(length + 1);
    return true;
}
#else
bool takeWrittenLine(std::string_view&, std::size_t, LoginRecord&) {
    return false;
}
#endif

}  // namespace

bool nextLoginRecord(std::string_view& text, std::size_t longest, LoginRecord& record) {
    while (!text.empty()) {
        if (takeWrittenLine(text, longest, record) || takeLine(text, longest, record)) return true;
    }
    return false;
}

bool nextLoginRecordOfAnyForm(std::string_view& text, std::size_t longest, LoginRecord& record) {
    while (!text.empty()) {
        if (takeLine(text, longest, record)) return true;
    }
    return false;
}

void appendLoginRecord(const LoginRecord& record, std::string& out) {
    if (!record.line.empty()) {
        out += record.line;
        return;
    }
    for (const std::string_view field : {record.address, record.user, record.session, record.loginTime,
                                         record.accessTime, record.position, record.neverExpires}) {
        out += field;
        out += ',';
    }
    out += record.link;
    out += '\n';
}

long numberOf(std::string_view field) {
    const bool plain = !field.empty() && field[0] >= '0' && field[0] <= '9';
    if (!plain) field.remove_prefix(std::min(field.find_first_not_of(" \t\n\v\f\r"), field.size()));
    const bool negative = field.starts_with('-');
    if (field.starts_with('+')) {
        field.remove_prefix(1);
        if (field.starts_with('-')) return 0;
    }
    long number = 0;
    const auto [end, error] = std::from_chars(field.data(), field.data() + field.size(), number);
    if (error == std::errc::result_out_of_range) return negative ? LONG_MIN : LONG_MAX;
    return number;
}

bool isFresh(long accessTime, long now, long timeout) {
    if (accessTime < 1) return false;
    return static_cast<std::int32_t>(static_cast<std::uint32_t>(now) - static_cast<std::uint32_t>(accessTime)) <=
           timeout;
}

}  // namespace orvel
