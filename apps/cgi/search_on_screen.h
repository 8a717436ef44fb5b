// The search whose results a user looks at while working on files: a request names it by "search_taskid", and what is
// done to a file it shows is done to its results as well.
#ifndef ORVEL_CGI_SEARCH_ON_SCREEN_H
#define ORVEL_CGI_SEARCH_ON_SCREEN_H

#include <memory>
#include <string>

#include "orvel/file_info.h"
#include "orvel/search_task.h"

namespace orvel::cgi {

// Failures are the library's to log: an operation on files does not fail over results that stay behind.
class SearchOnScreen {
 public:
    // The task `taskId` of the user, on whatever volume; "" and an unknown one: nothing is ever done. The process has
    // the user's identity.
    SearchOnScreen(const std::string& user, const std::string& taskId);

    // The file or folder is gone, with everything below it.
    void removed(const PathInfo& gone);
    // A file or folder was made here.
    void added(const PathInfo& made);
    // It has another place now, with everything below it.
    void moved(const PathInfo& from, const PathInfo& to);

 private:
    std::unique_ptr<FileSearch::OrvSearchDBTask> task_;
};

}  // namespace orvel::cgi

#endif
