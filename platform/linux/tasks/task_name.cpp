#include "tasks/task_name.h"

namespace vexo {
namespace {

constexpr size_t kLongest = 200;  // leaves room for what stands around the name of a temporary file
constexpr char kDigits[] = "0123456789ABCDEF";

bool isEscaped(char c, bool first) {
    return c == '/' || c == '%' || c == '\0' || (c == '.' && first);
}

int valueOf(char digit) {
    const size_t value = std::string_view(kDigits).find(digit);
    return value == std::string_view::npos ? -1 : static_cast<int>(value);
}

}  // namespace

std::optional<std::string> fileNameOfTask(std::string_view name) {
    if (name.empty() || name == "." || name == "..") return std::nullopt;
    std::string file;
    for (const char c : name) {
        if (isEscaped(c, file.empty())) {
            const auto byte = static_cast<unsigned char>(c);
            file += {'%', kDigits[byte >> 4], kDigits[byte & 15]};
        } else {
            file += c;
        }
    }
    if (file.size() > kLongest) return std::nullopt;
    return file;
}

std::optional<std::string> taskNameOfFile(std::string_view file) {
    std::string name;
    for (size_t i = 0; i < file.size(); ++i) {
        if (file[i] != '%') {
            name += file[i];
            continue;
        }
        if (file.size() - i < 3) return std::nullopt;
        const int high = valueOf(file[i + 1]), low = valueOf(file[i + 2]);
        if (high < 0 || low < 0) return std::nullopt;
        name += static_cast<char>(high * 16 + low);
        i += 2;
    }
    // Two spellings of one name would be two tasks.
    if (fileNameOfTask(name) != file) return std::nullopt;
    return name;
}

}  // namespace vexo
