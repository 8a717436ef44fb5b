// What an archive holds, as one look at it found. See docs/formats/kept-listings.md.
#ifndef ORVEL_CGI_LIST_ARCHIVE_INDEX_H
#define ORVEL_CGI_LIST_ARCHIVE_INDEX_H

#include <sys/stat.h>

#include <functional>
#include <string>
#include <string_view>

namespace orvel::cgi {

struct ArchiveMember {
    enum class Kind { kFile, kFolder, kLink, kOther } kind = Kind::kOther;
    bool encrypted = false;
    long long size = -1;     // bytes, -1 where the archive does not say
    long long modified = 0;  // 0 likewise
    std::string_view name;   // as nameOfMember() has it
};

class ArchiveIndex {
 public:
    // Looks into the open archive, in a process that can do nothing else, until it knows all members or meets a bound:
    // settings "archive_look_members" (100000) and "archive_look_seconds" (10), 16 MiB for what is found, and
    // kArchiveMemory. False when that process could not be made.
    [[nodiscard]] bool look(int file, const struct stat& status);
    // Takes what look() found some time ago, of the archive with that status. False when it is another one by now, or
    // no such thing.
    [[nodiscard]] bool take(std::string bytes, const struct stat& status);
    [[nodiscard]] const std::string& bytes() const { return bytes_; }

    // Why it is not all: "" (it is), "members", "seconds", "demanding", "damaged" behind what was found; "locked" where
    // names are encrypted, "none" for what is no archive.
    [[nodiscard]] std::string_view end() const { return end_; }
    void each(const std::function<void(const ArchiveMember& member)>& take) const;

 private:
    [[nodiscard]] bool readEnd();

    std::string bytes_;
    std::string end_;
};

}  // namespace orvel::cgi

#endif
