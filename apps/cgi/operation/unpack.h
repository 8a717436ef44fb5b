// Unpacking of archives that anybody can have made.
#ifndef ORVEL_CGI_OPERATION_UNPACK_H
#define ORVEL_CGI_OPERATION_UNPACK_H

#include <sys/types.h>

#include <map>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "operation/conflict.h"
#include "operation/item.h"
#include "operation/progress.h"

struct archive;
struct archive_entry;

namespace orvel::cgi {

// What an archive may come to. Settings "extract_max_ratio" (bytes for each byte of the archive, 200; archives that
// come to less than 64 MiB are never measured by it), "extract_max_size" (MiB, 1048576) and "extract_max_members"
// (1000000; it also bounds the folders that are made).
struct UnpackLimits {
    long long bytes, members;
    static UnpackLimits of(long long archiveSize);
};

// Unpacks what openArchive() reads into one folder. Nothing of a member's name or of links in the
// folder leads out of it; a member appears under its name whole or not at all. What cannot be unpacked is reported,
// each member for itself, and the rest goes on: names that lead out or may not be used, links that lead out, hard links
// to what was not unpacked, devices. At the first member that the password does not open it ends: who asks for the
// right one then wants the archive once.
class Unpacker {
 public:
    struct Target {
        const Descriptor& folder;
        std::string path;  // share-relative
        Conflict conflict;
        Owner owner;
        std::string password;  // of encrypted members, as bytes; "" for none
        // What is chosen: names in a folder of the archive, without which all that lies in it is. Folders above are
        // not made.
        std::vector<std::string> inside;  // the components of its path
        std::set<std::string> chosen;
    };
    Unpacker(Progress& progress, const Target& target) : progress_(progress), target_(target) {}

    // Unpacks the open file. 0, or the library code of why not all could be read: 1401 no archive, 1402 broken, 1403
    // an encrypted member without its password, 1007 beyond the limits, or one of an ArchiveRefusal.
    int run(int file, const UnpackLimits& limits);
    // The names that were given in the folder.
    [[nodiscard]] const std::set<std::string>& names() const { return names_; }
    [[nodiscard]] long long bytes() const { return bytes_; }
    // Those of the chosen names that no member met.
    [[nodiscard]] const std::set<std::string>& missing() const { return missing_; }

 private:
    struct Member;
    // What members of one path get instead of it: thousands of them do not each ask for all numbers again.
    struct Numbered {
        std::string name;  // that the last one got
        int number = 1;
    };
    struct MadeFolder {
        std::string path;  // below the target
        mode_t mode;
        timespec modified;
    };

    int readAll(archive* source);
    int codeOfEnd(archive* source) const;
    void take(archive* source, archive_entry* entry);
    bool isChosen(std::vector<std::string>& components);
    void skip(archive* source);
    void give(archive* source, archive_entry* entry, const std::string& shown, std::vector<std::string> components);
    int place(archive* source, Member& member);
    int enter(const std::vector<std::string>& folders, Descriptor& folder);
    int makeFolder(const Member& member);
    int makeFile(archive* source, Member& member);
    int makeLink(Member& member);
    int makeHardLink(Member& member);
    int fill(archive* source, const Member& member, int file);
    template <class Give>
    int nameIt(Member& member, Give give);
    bool findUnpacked(std::vector<std::string> components, Descriptor& folder, std::string& name, int& code) const;
    void tellConsumed(archive* source);
    void finishFolders();

    Progress& progress_;
    Target target_;
    UnpackLimits limits_{};
    std::set<std::string> names_;
    std::set<std::pair<dev_t, ino_t>> unpacked_;  // files, for their further names
    std::map<std::string, Numbered> numbered_;    // by path below the target
    std::vector<MadeFolder> madeFolders_;
    long long bytes_ = 0, members_ = 0, folders_ = 0, consumed_ = 0;
    bool exceeded_ = false, torn_ = false;
    bool locked_ = false;  // the password of a member is not known
    std::set<std::string> missing_;
    long long skippedBytes_ = 0;
};

}  // namespace orvel::cgi

#endif
