#include "download/range.h"

#include "support/testing.h"

namespace {

using namespace orvel::cgi;

TEST(Range, OneRangeOfBytesIsServed) {
    constexpr auto kWhole = RangeAnswer::kWhole, kPart = RangeAnswer::kPart, kNone = RangeAnswer::kUnsatisfiable;
    for (const auto& [header, size, answer, first, last] :
         Rows<const char*, std::int64_t, RangeAnswer, std::int64_t, std::int64_t>{
             {"", 10, kWhole, 0, 0},
             {"bytes=0-0", 10, kPart, 0, 0},
             {"Bytes=2-5", 10, kPart, 2, 5},
             {"bytes= 9-9 ", 10, kPart, 9, 9},
             {"bytes=9-10", 10, kPart, 9, 9},
             {"bytes=0-9223372036854775807", 10, kPart, 0, 9},
             {"bytes=3-99999999999999999999999", 10, kPart, 3, 9},
             {"bytes=3-", 10, kPart, 3, 9},
             {"bytes=-3", 10, kPart, 7, 9},
             {"bytes=-99999999999999999999999", 10, kPart, 0, 9},
             {"bytes=9223372036854775806-", INT64_MAX, kPart, INT64_MAX - 1, INT64_MAX - 1},
             {"bytes=10-", 10, kNone, 0, 0},
             {"bytes=99999999999999999999999-", 10, kNone, 0, 0},
             {"bytes=-0", 10, kNone, 0, 0},
             {"bytes=0-", 0, kNone, 0, 0},
             {"bytes=-1", 0, kNone, 0, 0},
             {"bytes=5-2", 10, kWhole, 0, 0},
             {"bytes=0-1,3-4", 10, kWhole, 0, 0},
             {"bytes=-", 10, kWhole, 0, 0},
             {"bytes=3", 10, kWhole, 0, 0},
             {"bytes=--3", 10, kWhole, 0, 0},
             {"bytes=+1-3", 10, kWhole, 0, 0},
             {"bytes=1 - 3", 10, kWhole, 0, 0},
             {"lines=1-3", 10, kWhole, 0, 0},
         }) {
        SCOPED_TRACE(header);
        ByteRange got;
        ASSERT_EQ(judgeRange(header, size, got), answer);
        if (answer != kPart) continue;
        EXPECT_EQ(got.first, first);
        EXPECT_EQ(got.last, last);
    }
}

TEST(Range, ConditionsAreComparedWithTheFile) {
    const std::int64_t modified = 784111777;  // Sun, 06 Nov 1994 08:49:37 GMT
    for (const auto& [noneMatch, modifiedSince, current] : Rows<const char*, const char*, bool>{
             row("", "", false), row("\"t\"", "", true), row("\"a\" ,W/\"t\"", "", true), row("*", "", true),
             row("\"other\"", "Sun, 06 Nov 1994 08:49:37 GMT", false), row("t", "", false),
             row("", "Sun, 06 Nov 1994 08:49:37 GMT", true), row("", "Sunday, 06-Nov-94 08:49:37 GMT", true),
             row("", "Sun Nov  6 08:49:38 1994", true), row("", "Sun, 06 Nov 1994 08:49:36 GMT", false),
             row("", "Sun, 06 Nov 1994 08:49:37 GMT+1", false), row("", "tomorrow", false)}) {
        EXPECT_EQ(isCurrent(noneMatch, modifiedSince, "\"t\"", modified), current) << noneMatch << modifiedSince;
    }
    EXPECT_EQ(httpDate(modified), "Sun, 06 Nov 1994 08:49:37 GMT");

    for (const auto& [header, time, counts] : Rows<const char*, std::int64_t, bool>{
             row("", modified, true), row("\"t\"", modified, true), row("W/\"t\"", modified, false),
             row("\"u\"", modified, false), row("Sun, 06 Nov 1994 08:49:37 GMT", modified, true),
             row("Sun, 06 Nov 1994 08:49:38 GMT", modified, false), row("junk", -1, false)})
        EXPECT_EQ(rangeCounts(header, "\"t\"", time), counts);
}

TEST(Range, NamesOfAnyScriptAndBytesStayInTheirHeader) {
    EXPECT_EQ(attachment("a b.txt"), "attachment; filename=\"a b.txt\"; filename*=UTF-8''a%20b.txt");
    EXPECT_EQ(attachment("日本.txt"), "attachment; filename=\"______.txt\"; filename*=UTF-8''%E6%97%A5%E6%9C%AC.txt");
    EXPECT_EQ(attachment("a\"\\%41;\r\nX: y"),
              "attachment; filename=\"a___41;__X: y\"; filename*=UTF-8''a%22%5C%2541%3B%0D%0AX%3A%20y");
    EXPECT_EQ(attachment("\xE9"), "attachment; filename=\"___\"; filename*=UTF-8''%EF%BF%BD");
}

}  // namespace
