// Key/value settings files: lines key="value"; other lines are kept but not read.
#ifndef VEXO_SETTINGS_H
#define VEXO_SETTINGS_H

#include <string>

#include "vexo/export.h"
#include "vexo/list.h"

// File names below are the appliance's own ("/etc/vexoinfo.conf") and are taken below the system root. A file is parsed
// once a process and again when its inode, size or time of modification changes.

VEXO_BEGIN_C
// Copies the value of `key` into `value`, cut to size - 1 bytes. 1 present, 0 no such key (value becomes ""), -1
// failure (0x0900 file missing, 0x0300 denied, 0x8100 else, 0x0D00 bad argument). A missing key is no failure. `flags`
// is 0.
VEXO_API int VLIBCFileGetKeyValue(const char* file, const char* key, char* value, int size, int flags);
// 1 when `key` has exactly this value (without case when `nocase` is nonzero), else 0.
VEXO_API int VLIBCFileCheckKeyValue(const char* file, const char* key, const char* value, int nocase);
// 1 when the model supports the feature: "yes" in /etc.defaults/vexoinfo.conf; else 0.
VEXO_API int VLIBCSupportGet(const char* key);
// Minutes until a session ends, setting "session_timeout"; -1 when unset or no number.
VEXO_API int VLIBCConfGetKTRTimeout(void);
// Adds every key of `file` (values unquoted) to the hash `*out`, which stays the caller's; a null `*out` becomes a new
// hash, except on failure. `sep` separates key and value ("="). The number of pairs read; 0 when there is none; -1 on
// failure as above.
VEXO_API int VLIBCFileGetKeys(const char* file, PVLIBCSZHASH* out, const char* sep);
VEXO_END_C

namespace VexoConf {

// Reader of /etc/vexoinfo.conf.
class VEXO_API Info {
 public:
    // The value of `key`, or `def` when the key or the file is absent.
    std::string Get(const std::string& key, const std::string& def) const;
};

}  // namespace VexoConf

#endif
