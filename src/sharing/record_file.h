// The login-record file: read whole, replaced whole. It lies where anybody may put a file of any kind, so nothing is
// followed, waited for or trusted before it is known to be ours.
#ifndef ORVEL_SHARING_RECORD_FILE_H
#define ORVEL_SHARING_RECORD_FILE_H

#include <string>
#include <string_view>

#include "core/owned.h"

namespace orvel {

// Names of the appliance's own, below the system root.
inline constexpr const char* kRecordFile = "/tmp/foldersharing.current.users";
inline constexpr const char* kRecordLock = "/tmp/foldersharing.current.users.lock";
inline constexpr const char* kRecordTemporary = "/tmp/foldersharing.current.users.tmp";

// Reads the record file `name` with the caller's identity. False, with errno, when it cannot be read or is not trusted:
// no regular file, a link, a second name, of neither root nor the effective user, writable by others, beyond 16 MiB.
[[nodiscard]] bool readRecordFile(const char* name, std::string& text);

// Gives the record file mode 0600. False with errno.
[[nodiscard]] bool protectRecordFile();

// The temporary file of a rewrite. Without commit() it is gone in the end, and the record file as it was.
class RecordRewrite {
 public:
    // Makes the temporary, mode 0600; what a killed process left under its name is removed before.
    RecordRewrite();
    ~RecordRewrite();
    RecordRewrite(const RecordRewrite&) = delete;
    RecordRewrite& operator=(const RecordRewrite&) = delete;
    explicit operator bool() const { return static_cast<bool>(file_); }  // else errno of the constructor says why

    // Sees to mode 0600 whatever the process masks. False with errno.
    [[nodiscard]] bool protect();
    // Writes the whole text, closes the temporary and renames it onto the record file. Not synchronised to the disk:
    // times count from the start of the machine, so no record outlives it. False when any of that failed.
    [[nodiscard]] bool commit(std::string_view text);

 private:
    std::string path_;
    Descriptor file_;
    bool left_ = false;  // the temporary is there
};

}  // namespace orvel

#endif
