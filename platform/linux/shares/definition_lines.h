// The lines of share definitions, and their blanks.
#ifndef VEXO_LINUX_DEFINITION_LINES_H
#define VEXO_LINUX_DEFINITION_LINES_H

#include <string>
#include <string_view>

namespace vexo {

constexpr std::string_view kDefinitionBlanks = " \t\n\v\f\r";

inline bool isDefinitionBlank(char c) {
    return kDefinitionBlanks.find(c) != std::string_view::npos;
}

// `text` without the blanks at its ends.
[[nodiscard]] std::string_view trimmed(std::string_view text);

// Gives the lines of a text: comments and empty lines left out, continued lines joined.
class DefinitionLines {
 public:
    explicit DefinitionLines(std::string_view text) : rest_(text) {}

    // The next line, without blanks at its ends, and the number it begins at; false at the end.
    bool next(std::string& line, int& number);

 private:
    [[nodiscard]] bool continues(std::string_view part) const;
    std::string_view take();

    std::string_view rest_;
    int number_ = 0;
    bool ended_ = false;  // the part last taken had its newline
};

}  // namespace vexo

#endif
