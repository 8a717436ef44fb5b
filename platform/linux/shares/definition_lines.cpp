#include "shares/definition_lines.h"

namespace vexo {

std::string_view trimmed(std::string_view text) {
    const size_t first = text.find_first_not_of(kDefinitionBlanks);
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(kDefinitionBlanks) - first + 1);
}

bool DefinitionLines::next(std::string& line, int& number) {
    while (!rest_.empty()) {
        number = number_ + 1;
        std::string_view part = take();
        const std::string_view start = trimmed(part);
        if (start.empty() || start.front() == '#' || start.front() == ';') continue;  // a comment never continues
        std::string joined;
        while (continues(part)) {
            joined += part.substr(0, part.find_last_of('\\'));
            part = take();
        }
        joined += part;
        line = trimmed(joined);
        if (!line.empty()) return true;
    }
    return false;
}

// Only a backslash with a newline behind it, not the last byte of the text, continues the line.
bool DefinitionLines::continues(std::string_view part) const {
    const size_t last = part.find_last_not_of(kDefinitionBlanks);
    return ended_ && last != std::string_view::npos && part[last] == '\\';
}

std::string_view DefinitionLines::take() {
    ++number_;
    const size_t end = rest_.find('\n');
    const std::string_view part = rest_.substr(0, end);
    ended_ = end != std::string_view::npos;
    rest_ = ended_ ? rest_.substr(end + 1) : std::string_view();
    return part;
}

}  // namespace vexo
