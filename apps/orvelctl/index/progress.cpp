#include "index/progress.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>

#include "command.h"

namespace orvel::ctl {
namespace {

constexpr auto kPause = std::chrono::milliseconds(100);

size_t columns() {
    winsize size = {};
    return ioctl(2, TIOCGWINSZ, &size) == 0 && size.ws_col > 1 ? size.ws_col : 80;
}

// The beginning of a UTF-8 text, at most `limit` characters. Wide ones take more room than that; a line that wraps is
// all that comes of it.
std::string cut(const std::string& text, size_t limit) {
    size_t characters = 0, end = 0;
    for (; end < text.size(); ++end) {
        const bool begins = (static_cast<unsigned char>(text[end]) & 0xC0) != 0x80;
        if (begins && ++characters > limit) break;
    }
    return text.substr(0, end);
}

}  // namespace

Progress::Progress() : shown_(isatty(2) == 1), start_(Clock::now()), last_(start_) {}

Progress::~Progress() {
    if (drawn_) fprintf(stderr, "\r\x1B[K");
}

void Progress::at(const std::string& folder, unsigned long long entries) {
    total_ += entries;
    const auto now = Clock::now();
    if (!shown_ || now - last_ < kPause) return;
    last_ = now;
    drawn_ = true;
    const std::chrono::duration<double> passed = now - start_;
    const auto rate = static_cast<unsigned long long>(static_cast<double>(total_) / passed.count());
    const std::string line =
        std::to_string(total_) + " entries, " + std::to_string(rate) + "/s  " + terminalText(folder);
    fprintf(stderr, "\r%s\x1B[K", cut(line, columns() - 1).c_str());
}

}  // namespace orvel::ctl
