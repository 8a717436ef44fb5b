// A file of lines, read in blocks of whole lines: however large it is, no more than a block lies in memory.
#ifndef ORVEL_BASE_LINE_BLOCKS_H
#define ORVEL_BASE_LINE_BLOCKS_H

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <string>
#include <string_view>

namespace orvel {

class LineBlocks {
 public:
    static constexpr std::size_t kLargest = std::size_t{1} << 20;

    // Reads `fd`, which must outlive it, from where it stands; `size` is what the file is expected to hold.
    LineBlocks(int fd, std::size_t size) : fd_(fd), buffer_(std::clamp<std::size_t>(size + 1, 4096, kLargest), '\0') {}

    // The next lines, with their ends; the last one of the file may lack its own. A line that does not fit into a block
    // is passed over. False at the end, and with failed() and errno when the file cannot be read.
    bool next(std::string_view& lines) {
        while (!atEnd_ && !failed_) {
            std::copy(buffer_.begin() + static_cast<std::ptrdiff_t>(used_),
                      buffer_.begin() + static_cast<std::ptrdiff_t>(have_), buffer_.begin());
            have_ -= used_;
            used_ = 0;
            if (!fill()) break;
            const std::string_view text(buffer_.data(), have_);
            used_ = atEnd_ ? have_ : text.rfind('\n') + 1;  // 0 without an end
            lines = text.substr(0, used_);
            if (within_ && !lines.empty()) {
                const std::size_t end = lines.find('\n');
                within_ = end == std::string_view::npos;
                lines.remove_prefix(within_ ? lines.size() : end + 1);
            }
            if (used_ == 0 && have_ == buffer_.size()) {
                used_ = have_;
                within_ = true;
            }
            if (!lines.empty()) return true;
        }
        return false;
    }
    [[nodiscard]] bool failed() const { return failed_; }

 private:
    // Reads until the buffer is full or the file at its end. False on failure.
    bool fill() {
        while (have_ < buffer_.size() && !atEnd_) {
            const ssize_t got = read(fd_, buffer_.data() + have_, buffer_.size() - have_);
            if (got < 0 && errno == EINTR) continue;
            failed_ = got < 0;
            if (failed_) return false;
            have_ += static_cast<std::size_t>(got);
            atEnd_ = got == 0;
        }
        return true;
    }

    int fd_;
    std::string buffer_;
    std::size_t have_ = 0, used_ = 0;  // bytes in the buffer, and those of them that were handed out
    bool within_ = false;              // what comes next is the rest of a line that did not fit
    bool atEnd_ = false, failed_ = false;
};

}  // namespace orvel

#endif
