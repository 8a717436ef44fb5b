#include "download/range.h"

#include "support/testing.h"

namespace {

using namespace orvel::cgi;

TEST(Range, OneRangeOfBytesIsServed) {
    const std::map<std::string, RangeAnswer> answers = {
        {"whole", RangeAnswer::kWhole}, {"part", RangeAnswer::kPart}, {"none", RangeAnswer::kUnsatisfiable}};
    for (const auto& [header, size, answer, first, last] :
         rowsOf<const char*, std::int64_t, std::string, std::int64_t, std::int64_t>("apps/ranges")) {
        SCOPED_TRACE(header);
        ByteRange got;
        ASSERT_EQ(judgeRange(header, size, got), answers.at(answer));
        if (answer != "part") continue;
        EXPECT_EQ(got.first, first);
        EXPECT_EQ(got.last, last);
    }
}

TEST(Range, ConditionsAreComparedWithTheFile) {
    const std::int64_t modified = 784111777;  // Sun, 06 Nov 1994 08:49:37 GMT
    for (const auto& [noneMatch, modifiedSince, current] : rowsOf<const char*, const char*, bool>("apps/conditions"))
        EXPECT_EQ(isCurrent(noneMatch, modifiedSince, "\"t\"", modified), current) << noneMatch << modifiedSince;
    EXPECT_EQ(httpDate(modified), "Sun, 06 Nov 1994 08:49:37 GMT");

    for (const auto& [header, time, counts] : Rows<const char*, std::int64_t, bool>{
             row("", modified, true), row("\"t\"", modified, true), row("W/\"t\"", modified, false),
             row("\"u\"", modified, false), row("Sun, 06 Nov 1994 08:49:37 GMT", modified, true),
             row("Sun, 06 Nov 1994 08:49:38 GMT", modified, false), row("junk", -1, false)})
        EXPECT_EQ(rangeCounts(header, "\"t\"", time), counts);
}

TEST(Range, NamesOfAnyScriptAndBytesStayInTheirHeader) {
    EXPECT_EQ(disposition("attachment", "a b.txt"), "attachment; filename=\"a b.txt\"; filename*=UTF-8''a%20b.txt");
    EXPECT_EQ(disposition("attachment", "日本.txt"),
              "attachment; filename=\"______.txt\"; filename*=UTF-8''%E6%97%A5%E6%9C%AC.txt");
    EXPECT_EQ(disposition("attachment", "a\"\\%41;\r\nX: y"),
              "attachment; filename=\"a___41;__X: y\"; filename*=UTF-8''a%22%5C%2541%3B%0D%0AX%3A%20y");
    EXPECT_EQ(disposition("attachment", "\xE9"), "attachment; filename=\"___\"; filename*=UTF-8''%EF%BF%BD");
}

}  // namespace
