#include "vexo/index.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <algorithm>
#include <memory>
#include <random>
#include <set>
#include <string>
#include <vector>

#include "orvel/search_criteria.h"
#include "support/appliance.h"
#include "vexo/error.h"

namespace {

using Cond = __tag_FI_SQL_COND;
using Data = __tag_FI_FILE_INFO_DATA;
using Rows = std::vector<std::string>;

struct Record {
    std::string path;  // within the share
    bool isDir = false;
    int64_t size = 0;
    uint32_t uid = 0;
    uint32_t gid = 0;
    int64_t created = 0;
    int64_t accessed = 0;
    int64_t modified = 0;
    std::string owner = "0";
    std::string share = "photo";

    [[nodiscard]] std::string name() const { return path.substr(path.rfind('/') + 1); }
    [[nodiscard]] std::string parent() const {
        return path.find('/') == std::string::npos ? "" : path.substr(0, path.rfind('/'));
    }
    [[nodiscard]] std::string extension() const {
        const size_t dot = name().rfind('.');
        std::string out = dot == std::string::npos ? "" : name().substr(dot + 1);
        for (char& c : out) c = static_cast<char>(toupper(static_cast<unsigned char>(c)));
        return out;
    }
    [[nodiscard]] std::string address() const { return share + ":" + path; }
    [[nodiscard]] _tag_VEXOSTAT_ status() const {
        _tag_VEXOSTAT_ st{};
        st.st_mode = isDir ? S_IFDIR : S_IFREG;
        st.st_size = size;
        st.st_uid = uid;
        st.st_gid = gid;
        st.st_create = created;
        st.st_access = accessed;
        st.st_modify = modified;
        return st;
    }
};

int insert(const std::string& db, const Record& record) {
    const std::string name = record.name();
    const std::string parent = record.parent();
    const std::string extension = record.extension();
    Data data{};
    data.szShareRoot = "/volume1/photo";
    data.szShare = record.share.c_str();
    data.szName = name.c_str();
    data.szPath = record.path.c_str();
    data.szParent = parent.c_str();
    data.szExtension = extension.c_str();
    data.szPermission = "rwxr-xr-x";
    data.szOwner = record.owner.c_str();
    data.szGroup = "users";
    data.isDir = record.isDir ? 1 : 0;
    data.size = record.isDir ? 0 : record.size;
    data.created = record.created;
    data.accessed = record.accessed;
    data.modified = record.modified;
    data.mode = 0755;
    data.uid = record.uid;
    data.gid = record.gid;
    return FILEIDXOutputDBInsert(db.c_str(), &data);
}

BOOL collect(Data* data, void* rows) {
    static_cast<Rows*>(rows)->push_back(std::string(data->szShare) + ":" + data->szPath);
    return 1;
}

constexpr unsigned long kEverything = ~0UL;

Rows select(const std::string& db, FIQUERY query) {
    Rows rows;
    EXPECT_EQ(FILEIDXDBSelect(db.c_str(), &query, collect, &rows), 0);
    return rows;
}

Rows select(const std::string& db, const Cond* cond = nullptr) {
    return select(db, {{}, 0, cond, 0, kEverything});
}

Rows sorted(Rows rows) {
    std::sort(rows.begin(), rows.end());
    return rows;
}

class IndexTest : public support::ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addShare("photo", "vexo:index = yes\n");
        folder_ = shareRoot("photo") + "/tasks";
        support::makeFolder(folder_, 0777);
        db_ = folder_ + "/results";
        ASSERT_EQ(FILEIDXDBCreate(db_.c_str()), 0);
    }
    // A share's index of these records.
    void build(const std::vector<Record>& records) {
        char path[4096];
        ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_BUILD, path, sizeof path), 0);
        for (const Record& record : records) ASSERT_EQ(insert(path, record), 0);
        ASSERT_EQ(FILEIDXIndexEnd("photo", 1), 0);
    }
    std::string folder_;
    std::string db_;
};

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

}  // namespace
