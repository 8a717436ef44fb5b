#include "orvel/name_check.h"

#include <syslog.h>

#include <cerrno>
#include <cstring>
#include <string_view>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/fat_name.h"
#include "orvel/error_state.h"
#include "vexo/filesystem.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvman";

[[nodiscard]] bool isReserved(const char* name) {
    const std::string_view text(name);
    return text == "." || text == ".." || text.find(':') != text.npos || text.find('/') != text.npos ||
           text.starts_with("._") || VEXOEAIsHiddenDir(name) == 1;
}

bool checkReservedName(const char* name) {
    if (name == nullptr || *name == '\0') {
        OrvLibSetErr(ORV_ERR_PARAMETER);
        return false;
    }
    if (isReserved(name)) {
        OrvLibSetErr(ORV_ERR_RESERVED_NAME);
        return false;
    }
    return true;
}

int checkFileName(const char* dirRealPath, const char* name) {
    if (dirRealPath == nullptr || name == nullptr || *name == '\0') {
        OrvLibSetErr(ORV_ERR_PARAMETER);
        return -1;
    }
    if (!checkReservedName(name)) return -1;

    const int fsType = VEXOGetFSType(dirRealPath, 0);
    if (fsType < 0) {
        const int reason = errno;
        OrvLibSetErr(OrvParseErrnoToError(reason, nullptr, nullptr));
        syslog(LOG_ERR, "%s:%d Failed to statfs %s, reason=%s", kSource, __LINE__, printable(dirRealPath).c_str(),
               strerror(reason));
        return -1;
    }
    if (fsType == VEXO_FS_FAT && !fatStores(name)) {
        OrvLibSetErr(ORV_ERR_FAT_NAME);
        return -1;
    }
    return 0;
}

// Continuation bytes that must follow a lead byte; -1 for a byte that begins no sequence.
[[nodiscard]] int continuationBytes(unsigned char lead) {
    if (lead < 0x80) return 0;
    if (lead < 0xC0) return -1;
    if (lead < 0xE0) return 1;
    if (lead < 0xF0) return 2;
    if (lead < 0xF8) return 3;
    if (lead < 0xFC) return 4;
    if (lead < 0xFE) return 5;
    return -1;
}

[[nodiscard]] bool isPatternOfUtf8(const char* text) {
    while (*text != '\0') {
        int expected = continuationBytes(static_cast<unsigned char>(*text++));
        if (expected < 0) return false;
        for (; expected > 0; --expected, ++text) {
            if ((static_cast<unsigned char>(*text) & 0xC0) != 0x80) return false;
        }
    }
    return true;
}

}  // namespace
}  // namespace orvel

bool OrvCheckReservedName(const char* name) {
    return orvel::guarded(false, [&] { return orvel::checkReservedName(name); });
}

int OrvCheckFileName(const char* dirRealPath, const char* name) {
    return orvel::guarded(-1, [&] { return orvel::checkFileName(dirRealPath, name); });
}

bool IsUnicodeString(const char* text) {
    return text == nullptr || orvel::isPatternOfUtf8(text);
}
