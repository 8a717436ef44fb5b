// What is kept of an upload between its requests: a file of its own in the user's store /var/lib/vexo/uploads. The
// bytes lie on the volume that they go to (see upload/spool.h). See docs/formats/uploads.md.
//
// The file is the user's own, so nothing in it is believed: every request asks the rules again.
#ifndef ORVEL_CGI_TUS_RECORD_H
#define ORVEL_CGI_TUS_RECORD_H

#include <chrono>
#include <ctime>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "base/descriptor.h"
#include "own_store.h"

namespace orvel::cgi {

inline constexpr long long kUploadKeptSeconds = 2LL * 24 * 60 * 60;  // after its last byte
inline constexpr size_t kLongestMetadata = 8 * 1024;

struct UploadFacts {
    std::string path;  // share-relative
    long long size = 0;
    std::string conflict;            // error, skip, overwrite, keep_both
    std::optional<time_t> modified;  // time of modification of the file
    std::string search;              // whose results shall show it, "" for none
    std::string metadata;            // the header Upload-Metadata
    std::string folder;              // which one it goes to, "" for one that was not there (see Upload::folderNow)
    time_t created = 0;
};

enum class UploadState : char {
    kGoing = 'g',    // all bytes that are there count
    kChecked = 'c',  // `number` bytes count; behind them comes a piece that must have a checksum
    kNaming = 'n',   // all bytes are there, and the file is given its name, or the one beside it with this number
    kDone = 'd',     // it has that name
    kSkipped = 's'   // all bytes came, and were dropped, for the sake of a file of that name
};

bool isConflict(std::string_view word);

// An id that an upload can have.
bool isUploadId(std::string_view text);

// The bytes that all unfinished uploads of a user may have, once they are whole: the setting "unfinished_upload_gib".
long long mostUnfinishedBytes();

class UploadRecord {
 public:
    UploadRecord() = default;
    // One that is not kept yet.
    explicit UploadRecord(UploadFacts facts) : facts_(std::move(facts)) {}
    // 0, with a new id; 415 when the user has too many unfinished ones or of too many bytes, or the code of the
    // failure.
    int create(const std::string& user, const std::string& id, UploadFacts facts);
    // 0; 408 when the user has none of that id, or it expired; 420 when it is to be locked and somebody else has it,
    // still after `wait`.
    int open(const std::string& user, const std::string& id, bool lock, std::chrono::seconds wait = {});

    [[nodiscard]] const std::string& id() const { return id_; }
    [[nodiscard]] const UploadFacts& facts() const { return facts_; }
    [[nodiscard]] UploadState state() const { return state_; }
    [[nodiscard]] long long number() const { return number_; }
    [[nodiscard]] bool isOver() const { return state_ == UploadState::kDone || state_ == UploadState::kSkipped; }
    [[nodiscard]] time_t expires() const { return touched_ + kUploadKeptSeconds; }
    // How much counts of `size` bytes that are there.
    [[nodiscard]] long long counted(long long size) const;
    // On the disk when true; else errno says why. It expires later by that.
    bool setState(UploadState state, long long number = 0);
    void remove();

 private:
    int take(const Descriptor& folder, bool lock, std::chrono::seconds wait);
    bool parse(const std::string& text, const std::string& user);

    std::string id_;
    UploadFacts facts_;
    UploadState state_ = UploadState::kGoing;
    long long number_ = 0;
    time_t touched_ = 0;
    Descriptor folder_, file_;
};

// The user's uploads that are not over, oldest first.
std::vector<UploadRecord> unfinishedUploads(const std::string& user);

// Removes records of what nobody sent a byte of for two days. As root.
[[nodiscard]] OwnSweep sweepUploadRecords();
// The ids of all that are left, of all users: their bytes are to stay. Nothing with errno when they cannot be listed.
[[nodiscard]] std::optional<std::set<std::string>> keptUploadIds();

}  // namespace orvel::cgi

#endif
