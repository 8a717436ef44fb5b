// Where the data of an upload goes: the checks before it comes, the place it takes after.
#ifndef ORVEL_CGI_UPLOAD_STORE_H
#define ORVEL_CGI_UPLOAD_STORE_H

#include <sys/stat.h>

#include <ctime>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "request.h"
#include "target.h"
#include "upload/spool.h"
#include "vexo/copy.h"

namespace orvel::cgi {

// Set by SIGTERM (the web server's word that the client is gone): the upload ends and leaves nothing. The first call
// begins to watch for it.
int isCancelled();

// What a client knew of the file when it decided to store its own: the headers If-Match and If-None-Match.
struct Condition {
    std::string match;       // tags of download, of which the file must have one; "" for none
    bool mustBeNew = false;  // "*": no file
};

// Failures of a condition: the file is another one by now, or (of If-Match) somebody has it open for writing.
inline constexpr int kUploadChanged = 1806;
inline constexpr int kUploadInUse = 1807;

// One file on its way to one path: begin, write as the data comes, finish. Each answers 0 or a library code, after
// which the object is only destroyed; nothing is left behind then.
class Upload {
 public:
    // `search`: task id of a search whose results shall show the file, "" for none. `modified`: the file's time of
    // modification, now without one.
    Upload(const User& user, std::string path, _tag__type_ mode, std::string search, std::optional<time_t> modified,
           Condition condition = {})
        : user_(user),
          path_(std::move(path)),
          mode_(mode),
          search_(std::move(search)),
          modified_(modified),
          condition_(std::move(condition)) {
        if (!condition_.match.empty()) mode_ = OVERWRITE_MODE_OVERWRITE;
        if (condition_.mustBeNew) mode_ = OVERWRITE_MODE_ERROR;
    }

    // Asks every rule and takes on the user's identity.
    int begin();
    // The steps of begin() for data that stays between requests, in the spool that the caller opens: identity, and what
    // the rules say of it now.
    int enter();
    int check() { return rules_ != ORV_ERR_NONE ? rules_ : inspect(); }
    // A name that is taken leads to one beside it.
    void keepBoth() { keepBoth_ = true; }
    // Which folder it is that the file will be in, "" where it is not there yet; finish() puts the file into no other.
    [[nodiscard]] std::string folderNow() const;
    void expectFolder(std::string folder) { folder_ = std::move(folder); }
    Spool& spool() { return spool_; }
    [[nodiscard]] const std::string& volumePath() const { return info_.volumePath; }
    int write(std::string_view data);
    // Puts the file in place and logs it. On 0 it is on the disk, under its name. `naming` is called before each name
    // that is tried (1: the one that was asked for, see keepBoth), false ends it.
    int finish(const std::function<bool(int number)>& naming = nullptr);

    // An existing file was left as it is, as asked for; what is written is not kept. Known after begin().
    [[nodiscard]] bool skipped() const { return skipped_; }
    // Of what was stored under If-Match, "" otherwise: the tag that the next If-Match names.
    [[nodiscard]] const std::string& tag() const { return tag_; }
    [[nodiscard]] const std::string& path() const { return path_; }
    [[nodiscard]] long long size() const { return spool_.size(); }

 private:
    int inspect();
    int judge(const Target& target, bool& there) const;
    int putNamed(Target& target, const std::function<bool(int number)>& naming);
    int put(const Target& target);
    int replace(const std::string& source, const std::string& place, const VEXOCOPYOPT& options);
    static int isExpected(const struct stat* old, const struct stat* fresh, void* upload);

    const User& user_;
    std::string path_;
    _tag__type_ mode_;
    std::string search_;
    std::optional<time_t> modified_;
    Condition condition_;
    std::string tag_;
    bool skipped_ = false;
    bool keepBoth_ = false;
    int rules_ = ORV_ERR_NONE;  // of the share
    std::string folder_;        // that is expected
    PathInfo info_;
    Spool spool_;
};

}  // namespace orvel::cgi

#endif
