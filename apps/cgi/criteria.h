// What a search asks for, from the words of a request.
//
//   name             patterns, separated by commas
//   type             "dir" or "file"; "all" asks for nothing
//   extension        extensions without their ".", separated by commas; files only
//   owner, group     names
//   mtime_from       modified at or after; mtime_to before: seconds since the epoch
//   crtime_from, crtime_to, atime_from, atime_to   the same of creation and last access
//   size_equal       bytes, within about 5 per cent; size_less, size_greater
// An empty value asks for nothing.
#ifndef ORVEL_CGI_CRITERIA_H
#define ORVEL_CGI_CRITERIA_H

#include <functional>
#include <string>
#include <vector>

#include "orvel/search_criteria.h"

namespace orvel::cgi {

// Owns criteria; the library only borrows them.
class Criteria {
 public:
    Criteria() = default;
    ~Criteria();
    Criteria(const Criteria&) = delete;
    Criteria& operator=(const Criteria&) = delete;

    // As FindFactory::createFindOp. 0 or its library code.
    int add(FileSearch::_tag_FIND_FIELD_ field, const char* op, const std::string& value);
    // Adds the names that match one of the patterns, which are separated by commas. 400, too, for a pattern over 490
    // bytes and for more than 100 of them.
    int addNames(const std::string& patterns);
    [[nodiscard]] const std::vector<FileSearch::FindComp*>& list() const { return list_; }
    // Those that ask about access times, which an index cannot know.
    [[nodiscard]] const std::vector<FileSearch::FindATimeComp*>& accessTimes() const { return accessTimes_; }

 private:
    std::vector<FileSearch::FindComp*> list_;
    std::vector<FileSearch::FindATimeComp*> accessTimes_;
};

// The names above, in their order.
const std::vector<std::string>& criterionNames();

// Makes the criteria from what `valueOf` gives for each name. 0; 400 for an invalid value (not a number, unknown kind,
// a pattern over 490 bytes, more than 100 of them) and for none at all, 403 unknown user, 404 unknown group, with the
// name in `culprit` ("" for none at all).
int parseCriteria(const std::function<std::string(const std::string& name)>& valueOf, Criteria& criteria,
                  std::string& culprit);

}  // namespace orvel::cgi

#endif
