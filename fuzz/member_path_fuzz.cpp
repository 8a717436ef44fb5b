// Any name and link text of an archive's member: whatever is accepted leads down.
#include <vector>

#include "check.h"
#include "operation/member_path.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view input = fuzz::text(data, size);
    if (const auto components = orvel::cgi::memberComponents(input)) {
        fuzz::require(!components->empty() && input.front() != '/');
        for (const std::string& one : *components)
            fuzz::require(!one.empty() && one != "." && one != ".." && one.find('/') == std::string::npos);
    }
    for (const std::size_t depth : {std::size_t{0}, std::size_t{1}, std::size_t{3}}) {
        if (!orvel::cgi::staysInside(input, depth)) continue;
        fuzz::require(!input.empty() && input.front() != '/');
        auto at = static_cast<long>(depth);
        for (std::string_view rest = input; !rest.empty();) {
            const std::string_view one = rest.substr(0, rest.find('/'));
            rest.remove_prefix(std::min(rest.size(), one.size() + 1));
            if (one == "..") fuzz::require(--at >= 0);
            if (one != ".." && one != "." && !one.empty()) ++at;
        }
    }
    return 0;
}
