// Records, conditions and databases for the tests of the file index.
#ifndef ORVEL_TESTS_PLATFORM_INDEX_FIXTURE_H
#define ORVEL_TESTS_PLATFORM_INDEX_FIXTURE_H

#include <sqlite3.h>

#include "index/index_connections.h"
#include "support/testing.h"
#include "vexo/index_shown.h"
#include "vexo/stat.h"

namespace index_tests {

using Cond = __tag_FI_SQL_COND;
using Data = __tag_FI_FILE_INFO_DATA;
using Addresses = std::vector<std::string>;  // "share:path" of records

struct Record {
    std::string path;  // within the share
    bool isDir = false;
    int64_t size = 0;
    uint32_t uid = 0;
    int64_t created = 0;
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
    data.accessed = record.created / 10;
    data.modified = record.modified;
    data.uid = record.uid;
    data.gid = kUsersGid;
    return FILEIDXOutputDBInsert(db.c_str(), &data);
}

inline BOOL collect(Data* data, void* addresses) {
    static_cast<Addresses*>(addresses)->push_back(std::string(data->szShare) + ":" + data->szPath);
    return 1;
}

inline FIQUERY everything(const Cond* cond = nullptr) {
    return {{}, 0, cond, 0, ~0UL};
}

inline Addresses select(const std::string& db, FIQUERY query) {
    Addresses found;
    EXPECT_EQ(FILEIDXDBSelect(db.c_str(), &query, collect, &found), 0);
    return found;
}

inline Addresses sorted(Addresses addresses) {
    std::sort(addresses.begin(), addresses.end());
    return addresses;
}

inline Addresses select(const std::string& db, const Cond* cond = nullptr) {
    return sorted(select(db, everything(cond)));
}

// The error of asking for a count, 0 when that works.
inline int countError(const std::string& db, const Cond* cond = nullptr) {
    const FIQUERY query = everything(cond);
    unsigned long long count = 0;
    VLIBCErrSetEx(0, "", 0);
    return FILEIDXCountGet(db.c_str(), &query, &count) < 0 ? VLIBCErrGet() : 0;
}

class IndexTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addShare("photo", "vexo:index = yes\n");
        folder_ = shareRoot("photo") + "/tasks";
        makeFolder(folder_, 0777);
        db_ = folder_ + "/results";
        ASSERT_EQ(FILEIDXDBCreate(db_.c_str()), 0);
    }
    // A share's index of these records.
    void build(const std::vector<Record>& records) {
        ASSERT_EQ(FILEIDXIndexBegin("photo", FI_INDEX_BUILD, path_, sizeof path_), 0);
        for (const Record& record : records) ASSERT_EQ(insert(path_, record), 0);
        ASSERT_EQ(FILEIDXIndexEnd("photo", 1), 0);
    }
    // What a search of the share's index finds.
    Addresses searched(const Cond* cond, const Cond* paths = nullptr) {
        const std::string out = folder_ + "/out";
        EXPECT_EQ(FILEIDXDBCreate(out.c_str()), 0);
        EXPECT_EQ(FILEIDXResultGetShown("PHOTO", paths, cond, out.c_str(), nullptr, nullptr, nullptr, nullptr, nullptr,
                                        &shown_),
                  0);
        Addresses found = select(out);
        unlink(out.c_str());
        return found;
    }
    // Runs SQL behind the platform's back; the last number that it gives.
    int64_t ask(const char* sql) { return ask(db_, sql); }
    static int64_t ask(const std::string& file, const char* sql) {
        sqlite3* db = nullptr;
        int64_t answer = -1;
        EXPECT_EQ(sqlite3_open(file.c_str(), &db), SQLITE_OK);
        const auto take = [](void* out, int, char** values, char**) {
            *static_cast<int64_t*>(out) = strtoll(values[0], nullptr, 10);
            return 0;
        };
        EXPECT_EQ(sqlite3_exec(db, sql, take, &answer, nullptr), SQLITE_OK) << sqlite3_errmsg(db);
        sqlite3_close(db);
        return answer;
    }
    FISORT shown_ = {FI_COL_NAME, 0};
    std::string folder_;
    std::string db_;
    char path_[4096] = "";  // that of the index that is written
};

// A condition; nodes are linked by hand.
inline Cond node(int type, int op, const std::string& value, Cond* andNext = nullptr, Cond* orNext = nullptr) {
    Cond cond{andNext, orNext, static_cast<__tag_FI_SQL_COND_TYPE>(type), static_cast<__tag_FI_SQL_COND_OP>(op), {}};
    snprintf(cond.szValue, sizeof cond.szValue, "%s", value.c_str());
    return cond;
}

}  // namespace index_tests

#endif
