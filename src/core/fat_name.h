// What a FAT file system can store as a name.
#ifndef ORVEL_CORE_FAT_NAME_H
#define ORVEL_CORE_FAT_NAME_H

#include <string_view>

namespace orvel {

[[nodiscard]] inline bool fatStores(std::string_view name) {
    return name.find_first_of("\\/:*?\"><|\r\n") == std::string_view::npos;
}

}  // namespace orvel

#endif
