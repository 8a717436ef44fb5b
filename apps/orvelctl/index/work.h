// What every work on the index of a share begins and ends with.
#ifndef ORVEL_ORVELCTL_INDEX_WORK_H
#define ORVEL_ORVELCTL_INDEX_WORK_H

#include <string>

#include "index/share_files.h"
#include "vexo/share.h"

namespace orvel::ctl {

// Throws what the user is to read.
[[noreturn]] void refuse(const std::string& share, const std::string& reason);
// Why the platform refused to work on an index.
const char* platformReason();

// The share's files. Throws when they are not there: a volume that is not mounted must not empty the index.
ShareFiles filesOf(const SDK::Share& share, int* stop);

// The platform's work on the index of a share: given up unless it is done. An index that cannot be read is not updated
// but built anew.
class IndexWork {
 public:
    IndexWork(const SDK::Share& share, bool build);
    ~IndexWork();
    IndexWork(const IndexWork&) = delete;
    IndexWork& operator=(const IndexWork&) = delete;

    [[nodiscard]] const std::string& database() const { return database_; }
    [[nodiscard]] bool builds() const { return builds_; }
    // What the index is now: FI_INDEX_BEHIND and so on.
    void mark(int state) const;
    void done();

 private:
    bool begin();

    std::string share_, database_;
    bool builds_;
    bool open_ = false;
};

}  // namespace orvel::ctl

#endif
