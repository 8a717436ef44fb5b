// Who is notified once an operation has changed files: the transfer log, and the search that the user has on screen.
#ifndef ORVEL_CGI_OPERATION_CHANGE_NOTICES_H
#define ORVEL_CGI_OPERATION_CHANGE_NOTICES_H

#include <string>

#include "operation/item.h"
#include "operation/operation.h"
#include "shown_search.h"

namespace orvel::cgi {

// `whole`: false when some of the item failed, or was not reached, but not all of it.
class ChangeNotices {
 public:
    // `search`: the parameter that names the search.
    explicit ChangeNotices(const Operation& operation, const char* search = "taskid");

    // `path`: the share-relative path of `file`; `isFolder`: what it was.
    void deleted(const std::string& path, const ChangedFile& file, bool isFolder, bool whole);
    void copied(const Item& from, const ChangedFile& to, long long bytes);
    void moved(const Item& from, const ChangedFile& to, long long bytes, bool whole);
    // The permissions of what a request names, and below it; refreshed: of each that was changed.
    void permitted(const Item& item);
    void refreshed(const ChangedFile& file) { search_.refreshed(file); }

 private:
    const std::string& user_;
    ShownSearch search_;
};

}  // namespace orvel::cgi

#endif
