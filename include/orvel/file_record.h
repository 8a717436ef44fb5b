// The record that a file gets in a result database or in the index of a share: one place fills it, so a file found by
// walking, one found through the index and one added later look the same, byte for byte.
#ifndef ORVEL_FILE_RECORD_H
#define ORVEL_FILE_RECORD_H

#include <string>

#include "orvel/export.h"
#include "orvel/user_directory.h"
#include "vexo/index.h"
#include "vexo/stat.h"

namespace FileSearch {

// Where a path that lies below no known root of a share stops being "/<volume>/<share>/<path within the share>".
enum class PathFault { kNone, kNoShare /* no second "/" */, kNoPath /* no third "/" */ };

// Refilled for each entry; its buffers stay. Not for sharing between threads. Filling may throw std::bad_alloc and
// nothing else, logs nothing and sets no code.
class ORVEL_API FileRecord {
 public:
    FileRecord();
    ~FileRecord();
    FileRecord(const FileRecord&) = delete;
    FileRecord& operator=(const FileRecord&) = delete;

    // Fills the record of the entry at `realPath` (bytes, no trailing "/"). `name` is its last component, `shareRoot`
    // the real path of the share's root, `shareName` (the first 492 bytes count) the share's name, "homes" for a home;
    // `status` with the creation time. Owner and group are looked up by id and remembered. Anything but kNone leaves
    // the record as it was. The record borrows the four texts.
    [[nodiscard]] PathFault fill(const std::string& realPath, const std::string& shareRoot,
                                 const std::string& shareName, const std::string& name, const _tag_VEXOSTAT_& status);
    // The same with the names of owner and group given: at most 492 and 128 bytes of them; an empty name and "root"
    // become the decimal id.
    [[nodiscard]] PathFault fill(const std::string& realPath, const std::string& shareRoot,
                                 const std::string& shareName, const std::string& name, const _tag_VEXOSTAT_& status,
                                 const std::string& owner, const std::string& group);

    // What was filled last; valid until the next filling and as long as its four texts.
    [[nodiscard]] const __tag_FI_FILE_INFO_DATA& data() const { return data_; }

 private:
    __tag_FI_FILE_INFO_DATA data_;
    std::string share_, parent_, extension_, permission_, owner_, group_;
    OrvelUserEnum names_;
};

}  // namespace FileSearch

#endif
