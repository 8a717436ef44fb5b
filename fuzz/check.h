// What the fuzz targets share.
#ifndef ORVEL_FUZZ_CHECK_H
#define ORVEL_FUZZ_CHECK_H

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <string_view>

namespace fuzz {

inline void require(bool holds) {
    if (!holds) std::abort();
}

inline std::string_view text(const std::uint8_t* data, std::size_t size) {
    return {reinterpret_cast<const char*>(data), size};
}

// A folder of this process, removed at its end. Made at first use, as system root of the platform too.
inline const std::string& folder() {
    struct Folder {
        Folder() {
            std::string name = (std::filesystem::temp_directory_path() / "orvel-fuzz-XXXXXX").string();
            require(mkdtemp(name.data()) != nullptr);
            path = name;
            setenv("VEXO_ROOT", path.c_str(), 1);
        }
        ~Folder() {
            std::error_code ignored;
            std::filesystem::remove_all(path, ignored);
        }
        std::string path;
    };
    static const Folder made;
    return made.path;
}

}  // namespace fuzz

#endif
