#include "download/range.h"

#include "support/testing.h"

namespace {

using namespace orvel::cgi;

TEST(Range, OneRangeOfBytesIsServed) {
    constexpr auto kWhole = RangeAnswer::kWhole, kPart = RangeAnswer::kPart, kNone = RangeAnswer::kUnsatisfiable;
    struct {
        const char* header;
        std::int64_t size;
        RangeAnswer answer;
        std::int64_t first, last;
    } const cases[] = {
        {"", 10, kWhole, 0, 0},
        {"bytes=0-0", 10, kPart, 0, 0},
        {"Bytes=2-5", 10, kPart, 2, 5},
        {"bytes= 9-9 ", 10, kPart, 9, 9},
        {"bytes=9-10", 10, kPart, 9, 9},
        {"bytes=0-9223372036854775807", 10, kPart, 0, 9},
        {"bytes=3-99999999999999999999999", 10, kPart, 3, 9},
        {"bytes=3-", 10, kPart, 3, 9},
        {"bytes=-3", 10, kPart, 7, 9},
        {"bytes=-10", 10, kPart, 0, 9},
        {"bytes=-99999999999999999999999", 10, kPart, 0, 9},
        {"bytes=9223372036854775806-", INT64_MAX, kPart, INT64_MAX - 1, INT64_MAX - 1},
        {"bytes=10-", 10, kNone, 0, 0},
        {"bytes=10-20", 10, kNone, 0, 0},
        {"bytes=99999999999999999999999-", 10, kNone, 0, 0},
        {"bytes=-0", 10, kNone, 0, 0},
        {"bytes=0-", 0, kNone, 0, 0},
        {"bytes=-1", 0, kNone, 0, 0},
        {"bytes=5-2", 10, kWhole, 0, 0},
        {"bytes=0-1,3-4", 10, kWhole, 0, 0},
        {"bytes=-", 10, kWhole, 0, 0},
        {"bytes=", 10, kWhole, 0, 0},
        {"bytes=3", 10, kWhole, 0, 0},
        {"bytes=--3", 10, kWhole, 0, 0},
        {"bytes=1--3", 10, kWhole, 0, 0},
        {"bytes=+1-3", 10, kWhole, 0, 0},
        {"bytes=0x1-3", 10, kWhole, 0, 0},
        {"bytes=1 - 3", 10, kWhole, 0, 0},
        {"lines=1-3", 10, kWhole, 0, 0},
        {"byte", 10, kWhole, 0, 0},
    };
    for (const auto& range : cases) {
        SCOPED_TRACE(range.header);
        ByteRange got;
        ASSERT_EQ(judgeRange(range.header, range.size, got), range.answer);
        if (range.answer != kPart) continue;
        EXPECT_EQ(got.first, range.first);
        EXPECT_EQ(got.last, range.last);
    }
}

TEST(Range, ConditionsAreComparedWithTheFile) {
    const std::int64_t modified = 784111777;  // Sun, 06 Nov 1994 08:49:37 GMT
    struct {
        const char *noneMatch, *modifiedSince;
        bool current;
    } const cases[] = {
        {"", "", false},
        {"\"t\"", "", true},
        {"\"a\" ,W/\"t\"", "", true},
        {"*", "", true},
        {"\"other\"", "Sun, 06 Nov 1994 08:49:37 GMT", false},
        {"t", "", false},
        {"", "Sun, 06 Nov 1994 08:49:37 GMT", true},
        {"", "Sunday, 06-Nov-94 08:49:37 GMT", true},
        {"", "Sun Nov  6 08:49:38 1994", true},
        {"", "Sun, 06 Nov 1994 08:49:36 GMT", false},
        {"", "Sun, 06 Nov 1994 08:49:37 GMT+1", false},
        {"", "tomorrow", false},
    };
    for (const auto& condition : cases) {
        EXPECT_EQ(isCurrent(condition.noneMatch, condition.modifiedSince, "\"t\"", modified), condition.current)
            << condition.noneMatch << condition.modifiedSince;
    }
    EXPECT_EQ(httpDate(modified), "Sun, 06 Nov 1994 08:49:37 GMT");

    struct {
        const char* header;
        std::int64_t modified;
        bool counts;
    } const ranges[] = {
        {"", modified, true},
        {"\"t\"", modified, true},
        {"W/\"t\"", modified, false},
        {"\"u\"", modified, false},
        {"Sun, 06 Nov 1994 08:49:37 GMT", modified, true},
        {"Sun, 06 Nov 1994 08:49:38 GMT", modified, false},
        {"junk", -1, false},
    };
    for (const auto& range : ranges) EXPECT_EQ(rangeCounts(range.header, "\"t\"", range.modified), range.counts);
}

TEST(Range, NamesOfAnyScriptAndBytesStayInTheirHeader) {
    EXPECT_EQ(attachment("a b.txt"), "attachment; filename=\"a b.txt\"; filename*=UTF-8''a%20b.txt");
    EXPECT_EQ(attachment("日本.txt"), "attachment; filename=\"______.txt\"; filename*=UTF-8''%E6%97%A5%E6%9C%AC.txt");
    EXPECT_EQ(attachment("a\"\\%41;\r\nX: y"),
              "attachment; filename=\"a___41;__X: y\"; filename*=UTF-8''a%22%5C%2541%3B%0D%0AX%3A%20y");
    EXPECT_EQ(attachment("\xE9"), "attachment; filename=\"___\"; filename*=UTF-8''%EF%BF%BD");
}

}  // namespace
