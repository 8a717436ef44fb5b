// What the index finds, keeps and orders, held against the criteria and against plain sorting.

#include "index/index_name_order.h"
#include "index/index_store.h"
#include "orvel/search_criteria.h"
#include "platform/index_fixture.h"
#include "vexo/text.h"

namespace {

using namespace index_tests;

// What walks and indexes must agree on: names of every encoding, sizes, owners, times and kinds.
std::vector<Record> manyRecords() {
    const auto names = listOf<std::string>(
        "Report.TXT", "report", "r\xC3\xA9sum\xC3\xA9.pdf", "R\xC3\x89SUM\xC3\x89.PDF", "a_b%c*d?.jpg",
        "quote'\"\\.jpg", "\xE9t\xE9.jpg", "bad\xFF\xFEname", "\xC0\xAAstar", "ab", ".jpg", "IMG_0001.JPG", "tail\\",
        "nul\xC0\x80in", "\xED\xA0\x80surrogate", "*", "?x?", "end.\xED\xA0\x80", "two.A.b", "dot.");
    std::vector<Record> records;
    unsigned i = 0;
    for (const char* folder : {"", "2012/", "2012/a/", "2012b/", "20_2/", "*/", "\xFF/"}) {
        for (const auto& name : names) {
            ++i;
            Record record{folder + name};
            record.isDir = i % 7 == 0;
            record.size = i % 5 == 0 ? INT64_MAX - i : i * 13LL;
            record.uid = kAliceUid + i % 3;
            record.owner = std::vector<std::string>{"alice", "bob", "carol"}[i % 3];
            record.created = i * 100LL;
            record.modified = i % 11 == 0 ? -1LL * i : i * 50LL;
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
        static const std::vector<const char*> extensions = {"jpg,pdf", "txt", "", "JPG,,\xED\xA0\x81,p?f", "a.b,x,b.C"};
        const auto pick = [&](const auto& from) { return from[random() % from.size()]; };
        const auto field = static_cast<FileSearch::_tag_FIND_FIELD_>(random() % 9);
        const char* op = field == FileSearch::FIND_TYPE ? (random() % 2 == 0 ? "dir" : "file") : pick(operators);
        const char* value = pick(numbers);
        if (field == FileSearch::FIND_NAME) value = pick(patterns);
        if (field == FileSearch::FIND_EXTENSION) value = pick(extensions);
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
        _tag_VEXOSTAT_ status{};
        status.st_mode = record.isDir ? S_IFDIR : S_IFREG;
        status.st_size = record.size;
        status.st_uid = record.uid;
        status.st_gid = kUsersGid;
        status.st_create = record.created;
        status.st_access = record.created / 10;
        status.st_modify = record.modified;
        return std::all_of(list.begin(), list.end(), [&](auto* one) { return (*one)(record.name().c_str(), status); });
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
        Addresses expected;
        for (const Record& record : records) {
            if (criteria.match(record)) expected.push_back(record.address());
        }
        found += expected.size();
        EXPECT_EQ(select(db_, tree), sorted(expected)) << criteria.text;
        shown_.descending = round % 2;
        EXPECT_EQ(searched(tree), sorted(expected)) << criteria.text;
    }
    EXPECT_GT(found, records.size() * 10);
}

BOOL keepLine(Data* data, void* line) {
    std::string& text = *static_cast<std::string*>(line);
    for (const char* field : {data->szShareRoot, data->szShare, data->szName, data->szPath, data->szParent,
                              data->szExtension, data->szPermission, data->szOwner, data->szGroup})
        text += std::string(field) + "|";
    for (const int64_t number : {int64_t{data->isDir}, data->size, data->created, data->changed, data->accessed,
                                 data->modified, int64_t{data->mode}, int64_t{data->uid}, int64_t{data->gid}})
        text += std::to_string(number) + "|";
    return 1;
}

TEST_F(IndexTest, RecordsStayWhatTheyAre) {
    const std::string longName(255, '\xFE');
    Data data{};
    std::tie(data.szShareRoot, data.szShare, data.szName, data.szPath, data.szParent) =
        std::make_tuple("/volume1/photo", "photo", longName.c_str(), "p/\xFFn'\"%;", "p");
    std::tie(data.szExtension, data.szPermission, data.szOwner, data.szGroup) =
        std::make_tuple("EXT", "rwx", "DOM\\\xE4", "");
    std::tie(data.size, data.created, data.changed, data.modified) = std::make_tuple(INT64_MAX, INT64_MIN, -1, 1);
    data.isDir = 1;
    data.mode = data.uid = UINT32_MAX;
    std::string expected, found;
    keepLine(&data, &expected);
    ASSERT_EQ(FILEIDXDBInsert(db_.c_str(), &data, 1), 0);
    data.size = 1;
    ASSERT_EQ(FILEIDXDBInsert(db_.c_str(), &data, 1), 0) << "a record that is there is left as it is";
    const FIQUERY all = everything();
    ASSERT_EQ(FILEIDXDBSelect(db_.c_str(), &all, keepLine, &found), 0);
    EXPECT_EQ(found, expected);
}

TEST_F(IndexTest, TreesThatSayNothingAreRefused) {
    Cond loop = node(FI_COL_NAME, FI_OP_WILDCARD, "*");
    loop.pAndNext = &loop;
    Cond ring = node(FI_COL_NAME, FI_OP_WILDCARD, "*");
    ring.pOrNext = &ring;
    std::vector<Cond> deep(5000, node(FI_COL_NAME, FI_OP_WILDCARD, "*"));
    for (size_t i = 1; i < deep.size(); ++i) deep[i - 1].pAndNext = &deep[i];
    for (const Cond* tree : {&loop, &ring, deep.data()}) EXPECT_EQ(countError(db_, tree), VEXO_ERR_PARAMETER);
    for (const auto& [column, op] :
         Rows<int, int>{row(19, FI_OP_EQUAL), row(-1, FI_OP_EQUAL), row(FI_COL_SIZE, 1), row(FI_COL_NAME, FI_OP_LESS),
                        row(FI_COL_SIZE, FI_OP_WILDCARD), row(FI_COL_NAME, FI_OP_PATH)}) {
        const Cond tree = node(column, op, "1");
        EXPECT_EQ(countError(db_, &tree), VEXO_ERR_PARAMETER) << column << "." << op;
    }
    // Many alternatives and a full value without a NUL are no reason to refuse.
    std::vector<Cond> wide(3000, node(FI_COL_NAME, FI_OP_WILDCARD, "x"));
    for (size_t i = 1; i < wide.size(); ++i) wide[i - 1].pOrNext = &wide[i];
    memset(wide[7].szValue, '*', sizeof wide[7].szValue);
    EXPECT_EQ(countError(db_, wide.data()), 0);
}

// A pattern is cut as the criterion cuts it where it is one; what filters a page of results is not.
TEST_F(IndexTest, LongPatternsForNames) {
    build({{"ab"}, {"x"}});
    for (const char* name : {"ab", "x"}) ASSERT_EQ(insert(db_, {name}), 0);
    const Cond ends = node(FI_COL_NAME, FI_OP_WILDCARD, std::string(600, '*') + "x");
    EXPECT_EQ(searched(&ends), (Addresses{"photo:ab", "photo:x"}));
    EXPECT_EQ(select(db_, &ends), Addresses{"photo:x"});
}

// Whatever way a search takes, records that are written anew while it copies are found once.
TEST_F(IndexTest, NoRecordIsLostWhenTheIndexChanges) {
    std::vector<Record> records;
    for (int i = 0; i < 300; ++i) records.push_back({.path = "img" + std::to_string(i)});
    build(records);
    struct Change {
        const std::vector<Record>& records;
        int asked;
    };
    const auto writeAnew = [](const char*, void* arg) -> BOOL {
        auto& [all, asked] = *static_cast<Change*>(arg);
        if (asked++ > 0) return 1;
        char path[4096];
        EXPECT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path, sizeof path), 0);
        for (int i = 299; i >= 100; --i) {
            const Cond where = node(FI_COL_PATH, FI_OP_EQUAL, all[i].path);
            EXPECT_EQ(FILEIDXDBDel(path, &where), 0);
        }
        EXPECT_EQ(FILEIDXDBFlush(path), 0);
        for (int i = 299; i >= 100; --i) EXPECT_EQ(insert(path, all[i]), 0);
        EXPECT_EQ(FILEIDXIndexEnd("photo", 1), 0);
        return 1;
    };
    for (const char* pattern : {"*", "*img*", "*9*"}) {
        const Cond cond = node(FI_COL_NAME, FI_OP_WILDCARD, pattern);
        const Addresses before = searched(&cond);
        const std::string out = folder_ + "/changed";
        Change change{records, 0};
        ASSERT_EQ(FILEIDXDBCreate(out.c_str()), 0);
        ASSERT_EQ(FILEIDXResultGetAndTableGen("photo", nullptr, &cond, out.c_str(), nullptr, nullptr, nullptr,
                                              writeAnew, &change),
                  0);
        EXPECT_EQ(select(out), before) << pattern;
        unlink(out.c_str());
    }
}

// Rows may be older than a move of the share's folder, and change between finding and copying.
TEST_F(IndexTest, WhatIsCopiedIsTrueNow) {
    std::vector<Record> records;
    for (int i = 0; i < 300; ++i) records.push_back({.path = std::to_string(i), .size = 5});
    build(records);
    const Cond five = node(FI_COL_SIZE, FI_OP_EQUAL, "5");
    const std::string index = systemRoot() + "/var/lib/vexo/index/photo.db";
    int asked = 0;
    struct Change {
        const std::string& index;
        int& asked;
    } change{index, asked};
    const auto changeAtFirst = [](const char*, void* arg) -> BOOL {
        const auto& [file, count] = *static_cast<Change*>(arg);
        if (count++ == 0) ask(file, "UPDATE record SET size=6 WHERE path='299' OR path='0'");
        return 1;
    };
    ASSERT_EQ(FILEIDXResultGetAndTableGen("photo", nullptr, &five, db_.c_str(), nullptr, nullptr, nullptr,
                                          changeAtFirst, &change),
              0);
    EXPECT_EQ(asked, 299);
    int cancel = 0;
    const std::string stopped = folder_ + "/stopped";
    ASSERT_EQ(FILEIDXDBCreate(stopped.c_str()), 0);
    const auto stopAtFirst = [](Data*, void* flag) { return *static_cast<int*>(flag) = 1; };
    for (int time = 0; time < 2; ++time) {  // the second one is stopped from the begin, which is no failure
        ASSERT_EQ(FILEIDXResultGetAndTableGen("photo", nullptr, nullptr, stopped.c_str(), stopAtFirst, &cancel, &cancel,
                                              nullptr, nullptr),
                  0);
    }
    EXPECT_EQ(select(stopped).size(), 1U);
    const Addresses found = select(db_);
    EXPECT_EQ(found.size(), 299U) << "the first part was read before";
    EXPECT_EQ(std::count(found.begin(), found.end(), "photo:299"), 0);
    std::string line;
    const FIQUERY one = {{}, 0, nullptr, 0, 1};
    ASSERT_EQ(FILEIDXDBSelect(db_.c_str(), &one, keepLine, &line), 0);
    EXPECT_EQ(line.substr(0, line.find('|')), shareRoot("photo"));
}

// What the order of pages is compared with: records with the text that is compared.
using Keyed = std::pair<std::string, const Record*>;

bool comesBefore(const Keyed& a, const Keyed& b, int column, bool descending) {
    int difference = a.second->size < b.second->size ? -1 : static_cast<int>(a.second->size > b.second->size);
    if (column != FI_COL_SIZE) {
        difference = VLIBCUnicodeUTF8StrCaseCmp(a.first.c_str(), b.first.c_str());
        if (difference == 0) difference = a.first.compare(b.first);
    }
    if (difference != 0) return descending ? difference > 0 : difference < 0;
    return std::tie(a.second->share, a.second->path) < std::tie(b.second->share, b.second->path);
}

TEST_F(IndexTest, PagesFollowTheOrderWhetherItIsKeptOrNot) {
    std::vector<Record> records = manyRecords();
    for (int i = 0; i < 9900; ++i) {
        const std::string name = i % 3 == 0 ? "Same" : "N\xC3\x89" + std::to_string(i % 500);
        records.push_back({.path = std::to_string(i % 10) + "/" + name + "." + std::to_string(i), .size = i % 40});
    }
    std::shuffle(records.begin(), records.end(), std::mt19937(3));
    for (Record& record : records) {
        if (record.isDir) record.size = 0;
        ASSERT_EQ(insert(db_, record), 0);
    }
    const Cond files = node(FI_COL_IS_DIR, FI_OP_EQUAL, "0");
    const auto check = [&](const char* when) {
        for (const auto& [column, descending] :
             {std::pair{FI_COL_NAME, 0}, {FI_COL_NAME, 1}, {FI_COL_SIZE, 1}, {FI_COL_TYPE, 0}}) {
            SCOPED_TRACE(when + std::to_string(column));
            std::vector<Keyed> order;
            for (const Record& record : records)
                order.emplace_back(column == FI_COL_TYPE ? record.extension() : record.name(), &record);
            std::sort(order.begin(), order.end(), [column = column, descending = descending](auto& a, auto& b) {
                return comesBefore(a, b, column, descending != 0);
            });
            for (const Cond* cond : {static_cast<const Cond*>(nullptr), &files}) {
                Addresses expected;
                for (const auto& [text, record] : order) {
                    if (cond == nullptr || !record->isDir) expected.push_back(record->address());
                }
                const FISORT sort = {column, descending};
                EXPECT_TRUE(select(db_, {{sort, {}}, 1, cond, 0, ~0UL}) == expected);
                const Addresses page(expected.begin() + 8190, expected.begin() + 8200);
                EXPECT_EQ(select(db_, {{sort, {}}, 1, cond, 8190, 10}), page);
            }
        }
    };
    const auto keptAfterOnePage = [this] {
        EXPECT_EQ(select(db_, {{{FI_COL_NAME, 0}, {}}, 1, nullptr, 0, 1}).size(), 1U);
        return ask("SELECT count(DISTINCT id>>32) FROM ranking");
    };
    EXPECT_EQ(keptAfterOnePage(), 0) << "an order was kept while records came in";
    check("while written ");
    // As if the search had ended a while ago.
    vexo::fileindex::closeDatabases();
    ask("UPDATE state SET written=1");
    check("first ");
    EXPECT_EQ(keptAfterOnePage(), 4);
    check("kept ");
    records.push_back({"z/AAA"});
    ASSERT_EQ(insert(db_, records.back()), 0);
    EXPECT_EQ(keptAfterOnePage(), 0) << "an order outlived a change";
    check("after a change ");
    EXPECT_EQ(select(db_, {{{FI_COL_NAME, 0}, {}}, 1, nullptr, 20000, 10}), Addresses());
}

// The addresses that satisfy, in the order by name that the index keeps.
Addresses inKeptOrder(const Cond* cond, bool descending) {
    using namespace vexo::fileindex;
    const std::unique_ptr<Database> index = openIndex("photo");
    const std::optional<Condition> condition = readCondition(cond, {.ofCriteria = true});
    std::unique_ptr<const Names> names = index == nullptr ? nullptr : openNames("photo", *index);
    if (names == nullptr || !condition) return {"no names"};
    NameOrder order(*index, *condition, std::move(names), descending, Database::Clock::now() + std::chrono::hours(1));
    std::vector<OwnedRecord> found;
    while (!order.atEnd()) EXPECT_TRUE(order.read(70, found));
    EXPECT_TRUE(order.wasWhole());
    Addresses addresses;
    for (const OwnedRecord& record : found) addresses.push_back(std::string("photo:") + record.view().szPath);
    return addresses;
}

TEST_F(IndexTest, NamesKeepTheirOrderWhateverChanges) {
    std::vector<Record> records = manyRecords();
    constexpr const char* kLong = "*.an extension that nobody would think of";
    for (int i = 0; i < 300; ++i) records.push_back({.path = std::to_string(i % 50) + "/same", .share = "photo"});
    for (int i = 0; i < 30; ++i) records.push_back({.path = std::to_string(i) + kLong, .share = "photo"});
    for (int i = 0; i < 30; ++i) records.push_back({.path = std::to_string(i) + ".\xC3\x89", .share = "photo"});
    std::sort(records.begin(), records.end(), [](auto& a, auto& b) { return a.path < b.path; });
    records.erase(std::unique(records.begin(), records.end(), [](auto& a, auto& b) { return a.path == b.path; }),
                  records.end());
    std::mt19937 random(3);
    std::shuffle(records.begin(), records.end(), random);
    build(records);
    const Cond every = node(FI_COL_NAME, FI_OP_WILDCARD, "*");
    const auto like = [](const char* pattern) { return node(FI_COL_NAME, FI_OP_WILDCARD, pattern); };
    Cond jpg = like("*.jpg"), pdf = like("*.\xC3\xA9"), beginning = like("*b*"), long_ = like(kLong);
    const Cond two = like("*.a.B"), empty = like("*.");
    pdf.pOrNext = &jpg;
    long_.pOrNext = &pdf;
    beginning.pAndNext = &jpg;
    const std::pair<const Cond*, bool> conditions[] = {{&every, true}, {&jpg, true},    {&long_, true},
                                                       {&two, false},  {&empty, false}, {&beginning, false}};
    const auto check = [&](const std::string& when) {
        for (const bool descending : {false, true}) {
            std::vector<Keyed> order;
            for (const Record& record : records) order.emplace_back(record.name(), &record);
            std::sort(order.begin(), order.end(),
                      [&](auto& a, auto& b) { return comesBefore(a, b, FI_COL_NAME, descending); });
            for (const auto& [cond, isMany] : conditions) {
                const Addresses found = searched(cond);
                Addresses expected;
                for (const auto& [name, record] : order) {
                    if (std::binary_search(found.begin(), found.end(), record->address()))
                        expected.push_back(record->address());
                }
                EXPECT_EQ(expected.size(), found.size());
                EXPECT_GT(found.size(), isMany ? 20U : 0U) << cond->szValue;
                EXPECT_EQ(inKeptOrder(cond, descending), expected) << when << descending << cond->szValue;
            }
        }
    };
    check("built");
    const std::string file = systemRoot() + "/var/lib/vexo/index/photo.names";
    const auto update = [&](int changes) {
        ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path_, sizeof path_), 0);
        for (int i = 0; i < changes; ++i) {
            const size_t at = random() % records.size();
            const Cond where = node(FI_COL_PATH, FI_OP_EQUAL, records[at].path);
            ASSERT_EQ(FILEIDXDBDel(path_, &where), 0);
            if (i % 3 == 0) {
                records.erase(records.begin() + static_cast<std::ptrdiff_t>(at));
            } else {
                records[at].path = std::to_string(random() % 9) + "/" + "SameR"[random() % 5] + std::to_string(i);
            }
            if (i % 3 != 0) {
                ASSERT_EQ(insert(path_, records[at]), 0);
            }
        }
        ASSERT_EQ(FILEIDXIndexEnd("photo", 1), 0);
    };
    const std::string before = readFile(file);
    update(40);
    EXPECT_EQ(readFile(file), before) << "packed again for a few changes";
    check("a few changes ");
    for (int i = 0; i < 1100; ++i)
        records.push_back({.path = "more/" + std::to_string(random() % 700) + "." + std::to_string(i)});
    ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_UPDATE, path_, sizeof path_), 0);
    for (size_t i = records.size() - 1100; i < records.size(); ++i) ASSERT_EQ(insert(path_, records[i]), 0);
    ASSERT_EQ(FILEIDXIndexEnd("photo", 1), 0);
    EXPECT_NE(readFile(file), before);
    check("packed again ");

    // One that is torn, foreign or gone: searches do without, and the next update makes it.
    const std::string good = readFile(file);
    for (const std::string& bad : {good.substr(0, good.size() / 2), "VEXONAM0" + good.substr(8), before,
                                   good.substr(0, 20), good.substr(0, 8) + "other" + good.substr(13), std::string()}) {
        writeFile(file, bad, 0600);
        if (bad.empty()) unlink(file.c_str());
        EXPECT_EQ(searched(&every).size(), records.size());
        if (bad != before) {
            EXPECT_EQ(inKeptOrder(&every, false), Addresses{"no names"}) << bad.size();
        }
        update(1);
        EXPECT_EQ(inKeptOrder(&every, false).size(), records.size()) << "made anew";
    }
    check("at the end ");
    const FISORT sort = {FI_COL_NAME, 1};
    const Addresses expected = inKeptOrder(&every, true);
    ASSERT_EQ(FILEIDXResultGetShown("photo", nullptr, &every, db_.c_str(), nullptr, nullptr, nullptr, nullptr, nullptr,
                                    &sort),
              0);
    EXPECT_EQ(select(db_, {{sort, {}}, 1, nullptr, 0, ~0UL}), expected);
}

// Two searches of one user that store what they find at the same time.
TEST_F(IndexTest, ResultsThatGrowTogetherAreBoundedTogether) {
    const auto fill = [](const std::string& db, int most) {
        int stored = 0;
        while (stored < most && insert(db, {std::to_string(stored)}) == 0) ++stored;
        return stored;
    };
    setSetting("search_results_mib", "4");
    const std::string other = folder_ + "/other";
    ASSERT_EQ(FILEIDXDBCreate(other.c_str()), 0);
    ASSERT_EQ(fill(db_, 1), 1) << "begun while there was room for it alone";
    ASSERT_EQ(fill(other, 15000), 15000);
    ASSERT_EQ(countError(other), 0) << "which stores them";
    const int alone = 4 * (1 << 20) / static_cast<int>(fs::file_size(other) / 15000);
    EXPECT_LT(fill(db_, alone), alone - 8192);
}

}  // namespace
