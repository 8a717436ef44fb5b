#include "vexo/index.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <random>
#include <string>
#include <tuple>
#include <vector>

#include "orvel/search_criteria.h"
#include "platform/index_fixture.h"
#include "vexo/error.h"
#include "vexo/text.h"

namespace {

using index_tests::Cond;
using index_tests::Data;
using index_tests::IndexTest;
using index_tests::insert;
using index_tests::kEverything;
using index_tests::node;
using index_tests::Record;
using index_tests::Rows;
using index_tests::select;
using index_tests::sorted;

// What walks and indexes must agree on: names of every encoding, sizes, owners, times and kinds.
std::vector<Record> manyRecords() {
    const std::vector<std::string> names = {"Report.TXT",
                                            "report",
                                            "r\xC3\xA9sum\xC3\xA9.pdf",
                                            "R\xC3\x89SUM\xC3\x89.PDF",
                                            "a_b%c*d?.jpg",
                                            "quote'\"\\.jpg",
                                            "\xE9t\xE9.jpg",
                                            "bad\xFF\xFEname",
                                            "\xC0\xAAstar",
                                            "ab",
                                            ".jpg",
                                            "IMG_0001.JPG",
                                            "tail\\",
                                            "nul\xC0\x80in",
                                            "\xED\xA0\x80surrogate",
                                            "*",
                                            "?x?"};
    const std::vector<std::string> folders = {"", "2012/", "2012/a/", "2012b/", "20_2/", "*/", "\xFF/"};
    std::vector<Record> records;
    unsigned i = 0;
    for (const auto& folder : folders) {
        for (const auto& name : names) {
            ++i;
            Record record{folder + name};
            record.isDir = i % 7 == 0;
            record.size = i % 5 == 0 ? INT64_MAX - i : i * 13LL;
            record.uid = 20001 + i % 3;
            record.owner = std::vector<std::string>{"alice", "bob", "carol"}[i % 3];
            record.gid = 20100;
            record.created = i * 100LL;
            record.modified = i % 11 == 0 ? -1LL * i : i * 50LL;
            record.accessed = i * 10LL;
            records.push_back(record);
        }
    }
    return records;
}

class Criteria {
 public:
    ~Criteria() {
        for (FileSearch::FindComp* one : list) delete one;
    }
    void add(std::mt19937& random) {
        static const std::vector<const char*> patterns = {
            "report,jpg",         "*.JPG", "?b",    "r\xC3\xA9s,bad",  "a_b%", "\\*",  "*\\",  "",
            "\"img\",*.txt,\xFF", "b%c*d", "\xE9t", "\xED\xA0\x80sur", "in",   "2012", "\\?x", "name,ort.t"};
        static const std::vector<const char*> operators = {"before", "after", "equal", "less", "more"};
        static const std::vector<const char*> numbers = {
            "0", "500", "1300", "9223372036854775700", "99999999999999999999", "x"};
        const auto pick = [&](const auto& from) { return from[random() % from.size()]; };
        const auto field = static_cast<FileSearch::_tag_FIND_FIELD_>(random() % 9);
        const char* op = field == FileSearch::FIND_TYPE ? (random() % 2 == 0 ? "dir" : "file") : pick(operators);
        const char* value = pick(numbers);
        if (field == FileSearch::FIND_NAME) value = pick(patterns);
        if (field == FileSearch::FIND_EXTENSION) value = random() % 2 == 0 ? "jpg,pdf" : "txt";
        if (field == FileSearch::FIND_OWNER) value = random() % 2 == 0 ? "alice" : "bob";
        if (field == FileSearch::FIND_GROUP) value = "users";
        ASSERT_TRUE(FileSearch::FindFactory::createFindOp(field, op, value, list));
        text += std::to_string(field) + " " + op + " " + value + "; ";
    }
    const Cond* tree() {
        for (size_t i = 0; i + 1 < list.size(); ++i) (*list[i])(list[i + 1]);
        return list[0]->getFirstCond();
    }
    [[nodiscard]] bool match(const Record& record) const {
        const _tag_VEXOSTAT_ st = record.status();
        return std::all_of(list.begin(), list.end(), [&](auto* one) { return (*one)(record.name().c_str(), st); });
    }
    std::vector<FileSearch::FindComp*> list;
    std::string text;
};

TEST_F(IndexTest, ConditionsSayWhatTheCriteriaSay) {
    const std::vector<Record> records = manyRecords();
    for (const Record& record : records) ASSERT_EQ(insert(db_, record), 0);
    build(records);
    std::mt19937 random(7);
    size_t found = 0;
    for (int round = 0; round < 300; ++round) {
        Criteria criteria;
        for (unsigned i = 0; i <= random() % 4; ++i) criteria.add(random);
        const Cond* tree = criteria.tree();
        Rows expected;
        for (const Record& record : records) {
            if (criteria.match(record)) expected.push_back(record.address());
        }
        expected = sorted(expected);
        found += expected.size();
        EXPECT_EQ(sorted(select(db_, tree)), expected) << criteria.text;
        const std::string copy = folder_ + "/copy" + std::to_string(round);
        ASSERT_EQ(FILEIDXDBCreate(copy.c_str()), 0);
        EXPECT_EQ(FILEIDXResultGetAndTableGen("photo", nullptr, tree, copy.c_str(), nullptr, nullptr, nullptr, nullptr,
                                              nullptr),
                  0);
        EXPECT_EQ(sorted(select(copy)), expected) << criteria.text;
    }
    EXPECT_GT(found, records.size() * 10);
}

std::string line(const Data& d) {
    std::string out;
    for (const char* text : {d.szShareRoot, d.szShare, d.szName, d.szPath, d.szParent, d.szExtension, d.szPermission,
                             d.szOwner, d.szGroup}) {
        out += std::string(text) + "|";
    }
    for (const int64_t number : {int64_t{d.isDir}, d.size, d.created, d.changed, d.accessed, d.modified,
                                 int64_t{d.mode}, int64_t{d.uid}, int64_t{d.gid}}) {
        out += std::to_string(number) + "|";
    }
    return out;
}

BOOL keepLine(Data* data, void* text) {
    *static_cast<std::string*>(text) += line(*data) + "\n";
    return 1;
}

TEST_F(IndexTest, RecordsStayWhatTheyAreUntilTheyAreChanged) {
    const std::string longName(255, '\xFE');
    Data data{"/volume1/photo",
              "photo",
              "n",
              "p/\xFFn'\"%;",
              "p",
              "EXT",
              "rwx",
              "DOM\\\xE4",
              "",
              1,
              INT64_MAX,
              INT64_MIN,
              -1,
              0,
              1,
              UINT32_MAX,
              UINT32_MAX,
              0};
    data.szName = longName.c_str();
    ASSERT_EQ(FILEIDXDBInsert(db_.c_str(), &data, 1), 0);
    Data again = data;
    again.size = 1;
    ASSERT_EQ(FILEIDXDBInsert(db_.c_str(), &again, 1), 0) << "a record that is there is left as it is";
    const FIQUERY all = {{}, 0, nullptr, 0, kEverything};
    std::string found;
    ASSERT_EQ(FILEIDXDBSelect(db_.c_str(), &all, keepLine, &found), 0);
    EXPECT_EQ(found, line(data) + "\n");

    const std::vector<std::string> paths = {"a_b/x", "axb/x", "a_b/y/%", "a_b", "a_bc/x", "a_b*/x", "A_b/x", "a_b/*"};
    for (const auto& path : paths) ASSERT_EQ(insert(db_, {path}), 0);
    ASSERT_EQ(insert(db_, {.path = "a_b/x", .share = "other"}), 0);
    Cond share = node(FI_COL_SHARE, FI_OP_EQUAL, "photo");
    Cond below = node(FI_COL_PATH, FI_OP_PATH, "a_b/*", &share);
    EXPECT_EQ(sorted(select(db_, &below)), (Rows{"photo:a_b/*", "photo:a_b/x", "photo:a_b/y/%"}));

    // A moved record takes the place of the one that stood there.
    Cond owner = node(FI_COL_OWNER, FI_OP_EQUAL, "o'wner");
    Cond toPath = node(FI_COL_PATH, FI_OP_EQUAL, "axb/x", &owner);
    Cond from = node(FI_COL_PATH, FI_OP_EQUAL, "a_b/x", &share);
    ASSERT_EQ(FILEIDXDBUpdate(db_.c_str(), &toPath, &from), 0);
    EXPECT_EQ(select(db_, &from), Rows());
    Cond byOwner = node(FI_COL_OWNER, FI_OP_EQUAL, "o'wner");
    EXPECT_EQ(select(db_, &byOwner), Rows{"photo:axb/x"});
    ASSERT_EQ(FILEIDXDBDel(db_.c_str(), &below), 0);
    unsigned long long count = 0;
    ASSERT_EQ(FILEIDXCountGet(db_.c_str(), &all, &count), 0);
    EXPECT_EQ(count, select(db_).size());
    EXPECT_EQ(sorted(select(db_)), (Rows{"other:a_b/x", "photo:A_b/x", "photo:a_b", "photo:a_b*/x", "photo:a_bc/x",
                                         "photo:axb/x", "photo:p/\xFFn'\"%;"}));
    EXPECT_LT(FILEIDXDBDel(db_.c_str(), nullptr), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
}

TEST_F(IndexTest, FoldersOfASearch) {
    build({{"x"}, {"2012/x"}, {"2012/a/x"}, {"2012b/x"}, {"*/x"}, {"*/a/x"}, {"2012"}, {"alice/x"}});
    struct Case {
        const char* folder;
        Rows direct, deep;
    };
    const Rows all = {"photo:*/a/x",  "photo:*/x",     "photo:2012",    "photo:2012/a/x",
                      "photo:2012/x", "photo:2012b/x", "photo:alice/x", "photo:x"};
    const std::vector<Case> cases = {
        {"/photo", {"photo:2012", "photo:x"}, all},
        {"/photo/2012", {"photo:2012/x"}, {"photo:2012/a/x", "photo:2012/x"}},
        {"/photo//2012/", {"photo:2012/x"}, {"photo:2012/a/x", "photo:2012/x"}},
        {"/photo/201", {}, {}},
        {"/photo/*", {"photo:*/x"}, {"photo:*/a/x", "photo:*/x"}},
        {"/homes/alice", {"photo:alice/x"}, {"photo:alice/x"}},
    };
    for (const Case& test : cases) {
        for (const bool deep : {false, true}) {
            ASSERT_EQ(FILEIDXDBCreate((folder_ + "/out").c_str()), 0);
            Cond widened = node(FI_COL_PATH, FI_OP_BELOW, test.folder);
            Cond other = node(FI_COL_PATH, FI_OP_PATH, "/photo/none");
            Cond paths = node(FI_COL_PATH, FI_OP_PATH, test.folder, deep ? &widened : nullptr, &other);
            EXPECT_EQ(FILEIDXResultGetAndTableGen("PHOTO", &paths, nullptr, (folder_ + "/out").c_str(), nullptr,
                                                  nullptr, nullptr, nullptr, nullptr),
                      0);
            EXPECT_EQ(sorted(select(folder_ + "/out")), deep ? test.deep : test.direct) << test.folder;
            unlink((folder_ + "/out").c_str());
        }
    }
}

TEST_F(IndexTest, TreesThatSayNothingAreRefused) {
    Cond loop = node(FI_COL_NAME, FI_OP_WILDCARD, "*");
    loop.pAndNext = &loop;
    Cond ring = node(FI_COL_NAME, FI_OP_WILDCARD, "*");
    ring.pOrNext = &ring;
    std::vector<Cond> deep(5000, node(FI_COL_NAME, FI_OP_WILDCARD, "*"));
    for (size_t i = 1; i < deep.size(); ++i) deep[i - 1].pAndNext = &deep[i];
    Cond column = node(19, FI_OP_EQUAL, "1");
    Cond negative = node(-1, FI_OP_EQUAL, "1");
    Cond comparison = node(FI_COL_SIZE, 1, "1");
    Cond lessText = node(FI_COL_NAME, FI_OP_LESS, "1");
    Cond wildNumber = node(FI_COL_SIZE, FI_OP_WILDCARD, "1");
    Cond pathOfName = node(FI_COL_NAME, FI_OP_PATH, "1");
    for (Cond* tree :
         {&loop, &ring, deep.data(), &column, &negative, &comparison, &lessText, &wildNumber, &pathOfName}) {
        const FIQUERY query = {{}, 0, tree, 0, 1};
        unsigned long long count = 0;
        VLIBCErrSetEx(0, "", 0);
        EXPECT_LT(FILEIDXCountGet(db_.c_str(), &query, &count), 0) << tree->type << "." << tree->op;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    }
    // Many alternatives and a full value without a NUL are no reason to refuse.
    std::vector<Cond> wide(3000, node(FI_COL_NAME, FI_OP_WILDCARD, "x"));
    for (size_t i = 1; i < wide.size(); ++i) wide[i - 1].pOrNext = &wide[i];
    memset(wide[7].szValue, '*', sizeof wide[7].szValue);
    const FIQUERY query = {{}, 0, wide.data(), 0, 1};
    unsigned long long count = 0;
    EXPECT_EQ(FILEIDXCountGet(db_.c_str(), &query, &count), 0);
}

// What the order of pages is compared with.
bool comesBefore(const Record& a, const Record& b, int column, bool descending) {
    int difference = 0;
    if (column == FI_COL_SIZE) {
        difference = a.size < b.size ? -1 : static_cast<int>(a.size > b.size);
    } else {
        const std::string x = column == FI_COL_TYPE ? a.extension() : a.name();
        const std::string y = column == FI_COL_TYPE ? b.extension() : b.name();
        difference = VLIBCUnicodeUTF8StrCaseCmp(x.c_str(), y.c_str());
        if (difference == 0) difference = x.compare(y);
    }
    if (difference != 0) return descending ? difference > 0 : difference < 0;
    return std::tie(a.share, a.path) < std::tie(b.share, b.path);
}

TEST_F(IndexTest, PagesFollowTheOrderWhetherItIsKeptOrNot) {
    std::vector<Record> records = manyRecords();
    for (int i = 0; i < 12000; ++i) {
        records.push_back({.path = std::to_string(i % 10) + "/" +
                                   (i % 3 == 0 ? "Same" : "N\xC3\x89" + std::to_string(i % 500)) + "." +
                                   std::to_string(i),
                           .size = i % 40});
    }
    std::shuffle(records.begin(), records.end(), std::mt19937(3));
    for (Record& record : records) {
        if (record.isDir) record.size = 0;
        ASSERT_EQ(insert(db_, record), 0);
    }
    const Cond files = node(FI_COL_IS_DIR, FI_OP_EQUAL, "0");
    const auto check = [&](const char* when) {
        for (const auto& [column, descending] :
             {std::pair{FI_COL_NAME, false}, {FI_COL_NAME, true}, {FI_COL_SIZE, true}, {FI_COL_TYPE, false}}) {
            std::sort(records.begin(), records.end(),
                      [column = column, descending = descending](const auto& a, const auto& b) {
                          return comesBefore(a, b, column, descending);
                      });
            for (const bool filtered : {false, true}) {
                Rows expected;
                for (const Record& record : records) {
                    if (!filtered || !record.isDir) expected.push_back(record.address());
                }
                const Cond* cond = filtered ? &files : nullptr;
                const FISORT sort = {column, descending ? 1 : 0};
                EXPECT_EQ(select(db_, {{sort, {}}, 1, cond, 0, kEverything}), expected) << when << column;
                const Rows page(expected.begin() + 8190, expected.begin() + 8200);
                EXPECT_EQ(select(db_, {{sort, {}}, 1, cond, 8190, 10}), page) << when << column << filtered;
                EXPECT_EQ(select(db_, {{sort, {}}, 1, cond, 20000, 10}), Rows());
            }
        }
    };
    const FIQUERY first = {{{FI_COL_NAME, 0}, {}}, 1, nullptr, 0, 1};
    EXPECT_EQ(select(db_, first).size(), 1U);
    EXPECT_EQ(orders(), 0) << "an order was kept while records came in";
    check("while written ");
    age();
    check("first ");
    EXPECT_EQ(orders(), 4);
    check("kept ");
    records.push_back({"z/AAA"});
    ASSERT_EQ(insert(db_, records.back()), 0);
    EXPECT_EQ(select(db_, first).size(), 1U);
    EXPECT_EQ(orders(), 0) << "an order outlived a change";
    check("after a change ");
}

}  // namespace
