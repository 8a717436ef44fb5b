#include "orvel/search_criteria.h"

#include "search/search_fixture.h"

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

bool match(const Criteria& criteria, const char* path, const _tag_VEXOSTAT_& st) {
    return std::all_of(criteria.all.begin(), criteria.all.end(), [&](FindComp* one) { return (*one)(path, st); });
}

bool matchName(const Criteria& criteria, const char* path) {
    return match(criteria, path, statusOf(S_IFREG));
}

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
    for (const auto& [field, op, value, result, code, added] :
         rowsOf<int, const char*, const char*, bool, int, size_t>("search/fields")) {
        SCOPED_TRACE(std::to_string(field) + " " + (op ? op : "-") + " " + (value ? value : "-"));
        Criteria criteria;
        OrvLibSetErr(0);
        EXPECT_EQ(criteria.add(field, op, value), result);
        EXPECT_EQ(OrvLibGetErr(), code);
        EXPECT_EQ(criteria.all.size(), added);
    }
}

TEST_F(CriteriaTest, PatternsOfNames) {
    const std::string longText(600, 'x');
    auto rows = rowsOf<std::string, std::string, std::string, std::string>("search/names");
    rows.emplace_back(longText, "0.6.*" + longText + "*", std::string(492, 'x'), std::string(491, 'x'));
    for (const auto& [value, condition, matching, other] : rows) {
        SCOPED_TRACE(value);
        Criteria criteria;
        ASSERT_TRUE(criteria.add(0, nullptr, value.c_str()));
        EXPECT_EQ(textOf(criteria.all[0]->getFirstCond()), condition);
        EXPECT_TRUE(matchName(criteria, matching.c_str()));
        EXPECT_FALSE(matchName(criteria, other.c_str()));
    }
}

TEST_F(CriteriaTest, ListsAreAlternatives) {
    Criteria names;
    ASSERT_TRUE(names.add(0, nullptr, "one, \"two,three\" ,*.c"));  // a comma inside quotes splits, too
    EXPECT_EQ(textOf(names.all[0]->getFirstCond()), "0.6.*.c|0.6.*three\"*|0.6.*\"two*|0.6.*one*");
    EXPECT_TRUE(matchName(names, "xONEx") && matchName(names, "a\"two") && matchName(names, "main.c"));
    EXPECT_FALSE(matchName(names, "two") || matchName(names, "three"));

    Criteria extensions;
    ASSERT_TRUE(extensions.add(2, nullptr, "jpg,png"));
    ASSERT_EQ(extensions.all.size(), 2U);
    EXPECT_EQ(textOf(extensions.all[0]->getFirstCond()), "6.0.0");
    EXPECT_EQ(textOf(extensions.all[1]->getFirstCond()), "0.6.*.png|0.6.*.jpg");
    EXPECT_TRUE(matchName(extensions, "a.PNG") && matchName(extensions, "a.jpg"));
    EXPECT_FALSE(matchName(extensions, "a.jpgx") || match(extensions, "a.jpg", statusOf(S_IFDIR)));
}

TEST_F(CriteriaTest, ComparesTheLastComponent) {
    for (const auto& [path, pattern, result] : Rows<const char*, const char*, bool>{
             row("/share/dir/a.txt", "?.tx?", true), row("/dir/x", "*dir*", false), row("/a/b/", "?/", true),
             row("/a/b//", "?", true),  // the trailing "/" alone
             row("/", "?", true), row("", "?", false), row(static_cast<const char*>(nullptr), "?", false)}) {
        FindNameComp criterion(pattern);
        EXPECT_EQ(criterion(path, statusOf(0)), result) << (path ? path : "-") << " " << pattern;
    }
}

TEST_F(CriteriaTest, SizesAndTypes) {
    using Sizes = std::vector<int64_t>;
    for (const auto& [op, value, condition, matching, others] :
         rowsOf<const char*, const char*, const char*, Sizes, Sizes>("search/sizes")) {
        SCOPED_TRACE(std::string(op) + " " + value);
        Criteria criteria;
        ASSERT_TRUE(criteria.add(8, op, value));
        EXPECT_EQ(textOf(criteria.all[0]->getFirstCond()), condition);
        for (const int64_t size : matching) EXPECT_TRUE(match(criteria, "a", statusOf(S_IFREG, size))) << size;
        for (const int64_t size : others) EXPECT_FALSE(match(criteria, "a", statusOf(S_IFREG, size))) << size;
    }
    FindSizeComp small("less", 10);
    EXPECT_TRUE(small("folder", statusOf(S_IFDIR, 4096))) << "a folder counts as 0 bytes";

    for (const mode_t mode : {S_IFREG, S_IFDIR, S_IFLNK, S_IFIFO}) {
        EXPECT_EQ(FindTypeComp(true)("x", statusOf(mode | 0777)), mode == S_IFDIR) << mode;
        EXPECT_EQ(FindTypeComp(false)("x", statusOf(mode | 0777)), mode == S_IFREG) << mode;
    }
}

TEST_F(CriteriaTest, Times) {
    for (const auto& [field, column, member] :
         Rows<int, int, int64_t _tag_VEXOSTAT_::*>{{5, 12, &_tag_VEXOSTAT_::st_modify},
                                                   {6, 9, &_tag_VEXOSTAT_::st_create},
                                                   {7, 11, &_tag_VEXOSTAT_::st_access}}) {
        for (const bool before : {false, true}) {
            Criteria criteria;
            ASSERT_TRUE(criteria.add(field, before ? "Before" : "after", "1000"));
            EXPECT_EQ(textOf(criteria.all[0]->getFirstCond()),
                      std::to_string(column) + (before ? ".2.1000" : ".5.1000"));
            for (const int64_t time : {999, 1000, 1001}) {
                _tag_VEXOSTAT_ st{};
                st.*member = time;
                EXPECT_EQ(match(criteria, "a", st), (time < 1000) == before) << field << " " << time;
            }
        }
    }
}

TEST_F(CriteriaTest, OwnersAndGroups) {
    Criteria criteria;
    ASSERT_TRUE(criteria.add(3, nullptr, "alice") && criteria.add(4, nullptr, "users"));
    EXPECT_EQ(textOf(criteria.all[1]->getFirstCond()), "16.0.20100|18.6.users");
    for (const auto& [uid, gid, matches] : Rows<unsigned, unsigned, bool>{
             {kAliceUid, kUsersGid, true}, {kBobUid, kUsersGid, false}, {kAliceUid, kAdminGid, false}})
        EXPECT_EQ(match(criteria, "a", statusOf(S_IFREG, 0, uid, gid)), matches) << uid << " " << gid;
    const _tag_VEXOSTAT_ unknown = statusOf(S_IFREG, 0, 0xFFFFFFFF, 0xFFFFFFFF);
    EXPECT_FALSE(FindUserComp("x", 0xFFFFFFFF)("a", unknown) || FindGroupComp(nullptr, 0xFFFFFFFF)("a", unknown));
}

// The tree that the index gets: each criterion's test holds together with the next one's.
TEST_F(CriteriaTest, ChainsIntoOneTree) {
    Criteria criteria;
    EXPECT_TRUE(criteria.add(0, nullptr, "a,b") && criteria.add(3, nullptr, "alice"));
    EXPECT_TRUE(criteria.add(8, "equal", "100") && criteria.add(1, "file", nullptr));
    for (size_t i = 0; i + 1 < criteria.all.size(); ++i) (*criteria.all[i])(criteria.all[i + 1]);
    EXPECT_EQ(textOf(criteria.all[0]->getFirstCond()),
              "0.6.*b*(15.0.20001|17.6.alice(7.2.105(7.5.95(6.0.0))))|0.6.*a*");
}

TEST_F(CriteriaTest, AlternativesMayBeDeletedInAnyOrder) {
    for (const bool headFirst : {false, true}) {
        std::unique_ptr<FindNameComp> all[3];
        for (int i = 0; i < 3; ++i) all[i] = std::make_unique<FindNameComp>(std::to_string(i + 1).c_str());
        for (FindNameComp* other : {static_cast<FindNameComp*>(nullptr), all[0].get(), all[1].get(), all[2].get()})
            all[0]->orComp(other);
        EXPECT_EQ(textOf(all[0]->getFirstCond()), "0.6.*3*|0.6.*2*|0.6.*1*");
        EXPECT_TRUE((*all[0])("/x/3", {}) && (*all[0])("2", {}) && !(*all[1])("3", {}));
        if (headFirst) {
            all[0].reset();
            EXPECT_TRUE((*all[1])("2", {}));
            EXPECT_STREQ(all[2]->getFirstCond()->szValue, "*3*");
        } else {
            for (const int gone : {2, 1}) all[gone].reset();
            EXPECT_EQ(textOf(all[0]->getFirstCond()), "0.6.*3*|0.6.*2*|0.6.*1*");
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
}

}  // namespace
