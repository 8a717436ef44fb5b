// The text of one entry's JSON object, without the object.
#ifndef ORVEL_ENUM_FILE_INFO_WRITER_H
#define ORVEL_ENUM_FILE_INFO_WRITER_H

#include <cstdint>
#include <string>

#include "orvel/dir_entry.h"

namespace orvel {

// The properties that appear below "additional".
inline constexpr int kWrittenBits = 0xFF;

// The permission bits of an entry as its object shows them.
struct AclFlags {
    bool exec, write, read, append, del;
};

inline AclFlags aclFlagsOf(uint32_t bits) {
    const bool bit4 = (bits & 0x4) != 0;
    // Kept: "write" and "read" show the same bit, callers rely on it.
    return {(bits & 0x1) != 0, bit4, bit4, (bits & 0x8) != 0, (bits & 0x200) != 0};
}

// See AppendFileInfoText. Throws bad_alloc with `out` unchanged.
void appendFileInfoText(int additional, const DIRENTRY_INFO& info, std::string& out);

}  // namespace orvel

#endif
