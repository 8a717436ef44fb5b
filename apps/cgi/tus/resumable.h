// One upload that goes on over several requests: begun, looked at, continued, ended.
#ifndef ORVEL_CGI_TUS_RESUMABLE_H
#define ORVEL_CGI_TUS_RESUMABLE_H

#include <chrono>
#include <optional>
#include <string>

#include "request.h"
#include "tus/checksum.h"
#include "tus/record.h"
#include "upload/store.h"

namespace orvel::cgi {

// What a request with a piece came to, beside a library code.
enum class Piece {
    kTaken,
    kTooLong,      // longer than what is missing
    kOtherOffset,  // begins elsewhere than where the bytes end
    kCut,          // the client went away; what came counts, unless it had to have a checksum
    kMismatch,     // does not have its checksum
    kFailed        // see the code
};

// Each function answers 0 or a library code; the process acts as the user from then on.
class Resumable {
 public:
    explicit Resumable(const User& user) : user_(user) {}

    // Begins one, after all rules were asked, and makes its id.
    int create(UploadFacts facts);
    // What an existing file means from now on, as far as open() is concerned; "" for what the upload was begun with.
    void answer(std::string conflict) { conflict_ = std::move(conflict); }
    // Opens one of the user's; 420 when it is to be locked and another request has it, still after `wait`.
    int open(const std::string& id, bool lock, std::chrono::seconds wait = {});
    // Appends the body of the request. It is on the disk, and where it was the last piece the file has its name.
    // What was sent before stays, whatever happens.
    int append(long long offset, long long length, std::optional<Checksum> checksum, Piece& piece);
    // Gives the file its name, when all of it is there and that was not done yet.
    int complete();
    // Removes the upload and its bytes.
    int remove();

    // open() with a lock got as far as that.
    [[nodiscard]] bool isLocked() const { return locked_; }
    [[nodiscard]] const UploadRecord& record() const { return record_; }
    // How much of it is on the disk, and counts.
    [[nodiscard]] long long offset() const;
    [[nodiscard]] bool isWhole() const { return offset() == record_.facts().size; }
    // The path that the file has got, or that was asked for.
    [[nodiscard]] std::string path() const;

 private:
    int enter();
    bool receive(long long length, std::optional<Checksum>& checksum, bool& whole, int& code);
    int take(long long offset, long long length, std::optional<Checksum>& checksum, Piece& piece);

    const User& user_;
    UploadRecord record_;
    bool locked_ = false;
    std::string conflict_;
    std::optional<Upload> upload_;
};

}  // namespace orvel::cgi

#endif
