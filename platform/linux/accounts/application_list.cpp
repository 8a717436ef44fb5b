#include "accounts/application_list.h"

#include <utility>

#include "shares/definition_lines.h"
#include "shares/share_definitions.h"

namespace vexo {
ApplicationList parseApplications(std::string_view text) {
    ApplicationList list;
    for (int number = 1; !text.empty(); ++number) {
        const size_t end = text.find('\n');
        const std::string_view line = trimmed(text.substr(0, end));
        text = end == std::string_view::npos ? std::string_view() : text.substr(end + 1);
        if (line.empty() || line.front() == '#' || line.front() == ';') continue;
        const size_t colon = line.find(':');
        const std::string_view identifier = trimmed(line.substr(0, colon));
        if (colon == std::string_view::npos || identifier.empty()) {
            list.malformed.push_back(number);
            // Whoever wrote it meant a restriction: it must not leave the application to everybody.
            if (!identifier.empty())
                list.users.try_emplace(std::string(identifier.substr(0, identifier.find_first_of(" \t"))));
            continue;
        }
        std::vector<std::string>& users = list.users[std::string(identifier)];
        for (std::string& entry : splitList(line.substr(colon + 1))) users.push_back(std::move(entry));
    }
    return list;
}

}  // namespace vexo
