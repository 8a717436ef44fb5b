#include <deque>
#include <new>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>

#include "failure.h"
#include "fault_gate.h"
#include "vexo/list.h"

struct _VLIBCSZHASH_ {
    // In order of insertion; a deque, since the index refers to the keys where they lie.
    std::deque<std::pair<std::string, std::string>> pairs;
    std::unordered_map<std::string_view, const std::string*> index;
};

namespace {

void insert(_VLIBCSZHASH_& hash, const char* key, const char* value) {
    if (hash.index.contains(key)) return;
    hash.pairs.emplace_back(key, value);
    try {
        hash.index.emplace(hash.pairs.back().first, &hash.pairs.back().second);
    } catch (...) {
        hash.pairs.pop_back();
        throw;
    }
}

}  // namespace

PVLIBCSZHASH VLIBCSzHashAlloc(int capacity) {
    VEXO_GATE("VLIBCSzHashAlloc", nullptr);
    static_cast<void>(capacity);
    try {
        return new _VLIBCSZHASH_;
    } catch (const std::bad_alloc&) {
        vexo::fail(VEXO_ERR_GENERAL);
        return nullptr;
    }
}

int VLIBCSzHashSetValue(PVLIBCSZHASH* hash, const char* key, const char* value) {
    VEXO_GATE("VLIBCSzHashSetValue", -1);
    if (hash == nullptr || *hash == nullptr || key == nullptr || value == nullptr) {
        return vexo::fail(VEXO_ERR_PARAMETER);
    }
    try {
        insert(**hash, key, value);
    } catch (const std::bad_alloc&) {
        return vexo::fail(VEXO_ERR_GENERAL);
    }
    return 0;
}

const char* VLIBCSzHashGetValue(PVLIBCSZHASH hash, const char* key) {
    if (hash == nullptr || key == nullptr) return nullptr;
    const auto found = hash->index.find(key);
    return found == hash->index.end() ? nullptr : found->second->c_str();
}

int VLIBCSzHashEnumKey(PVLIBCSZHASH hash, PVLIBCSZLIST* out) {
    VEXO_GATE("VLIBCSzHashEnumKey", -1);
    if (hash == nullptr || out == nullptr || *out == nullptr) return vexo::fail(VEXO_ERR_PARAMETER);
    int keys = 0;
    for (const auto& [key, value] : hash->pairs) {
        if (VLIBCSzListPush(out, key.c_str()) < 0) return -1;
        ++keys;
    }
    return keys;
}

void VLIBCSzHashFree(PVLIBCSZHASH hash) {
    delete hash;
}
