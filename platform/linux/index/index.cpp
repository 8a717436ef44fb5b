// The operations on databases of records.
#include "vexo/index.h"

#include <algorithm>
#include <exception>
#include <vector>

#include "failure.h"
#include "fault_gate.h"
#include "index/index_columns.h"
#include "index/index_connections.h"
#include "index/index_order.h"
#include "index/index_reading.h"

namespace {

using vexo::fileindex::Lease;

int outOfMemory() {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int badArgument() {
    return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
}

int insert(const char* db, const __tag_FI_FILE_INFO_DATA* records, int count) {
    if (db == nullptr || records == nullptr || count < 0) return badArgument();
    const Lease lease(db);
    if (!lease) return -1;
    return std::all_of(records, records + count, [&](const auto& record) { return lease->insert(record); }) ? 0 : -1;
}

}  // namespace

int FILEIDXDBCreate(const char* path) try {
    VEXO_GATE("FILEIDXDBCreate", -1);
    if (path == nullptr) return badArgument();
    return vexo::fileindex::Database::create(path) ? 0 : -1;
} catch (const std::exception&) {
    return outOfMemory();
}

int FILEIDXOutputDBInsert(const char* db, const __tag_FI_FILE_INFO_DATA* record) try {
    VEXO_GATE("FILEIDXOutputDBInsert", -1);
    return insert(db, record, 1);
} catch (const std::exception&) {
    return outOfMemory();
}

int FILEIDXDBInsert(const char* db, const __tag_FI_FILE_INFO_DATA* records, int count) try {
    VEXO_GATE("FILEIDXDBInsert", -1);
    return insert(db, records, count);
} catch (const std::exception&) {
    return outOfMemory();
}

int FILEIDXDBUpdate(const char* db, const __tag_FI_SQL_COND* set, const __tag_FI_SQL_COND* where) try {
    VEXO_GATE("FILEIDXDBUpdate", -1);
    if (db == nullptr || set == nullptr || where == nullptr) return badArgument();
    const Lease lease(db);
    return lease && lease->update(set, where) ? 0 : -1;
} catch (const std::exception&) {
    return outOfMemory();
}

int FILEIDXDBDel(const char* db, const __tag_FI_SQL_COND* where) try {
    VEXO_GATE("FILEIDXDBDel", -1);
    if (db == nullptr || where == nullptr) return badArgument();
    const Lease lease(db);
    return lease && lease->remove(where) ? 0 : -1;
} catch (const std::exception&) {
    return outOfMemory();
}

int FILEIDXDBFlush(const char* db) try {
    VEXO_GATE("FILEIDXDBFlush", -1);
    if (db == nullptr) return badArgument();
    const Lease lease(db);
    return lease && lease->commit() ? 0 : -1;
} catch (const std::exception&) {
    return outOfMemory();
}

int FILEIDXCountGet(const char* db, const FIQUERY* query, unsigned long long* count) try {
    VEXO_GATE("FILEIDXCountGet", -1);
    if (db == nullptr || query == nullptr || count == nullptr) return badArgument();
    const auto condition = vexo::fileindex::readCondition(query->cond, {});
    if (!condition) return -1;
    const Lease lease(db);
    if (!lease || !lease->commit()) return -1;
    vexo::fileindex::State state{};
    if (query->cond == nullptr ? !lease->readState(state) : !lease->count(*condition, state.records)) return -1;
    *count = static_cast<unsigned long long>(state.records);
    return 0;
} catch (const std::exception&) {
    return outOfMemory();
}

int FILEIDXDBSelect(const char* db, const FIQUERY* query, BOOL (*callback)(__tag_FI_FILE_INFO_DATA*, void*),
                    void* arg) try {
    VEXO_GATE("FILEIDXDBSelect", -1);
    if (db == nullptr || query == nullptr || callback == nullptr) return badArgument();
    std::vector<int64_t> ids;
    {
        const Lease lease(db);
        if (!lease || !lease->commit() || !vexo::fileindex::selectPage(*lease, *query, ids)) return -1;
    }
    vexo::fileindex::PartReader parts(ids);
    while (!parts.atEnd()) {
        std::vector<vexo::fileindex::OwnedRecord> part;
        {
            const Lease lease(db);
            if (!lease || !lease->commit() || !parts.read(*lease, part)) return -1;
        }
        for (const auto& record : part) {
            __tag_FI_FILE_INFO_DATA view = record.view();
            if (callback(&view, arg) == 0) return 0;
        }
    }
    return 0;
} catch (const std::exception&) {
    return outOfMemory();
}
