#include "sharing/login_record.h"

#include <gtest/gtest.h>

#include <climits>
#include <string>
#include <vector>

using namespace orvel;

namespace {

// The records of a text, written back.
std::string rewritten(std::string_view text, size_t longest = kLongestCheckedLine) {
    std::string out;
    for (LoginRecord record; nextLoginRecord(text, longest, record);) appendLoginRecord(record, out);
    return out;
}

TEST(LoginRecordTest, LinesAsTheyAreReadAndWrittenBack) {
    const std::string whole = "10.0.0.5,alice,abc,1,2,1,0,link\n";
    const std::string tail = "alice,abc,1,2,1,0,link\n";
    struct Case {
        std::string text, wanted;
    };
    const std::vector<Case> cases = {
        {"", ""},
        {whole + whole, whole + whole},
        {"a,u,s,1,2,3,4,l", "a,u,s,1,2,3,4,l\n"},                         // torn behind the last field
        {"a,u,s,1,2,3,4,l\r", "a,u,s,1,2,3,4,l\n"},                       // or within its end
        {"a,u,s,1,2,3,4,l,", "a,u,s,1,2,3,4,l\n"},                        // or with more behind it
        {std::string("a,u,s,1,2,3,4,l\0", 16), "a,u,s,1,2,3,4,l\n"},      // or not wholly on the disk
        {"a,u,s,1,2,3\n", "a,u,s,1,2,3,0,0\n"},                           // six fields make a record
        {"a,u,s,1,2,3,7\n", "a,u,s,1,2,3,7,0\n"},                         // seven
        {"a,u,s,1,2\n" + whole, whole},                                   // five do not
        {"a,u,s,1,2,3\r\n" + whole, "a,u,s,1,2,3,0,0\n" + whole},         // the sixth ends at CR
        {"a,u,s,1,2,3,4,l\r\n", "a,u,s,1,2,3,4,l\n"},                     // and the eighth
        {"a,u,s,1,2,3,4,l,more\n", "a,u,s,1,2,3,4,l\n"},                  // what follows is dropped
        {",,a,,u,s,1,2,3,4,l\n", "a,u,s,1,2,3,4,l\n"},                    // separators in a row are one
        {"a,u,s,1,2,3,4,\n", "a,u,s,1,2,3,4,0\n"},                        // an empty link reads as "0"
        {"\n\n,,,\n\r\n" + whole, whole},                                 // nothing to read
        {std::string("\0\xFF\x01,\n", 5) + whole, whole},                 // binary
        {std::string("a,u,s,1,2,3\0x,y,z,\n", 19), "a,u,s,1,2,3,0,0\n"},  // a NUL ends what is read
        {std::string(747 - tail.size(), 'x') + "," + tail, std::string(747 - tail.size(), 'x') + "," + tail},
        {std::string(748 - tail.size(), 'x') + "," + tail + whole, whole},  // too long: no part of it is a record
        {std::string(100000, ',') + whole + whole, whole},
    };
    for (const auto& [text, wanted] : cases) {
        EXPECT_EQ(rewritten(text), wanted) << text;
        EXPECT_EQ(rewritten(rewritten(text)), wanted) << "read again: " << text;
    }
    EXPECT_EQ(rewritten(std::string(1023 - tail.size(), 'x') + "," + tail, kLongestLookedUpLine).size(), 1024U);
}

TEST(LoginRecordTest, NumbersAndFreshness) {
    struct Number {
        const char* field;
        long wanted;
    };
    for (const auto& [field, wanted] : {Number{"12", 12},
                                        {" \t+12x", 12},
                                        {"-3", -3},
                                        {"+-3", 0},
                                        {"x", 0},
                                        {"", 0},
                                        {"99999999999999999999", LONG_MAX},
                                        {"-99999999999999999999", LONG_MIN}}) {
        EXPECT_EQ(numberOf(field), wanted) << field;
    }
    struct Case {
        long accessTime, now;
        bool fresh;
    };
    for (const auto& [accessTime, now, fresh] : {Case{1000, 1000, true},
                                                 {1000, 1900, true},
                                                 {1000, 1901, false},
                                                 {0, 10, false},
                                                 {-5, 10, false},
                                                 {5000, 100, true},          // written before the machine was restarted
                                                 {1, 1 + (1L << 31), true},  // the difference has 32 bits and a sign
                                                 {1 + (1L << 32), 902, false},
                                                 {LONG_MAX, 100, true}}) {
        EXPECT_EQ(isFresh(accessTime, now, 900), fresh) << accessTime << " at " << now;
    }
}

}  // namespace
