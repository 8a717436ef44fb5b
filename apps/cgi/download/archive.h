// Several files and folders as one archive, written as it is made.
#ifndef ORVEL_CGI_DOWNLOAD_ARCHIVE_H
#define ORVEL_CGI_DOWNLOAD_ARCHIVE_H

#include <sys/stat.h>

#include <string>
#include <string_view>
#include <vector>

#include "base/descriptor.h"

struct archive;

namespace orvel::cgi {

// The name of a file or folder within an archive, which knows UTF-8 alone: itself, or percent-encoded.
std::string memberName(const std::string& component);

// Looks on while an archive is made.
class ArchiveObserver {
 public:
    virtual ~ArchiveObserver() = default;
    // A member begins, or `count` more of its bytes were written. False ends the making.
    virtual bool begins(const std::string& name) = 0;
    virtual bool wrote(long long count) = 0;
    // A member could not be read, or not to its end, for an errno value.
    virtual void leftOut(const std::string& name, int error) = 0;
};

// What an archive says of a source that was refused with the library code.
const char* reasonOf(int code);

struct ArchiveFormat {
    const char* word;  // of a request
    bool takesPassword;
};
// zip, tar.gz, tar.xz, tar.zst, 7z; null for any other word.
const ArchiveFormat* archiveFormatOf(std::string_view word);

// A stream to a descriptor; 7z needs the room twice while it is made, in the folder that TMPDIR names. What cannot be
// read is left out, reported to the observer, if there is one, and said in a last member, "_not_included.txt". Members
// are compressed, times and permissions kept; symbolic links and anything else but files and folders stay out.
class ArchiveStream {
 public:
    // A zip. With another word the format of that; a password encrypts what members hold (AES-256), and not their
    // names.
    explicit ArchiveStream(int fd, ArchiveObserver* observer = nullptr, std::string_view format = "zip",
                           const std::string& password = "");
    ~ArchiveStream();
    ArchiveStream(const ArchiveStream&) = delete;
    ArchiveStream& operator=(const ArchiveStream&) = delete;

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
    [[nodiscard]] bool setUp(int fd, std::string_view format, const std::string& password);
    bool addFile(const Descriptor& file, const std::string& name);
    bool addFolder(const Descriptor& folder, const std::string& name);
    bool addChild(const Descriptor& folder, const std::string& child, const std::string& name);
    bool begin(const std::string& name, const struct stat& status, long long size);
    bool recordFailure();
    bool recordStop();
    bool writeLeftOut();
    void miss(const std::string& name, int error, const char* reason = nullptr);

    struct archive* archive_;
    ArchiveObserver* observer_;
    int error_ = 0;
    std::vector<std::string> leftOut_;
    long long leftOutUnsaid_ = 0;  // beyond those
    long long bytes_ = 0;
    bool broken_ = false, begun_ = false;
    int depth_ = 0;
};

}  // namespace orvel::cgi

#endif
