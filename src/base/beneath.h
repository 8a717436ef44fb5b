// Opening what a path names below an open folder, so that nothing in the path leads out of that folder.
#ifndef ORVEL_BASE_BENEATH_H
#define ORVEL_BASE_BENEATH_H

#include <string>

#include "base/descriptor.h"

namespace orvel {

// What symbolic links in such a path may do.
enum class LinkPolicy {
    kInside,  // lead anywhere within the folder; absolute ones always count as leaving it
    kNone     // not be followed at all
};

// Opens `path`, relative, beneath the open folder `root` with the flags of open(2). Null with errno: EXDEV when the
// path leaves the folder, ELOOP when the policy forbids a link in it.
[[nodiscard]] Descriptor openBeneath(const Descriptor& root, const std::string& path, LinkPolicy policy, int flags);

// What a link of /proc says; "" with errno when that is no path, or longer than 4,095 bytes.
[[nodiscard]] std::string linkedPath(const std::string& link);
// Where an open file or folder lies, free of links; "" as above.
[[nodiscard]] inline std::string realPathOf(const Descriptor& opened) {
    return linkedPath(opened.path());
}

// What follows `root` in the real path `path`, which begins with it, for openBeneath: "." for the root itself.
[[nodiscard]] std::string pathBelow(const std::string& root, const std::string& path);

}  // namespace orvel

#endif
