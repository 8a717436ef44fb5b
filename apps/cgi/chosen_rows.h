// Rows of a kept listing as a request chooses them: parameters "listing", its id, "ranges", and "except".
#ifndef ORVEL_CGI_CHOSEN_ROWS_H
#define ORVEL_CGI_CHOSEN_ROWS_H

#include <json/forwards.h>
#include <sys/stat.h>

#include <string>
#include <vector>

#include "kept_listing.h"
#include "row_ranges.h"
#include "vexo/web.h"

namespace orvel::cgi {

class ChosenRows {
 public:
    // Whether a request chooses so.
    [[nodiscard]] static bool isIn(const VEXO::WebCGI& web);

    // Finds the listing and the rows. 0; 400 for ranges that are wrong, else as KeptListing::find. The process has the
    // user's identity.
    int find(const User& user, const VEXO::WebCGI& web);
    // Opens the folder. 0 or as KeptListing::openFolder.
    int openFolder(const User& user);

    [[nodiscard]] size_t size() const { return rows_.size(); }
    // The share-relative path of the folder, as the listing has it.
    [[nodiscard]] const std::string& path() { return listing_.file().about().path; }
    [[nodiscard]] const ChosenRowNumbers& numbers() const { return rows_; }
    [[nodiscard]] KeptListing& listing() { return listing_; }
    [[nodiscard]] const OpenedFolder& opened() const { return opened_; }

    // One of them. 0, or 401 when the file is damaged.
    int row(size_t position, KeptRow& row);
    // Looks at it in the open folder: 0 with its status. 408 when it is gone, or something of another kind, or the
    // folder lies elsewhere by now.
    int look(const KeptRow& row, struct stat& status) const;

    // The names that the folder shows by now, under the same conditions, and that the listing lacks. 0 or a code.
    int namesSince(const User& user, std::vector<std::string>& names);

    // What a failure is about, for `data` of the reply: {"listing"} or {"parameter"}.
    void explain(Json::Value& data) const;

 private:
    KeptListing listing_;
    ChosenRowNumbers rows_;
    OpenedFolder opened_;
    std::string wrong_;  // the parameter
};

}  // namespace orvel::cgi

#endif
