#include "sharing/link_window.h"

#include <limits>

namespace orvel {
namespace {

constexpr std::int64_t kRestOfDay = 86399;

// Dates beyond the range of 64 bits stay at its end.
std::int64_t plus(std::int64_t date, std::int64_t seconds) {
    std::int64_t sum = 0;
    if (!__builtin_add_overflow(date, seconds, &sum)) return sum;
    return seconds > 0 ? std::numeric_limits<std::int64_t>::max() : std::numeric_limits<std::int64_t>::min();
}

}  // namespace

bool isWithin(const LinkWindow& window, std::int64_t now) {
    // The first second of a day is a multiple of 10, its last is not.
    const std::int64_t day = window.expires % 10 != 0 ? plus(window.expires, -kRestOfDay) : window.expires;
    if (day == 0) return true;
    return window.available <= now && now <= plus(day, kRestOfDay);
}

}  // namespace orvel
