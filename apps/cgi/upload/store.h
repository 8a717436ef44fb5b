// Where the data of an upload goes: the checks before it comes, the place it takes after.
#ifndef ORVEL_CGI_UPLOAD_STORE_H
#define ORVEL_CGI_UPLOAD_STORE_H

#include <ctime>
#include <optional>
#include <string>
#include <string_view>

#include "orvel/privilege.h"
#include "request.h"
#include "target.h"
#include "upload/spool.h"

namespace orvel::cgi {

// Set by SIGTERM (the web server's word that the client is gone): the upload ends and leaves nothing. The first call
// begins to watch for it.
int isCancelled();

// One file on its way to one path: begin, write as the data comes, finish. Each answers 0 or a library code, after
// which the object is only destroyed; nothing is left behind then.
class Upload {
 public:
    // `search`: task id of a search whose results shall show the file, "" for none. `modified`: the file's time of
    // modification, now without one.
    Upload(const User& user, std::string path, _tag__type_ mode, std::string search, std::optional<time_t> modified)
        : user_(user), path_(std::move(path)), mode_(mode), search_(std::move(search)), modified_(modified) {}

    // Asks every rule and takes on the user's identity.
    int begin();
    int write(std::string_view data);
    // Puts the file in place and logs it. On 0 it is on the disk, under its name.
    int finish();

    // An existing file was left as it is, as asked for; what is written is not kept. Known after begin().
    [[nodiscard]] bool skipped() const { return skipped_; }
    [[nodiscard]] const std::string& path() const { return path_; }
    [[nodiscard]] long long size() const { return spool_.size(); }

 private:
    int inspect();
    int put(const Target& target);

    const User& user_;
    std::string path_;
    _tag__type_ mode_;
    std::string search_;
    std::optional<time_t> modified_;
    bool skipped_ = false;
    PathInfo info_;
    Spool spool_;
};

}  // namespace orvel::cgi

#endif
