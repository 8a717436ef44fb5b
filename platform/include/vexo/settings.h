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

// Changing a file. The file keeps its inode, so a caller can hold a lock on the file itself over several changes, and
// must: two changes at once may lose one. Nothing raises here; settings are changed by who may write them. The file
// must be regular, under one name, no link, of root or the effective user and writable by nobody else. Every other line
// stays byte for byte: its end (CR LF, or none at the end of the file), lines that are no settings. 0, or -1 with errno
// and the slot: 0x0D00 a bad argument, 0x0900 the file is missing or its folder, 0x0300 denied or a file that is not
// trusted, 0x2900 no space, 0x2400 quota, 0x8400 read-only, 0x8100 else; the file then is as it was before.
//
// Gives `key` the value `value`: the first line of the key is replaced and further ones are removed; without one, a
// line is added at the end. A missing file is made, mode 0644. `format` is how a line is written and must be one of
// two:
// "%s=\"%s\"\n" (null means the same) and "%s=%s\n"; any other is a bad argument, it is never used as a format. The key
// and the value must read back as given, or they are bad arguments too: no control bytes but a tab within, no quote in
// a value, no key that is empty, begins with "#", holds "=" or has blanks at its ends.
VEXO_API int VLIBCFileSetKeyValue(const char* file, const char* key, const char* value, const char* format);
// Removes every line of `key`. 0 even if there is none, or no file.
VEXO_API int VLIBCFileRemoveKey(const char* file, const char* key);
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
