#include "descriptors.h"

#include <algorithm>
#include <charconv>
#include <filesystem>

namespace orvel::orveld {

std::vector<std::string> otherDescriptors(const std::vector<int>& named) {
    std::vector<std::string> others;
    std::error_code error;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd", error)) {
        std::string text = entry.path().filename();
        int number = -1;
        std::from_chars(text.data(), text.data() + text.size(), number);
        if (std::find(named.begin(), named.end(), number) != named.end()) continue;
        const std::string target = std::filesystem::read_symlink(entry.path(), error);
        // The descriptor that this very look is made through.
        if (!target.starts_with("/proc/") || !target.ends_with("/fd"))
            others.push_back(text.append(" -> ").append(target));
    }
    return others;
}

}  // namespace orvel::orveld
