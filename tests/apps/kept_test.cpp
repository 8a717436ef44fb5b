// The parts of kept listings: ranges of rows, the file, the natural order.
#include <fstream>

#include "kept_file.h"
#include "natural_order.h"
#include "row_ranges.h"
#include "support/testing.h"

namespace {

using orvel::cgi::KeptFile;
using orvel::cgi::KeptRow;
using orvel::cgi::KeptText;
using orvel::cgi::NaturalOrder;

TEST(RowRanges, AreInOrderAndWithinTheList) {
    for (const char* wrong : {"", "3-2", "0-10", "10", "0-3,3-4", "4,2", "1,", ",1", "1-", "-1", "a", "1 ",
                              "0-4294967296", "99999999999999999999"})
        EXPECT_FALSE(orvel::cgi::parseRanges(wrong, 10)) << wrong;
    for (const auto& [ranges, without, remaining] : rowsOf<std::string, std::string, std::string>("apps/row_ranges")) {
        const auto except =
            without.empty() ? std::vector<orvel::cgi::RowRange>() : *orvel::cgi::parseRanges(without, 10);
        const auto left = orvel::cgi::withoutRows(*orvel::cgi::parseRanges(ranges, 10), except);
        EXPECT_EQ(left ? orvel::cgi::rangesText(*left) : "none", remaining) << ranges << " without " << without;
    }
    const orvel::cgi::ChosenRowNumbers rows(*orvel::cgi::parseRanges("1,4-6,8", 10));
    std::string all;
    for (size_t i = 0; i < rows.size(); ++i) all += std::to_string(rows[i]) + " ";
    EXPECT_EQ(all, "1 4 5 6 8 ");
}

class KeptFiles : public testing::Test {
 protected:
    static std::string bytesOf(int rows) {
        KeptText text;
        for (int i = 0; i < rows; ++i) text.add(nameOf(i), i % 3 == 0);
        return text.finish({"/photo/a", "*.jpg", 1, {.device = 1, .inode = 2, .modified = -3}});
    }
    static std::string nameOf(int i) { return "name " + std::to_string(i); }
    bool open(const std::string& bytes) {
        std::ofstream(path_, std::ios::binary | std::ios::trunc) << bytes;
        return file_.open(orvel::Descriptor(::open(path_.c_str(), O_RDONLY | O_CLOEXEC)));
    }
    // All rows, "damaged" where they cannot be read.
    std::string rowsOf() {
        std::string all;
        const bool whole = file_.each(0, file_.rows(), [&](uint32_t /*number*/, const KeptRow& row) {
            all += row.name + (row.isFolder ? "/\n" : "\n");
            return true;
        });
        return whole ? all : "damaged";
    }
    std::string path_ = testing::TempDir() + "/kept-" + std::to_string(getpid());
    KeptFile file_;
    void TearDown() override { unlink(path_.c_str()); }
};

TEST_F(KeptFiles, GiveBackWhatTheyWereGiven) {
    for (const int rows : {0, 1, 255, 256, 257, 1000}) {
        ASSERT_TRUE(open(bytesOf(rows))) << rows;
        EXPECT_EQ(file_.about().path, "/photo/a");
        EXPECT_EQ(file_.about().pattern, "*.jpg");
        EXPECT_EQ(file_.about().type, 1);
        EXPECT_EQ(file_.about().folder.modified, -3);
        std::string expected;
        for (int i = 0; i < rows; ++i) expected += nameOf(i) + (i % 3 == 0 ? "/\n" : "\n");
        EXPECT_EQ(rowsOf(), expected) << rows;
    }
}

// A byte that is another one, and an end that comes too early, is noticed before a row is believed.
TEST_F(KeptFiles, AreNotBelievedOnceTheyWereAltered) {
    const std::string whole = bytesOf(300);
    for (size_t at = 0; at < whole.size(); at += at < 400 ? 1 : 11) {
        std::string altered = whole;
        altered[at] = static_cast<char>(altered[at] ^ 0x21);
        EXPECT_TRUE(!open(altered) || rowsOf() == "damaged") << "byte " << at;
    }
    for (size_t length = 0; length < whole.size(); length += 77) EXPECT_FALSE(open(whole.substr(0, length))) << length;
    EXPECT_FALSE(open(whole + "x"));
}

TEST_F(KeptFiles, HoldNoNameThatNoListingShows) {
    for (const std::string& name : {std::string(), std::string("."), std::string(".."), std::string("a/b"),
                                    std::string("a\0b", 3), std::string("@tmp"), std::string(".vexo-part-1")}) {
        KeptText text;
        text.add(name, false);
        EXPECT_TRUE(!open(text.finish({"/photo", "", 2, {}})) || rowsOf() == "damaged") << name;
    }
}

std::string longKey(NaturalOrder& order, const std::string& name) {
    std::string key;
    EXPECT_TRUE(order.appendKey(name, key));
    return key;
}

// The short way agrees with ICU on any two names, so that a folder's order does not change with its first umlaut.
TEST(NaturalNames, TheShortWayOrdersAsIcu) {
    std::mt19937 random(7);
    NaturalOrder order("de");
    const std::string few = "aAbB019 _-.";
    for (int i = 0; i < 20000; ++i) {
        std::string names[2];
        for (std::string& name : names) {
            for (auto length = random() % 8; length > 0; --length)
                name += i % 2 == 0 ? static_cast<char>(' ' + random() % 95) : few[random() % few.size()];
        }
        ASSERT_TRUE(order.hasShortKey(names[0]));
        std::string keys[2];
        for (int one : {0, 1}) NaturalOrder::appendShortKey(names[one], keys[one]);
        const auto sign = [](int difference) { return (difference > 0) - (difference < 0); };
        ASSERT_EQ(sign(keys[0].compare(keys[1])), sign(longKey(order, names[0]).compare(longKey(order, names[1]))))
            << '"' << names[0] << "\" and \"" << names[1] << '"';
    }
}

TEST(NaturalNames, FollowNumbersAndTheLanguage) {
    const struct {
        const char* language;
        std::vector<std::string> names;
    } cases[] = {{"en", {"file 1", "file 2", "File 10", "file 0011", "file 100"}},
                 {"de", {"Apfel", "\xC3\x84pfel", "Zebra"}},
                 {"sv", {"Zebra", "\xC3\x84pple"}},
                 {"cs", {"czas", "hrad", "chleb"}},
                 {"xx-XX", {"a2", "a10"}}};
    for (const auto& [language, names] : cases) {
        NaturalOrder order(language);
        std::vector<std::string> sorted = names;
        std::reverse(sorted.begin(), sorted.end());
        std::sort(sorted.begin(), sorted.end(),
                  [&](const auto& a, const auto& b) { return longKey(order, a) < longKey(order, b); });
        EXPECT_EQ(sorted, names) << language;
    }
    EXPECT_FALSE(NaturalOrder("cs").hasShortKey("ch"));
    EXPECT_FALSE(NaturalOrder("en").hasShortKey(std::string(200, '1')));
    for (const char* wrong : {"", "de de", "../x", "de;", "aaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaaa"})
        EXPECT_FALSE(orvel::cgi::isLanguage(wrong)) << wrong;
}

TEST(NaturalNames, BeginningsAreFoundInEitherForm) {
    const std::string composed = "Caf\xC3\xA9 1", decomposed = "Cafe\xCC\x81 1";
    for (const std::string& typed : {std::string("caf\xC3\x89"), std::string("CAFE\xCC\x81"), std::string("caf")}) {
        const orvel::cgi::NameBeginning beginning(typed);
        EXPECT_TRUE(beginning.begins(composed)) << typed;
        EXPECT_TRUE(beginning.begins(decomposed)) << typed;
        EXPECT_FALSE(beginning.begins("cab")) << typed;
    }
}

}  // namespace
