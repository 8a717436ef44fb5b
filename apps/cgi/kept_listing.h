// Listings that stay: the order that a folder showed, for further pages, and for work on what was chosen in it.
#ifndef ORVEL_CGI_KEPT_LISTING_H
#define ORVEL_CGI_KEPT_LISTING_H

#include <optional>
#include <string>
#include <vector>

#include "kept_file.h"
#include "listing.h"
#include "orvel/file_info.h"
#include "request.h"

namespace orvel::cgi {

// How a kept listing is ordered beside what the library orders by.
struct KeptOrder {
    std::string natural;        // names as people of this language expect them; "" for as the library does
    bool foldersFirst = false;  // also when descending
};

// One row of a page: the name alone, `gone`, where nothing of that name and kind is there any more.
struct KeptPageRow {
    DIRENTRY_INFO entry;
    bool gone = false;
};

// What is kept anew, with its first page.
struct KeptAnew {
    std::string id;       // "" when it could not be kept,
    std::string refusal;  // as it is "full" or "failed"
    unsigned long total = 0;
    std::vector<KeptPageRow> rows;
};

// A folder that is open as a place, and how it was found.
struct OpenedFolder {
    PathInfo info;
    Descriptor folder;
    std::string realPath;
    FolderState state;
};

// Resolves, asks whether the user may list it, and opens it beneath its share's root. 0 or a library code.
int openListed(const ListRequest& request, OpenedFolder& opened);

// Lists the folder whole and keeps its order. One that cannot be kept is listed all the same. 0 or a library code.
// Needs memory for all names of the folder while it works, about half a KiB each.
int keepFolder(const ListRequest& request, const KeptOrder& order, KeptAnew& anew);

// A kept listing that was found again.
class KeptListing {
 public:
    // Finds and holds it. 0; else 408, `why` "gone", or 401, "damaged", and then it is removed.
    int find(const std::string& user, const std::string& id);
    // Opens its folder, as openListed. 408, `why` "replaced", when that is another one by now.
    int openFolder(const ListRequest& request, OpenedFolder& opened);

    // The page that `request` asks for. 0 or a library code.
    int page(const ListRequest& request, const OpenedFolder& opened, std::vector<KeptPageRow>& rows);

    // What the rows before `end` are like: another text as soon as one of them is changed; "" for what may still change
    // without leaving another time. 0 or 401.
    int stateOfRows(uint32_t first, uint32_t end, const OpenedFolder& opened, std::string& state);

    // The first row from `from` on, and round, whose name begins so; nothing in `row` when there is none. 0 or 401.
    int findBeginning(const std::string& text, uint32_t from, std::optional<uint32_t>& row);
    // The rows of the names, -1 for those that it lacks. 0 or 401.
    int rowsOf(const std::vector<std::string>& names, std::vector<int64_t>& rows);

    [[nodiscard]] KeptFile& file() { return file_; }
    // What a failure is about: see find() and openFolder().
    [[nodiscard]] const std::string& why() const { return why_; }
    // For who found a block of its file damaged: as find().
    int damaged();

 private:
    std::string user_, id_, why_;
    KeptFile file_;
};

}  // namespace orvel::cgi

#endif
