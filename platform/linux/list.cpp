#include "vexo/list.h"

#include <algorithm>
#include <cstring>
#include <new>
#include <string>
#include <utility>
#include <vector>

#include "failure.h"
#include "fault_gate.h"
#include "vexo/text.h"

namespace {

constexpr int kAscendingWithoutCase = 16;

struct List : VLIBCSZLIST {
    std::vector<std::string> items;
};

List& listOf(PVLIBCSZLIST list) {
    return *static_cast<List*>(list);
}

// Each string is folded once, not at each comparison.
void sortWithoutCase(std::vector<std::string>& items) {
    std::vector<std::pair<std::string, std::string>> keyed(items.size());
    for (size_t i = 0; i < items.size(); ++i) VEXO::AppendFoldKey(items[i], keyed[i].first);
    // Nothing throws from here on, so no string is lost.
    for (size_t i = 0; i < items.size(); ++i) keyed[i].second = std::move(items[i]);
    std::sort(keyed.begin(), keyed.end());
    for (size_t i = 0; i < items.size(); ++i) items[i] = std::move(keyed[i].second);
}

}  // namespace

PVLIBCSZLIST VLIBCSzListAlloc(int capacity) {
    VEXO_GATE("VLIBCSzListAlloc", nullptr);
    static_cast<void>(capacity);
    auto* list = new (std::nothrow) List{};
    if (list == nullptr) vexo::fail(VEXO_ERR_GENERAL);
    return list;
}

int VLIBCSzListPush(PVLIBCSZLIST* list, const char* text) {
    VEXO_GATE("VLIBCSzListPush", -1);
    if (list == nullptr || *list == nullptr || text == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    try {
        listOf(*list).items.emplace_back(text);
    } catch (const std::bad_alloc&) {
        return vexo::fail(VEXO_ERR_GENERAL);
    }
    return ++(*list)->nItem;
}

const char* VLIBCSzListGet(PVLIBCSZLIST list, int index) {
    if (list == nullptr || index < 0 || index >= list->nItem) return nullptr;
    return listOf(list).items[static_cast<size_t>(index)].c_str();
}

void VLIBCSzListSortItems(PVLIBCSZLIST list, int option) {
    if (list == nullptr || option != kAscendingWithoutCase) return;
    try {
        sortWithoutCase(listOf(list).items);
    } catch (const std::bad_alloc&) {
        vexo::fail(VEXO_ERR_GENERAL);  // the order stays as it was
    }
}

void VLIBCSzListFree(PVLIBCSZLIST list) {
    if (list != nullptr) delete &listOf(list);
}

int VLIBCStrTok(char* text, const char* separators, PVLIBCSZLIST* out) {
    VEXO_GATE("VLIBCStrTok", -1);
    if (text == nullptr || separators == nullptr || out == nullptr || *out == nullptr) {
        return vexo::fail(VEXO_ERR_PARAMETER);
    }
    int pieces = 0;
    char* rest = nullptr;
    for (char* piece = strtok_r(text, separators, &rest); piece != nullptr;
         piece = strtok_r(nullptr, separators, &rest)) {
        if (VLIBCSzListPush(out, piece) < 0) return -1;
        ++pieces;
    }
    return pieces;
}
