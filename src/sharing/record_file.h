// The login-record file: read in blocks, replaced whole. It lies where anybody may put a file of any kind, so nothing
// is followed, waited for or trusted before it is known to be ours.
#ifndef ORVEL_SHARING_RECORD_FILE_H
#define ORVEL_SHARING_RECORD_FILE_H

#include <optional>
#include <string>
#include <string_view>

#include "base/line_blocks.h"
#include "core/owned.h"

namespace orvel {

// Names of the appliance's own, below the system root.
inline constexpr const char* kRecordFile = "/tmp/foldersharing.current.users";
inline constexpr const char* kRecordLock = "/tmp/foldersharing.current.users.lock";
inline constexpr const char* kRecordTemporary = "/tmp/foldersharing.current.users.tmp";

// Reads a record file with the caller's identity, whatever its size: the records of others must not shut anybody out.
class RecordReader {
 public:
    // Empty, with errno, when the file cannot be opened or is not trusted: not a regular file, a link, a second name,
    // of neither root nor the effective user, writable by others.
    explicit RecordReader(const char* name);
    explicit operator bool() const { return static_cast<bool>(file_); }

    // The next whole lines. False at the end, and with failed() and errno when the file cannot be read.
    [[nodiscard]] bool next(std::string_view& lines) { return blocks_->next(lines); }
    [[nodiscard]] bool failed() const { return blocks_->failed(); }

 private:
    Descriptor file_;
    std::optional<LineBlocks> blocks_;
};

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
    // Adds text. False when that failed.
    [[nodiscard]] bool write(std::string_view text);
    // Closes the temporary and renames it onto the record file. Not synchronised to the disk: times count from the
    // start of the machine, so no record outlives it. False when any of that failed.
    [[nodiscard]] bool commit();

 private:
    std::string path_;
    Descriptor file_;
    bool left_ = false;  // the temporary is there
};

}  // namespace orvel

#endif
