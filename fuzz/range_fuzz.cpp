// Any Range header, HTTP date, entity tag and file name: what is served lies in the file, what is sent is one header.
#include <algorithm>

#include "check.h"
#include "download/range.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view input = fuzz::text(data, size);
    for (const std::int64_t length : {std::int64_t{0}, std::int64_t{1}, std::int64_t{1000}, INT64_MAX}) {
        orvel::cgi::ByteRange range;
        if (orvel::cgi::judgeRange(input, length, range) != orvel::cgi::RangeAnswer::kPart) continue;
        fuzz::require(range.first >= 0 && range.first <= range.last && range.last < length);
        fuzz::require(range.length() > 0);
    }
    const std::int64_t date = orvel::cgi::parseHttpDate(input);
    fuzz::require(date >= -1);
    if (date >= 0) fuzz::require(orvel::cgi::parseHttpDate(orvel::cgi::httpDate(date)) == date);
    const std::string tag = orvel::cgi::entityTag(7, 8, 9, 10);
    static_cast<void>(orvel::cgi::isCurrent(input, input, tag, 9));
    static_cast<void>(orvel::cgi::rangeCounts(input, tag, 9));
    const std::string header = orvel::cgi::disposition("attachment", input);
    fuzz::require(std::all_of(header.begin(), header.end(), [](char c) { return c >= ' ' && c < 127; }));
    return 0;
}
