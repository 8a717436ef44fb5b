// The order of names: a strict total preorder for any bytes, and keys that order the same.
#include "vexo/text.h"

#include "support/testing.h"

namespace {

int sign(int value) {
    return (value > 0) - (value < 0);
}

int compare(const std::string& a, const std::string& b) {
    return sign(VLIBCUnicodeUTF8StrCaseCmp(a.c_str(), b.c_str()));
}

std::string key(const std::string& name) {
    std::string out;
    VEXO::AppendFoldKey(name, out);
    return out;
}

TEST(NameOrder, ComparesFoldedCodePoints) {
    for (const auto& [a, b, expected] : Rows<const char*, const char*, int>{
             {"", "a", -1},
             {"photo", "PHOTO", 0},
             {"photo", "Photos", -1},
             {"[", "a", -1},               // between the cases of ASCII: letters fold down
             {"\xC3\xA9", "\xC3\x89", 0},  // é É
             {"z", "\xC3\xA9", -1},
             {"k", "\xE2\x84\xAA", 0},                     // the Kelvin sign folds to an ASCII letter
             {"\xC3\x9F", "ss", 1},                        // folding is simple: no letter becomes two
             {"\xC8\xBA", "\xE2\xB1\xA5", 0},              // Ⱥ folds to a longer sequence
             {"\xF0\x90\x90\x80", "\xF0\x90\x90\xA8", 0},  // beyond the first plane
             {"\xEF\xBF\xBF", "\xF0\x90\x80\x80", -1},     // by code point, not by UTF-16 unit
             {"\xF4\x8F\xBF\xBF", "\x80", -1},             // a broken byte stands above every code point
             {"\xC3", "\xC3\xA9", 1},                      // cut sequence
             {"\xC0\x80", "\xC3\xA9", 1},                  // overlong
             {"\xED\xA0\x80", "\xEE\x80\x80", 1},          // surrogate
             {"\xE2\x82", "\xE2\x83", -1},
             {"\xE2\x82", "\xE2\x82z", -1},  // each byte of a broken sequence counts by itself
         })
        EXPECT_EQ(compare(a, b), expected) << testing::PrintToString(a) << testing::PrintToString(b);
}

// Random texts over bytes that make and break sequences.
std::string randomName(std::mt19937& random) {
    static const std::string bytes(
        "aAkK[z\x01\x7F\x80\xA0\xA9\xBF\xC0\xC3\x89\xC8\xBA\xE2\x84\xAA\xED\xEF\xF0\x90\xF4\xF5\xFE\xFF", 26);
    std::string name;
    for (auto length = random() % 7; length > 0; --length) name += bytes[random() % bytes.size()];
    return name;
}

TEST(NameOrder, IsAStrictOrderOnAnyBytesAndKeysAgree) {
    std::mt19937 random(20240501);
    for (int round = 0; round < 100000; ++round) {
        const std::string a = randomName(random);
        const std::string b = randomName(random);
        const std::string c = randomName(random);
        const int ab = compare(a, b);
        ASSERT_EQ(compare(b, a), -ab);
        ASSERT_EQ(sign(key(a).compare(key(b))), ab) << testing::PrintToString(a) << testing::PrintToString(b);
        ASSERT_TRUE(ab > 0 || compare(b, c) > 0 || compare(a, c) <= 0);
        ASSERT_TRUE(ab != 0 || compare(a, c) == compare(b, c));
    }
}

}  // namespace
