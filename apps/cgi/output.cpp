#include "output.h"

#include <unistd.h>

#include <cerrno>
#include <utility>

namespace orvel::cgi {
namespace {

constexpr size_t kBlock = size_t{64} * 1024;

}  // namespace

void Output::spill() {
    if (text_.size() >= kBlock) write();
}

bool Output::finish() {
    write();
    return !broken_;
}

void Output::write() {
    if (beginning_ != nullptr) std::exchange(beginning_, nullptr)();
    std::string_view rest = text_;
    while (!rest.empty() && !broken_) {
        const ssize_t written = ::write(fd_, rest.data(), rest.size());
        if (written > 0) {
            rest.remove_prefix(static_cast<size_t>(written));
        } else if (written == 0 || errno != EINTR) {
            broken_ = true;
        }
    }
    text_.clear();
}

}  // namespace orvel::cgi
