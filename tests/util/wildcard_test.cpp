#include "util/wildcard.h"

#include <chrono>
#include <random>

#include "orvel/text.h"
#include "support/testing.h"
#include "util/wildcard_model.h"

namespace {

constexpr int kBackslash = 92;

std::string repeated(const std::string& text, int count) {
    std::string result;
    for (int i = 0; i < count; ++i) result += text;
    return result;
}

TEST(Wildcard, Table) {
    struct Case {
        const char* pattern;
        const char* text;
        int expected;
        int escape = kBackslash;
    };
    const Case cases[] = {
        {"", "", 1},
        {"*.JPG", "photo.jpg", 1},
        {"a?c", "abc", 1},
        {"a\\*", "a*", 1},
        {"a\\*", "ab", 0},
        {"a\\\\", "a\\", 1},
        {"*", "", 1},
        {"?", "", 0},
        {"a*", "a", 1},
        {"*a", "ba", 1},
        {"*ab*cd", "abxcxabcd", 1},
        {"*?", "", 0},
        {"*?*?", "a", 0},
        {"*?*?", "ab", 1},
        {"*?", "\xC3\x84", 1},
        {"??", "\xC3\x84", 0},
        // The escape character: alone at the end it stands for nothing, and behind a run that never fits.
        {"a\\", "a", 1},
        {"a\\", "a\\", 0},
        {"*\\", "a", 0},
        {"*\\?", "a?", 1},
        {"a+*", "a*", 1, '+'},
        {"a\\*", "a\\b", 1, '+'},
        {"*a", "ba", 1, '*'},
        {"\xC3\x84*", "*", 1, 0xC4},
        {"a\\", "a\\", 1, -1},
        // Case folding beyond ASCII, also between lengths of encoding.
        {"\xC3\x84", "\xC3\xA4", 1},
        {"*\xC3\xA4.TXT", "x\xC3\x84.txt", 1},
        {"k", "\xE2\x84\xAA", 1},
        {"\xF0\x90\x90\x80", "\xF0\x90\x90\xA8", 1},
        {"\xC3\x84", "a", 0},
        // Broken bytes: a lead byte takes what follows, as far as there is something.
        {"?", "\xC3*", 1},
        {"?", "\xF0\x90", 1},
        {"?b", "\xC3\x62", 0},
        {"\xC3", "\xC3\x80", 1},
        {"\x80", "\x81", 0},
        {"\xC0\x80", "", 0},
        {"\xC1\x81", "a", 1},
        {"*\xC0\xAA", "", 0},
        {"*\xC0\xAA", "a", 1},
        {"*\xC0\xAA*", "", 0},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(testing::PrintToString(std::string(c.pattern)) + " with " +
                     testing::PrintToString(std::string(c.text)));
        EXPECT_EQ(wildcard_model::compare(c.pattern, c.text, c.escape) ? 1 : 0, c.expected) << "the model";
        EXPECT_EQ(OrvLibStrLikeCompare(c.pattern, c.text, c.escape), c.expected);
    }
    EXPECT_EQ(OrvLibStrLikeCompare(nullptr, "a", kBackslash), 0);
    EXPECT_EQ(OrvLibStrLikeCompare("a", nullptr, kBackslash), 0);
}

// Short words over few characters, so that a good part of the pairs matches.
class Words {
 public:
    Words(unsigned seed, std::vector<std::string> alphabet) : random_(seed), alphabet_(std::move(alphabet)) {}
    std::string next(unsigned longest) {
        std::string word;
        for (unsigned left = random_() % (longest + 1); left > 0; --left)
            word += alphabet_[random_() % alphabet_.size()];
        return word;
    }

 private:
    std::mt19937 random_;
    std::vector<std::string> alphabet_;
};

TEST(Wildcard, AnswersLikeTheRecursion) {
    const std::vector<std::string> clean = {"a", "b", "A", "\\", "\xC3\x84", "\xC3\xA4", "\xE2\x82\xAC"};
    const std::vector<std::string> broken = {"a",    "*",    "?",    "\\",   "\xC0", "\xC1",
                                             "\x9C", "\xAA", "\xC3", "\xE2", "\xF0"};
    auto withSigns = clean;
    for (const char* sign : {"*", "*", "?", "\\"}) withSigns.emplace_back(sign);
    int matches = 0;
    for (const auto& [patternAlphabet, textAlphabet] : Rows<std::vector<std::string>, std::vector<std::string>>{
             {withSigns, clean}, {{"a", "b", "*", "?", "\\"}, {"a", "b", "\\"}}, {broken, broken}}) {
        Words patterns(1, patternAlphabet);
        Words texts(2, textAlphabet);
        for (int i = 0; i < 60000; ++i) {
            const std::string pattern = patterns.next(7);
            const orvel::Wildcard compiled(pattern, kBackslash);
            for (int j = 0; j < 4; ++j) {
                const std::string text = texts.next(7);
                const bool expected = wildcard_model::compare(pattern.c_str(), text.c_str(), kBackslash);
                // A buffer without a terminator, so that a sanitizer sees a read behind the end.
                const std::vector<char> bare(text.begin(), text.end());
                ASSERT_EQ(compiled.match({bare.data(), bare.size()}), expected)
                    << testing::PrintToString(pattern) << " with " << testing::PrintToString(text);
                matches += expected ? 1 : 0;
            }
        }
    }
    EXPECT_GT(matches, 30000) << "too few of the pairs match to say much";
}

TEST(Wildcard, NeverExponential) {
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(OrvLibStrLikeCompare((repeated("*a", 12) + "*b").c_str(), std::string(255, 'a').c_str(), kBackslash), 0);
    EXPECT_EQ(OrvLibStrLikeCompare((repeated("*a?", 400) + "*b").c_str(), std::string(20000, 'a').c_str(), kBackslash),
              0);
    // The plain form of this one would need a stack as deep as the pattern is long.
    EXPECT_EQ(OrvLibStrLikeCompare(repeated("*a", 50000).c_str(), std::string(100000, 'A').c_str(), kBackslash), 1);
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(5));
}

}  // namespace
