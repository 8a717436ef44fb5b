#include "base/wildcard.h"

#include "base/wildcard_model.h"
#include "orvel/text.h"
#include "support/testing.h"

namespace {

constexpr int kBackslash = 92;

std::string repeated(const std::string& text, int count) {
    std::string result;
    for (int i = 0; i < count; ++i) result += text;
    return result;
}

TEST(Wildcard, Table) {
    for (const auto& [pattern, text, escape, expected] : Rows<const char*, const char*, int, int>{
             row("", "", kBackslash, 1), row("*.JPG", "photo.jpg", kBackslash, 1), row("a?c", "abc", kBackslash, 1),
             row("a\\*", "a*", kBackslash, 1), row("a\\*", "ab", kBackslash, 0), row("a\\\\", "a\\", kBackslash, 1),
             row("?", "", kBackslash, 0), row("*ab*cd", "abxcxabcd", kBackslash, 1), row("*?*?", "a", kBackslash, 0),
             row("*?*?", "ab", kBackslash, 1),
             // The escape character: alone at the end it stands for nothing, and behind a run that never fits.
             row("a\\", "a", kBackslash, 1), row("a\\", "a\\", kBackslash, 0), row("*\\", "a", kBackslash, 0),
             row("*\\?", "a?", kBackslash, 1), row("a+*", "a*", '+', 1), row("a\\*", "a\\b", '+', 1),
             row("*a", "ba", '*', 1), row("\xC3\x84*", "*", 0xC4, 1), row("a\\", "a\\", -1, 1),
             // Case folding beyond ASCII, also between lengths of encoding.
             row("*\xC3\xA4.TXT", "x\xC3\x84.txt", kBackslash, 1), row("k", "\xE2\x84\xAA", kBackslash, 1),
             row("\xF0\x90\x90\x80", "\xF0\x90\x90\xA8", kBackslash, 1), row("\xC3\x84", "a", kBackslash, 0),
             // Broken bytes: a lead byte takes what follows, as far as there is something.
             row("?", "\xC3*", kBackslash, 1), row("?", "\xF0\x90", kBackslash, 1),
             row("?b", "\xC3\x62", kBackslash, 0), row("\xC3", "\xC3\x80", kBackslash, 1),
             row("\x80", "\x81", kBackslash, 0), row("\xC1\x81", "a", kBackslash, 1),
             row("*\xC0\xAA", "", kBackslash, 0), row("*\xC0\xAA", "a", kBackslash, 1),
             row("*\xC0\xAA*", "", kBackslash, 0)}) {
        SCOPED_TRACE(testing::PrintToString(std::string(pattern)) + " with " +
                     testing::PrintToString(std::string(text)));
        EXPECT_EQ(wildcard_model::compare(pattern, text, escape) ? 1 : 0, expected) << "the model";
        EXPECT_EQ(OrvLibStrLikeCompare(pattern, text, escape), expected);
    }
    EXPECT_EQ(OrvLibStrLikeCompare(nullptr, "a", kBackslash), 0);
    EXPECT_EQ(OrvLibStrLikeCompare("a", nullptr, kBackslash), 0);
}

TEST(Wildcard, AnswersLikeTheRecursion) {
    using Alphabet = std::vector<std::string>;
    const Alphabet clean = {"a", "b", "A", "\\", "\xC3\x84", "\xC3\xA4", "\xE2\x82\xAC"};
    const Alphabet broken = {"a", "*", "?", "\\", "\xC0", "\xC1", "\x9C", "\xAA", "\xC3", "\xE2", "\xF0", "\xF5"};
    Alphabet withSigns = clean;
    for (const char* sign : {"*", "*", "?", "\\"}) withSigns.emplace_back(sign);
    std::mt19937 random(1);
    // Short words over few characters, so that a good part of the pairs matches.
    const auto word = [&](const Alphabet& alphabet) {
        std::string text;
        for (unsigned left = random() % 8; left > 0; --left) text += alphabet[random() % alphabet.size()];
        return text;
    };
    int matches = 0;
    for (const auto& [ofPatterns, ofTexts] : Rows<Alphabet, Alphabet>{
             {withSigns, clean}, {{"a", "b", "*", "?", "\\"}, {"a", "b", "\\"}}, {broken, broken}}) {
        for (int i = 0; i < 100000; ++i) {
            const std::string pattern = word(ofPatterns);
            const std::string text = word(ofTexts);
            const bool expected = wildcard_model::compare(pattern.c_str(), text.c_str(), kBackslash);
            // A buffer without a terminator, so that a sanitizer sees a read behind the end.
            const std::vector<char> bare(text.begin(), text.end());
            ASSERT_EQ(orvel::Wildcard(pattern, kBackslash).match({bare.data(), bare.size()}), expected)
                << testing::PrintToString(pattern) << " with " << testing::PrintToString(text);
            matches += expected ? 1 : 0;
        }
    }
    EXPECT_GT(matches, 20000) << "too few of the pairs match to say much";
}

TEST(Wildcard, NeverExponential) {
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(OrvLibStrLikeCompare((repeated("*a?", 400) + "*b").c_str(), std::string(20000, 'a').c_str(), kBackslash),
              0);
    // The plain form of this one would need a stack as deep as the pattern is long.
    EXPECT_EQ(OrvLibStrLikeCompare(repeated("*a", 50000).c_str(), std::string(100000, 'A').c_str(), kBackslash), 1);
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(5));
}

}  // namespace
