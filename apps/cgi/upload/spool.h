// The temporary place of an upload, on the volume that it goes to.
#ifndef ORVEL_CGI_UPLOAD_SPOOL_H
#define ORVEL_CGI_UPLOAD_SPOOL_H

#include <unistd.h>

#include <ctime>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "base/descriptor.h"
#include "base/new_file.h"

namespace orvel::cgi {

// The library code for a failure to store what was uploaded, an errno value.
int uploadCodeOf(int error);

// Names of data that stays between two requests: this, and the id of its upload (see tus/record.h).
inline constexpr std::string_view kKeptPrefix = "resume-";

// Removes what killed uploads left in one user's folder of uploads, and counts it; -1 with errno. `isKept` is asked
// about the id of data that stays between requests; without it all such data is left alone.
long removeAbandonedUploads(const Descriptor& folder,
                            const std::function<bool(const std::string& id)>& isKept = nullptr);

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
    // Instead of open(): data that stays there between two requests, until it is published or removed; made when
    // `make`, else ORV_ERR_MISSING where there is none.
    int openKept(const std::string& volumePath, const std::string& id, bool make);
    void removeKept();
    // Drops what is behind `size`. False with errno.
    [[nodiscard]] bool cut(long long size);
    // What is written is on the disk. False with errno.
    [[nodiscard]] bool sync() const { return fdatasync(fd()) == 0; }
    // Bytes that the file system has left for the user; -1 with errno.
    [[nodiscard]] long long freeBytes() const;
    // Appends. 0 or a library code.
    int write(std::string_view data);
    // The finished file's time of modification. False with errno.
    [[nodiscard]] bool setModified(time_t time) const;
    // A path under which the finished file can be read; "" with errno on failure. It is gone with this object.
    std::string publish();
    [[nodiscard]] long long size() const { return size_; }

 private:
    int openFolder(const std::string& volumePath);
    [[nodiscard]] int fd() const { return kept_ ? kept_.get() : file_->get(); }

    Descriptor folder_;
    std::optional<NewFile> file_;
    Descriptor kept_;
    std::string name_;
    bool named_ = false;
    long long size_ = 0;
};

}  // namespace orvel::cgi

#endif
