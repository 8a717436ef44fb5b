// A listing from a share-relative path to text, as the programs and the command-line tool ask for it.
#ifndef ORVEL_CGI_LISTING_H
#define ORVEL_CGI_LISTING_H

#include <list>
#include <string>
#include <string_view>

#include "base/descriptor.h"
#include "orvel/dir_entry.h"
#include "orvel/file_info.h"
#include "output.h"

namespace orvel::cgi {

// Beside the library's ADDITIONAL_... bits: the icon that the library chooses.
inline constexpr int kAdditionalIcon = 1 << 30;

struct ListRequest {
    std::string user;
    std::string sid;     // "" for none
    std::string path;    // not used for the shares
    std::string sortBy;  // "": folders by name, shares as they are defined, the home folder first
    bool ascending = true;
    unsigned long offset = 0;
    unsigned long limit = 0;  // 0: everything
    int additional = 0;       // ADDITIONAL_... bits and kAdditionalIcon
    std::string pattern;      // comma-separated name patterns, "" for every name
    _tag_dir_entry_type_ type = DIR_ENTRY_TYPE_ALL;
};

struct Listing {
    std::list<DIRENTRY_INFO> entries;  // the page
    unsigned long total = 0;           // before the page was cut
};

// Words of a comma-separated list ("size,icon") as bits of `additional`; unknown words ask for nothing.
int additionalBits(std::string_view words);

// The working directory of its beginning is that of its end: listing leads elsewhere, and icons are looked for from
// where the web server started the program.
class ReturnToFolder {
 public:
    ReturnToFolder();
    ~ReturnToFolder();
    ReturnToFolder(const ReturnToFolder&) = delete;
    ReturnToFolder& operator=(const ReturnToFolder&) = delete;

 private:
    Descriptor start_;
};

// List a folder, or the home folder and the shares of the user. The process has the user's identity. 0 or a library
// code; what a failure leaves in `listing` is to be thrown away.
int listFolder(const ListRequest& request, Listing& listing);
// The two steps of the first. Resolves, asks whether the user may list it, and opens it as a place beneath its share's
// root; then for a folder that is open so: `path` is what it is called, `realPath` where it lies.
int openFolderToList(const ListRequest& request, PathInfo& info, Descriptor& folder, std::string& realPath);
int listOpened(const ListRequest& request, const Descriptor& folder, const std::string& path,
               const std::string& realPath, Listing& listing);
int listShares(const ListRequest& request, Listing& listing);

// Appends the object of one entry, always valid UTF-8: a name or path that is not is shown readable, with "name_raw"
// and "path_raw", its bytes percent-encoded, beside it. The "icon" of an entry is looked for from the working directory
// (see GetImgFileExt). Entries of the share listing also have the user's right
// ("perm": "share_right", "ftp_privilege", "acl_enabled") and "sync_share".
void appendEntry(const DIRENTRY_INFO& entry, int additional, std::string& out);
void appendShare(const DIRENTRY_INFO& entry, int additional, std::string& out);

// Appends {"total","offset","items"} with the entries written by `append`; the second without the braces.
void writeListing(const ListRequest& request, const Listing& listing,
                  void (*append)(const DIRENTRY_INFO&, int, std::string&), Output& out);
void writePage(const ListRequest& request, const Listing& listing,
               void (*append)(const DIRENTRY_INFO&, int, std::string&), Output& out);

}  // namespace orvel::cgi

#endif
