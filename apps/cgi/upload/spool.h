// The temporary place of an upload, on the volume that it goes to.
#ifndef ORVEL_CGI_UPLOAD_SPOOL_H
#define ORVEL_CGI_UPLOAD_SPOOL_H

#include <ctime>
#include <optional>
#include <string>
#include <string_view>

#include "base/descriptor.h"
#include "base/new_file.h"

namespace orvel::cgi {

// The library code for a failure to store what was uploaded, an errno value.
int uploadCodeOf(int error);

// Removes what killed uploads left in one user's folder of uploads, and counts it; -1 with errno.
long removeAbandonedUploads(const Descriptor& folder);

// A file without a name where the file system can make one, so that it goes away with the process, however that ends;
// else one with a name of its own in a folder that only the user can enter.
class Spool {
 public:
    Spool() = default;
    ~Spool();
    Spool(const Spool&) = delete;
    Spool& operator=(const Spool&) = delete;

    // Makes the file below the volume's temporary folder, as the calling identity. 0 or a library code.
    int open(const std::string& volumePath);
    // Appends. 0 or a library code.
    int write(std::string_view data);
    // The finished file's time of modification. False with errno.
    [[nodiscard]] bool setModified(time_t time) const;
    // A path under which the finished file can be read; "" with errno on failure. It is gone with this object.
    std::string publish();
    [[nodiscard]] long long size() const { return size_; }

 private:
    int openFolder(const std::string& volumePath);

    Descriptor folder_;
    std::optional<NewFile> file_;
    std::string name_;
    bool named_ = false;
    long long size_ = 0;
};

}  // namespace orvel::cgi

#endif
