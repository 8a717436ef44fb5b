// Records, conditions and databases for the tests of the file index.
#ifndef ORVEL_TESTS_PLATFORM_INDEX_FIXTURE_H
#define ORVEL_TESTS_PLATFORM_INDEX_FIXTURE_H

#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/stat.h>

#include <algorithm>
#include <string>
#include <vector>

#include "index_connections.h"
#include "support/appliance.h"
#include "vexo/index.h"
#include "vexo/stat.h"

namespace index_tests {

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

inline int insert(const std::string& db, const Record& record) {
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

inline BOOL collect(Data* data, void* rows) {
    static_cast<Rows*>(rows)->push_back(std::string(data->szShare) + ":" + data->szPath);
    return 1;
}

constexpr unsigned long kEverything = ~0UL;

inline Rows select(const std::string& db, FIQUERY query) {
    Rows rows;
    EXPECT_EQ(FILEIDXDBSelect(db.c_str(), &query, collect, &rows), 0);
    return rows;
}

inline Rows select(const std::string& db, const Cond* cond = nullptr) {
    return select(db, {{}, 0, cond, 0, kEverything});
}

inline Rows sorted(Rows rows) {
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
    // One number of the database, asked behind the platform's back.
    int64_t ask(const char* sql) {
        sqlite3* db = nullptr;
        int64_t answer = -1;
        EXPECT_EQ(sqlite3_open(db_.c_str(), &db), SQLITE_OK);
        const auto take = [](void* out, int, char** values, char**) {
            *static_cast<int64_t*>(out) = strtoll(values[0], nullptr, 10);
            return 0;
        };
        EXPECT_EQ(sqlite3_exec(db, sql, take, &answer, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
        sqlite3_close(db);
        return answer;
    }
    int64_t orders() { return ask("SELECT count(DISTINCT id>>32) FROM ranking"); }
    // As if the search had ended a while ago.
    void age() {
        vexo::fileindex::closeDatabases();
        ask("UPDATE state SET written=1;SELECT 0");
    }
    std::string folder_;
    std::string db_;
};

// A condition; nodes are linked by hand.
inline Cond node(int type, int op, const std::string& value, Cond* andNext = nullptr, Cond* orNext = nullptr) {
    Cond cond{andNext, orNext, static_cast<__tag_FI_SQL_COND_TYPE>(type), static_cast<__tag_FI_SQL_COND_OP>(op), {}};
    snprintf(cond.szValue, sizeof cond.szValue, "%s", value.c_str());
    return cond;
}

}  // namespace index_tests

#endif
