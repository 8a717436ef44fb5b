// Searches on a real appliance: run one, read its results, keep an index of a share.
#ifndef ORVEL_TESTS_SEARCH_FIXTURE_H
#define ORVEL_TESTS_SEARCH_FIXTURE_H

#include "orvel/directory_walker.h"
#include "orvel/file_record.h"
#include "orvel/identity.h"
#include "orvel/search_criteria.h"
#include "orvel/search_task.h"
#include "orvel/search_walker.h"
#include "support/testing.h"

namespace support {

// One field of a search request.
struct Ask {
    int field;
    const char *op, *value;
};

struct Query {
    std::vector<std::string> folders;
    std::vector<Ask> asks;
    bool currentOnly = false;
};

// The criteria of a query, deleted at the end.
class Criteria {
 public:
    explicit Criteria(const std::vector<Ask>& asks = {}) {
        for (const Ask& ask : asks) EXPECT_TRUE(add(ask.field, ask.op, ask.value));
        for (FileSearch::FindComp* one : all) {
            if (auto* time = dynamic_cast<FileSearch::FindATimeComp*>(one)) accessTimes.push_back(time);
        }
    }
    ~Criteria() {
        for (FileSearch::FindComp* one : all) delete one;
    }
    Criteria(const Criteria&) = delete;
    Criteria& operator=(const Criteria&) = delete;

    bool add(int field, const char* op, const char* value) {
        return FileSearch::FindFactory::createFindOp(static_cast<FileSearch::_tag_FIND_FIELD_>(field), op, value, all);
    }

    std::vector<FileSearch::FindComp*> all;
    std::vector<FileSearch::FindATimeComp*> accessTimes;
};

// "share/path" to every other column but the access time, which reading a folder changes.
using Found = std::map<std::string, std::string>;

inline std::string keyOf(const __tag_FI_FILE_INFO_DATA& record) {
    return std::string(record.szShare) + "/" + record.szPath;
}

inline BOOL addRow(__tag_FI_FILE_INFO_DATA* record, void* rows) {
    std::string text;
    for (const char* column : {record->szShareRoot, record->szName, record->szParent, record->szExtension,
                               record->szPermission, record->szOwner, record->szGroup})
        (text += column) += '|';
    for (const int64_t number : {int64_t{record->isDir}, record->size, record->created, record->changed,
                                 record->modified, int64_t{record->mode}, int64_t{record->uid}, int64_t{record->gid}})
        (text += std::to_string(number)) += '|';
    EXPECT_TRUE(static_cast<Found*>(rows)->emplace(keyOf(*record), text).second) << "twice: " << keyOf(*record);
    return 1;
}

inline Found rowsOf(FileSearch::OrvSearchDBTask& task) {
    Found rows;
    unsigned long long count = 0;
    EXPECT_TRUE(task.queryResult(0, 1000000, nullptr, nullptr, nullptr, nullptr, addRow, &rows, &count));
    EXPECT_EQ(count, rows.size());
    return rows;
}

// One search; its task goes with it.
class OneSearch {
 public:
    OneSearch(const char* user, const std::vector<std::string>& folders,
              const std::vector<FileSearch::FindComp*>& criteria, bool withFlag = true)
        : walker(user, nullptr, withFlag ? &flag : nullptr),
          ready(walker.init(folders, criteria)),
          task(walker.getDBVol(), user, walker.getDBTaskId()) {}
    ~OneSearch() { task.remove(); }
    OneSearch(const OneSearch&) = delete;
    OneSearch& operator=(const OneSearch&) = delete;

    int flag = 0;
    FileSearch::OrvSearchWalker walker;
    const bool ready;
    FileSearch::OrvSearchDBTask task;
};

// The rows of a search that must succeed.
inline Found search(const char* user, const Query& query) {
    const Criteria criteria(query.asks);
    OneSearch run(user, query.folders, criteria.all);
    run.walker.setSearchCurrentDir(query.currentOnly);
    EXPECT_TRUE(run.ready && run.walker.Walk(criteria.accessTimes));
    return rowsOf(run.task);
}

inline std::vector<std::string> keysOf(const Found& rows) {
    std::vector<std::string> keys;
    for (const auto& [key, text] : rows) keys.push_back(key);
    return keys;
}

// Puts every file and folder of a share into its index.
class Indexer : public OrvDirectoryWalkerCallBack {
 public:
    Indexer(const std::string& share, const std::string& root) {
        char path[4096];
        EXPECT_GE(FILEIDXIndexBegin(share.c_str(), FI_INDEX_BUILD, path, sizeof path), 0);
        database_ = path;
        OrvDirectoryWalker walker(ENUM_IGNORE_ALL_ERR, nullptr);
        EXPECT_TRUE(walker.Walk_TopDown("", root, root, *this, &share, true));
        EXPECT_GE(FILEIDXIndexEnd(share.c_str(), 1), 0);
    }
    bool operator()(const std::string&, const std::string& root, const std::string& realPath, const std::string& name,
                    _tag_VEXOSTAT_& status, const std::string* share) override {
        if (!S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode)) return true;
        EXPECT_EQ(record_.fill(realPath, root, *share, name, status), FileSearch::PathFault::kNone);
        EXPECT_GE(FILEIDXDBInsert(database_.c_str(), &record_.data(), 1), 0);
        return true;
    }

 private:
    std::string database_;
    FileSearch::FileRecord record_;
};

// The platform keeps databases open for the process: what uses them runs in one of its own (inChild).
class SearchFixture : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        for (const char* share : {"photo", "docs", "homes"})
            addShare(share, "read only = no\nvalid users = alice, bob, carol\nread list = bob\nvexo:index = yes\n");
    }
    static void makeFile(const std::string& path, off_t size = 0, uid_t uid = 0, gid_t gid = 0, time_t modified = 0,
                         time_t accessed = 0) {
        writeFile(path, "");
        EXPECT_EQ(truncate(path.c_str(), size), 0);
        EXPECT_TRUE(geteuid() != 0 || chown(path.c_str(), uid, gid) == 0);
        const timespec times[] = {{accessed, 0}, {modified, 0}};
        EXPECT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
    }
    static void buildIndex(const std::vector<std::string>& shares) {
        for (const std::string& share : shares) Indexer(share, shareRoot(share));
    }
};

}  // namespace support

#endif
