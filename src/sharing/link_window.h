// From when to when a sharing link is valid. Pure.
#ifndef ORVEL_SHARING_LINK_WINDOW_H
#define ORVEL_SHARING_LINK_WINDOW_H

#include <cstdint>

namespace orvel {

// Seconds since 1970, as the link's row holds them.
struct LinkWindow {
    std::int64_t available = 0;
    std::int64_t expires = 0;
};

// Is the link valid at `now`? An end date is stored as the last second of a day or as its first; either way the link
// is valid through the whole of that day. An end date of 0 means no window at all.
bool isWithin(const LinkWindow& window, std::int64_t now);

}  // namespace orvel

#endif
