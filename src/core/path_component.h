// The components of a share-relative path.
#ifndef ORVEL_CORE_PATH_COMPONENT_H
#define ORVEL_CORE_PATH_COMPONENT_H

#include <cstring>
#include <string_view>

#include "core/owned.h"

namespace orvel {

// The first or the last component of `path` as OrvLibGetTokOfPath finds it; null on failure, which is logged.
[[nodiscard]] CString pathComponent(const char* path, bool first);

// What follows the first component in `path`, as it stands: "/2012//a.jpg" behind "photo".
[[nodiscard]] inline const char* restOfPath(const char* path, std::string_view component) {
    return path + strspn(path, "/") + component.size();
}

}  // namespace orvel

#endif
