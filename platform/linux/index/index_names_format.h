// The file of packed names; see docs/formats/index.md.
#ifndef VEXO_LINUX_INDEX_NAMES_FORMAT_H
#define VEXO_LINUX_INDEX_NAMES_FORMAT_H

#include <cstddef>
#include <cstdint>
#include <string>

#include "index/index_database.h"

namespace vexo::fileindex {

// Its last character is the version. Numbers are little-endian.
constexpr char kNamesMagic[] = "VEXONAM2";

// Behind it: ids, four bytes each; what stands for their extensions, two bytes each; where the texts of every 64th name
// begin, eight bytes each; the texts; the extensions. Texts end with a NUL.
struct NamesHead {
    char magic[8];
    int64_t index;    // the mark of the index
    int64_t highest;  // id of its records by then
    uint64_t count;
    uint64_t extensionsAt, blocksAt, textsAt, textsSize;
    uint64_t listAt, listSize;  // the extensions that have a number of their own, from 1 on
};
constexpr size_t kNamesOfBlock = 64;
// An extension that has no number of its own, and none at all.
constexpr uint16_t kOtherExtension = 0, kNoExtension = 0xFFFF;
constexpr size_t kMostExtensions = kNoExtension - 1;
static_assert(__BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__);

// SQL that gives the index a new mark.
[[nodiscard]] std::string drawMark();
// What tells an index from others, and from itself before a name in it changed in place; 0 for none.
[[nodiscard]] bool readMark(Database& index, int64_t& mark);

}  // namespace vexo::fileindex

#endif
