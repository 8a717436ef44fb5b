// The search whose results the user has on screen while he changes files: its rows follow what is done.
#ifndef ORVEL_CGI_SHOWN_SEARCH_H
#define ORVEL_CGI_SHOWN_SEARCH_H

#include <string>

#include "base/descriptor.h"
#include "orvel/file_info.h"
#include "orvel/user_directory.h"
#include "search_task.h"

namespace orvel::cgi {

// A file or folder by the open folder that holds it. `info`: what a path in the same share resolved to.
struct ChangedFile {
    const PathInfo& info;
    const Descriptor& folder;
    const std::string& name;
};

// Calls come after the operation, as the user. A row that cannot be brought up to date is logged; the operation was
// done all the same.
class ShownSearch {
 public:
    // `taskId`: parameter "taskid", "" for none. An unknown or expired id counts as none.
    ShownSearch(const std::string& user, const std::string& taskId);
    // The rows are as they are to be: whoever is answered after this, or sees the task's end, finds them so.
    ~ShownSearch();
    ShownSearch(const ShownSearch&) = delete;
    ShownSearch& operator=(const ShownSearch&) = delete;

    // A file or folder came into being, or a file got a new content.
    void added(const ChangedFile& file);
    // Its owner, group or permissions changed.
    void refreshed(const ChangedFile& file);
    // It is gone, with everything below it.
    void removed(const ChangedFile& file);
    // Some of what is below it may be gone.
    void reduced(const ChangedFile& folder) { movedPartly(folder, nullptr); }
    // Some of what was below `from` lies at the same place below `to` now (null: nowhere).
    void movedPartly(const ChangedFile& from, const ChangedFile* to);
    // What was `from` is `to` now, with everything below it.
    void moved(const ChangedFile& from, const ChangedFile& to);

 private:
    SearchTask task_;
    OrvelUserEnum names_;
};

}  // namespace orvel::cgi

#endif
