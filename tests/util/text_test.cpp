#include "orvel/text.h"

#include "support/testing.h"

namespace {

using Pieces = std::vector<std::string>;

TEST(Text, LowerCaseAndHexadecimalBytes) {
    char text[] = "Ab.\xC3\x84\xC4Z[@";
    EXPECT_EQ(OrvLibStringToLower(text), 0);
    EXPECT_STREQ(text, "ab.\xC3\x84\xC4z[@");
    for (const auto& [hex, bytes] : Rows<const char*, const char*>{
             row("41004243", "A"), row("414", "A"), row("", ""), row("4", ""), row("fFe0", "\xFF\xE0"), row("zz41", ""),
             row("4z41", "\4A"), row(" 141", "\1A"), row("-142", "\xFF\x42"), row("410x42", "A")})
        EXPECT_EQ(OrvLibHex2Bin(hex), bytes) << hex;
}

Pieces collected;

void collect(std::string& piece, long argument) {
    EXPECT_EQ(argument, -7);
    collected.push_back(piece);
    piece = "changed";
}

TEST(Text, ExplodeGivesTheSamePiecesInAllForms) {
    for (const auto& [whole, delimiter, expected, joinedNames] :
         rowsOf<const char*, const char*, Pieces, const char*>("util/explode")) {
        SCOPED_TRACE(whole);
        std::string text = whole;
        collected.clear();
        StringExplode(text, delimiter, collect, -7);
        EXPECT_EQ(collected, expected);
        // Only a text without a delimiter is handed out itself.
        EXPECT_EQ(text, expected == Pieces{whole} ? "changed" : whole);
        Pieces out = {"first"};
        StringExplode(out, whole, delimiter);
        EXPECT_EQ(Pieces(out.begin() + 1, out.end()), expected);
        std::string names = "kept";
        StringExplodeToFileNameString(names, whole, delimiter, "|");
        EXPECT_EQ(names, joinedNames);
    }
}

TEST(Text, CommonParent) {
    using Case = std::pair<Pieces, const char*>;
    for (const auto& [paths, parent] : {Case({}, ""), Case({"/a/b"}, "/a/b/"), Case({"/a/bc", "/a/bd"}, "/a/"),
                                        Case({"/a/b/c", "/a/b", "/a/b/"}, "/a/b/"), Case({"abc", "abd"}, "ab"),
                                        Case({"a", "/a"}, ""), Case({"/a", "/b", ""}, "/")})
        EXPECT_EQ(FindCommonParent(paths), parent);
}

TEST(Text, FileExtension) {
    for (const auto& [name, limit, at] : rowsOf<const char*, unsigned, int>("util/file_extensions")) {
        const char* found = ReturnFileExt(name, limit);
        EXPECT_EQ(found == nullptr ? -1 : found - name, at) << testing::PrintToString(name) << limit;
    }
}

TEST(Text, FileUnit) {
    for (const auto& [size, twoDecimals, expected] : rowsOf<long long, bool, const char*>("util/units")) {
        char buffer[64] = "";
        EXPECT_EQ(FileUnitGet(size, buffer, sizeof buffer, twoDecimals), 1);
        EXPECT_STREQ(buffer, expected);
    }
    char buffer[] = "xxxxxxxx";
    for (const long long none : {0, -1}) EXPECT_EQ(FileUnitGet(none, buffer, sizeof buffer, false), 0);
    EXPECT_EQ(FileUnitGet(5, buffer, 0, false), 0);
    EXPECT_STREQ(buffer, "xxxxxxxx");
    EXPECT_EQ(FileUnitGet(1023, buffer, 4, false), 1);
    EXPECT_EQ(std::string(buffer, 8), std::string("102\0xxxx", 8));
}

}  // namespace
