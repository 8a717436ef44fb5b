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
    for (const auto& [text, wanted] : Rows<std::string, std::string>{
             row(whole + whole, whole + whole),
             {"a,u,s,1,2,3,4,l", "a,u,s,1,2,3,4,l\n"},                         // torn behind the last field
             {"a,u,s,1,2,3,4,l\r", "a,u,s,1,2,3,4,l\n"},                       // or within its end
             {std::string("a,u,s,1,2,3,4,l\0", 16), "a,u,s,1,2,3,4,l\n"},      // or not wholly on the disk
             {"a,u,s,1,2,3,7\n", "a,u,s,1,2,3,7,0\n"},                         // seven fields
             {"a,u,s,1,2\n" + whole, whole},                                   // five make no record
             {"a,u,s,1,2,3\r\n" + whole, "a,u,s,1,2,3,0,0\n" + whole},         // six do; the sixth ends at CR
             {"a,u,s,1,2,3,4,l\r\n", "a,u,s,1,2,3,4,l\n"},                     // and the eighth
             {"a,u,s,1,2,3,4,l,more\n", "a,u,s,1,2,3,4,l\n"},                  // what follows is dropped
             {",,a,,u,s,1,2,3,4,l\n", "a,u,s,1,2,3,4,l\n"},                    // separators in a row are one
             {"a,u,s,1,2,3,4,\n", "a,u,s,1,2,3,4,0\n"},                        // an empty link reads as "0"
             {std::string("\n,,,\n\0\xFF\x01,\n", 10) + whole, whole},         // nothing to read
             {std::string("a,u,s,1,2,3\0x,y,z,\n", 19), "a,u,s,1,2,3,0,0\n"},  // a NUL ends what is read
             // The same where what follows lets lines be read in blocks.
             {"alice,u,s,1,2,3,4,\n" + whole + whole, "alice,u,s,1,2,3,4,0\n" + whole + whole},
             {",alice,u,s,1,2,3,link\n" + whole + whole, "alice,u,s,1,2,3,link,0\n" + whole + whole},
             {"alice,u,s,1,2,3,4,l\r\n" + whole + whole, "alice,u,s,1,2,3,4,l\n" + whole + whole},
             {std::string("alice,u,s,1,2,3,4\0,l\n", 21) + whole + whole, "alice,u,s,1,2,3,4,0\n" + whole + whole},
             {"x" + longest + whole + whole, whole + whole},
             {longest, longest},
             {"x" + longest + whole, whole},  // too long: no part of it is a record
         }) {
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
