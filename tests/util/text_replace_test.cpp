#include "orvel/text.h"
#include "support/testing.h"

namespace {

class TextReplace : public ApplianceTest {};

// The result and the text, as "1 text"; the text is freed.
std::string take(int result, char* out) {
    std::string replaced = std::to_string(result) + " " + (out == nullptr ? "(null)" : out);
    free(out);  // NOLINT(cppcoreguidelines-no-malloc): the caller's part of the contract
    return replaced;
}

std::string replaceOne(const char* source, const char* search, const char* replacement) {
    char* out = nullptr;
    const int result = OrvLibStrReplace(source, search, replacement, &out);
    return take(result, out);
}

std::string replaceTwo(const char* source, const char* s1, const char* r1, const char* s2, const char* r2) {
    char* out = nullptr;
    const int result = OrvLibTwoStrReplace(source, s1, r1, s2, r2, &out);
    return take(result, out);
}

TEST_F(TextReplace, One) {
    for (const auto& [source, search, replacement, expected] :
         rowsOf<const char*, const char*, const char*, const char*>("util/one_replaced"))
        EXPECT_EQ(replaceOne(source, search, replacement), expected);
    for (const char* none : {"", static_cast<const char*>(nullptr)}) {
        EXPECT_EQ(replaceOne(none, "a", "b"), "-1 (null)");
        EXPECT_EQ(replaceOne("a", none, "b"), "-1 (null)");
        EXPECT_EQ(replaceOne("a", "a", none), "-1 (null)");
    }
    const std::string source(2000000, 'a');
    EXPECT_EQ(replaceOne(source.c_str(), "a", "bb").size(), 4000002U) << "within linear time";
}

TEST_F(TextReplace, NoMemoryForTheResult) {
#ifdef __SANITIZE_ADDRESS__
    GTEST_SKIP() << "AddressSanitizer ends the program at an allocation this large";
#else
    std::string many;
    many.resize(20000000, 'a');  // replaced by itself: more than an address space in all
    announceLog("): failed to calloc, errno=Cannot allocate memory");
    EXPECT_EQ(replaceOne(many.c_str(), "a", many.c_str()), "-1 (null)");
#endif
}

TEST_F(TextReplace, Two) {
    for (const auto& [source, s1, r1, s2, r2, expected] :
         rowsOf<const char*, const char*, const char*, const char*, const char*, const char*>("util/text_replace"))
        EXPECT_EQ(replaceTwo(source, s1, r1, s2, r2), expected);
}

}  // namespace
