#include "orvel/search_criteria.h"

#include "support/testing.h"

using namespace FileSearch;

namespace {

_tag_VEXOSTAT_ statusOf(mode_t mode, int64_t size = 0, uid_t uid = 0, gid_t gid = 0) {
    _tag_VEXOSTAT_ st{};
    st.st_mode = mode;
    st.st_size = size;
    st.st_uid = uid;
    st.st_gid = gid;
    return st;
}

// The criteria that one or more fields give, deleted at the end.
class Criteria {
 public:
    ~Criteria() {
        for (FindComp* one : list) delete one;
    }
    bool add(int field, const char* op, const char* value) {
        return FindFactory::createFindOp(static_cast<_tag_FIND_FIELD_>(field), op, value, list);
    }
    bool match(const char* path, const _tag_VEXOSTAT_& st) {
        return std::all_of(list.begin(), list.end(), [&](FindComp* one) { return (*one)(path, st); });
    }
    bool matchName(const char* path) { return match(path, statusOf(S_IFREG)); }

    std::vector<FindComp*> list;
};

// "type.op.value", and-links in brackets behind a node, or-links behind "|".
std::string textOf(const __tag_FI_SQL_COND* node) {
    std::string text;
    for (; node != nullptr; node = node->pOrNext) {
        text += (text.empty() ? "" : "|") + std::to_string(node->type) + "." + std::to_string(node->op) + "." +
                node->szValue;
        if (node->pAndNext != nullptr) text += "(" + textOf(node->pAndNext) + ")";
    }
    return text;
}

class CriteriaTest : public ApplianceTest {};

TEST_F(CriteriaTest, ArgumentsAndResultsOfEachField) {
    for (const auto& [field, op, value, result, code, added] : Rows<int, const char*, const char*, bool, int, size_t>{
             {0, nullptr, "a", true, 0, 1},
             {0, "x", nullptr, false, 400, 0},
             {1, "dir", nullptr, true, 0, 1},
             {1, "File", nullptr, true, 0, 1},
             {1, "link", nullptr, true, 0, 0},
             {1, nullptr, "dir", false, 400, 0},
             {2, nullptr, "jpg", true, 0, 2},
             {3, nullptr, "alice", true, 0, 1},
             {3, nullptr, "nobody-here", false, 403, 0},
             {4, nullptr, "users", true, 0, 1},
             {4, nullptr, "nobody-here", false, 404, 0},
             {5, nullptr, "1", false, 400, 0},
             {5, "before", nullptr, false, 400, 0},
             {5, "before", "1", true, 0, 1},
             {6, "", "", true, 0, 1},
             {7, "after", "no number", true, 0, 1},
             {8, "less", "1", true, 0, 1},
             {8, nullptr, "1", false, 400, 0},
             {9, nullptr, "x", true, 0, 0},
             {9, "x", nullptr, false, 400, 0},
             {-1, nullptr, "x", true, 0, 0},
         }) {
        SCOPED_TRACE(std::to_string(field) + " " + (op ? op : "-") + " " + (value ? value : "-"));
        Criteria criteria;
        OrvLibSetErr(0);
        EXPECT_EQ(criteria.add(field, op, value), result);
        EXPECT_EQ(OrvLibGetErr(), code);
        EXPECT_EQ(criteria.list.size(), added);
    }
    EXPECT_EQ(FindTypeCompFactory::createFindTypeOpt(nullptr), nullptr);
}

TEST_F(CriteriaTest, PatternsOfNames) {
    struct Case {
        std::string value, condition, matching, other;
    };
    const std::string longText(600, 'x');
    const Case cases[] = {
        {"report", "0.6.*report*", "my REPORT.txt", "repor"},
        {"*.txt", "0.6.*.txt", "a.TXT", "a.txt.gz"},
        {R"(a\?)", R"(0.6.*a\?*)", "xa?x", "ab"},
        {R"(a\*b)", R"(0.6.*a\*b*)", "a*b!", "axb"},
        {R"(a\?b?)", R"(0.6.*a\?b?*)", "xa?bcx", "a?b"},  // one escaped "?" speaks for all
        {R"(ab\)", R"(0.6.ab\)", "ab", "xabx"},
        {R"(a\\b)", R"(0.6.*a\\b*)", R"(xa\bx)", "ab"},
        {" \t\"two words\"\n", "0.6.*two words*", "x two words", "twowords"},
        {"\"\"", "0.6.*\"\"*", "x\"\"y", "xy"},  // too short to lose its quotes
        {"", "0.0.", "", "a"},
        {"   ", "0.0.", "", "   "},
        {"Ä", "0.6.*Ä*", "xäx", "xax"},
        {longText, "0.6.*" + longText + "*", std::string(492, 'x'), std::string(491, 'x')},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.value);
        Criteria criteria;
        ASSERT_TRUE(criteria.add(0, nullptr, c.value.c_str()));
        ASSERT_EQ(criteria.list.size(), 1U);
        EXPECT_EQ(textOf(criteria.list[0]->getFirstCond()), c.condition);
        EXPECT_TRUE(criteria.matchName(c.matching.c_str()));
        EXPECT_FALSE(criteria.matchName(c.other.c_str()));
    }
}

TEST_F(CriteriaTest, ListsAreAlternatives) {
    Criteria names;
    ASSERT_TRUE(names.add(0, nullptr, "one, \"two,three\" ,*.c"));  // a comma inside quotes splits, too
    ASSERT_EQ(names.list.size(), 1U);
    EXPECT_EQ(textOf(names.list[0]->getFirstCond()), "0.6.*.c|0.6.*three\"*|0.6.*\"two*|0.6.*one*");
    for (const char* name : {"xONEx", "a\"two", "three\"", "main.c"}) EXPECT_TRUE(names.matchName(name)) << name;
    for (const char* name : {"two", "three", "main.h"}) EXPECT_FALSE(names.matchName(name)) << name;

    Criteria extensions;
    ASSERT_TRUE(extensions.add(2, nullptr, "jpg,png"));
    ASSERT_EQ(extensions.list.size(), 2U);
    EXPECT_EQ(textOf(extensions.list[0]->getFirstCond()), "6.0.0");
    EXPECT_EQ(textOf(extensions.list[1]->getFirstCond()), "0.6.*.png|0.6.*.jpg");
    EXPECT_TRUE(extensions.matchName("a.PNG"));
    EXPECT_TRUE(extensions.matchName("a.jpg"));
    EXPECT_FALSE(extensions.matchName("a.jpgx"));
    EXPECT_FALSE(extensions.match("a.jpg", statusOf(S_IFDIR)));
}

TEST_F(CriteriaTest, ComparesTheLastComponent) {
    for (const auto& [path, pattern, result] : Rows<const char*, const char*, bool>{
             {"/share/dir/a.txt", "?.tx?", true},
             {"/dir/x", "*dir*", false},
             {"/a/b/", "?/", true},
             {"/a/b/", "?", false},
             {"/a/b//", "?", true},  // the trailing "/" alone
             {"/", "?", true},
             {"b/", "??", true},
             {"", "?", false},
             {nullptr, "?", false},
         }) {
        FindNameComp criterion(pattern);
        EXPECT_EQ(criterion(path, statusOf(0)), result) << (path ? path : "-") << " " << pattern;
    }
}

TEST_F(CriteriaTest, SizesAndTypes) {
    struct Case {
        const char *op, *value, *condition;
        std::vector<int64_t> matching, others;
    };
    constexpr int64_t kMax = INT64_MAX;
    const Case cases[] = {
        {"equal", "100", "7.2.105(7.5.95)", {95, 100, 104}, {94, 105}},
        {"equal", "10", "7.2.11(7.5.9)", {9, 10}, {8, 11}},
        {"equal", "0", "7.2.1(7.5.0)", {0}, {1}},
        {"equal", "1", "7.2.2(7.5.0)", {0, 1}, {2}},
        {"equal", "18446744073709551615", "7.2.9223372036854775807(7.5.8762203435012037017)", {kMax - 1}, {0, kMax}},
        {"less", "100", "7.2.100", {0, 99}, {100}},
        {"Less", "100", "7.4.100", {101}, {99, 100}},
        {"", "ten", "7.4.0", {1}, {0}},
        {"greater", "9223372036854775807", "7.4.9223372036854775807", {}, {0, kMax}},
        {"less", "-1", "7.2.9223372036854775807", {0, kMax - 1}, {}},  // counts as the largest
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(std::string(c.op) + " " + c.value);
        Criteria criteria;
        ASSERT_TRUE(criteria.add(8, c.op, c.value));
        EXPECT_EQ(textOf(criteria.list[0]->getFirstCond()), c.condition);
        for (const int64_t size : c.matching) EXPECT_TRUE(criteria.match("a", statusOf(S_IFREG, size))) << size;
        for (const int64_t size : c.others) EXPECT_FALSE(criteria.match("a", statusOf(S_IFREG, size))) << size;
    }
    FindSizeComp small("less", 10);
    EXPECT_TRUE(small("folder", statusOf(S_IFDIR, 4096))) << "a folder counts as 0 bytes";

    const mode_t modes[] = {S_IFREG, S_IFDIR, S_IFLNK, S_IFSOCK, S_IFIFO, S_IFCHR, S_IFBLK};
    for (const mode_t mode : modes) {
        FindTypeComp folders(true), files(false);
        EXPECT_EQ(folders("x", statusOf(mode | 0777)), mode == S_IFDIR) << mode;
        EXPECT_EQ(files("x", statusOf(mode | 0777)), mode == S_IFREG) << mode;
    }
}

TEST_F(CriteriaTest, Times) {
    for (const auto& [field, column, member] :
         Rows<int, int, int64_t _tag_VEXOSTAT_::*>{{5, 12, &_tag_VEXOSTAT_::st_modify},
                                                   {6, 9, &_tag_VEXOSTAT_::st_create},
                                                   {7, 11, &_tag_VEXOSTAT_::st_access}}) {
        SCOPED_TRACE(field);
        for (const bool before : {false, true}) {
            Criteria criteria;
            ASSERT_TRUE(criteria.add(field, before ? "Before" : "after", "1000"));
            EXPECT_EQ(textOf(criteria.list[0]->getFirstCond()),
                      std::to_string(column) + (before ? ".2.1000" : ".5.1000"));
            for (const int64_t time : {999, 1000, 1001}) {
                _tag_VEXOSTAT_ st{};
                st.*member = time;
                EXPECT_EQ(criteria.match("a", st), (time < 1000) == before) << time;
            }
        }
    }
}

TEST_F(CriteriaTest, OwnersAndGroups) {
    Criteria criteria;
    ASSERT_TRUE(criteria.add(3, nullptr, "alice"));
    ASSERT_TRUE(criteria.add(4, nullptr, "users"));
    EXPECT_EQ(textOf(criteria.list[0]->getFirstCond()), "15.0.20001|17.6.alice");
    EXPECT_EQ(textOf(criteria.list[1]->getFirstCond()), "16.0.20100|18.6.users");
    EXPECT_TRUE(criteria.match("a", statusOf(S_IFREG, 0, kAliceUid, kUsersGid)));
    EXPECT_FALSE(criteria.match("a", statusOf(S_IFREG, 0, kBobUid, kUsersGid)));
    EXPECT_FALSE(criteria.match("a", statusOf(S_IFREG, 0, kAliceUid, kAdminGid)));

    FindUserComp nobody("x", 0xFFFFFFFF);
    FindGroupComp noGroup(nullptr, 0xFFFFFFFF);
    const _tag_VEXOSTAT_ st = statusOf(S_IFREG, 0, 0xFFFFFFFF, 0xFFFFFFFF);
    EXPECT_FALSE(nobody("a", st) || noGroup("a", st));
}

// The tree that the index gets: each criterion's test holds together with the next one's.
TEST_F(CriteriaTest, ChainsIntoOneTree) {
    Criteria criteria;
    ASSERT_TRUE(criteria.add(0, nullptr, "a,b"));
    ASSERT_TRUE(criteria.add(3, nullptr, "alice"));
    ASSERT_TRUE(criteria.add(8, "equal", "100"));
    ASSERT_TRUE(criteria.add(1, "file", nullptr));
    for (size_t i = 0; i < criteria.list.size(); ++i) {
        (*criteria.list[i])(i + 1 < criteria.list.size() ? criteria.list[i + 1] : nullptr);
    }
    EXPECT_EQ(textOf(criteria.list[0]->getFirstCond()),
              "0.6.*b*(15.0.20001|17.6.alice(7.2.105(7.5.95(6.0.0))))|0.6.*a*");
}

TEST_F(CriteriaTest, AlternativesMayBeDeletedInAnyOrder) {
    const _tag_VEXOSTAT_ st{};
    for (const bool headFirst : {false, true}) {
        auto head = std::make_unique<FindNameComp>("first");
        auto second = std::make_unique<FindNameComp>("second");
        auto third = std::make_unique<FindNameComp>("third");
        head->orComp(nullptr);
        head->orComp(head.get());
        head->orComp(second.get());
        head->orComp(third.get());
        EXPECT_EQ(textOf(head->getFirstCond()), "0.6.*third*|0.6.*second*|0.6.*first*");
        EXPECT_TRUE((*head)("/x/THIRD", st) && (*head)("second", st) && !(*second)("third", st));
        if (headFirst) {
            head.reset();
            EXPECT_TRUE((*second)("second", st));
            EXPECT_STREQ(third->getFirstCond()->szValue, "*third*");
        } else {
            third.reset();
            second.reset();
            EXPECT_EQ(textOf(head->getFirstCond()), "0.6.*third*|0.6.*second*|0.6.*first*");
        }
    }
}

TEST(Condition, ZeroFillsAndCuts) {
    __tag_FI_SQL_COND node, other;
    memset(&node, 0xEE, sizeof node);
    setSqlCond(node, FI_COL_PATH, FI_OP_PATH, std::string(5000, 'a'), &other, nullptr);
    EXPECT_EQ(std::string(node.szValue), std::string(4095, 'a'));
    EXPECT_TRUE(node.pAndNext == &other && node.pOrNext == nullptr);
    setSqlCond(node, FI_COL_SIZE, FI_OP_LESS, 18446744073709551615ULL, nullptr, &other);
    EXPECT_STREQ(node.szValue, "18446744073709551615");
    EXPECT_TRUE(std::all_of(node.szValue + 20, std::end(node.szValue), [](char c) { return c == 0; }));
    EXPECT_TRUE(node.pAndNext == nullptr && node.pOrNext == &other && node.type == FI_COL_SIZE &&
                node.op == FI_OP_LESS);
}

}  // namespace
