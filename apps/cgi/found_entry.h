// Records of a search as the entries that a listing has.
#ifndef ORVEL_CGI_FOUND_ENTRY_H
#define ORVEL_CGI_FOUND_ENTRY_H

#include <list>
#include <string>

#include "orvel/dir_entry.h"
#include "vexo/index.h"

namespace orvel::cgi {

class FoundEntries {
 public:
    // `additional`: ADDITIONAL_... bits. What the user may do (ADDITIONAL_PERM) is asked of the file system for each
    // entry, as the calling identity; all else is what the search found.
    FoundEntries(const std::string& user, int additional);

    // The entry of a record. Its path begins with "/home" below the user's own home.
    [[nodiscard]] DIRENTRY_INFO entryOf(const __tag_FI_FILE_INFO_DATA& record) const;

 private:
    std::string home_;  // real path, "" for none
    int additional_;
};

}  // namespace orvel::cgi

#endif
