// Several files and folders as one zip, written as it is made.
#ifndef ORVEL_CGI_DOWNLOAD_ARCHIVE_H
#define ORVEL_CGI_DOWNLOAD_ARCHIVE_H

#include <sys/stat.h>

#include <string>
#include <vector>

#include "base/descriptor.h"

struct archive;

namespace orvel::cgi {

// The name of a file or folder within an archive, which knows UTF-8 alone: itself, or percent-encoded.
std::string memberName(const std::string& component);

// Looks on while a zip is made.
class ZipObserver {
 public:
    virtual ~ZipObserver() = default;
    // A member begins, or `count` more of its bytes were written. False ends the making.
    virtual bool begins(const std::string& name) = 0;
    virtual bool wrote(long long count) = 0;
    // A member could not be read, or not to its end, for an errno value.
    virtual void leftOut(const std::string& name, int error) = 0;
};

// What a zip says of a source that was refused with the library code.
const char* reasonOf(int code);

// A stream to a descriptor. What cannot be read is left out, reported to the observer, if there is one, and said in a
// last member, "_not_included.txt". Members are deflated, times and permissions kept; symbolic links and anything else
// but files and folders stay out.
class ZipStream {
 public:
    explicit ZipStream(int fd, ZipObserver* observer = nullptr);
    ~ZipStream();
    ZipStream(const ZipStream&) = delete;
    ZipStream& operator=(const ZipStream&) = delete;

    // Adds the open file or folder, with everything below it, under `name` (UTF-8). False when the reader is gone:
    // stop.
    bool add(const Descriptor& opened, const std::string& name);
    // Notes that `name` is left out.
    void leaveOut(const std::string& name, const std::string& reason);
    // Writes the end. False when not everything arrived.
    bool finish();
    [[nodiscard]] bool isWhole() const { return leftOut_.empty(); }  // nothing was left out so far
    [[nodiscard]] bool isEmpty() const { return !begun_; }           // no member was written so far
    [[nodiscard]] long long bytes() const { return bytes_; }         // of the members, as they were
    [[nodiscard]] int error() const { return error_; }               // errno of what broke it, 0 when it was stopped

 private:
    bool addFile(const Descriptor& file, const std::string& name);
    bool addFolder(const Descriptor& folder, const std::string& name);
    bool addChild(const Descriptor& folder, const std::string& child, const std::string& name);
    bool begin(const std::string& name, const struct stat& status, long long size);
    bool recordFailure();
    bool recordStop();
    bool writeLeftOut();
    void miss(const std::string& name, int error, const char* reason = nullptr);

    struct archive* archive_;
    ZipObserver* observer_;
    int error_ = 0;
    std::vector<std::string> leftOut_;
    long long leftOutUnsaid_ = 0;  // beyond those
    long long bytes_ = 0;
    bool broken_ = false, begun_ = false;
    int depth_ = 0;
};

}  // namespace orvel::cgi

#endif
