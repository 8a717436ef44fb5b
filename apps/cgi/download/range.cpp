#include "download/range.h"

#include <strings.h>

#include <algorithm>
#include <charconv>
#include <cstdio>
#include <ctime>

#include "text.h"

namespace orvel::cgi {
namespace {

// Digits alone; -1 for anything else. A number that does not fit lies behind the end of any file, as the largest does.
std::int64_t number(std::string_view text) {
    if (text.empty() || text.find_first_not_of("0123456789") != std::string_view::npos) return -1;
    std::int64_t value = 0;
    const auto result = std::from_chars(text.data(), text.data() + text.size(), value);
    return result.ec == std::errc() ? value : INT64_MAX;
}

std::string_view trimmed(std::string_view text) {
    const size_t first = text.find_first_not_of(" \t");
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(" \t") - first + 1);
}

// A tag marked as weak says that the bytes may differ.
enum class Weak { kCounts, kDiffers };

bool anyTagIs(std::string_view list, std::string_view tag, Weak weak) {
    while (!list.empty()) {
        const size_t end = std::min(list.find(','), list.size());
        std::string_view one = trimmed(list.substr(0, end));
        if (weak == Weak::kCounts && one.starts_with("W/")) one.remove_prefix(2);
        if (one == tag || one == "*") return true;
        list.remove_prefix(std::min(end + 1, list.size()));
    }
    return false;
}

}  // namespace

RangeAnswer judgeRange(std::string_view header, std::int64_t size, ByteRange& range) {
    constexpr std::string_view unit = "bytes=";
    if (header.size() < unit.size() || strncasecmp(header.data(), unit.data(), unit.size()) != 0 ||
        header.find(',') != std::string_view::npos)
        return RangeAnswer::kWhole;
    const std::string_view text = trimmed(header.substr(unit.size()));
    const size_t dash = text.find('-');
    if (dash == std::string_view::npos) return RangeAnswer::kWhole;
    const std::string_view from = text.substr(0, dash), to = text.substr(dash + 1);
    const std::int64_t first = number(from), last = number(to);
    if (from.empty()) {  // the last so many bytes
        if (last < 0) return RangeAnswer::kWhole;
        if (last == 0 || size == 0) return RangeAnswer::kUnsatisfiable;
        range = {size - std::min(last, size), size - 1};
        return RangeAnswer::kPart;
    }
    if (first < 0 || (!to.empty() && last < first)) return RangeAnswer::kWhole;
    if (first >= size) return RangeAnswer::kUnsatisfiable;
    range = {first, to.empty() ? size - 1 : std::min(last, size - 1)};
    return RangeAnswer::kPart;
}

std::string entityTag(std::uint64_t inode, std::int64_t size, std::int64_t seconds, std::int64_t nanoseconds) {
    char text[80];
    std::snprintf(text, sizeof text, "\"%llx-%llx-%llx.%llx\"", static_cast<unsigned long long>(inode),
                  static_cast<unsigned long long>(size), static_cast<unsigned long long>(seconds),
                  static_cast<unsigned long long>(nanoseconds));
    return text;
}

bool isCurrent(std::string_view ifNoneMatch, std::string_view ifModifiedSince, std::string_view tag,
               std::int64_t modified) {
    if (!ifNoneMatch.empty()) return anyTagIs(ifNoneMatch, tag, Weak::kCounts);
    const std::int64_t since = parseHttpDate(ifModifiedSince);
    return since >= 0 && modified <= since;
}

bool namesTag(std::string_view ifMatch, std::string_view tag) {
    return anyTagIs(ifMatch, tag, Weak::kDiffers);
}

bool rangeCounts(std::string_view ifRange, std::string_view tag, std::int64_t modified) {
    const std::string_view condition = trimmed(ifRange);
    const std::int64_t date = parseHttpDate(condition);
    return condition.empty() || condition == tag || (date >= 0 && date == modified);
}

std::string httpDate(std::int64_t seconds) {
    const time_t when = seconds;
    struct tm parts {};
    char text[64];
    if (gmtime_r(&when, &parts) == nullptr || strftime(text, sizeof text, "%a, %d %b %Y %H:%M:%S GMT", &parts) == 0) {
        return "";
    }
    return text;
}

std::int64_t parseHttpDate(std::string_view text) {
    const std::string copy(trimmed(text));
    // The second and third are what old clients send.
    for (const char* format : {"%a, %d %b %Y %H:%M:%S GMT", "%a, %d-%b-%y %H:%M:%S GMT", "%a %b %d %H:%M:%S %Y"}) {
        struct tm parts {};
        const char* end = strptime(copy.c_str(), format, &parts);
        if (end != nullptr && *end == '\0') return std::max<std::int64_t>(timegm(&parts), -1);
    }
    return -1;
}

std::string disposition(const char* how, std::string_view name) {
    const std::string exact = readable(name);
    std::string plain;
    for (const char c : exact) {
        const auto byte = static_cast<unsigned char>(c);
        plain += byte < 0x20 || byte >= 0x7F || c == '"' || c == '\\' || c == '/' || c == '%' ? '_' : c;
    }
    return std::string(how) + "; filename=\"" + plain + "\"; filename*=UTF-8''" + percentEncode(exact);
}

}  // namespace orvel::cgi
