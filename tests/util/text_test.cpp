#include "orvel/text.h"

#include <climits>

#include "support/testing.h"

namespace {

using Pieces = std::vector<std::string>;

TEST(Text, ToLower) {
    char text[] = "Ab.\xC3\x84\xC4Z[@";
    EXPECT_EQ(OrvLibStringToLower(text), 0);
    EXPECT_STREQ(text, "ab.\xC3\x84\xC4z[@");
    EXPECT_EQ(OrvLibStringToLower(nullptr), -1);
}

TEST(Text, Hex2Bin) {
    const std::pair<const char*, const char*> cases[] = {
        {"41004243", "A"},    {"414", "A"},    {"", ""},        {"4", ""},
        {"fFe0", "\xFF\xE0"}, {"zz41", ""},    {"4z41", "\4A"}, {" 141", "\1A"},
        {"-142", "\xFF\x42"}, {"410x42", "A"},
    };
    for (const auto& [hex, bytes] : cases) EXPECT_EQ(OrvLibHex2Bin(hex), bytes) << hex;
}

Pieces collected;
std::vector<long> arguments;

void collect(std::string& piece, long argument) {
    collected.push_back(piece);
    arguments.push_back(argument);
    piece = "changed";
}

TEST(Text, ExplodeGivesTheSamePiecesInAllForms) {
    for (const auto& [whole, delimiter, expected, joinedNames] : Rows<const char*, const char*, Pieces, const char*>{
             {"", ",", {}, "kept"},
             {"/x/a", ",", {"/x/a"}, "a"},
             {",a,,b,", ",", {"a", "", "b", ""}, "a||b|"},
             {",", ",", {""}, ""},
             {",,a", ",", {"", "a"}, "|a"},
             {"/x/a::b/::/c", "::", {"/x/a", "b/", "/c"}, "a||c"},
             {"a:::b", "::", {"a", ":b"}, "a|:b"},
             {"a,b", "", {"a,b"}, "a,b"},
             {"a/b", nullptr, {"a/b"}, "b"},
         }) {
        SCOPED_TRACE(whole);
        std::string text = whole;
        collected.clear();
        arguments.clear();
        StringExplode(text, delimiter, collect, -7);
        EXPECT_EQ(collected, expected);
        EXPECT_EQ(arguments, std::vector<long>(expected.size(), -7));
        // Only a text without a delimiter is handed out itself.
        EXPECT_EQ(text, expected == Pieces{whole} ? "changed" : whole);
        Pieces out = {"first"};
        StringExplode(out, whole, delimiter);
        EXPECT_EQ(Pieces(out.begin() + 1, out.end()), expected);
        std::string names = "kept";
        StringExplodeToFileNameString(names, whole, delimiter, "|");
        EXPECT_EQ(names, joinedNames);
    }
    std::string text = "a,b";
    StringExplode(text, ",", nullptr, 0);
    std::string names;
    StringExplodeToFileNameString(names, text, ",", nullptr);
    EXPECT_EQ(names, "ab");
}

TEST(Text, CommonParent) {
    const std::pair<Pieces, const char*> cases[] = {
        {{}, ""},
        {{""}, "/"},
        {{"/a/b"}, "/a/b/"},
        {{"/a/b/c", "/a/b/d"}, "/a/b/"},
        {{"/a/bc", "/a/bd"}, "/a/"},
        {{"/a/b", "/a/b/c", "/a/b/"}, "/a/b/"},
        {{"/a/b/c", "/a/b"}, "/a/b/"},
        {{"abc", "abd"}, "ab"},
        {{"a", "/a"}, ""},
        {{"/a", "/b", ""}, "/"},
    };
    for (const auto& [paths, parent] : cases) EXPECT_EQ(FindCommonParent(paths), parent);
}

TEST(Text, FileExtension) {
    for (const auto& [name, limit, at] : Rows<const char*, unsigned, int>{
             {nullptr, 0, -1},
             {"", 0, -1},
             {".", 255, -1},
             {"ab", 0, -1},
             {".profile", 255, -1},
             {"a.", 255, -1},
             {"a.b", 0, 2},
             {"..b", 0, 2},
             {".a.b", 0, 3},
             {"archive.tar.gz", 255, 12},
             {"archive.tar.gz", 1, 12},
             // A limit below the length is an index from the front.
             {"archive.tar.gz", 13, 12},
             {"archive.tar.gz", 11, 12},
             {"archive.tar.gz", 10, 8},
             {"archive.tar.gz", 6, -1},
             {"archive.tar.gz", 14, 12},
             {"a.bcdef", 2, 2},
         }) {
        const char* found = ReturnFileExt(name, limit);
        EXPECT_EQ(found == nullptr ? -1 : found - name, at) << testing::PrintToString(name) << limit;
    }
}

TEST(Text, FileUnit) {
    for (const auto& [size, twoDecimals, expected] : Rows<long long, bool, const char*>{
             {1, false, "1 Bytes"},
             {1023, true, "1023 Bytes"},
             {1024, true, " 1.00 KB"},
             {1536, false, "1 KB"},
             {1536, true, " 1.50 KB"},
             {1048575, false, "1023 KB"},
             {1048575, true, "1024.00 KB"},
             {1048576, false, "1 MB"},
             {1073741823, false, "1024 MB"},  // single precision rounds it up
             {1073741824, true, " 1.00 GB"},
             {LLONG_MAX, false, "8589934592 GB"},
         }) {
        char buffer[64] = "";
        EXPECT_EQ(FileUnitGet(size, buffer, sizeof buffer, twoDecimals), 1);
        EXPECT_STREQ(buffer, expected);
    }
    char buffer[] = "xxxxxxxx";
    for (const long long none : {0, -1}) EXPECT_EQ(FileUnitGet(none, buffer, sizeof buffer, false), 0);
    EXPECT_EQ(FileUnitGet(5, buffer, 0, false), 0);
    EXPECT_EQ(FileUnitGet(5, nullptr, 9, false), 0);
    EXPECT_STREQ(buffer, "xxxxxxxx");
    EXPECT_EQ(FileUnitGet(1023, buffer, 4, false), 1);
    EXPECT_EQ(std::string(buffer, 8), std::string("102\0xxxx", 8));
}

}  // namespace
