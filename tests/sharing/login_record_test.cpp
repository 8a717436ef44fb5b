#include "sharing/login_record.h"

#include "support/testing.h"

using namespace orvel;

namespace {

// The records of a text, written back. Lines as they are written have a reader of their own, which must say the same.
std::string rewritten(std::string_view text, size_t longest = kLongestCheckedLine) {
    const std::vector<char> exact(text.begin(), text.end());  // nothing readable behind it
    std::string out, others;
    std::string_view rest(exact.data(), exact.size());
    for (LoginRecord record; nextLoginRecord(rest, longest, record);) appendLoginRecord(record, out);
    rest = {exact.data(), exact.size()};
    for (LoginRecord record; nextLoginRecordOfAnyForm(rest, longest, record);) appendLoginRecord(record, others);
    EXPECT_EQ(out, others);
    return out;
}

TEST(LoginRecordTest, LinesAsTheyAreReadAndWrittenBack) {
    const std::string whole = "10.0.0.5,alice,abc,1,2,1,0,link\n";
    const std::string tail = "alice,abc,1,2,1,0,link\n";
    const std::string longest = std::string(747 - tail.size(), 'x') + "," + tail;
    auto rows = rowsOf<std::string, std::string>("sharing/record_lines");
    for (const auto& [line, kept] :
         Rows<std::string, std::string>{{"x" + longest + whole + whole, whole + whole},
                                        {longest, longest},
                                        {"x" + longest + whole, whole}})  // too long: no part of it is a record
        rows.emplace_back(line, kept);
    for (const auto& [text, wanted] : rows) {
        EXPECT_EQ(rewritten(text), wanted) << text;
        EXPECT_EQ(rewritten(rewritten(text)), wanted) << "read again: " << text;
    }
    EXPECT_EQ(rewritten(std::string(1023 - tail.size(), 'x') + "," + tail, kLongestLookedUpLine).size(), 1024U);
}

TEST(LoginRecordTest, NumbersAndFreshness) {
    for (const auto& [field, wanted] : rowsOf<const char*, long>("sharing/numbers"))
        EXPECT_EQ(numberOf(field), wanted) << field;
    for (const auto& [accessTime, now, fresh] : rowsOf<long, long, bool>("sharing/fresh"))
        EXPECT_EQ(isFresh(accessTime, now, 900), fresh) << accessTime << " at " << now;
}

}  // namespace
