// Copying what a search asks for out of a share's index.
#include <algorithm>
#include <exception>
#include <memory>
#include <optional>
#include <utility>
#include <vector>

#include "base/raised_identity.h"
#include "failure.h"
#include "fault_gate.h"
#include "index/index_columns.h"
#include "index/index_condition.h"
#include "index/index_connections.h"
#include "index/index_search.h"
#include "index/index_store.h"
#include "shares/share_record.h"
#include "vexo/index_shown.h"

namespace vexo::fileindex {
namespace {

constexpr size_t kFirstPart = 128;
constexpr size_t kPart = 4096;
constexpr size_t kOrdered = 1000;

// What the caller says about single records; see FILEIDXResultGetAndTableGen.
struct Tests {
    BOOL (*access)(__tag_FI_FILE_INFO_DATA*, void*);
    void* accessArgument;
    BOOL (*folder)(const char*, void*);
    void* folderArgument;
};

bool holds(const Tests& tests, __tag_FI_FILE_INFO_DATA& record) {
    if (tests.folder != nullptr && tests.folder(record.szParent, tests.folderArgument) == 0) return false;
    return tests.access == nullptr || tests.access(&record, tests.accessArgument) != 0;
}

bool insertInto(const char* out, const std::vector<__tag_FI_FILE_INFO_DATA>& records, bool atOnce) {
    const Lease lease(out);
    return lease && std::all_of(records.begin(), records.end(), [&](const auto& r) { return lease->insert(r); }) &&
           (!atOnce || lease->commit());
}

// The first rows are committed at once, since somebody waits for them. The index knows neither the share's name
// nor its root.
bool copy(IndexSearch& search, const VEXOSHARE& share, const char* out, const Tests& tests, const int* cancel) {
    size_t most = search.isShort() ? kPart : kFirstPart;
    bool isFirst = true;
    size_t ordered = 0;
    while (!search.atEnd() && !isCancelled(cancel)) {
        std::vector<OwnedRecord> part;
        const bool inOrder = search.readsInOrder();
        {
            const orvel::RaisedIdentity raised;
            if (!search.read(inOrder ? kOrdered - ordered : most, part)) return false;
        }
        std::vector<__tag_FI_FILE_INFO_DATA> kept;
        kept.reserve(part.size());
        for (const OwnedRecord& record : part) {
            if (isCancelled(cancel)) break;
            __tag_FI_FILE_INFO_DATA view = record.view();
            view.szShare = share.szName;
            view.szShareRoot = share.szPath;
            if (holds(tests, view)) kept.push_back(view);
        }
        if (inOrder && (ordered += kept.size()) == kOrdered) search.endOrder();
        most = std::min(most * 2, kPart);
        if (kept.empty()) continue;
        if (!insertInto(out, kept, isFirst || inOrder)) return false;
        isFirst = false;
        most = kPart;
    }
    const Lease lease(out);
    return lease && lease->commit();
}

// Both conditions, the shorter one asked first: it spares most records the longer one.
Condition shorterFirst(Condition a, Condition b) {
    return a.values.size() <= b.values.size() ? both(std::move(a), std::move(b)) : both(std::move(b), std::move(a));
}

}  // namespace
}  // namespace vexo::fileindex

int FILEIDXResultGetAndTableGen(const char* share, const __tag_FI_SQL_COND* paths, const __tag_FI_SQL_COND* cond,
                                const char* out, BOOL (*accessTest)(__tag_FI_FILE_INFO_DATA*, void*), void* accessArg,
                                int* cancel, BOOL (*folderTest)(const char*, void*), void* folderArg) {
    return FILEIDXResultGetShown(share, paths, cond, out, accessTest, accessArg, cancel, folderTest, folderArg,
                                 nullptr);
}

int FILEIDXResultGetShown(const char* share, const __tag_FI_SQL_COND* paths, const __tag_FI_SQL_COND* cond,
                          const char* out, BOOL (*accessTest)(__tag_FI_FILE_INFO_DATA*, void*), void* accessArg,
                          int* cancel, BOOL (*folderTest)(const char*, void*), void* folderArg,
                          const FISORT* shown) try {
    using namespace vexo::fileindex;
    VEXO_GATE("FILEIDXResultGetAndTableGen", -1);
    if (share == nullptr || out == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    auto where = readCondition(paths, {.ofSearch = true});
    auto what = readCondition(cond, {.accessHolds = accessTest != nullptr, .ofCriteria = true});
    if (!where || !what) return -1;
    const vexo::ShareRecord record = vexo::loadShare(share);
    if (record == nullptr) return -1;
    const Condition asked = shorterFirst(std::move(*where), std::move(*what));
    std::unique_ptr<Database> index;
    std::optional<IndexSearch> search;
    {
        const orvel::RaisedIdentity raised;
        index = openIndex(share);
        if (index == nullptr) return -1;
        search.emplace(*index, asked, cancel);
        const bool byName = shown != nullptr && shown->column == FI_COL_NAME;
        if (!search->begin(byName ? openNames(share, *index) : nullptr, byName && shown->descending != 0)) return -1;
    }
    const Tests tests = {accessTest, accessArg, folderTest, folderArg};
    return copy(*search, *record, out, tests, cancel) ? 0 : -1;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
