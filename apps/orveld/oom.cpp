#include "oom.h"

#include <fcntl.h>
#include <unistd.h>

#include <string_view>

namespace orvel::orveld {
namespace {

constexpr const char* kScore = "/proc/self/oom_score_adj";
bool isProtected = false;

bool setScore(std::string_view score) {
    const int fd = open(kScore, O_WRONLY | O_CLOEXEC);
    if (fd < 0) return false;
    const bool written = write(fd, score.data(), score.size()) == static_cast<ssize_t>(score.size());
    close(fd);
    return written;
}

}  // namespace

void enterProtection() {
    isProtected = setScore("-900");
}

void leaveProtection() {
    if (isProtected) setScore("0");
}

}  // namespace orvel::orveld
