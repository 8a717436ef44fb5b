// Names that operations choose, and names that they refuse.
#include "free_names.h"
#include "operation/member_path.h"
#include "operation/recycle.h"
#include "support/testing.h"
#include "text.h"

namespace {

TEST(OperationNames, AreNumberedBeforeTheirEnding) {
    struct {
        std::string name, numbered;
        bool isFolder;
    } const cases[] = {{"a.txt", "a (2).txt", false},
                       {"a.b", "a.b (2)", true},
                       {".profile", ".profile (2)", false},
                       {"a", "a (2)", false},
                       {std::string(255, 'x') + ".txt", std::string(247, 'x') + " (2).txt", false},
                       {"a." + std::string(40, 'x'), "a." + std::string(40, 'x') + " (2)", false}};
    for (const auto& [name, numbered, isFolder] : cases)
        EXPECT_EQ(orvel::cgi::numberedName(name, 2, isFolder), numbered);
    orvel::cgi::FreeNames names;
    for (const char* free : {"a.txt", "a (2).txt", "a (3).txt"}) EXPECT_EQ(names.take("a.txt", false), free);
    EXPECT_EQ(names.take("a (2).txt", false), "a (2) (2).txt");
    EXPECT_EQ(names.take("a (4).txt", false), "a (4).txt");
    EXPECT_EQ(names.take("a.txt", false), "a (5).txt");
    std::string wide;
    while (wide.size() < 255) wide += "\xE2\x82\xAC";
    EXPECT_TRUE(orvel::cgi::isUtf8(orvel::cgi::numberedName(wide, 10, true))) << "no character is cut";
}

TEST(OperationNames, OfTheBinLeadBack) {
    EXPECT_EQ(orvel::cgi::binName("a.txt", 1), "a.txt");
    EXPECT_EQ(orvel::cgi::binName("a.txt", 2), "a (#2).txt");
    for (const char* name : {"a", "a.txt", ".a", "a (#2).txt", "a (#2)", "a.b (#7)", "a (#3) (#1).b", "a (#).b", "(#1)",
                             " (#1)", "a (2).txt", "a.(#2)", "a (#2).b (#3)"}) {
        for (const int number : {1, 2, 77}) {
            const std::string inBin = orvel::cgi::binName(name, number);
            EXPECT_EQ(orvel::cgi::originalName(inBin), name) << inBin;
            EXPECT_EQ(orvel::cgi::originalName(orvel::cgi::nextBinName(inBin, 5, false)), name);
        }
    }
}

TEST(OperationNames, OfArchivesLeadDownOnly) {
    for (const char* name : {"", "/", "/etc/passwd", "..", "a/../b", "./..", "a/..", ".", "./"})
        EXPECT_FALSE(orvel::cgi::memberComponents(name)) << name;
    EXPECT_EQ(*orvel::cgi::memberComponents("./a//b/."), (std::vector<std::string>{"a", "b"}));
    EXPECT_EQ(*orvel::cgi::memberComponents("...\\..\\x"), (std::vector<std::string>{"...\\..\\x"}));
    for (const auto& [text, depth, inside] : rowsOf<const char*, size_t, bool>("apps/links_inside"))
        EXPECT_EQ(orvel::cgi::staysInside(text, depth), inside) << text;
}

}  // namespace
