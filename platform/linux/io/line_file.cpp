#include "vexo/line_file.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <exception>
#include <optional>
#include <string>
#include <string_view>

#include "base/line_blocks.h"
#include "base/raised_identity.h"
#include "failure.h"
#include "fault_gate.h"
#include "io/append_line.h"
#include "io/file_io.h"
#include "io/trusted_file.h"
#include "vexo/system_root.h"

namespace {

bool hasField(std::string_view line, std::string_view key, std::string_view separators) {
    while (true) {
        const size_t end = line.find_first_of(separators);
        if (line.substr(0, end) == key) return true;
        if (end == std::string_view::npos) return false;
        line.remove_prefix(end + 1);
    }
}

std::optional<std::string_view> findLine(std::string_view text, std::string_view key, std::string_view separators) {
    while (!text.empty()) {
        const size_t end = std::min(text.find('\n'), text.size());
        std::string_view line = text.substr(0, end);
        text.remove_prefix(std::min(end + 1, text.size()));
        if (line.ends_with('\r')) line.remove_suffix(1);
        if (line.find('\0') == std::string_view::npos && hasField(line, key, separators)) return line;
    }
    return {};
}

vexo::Descriptor openRecords(const char* file) {
    const orvel::RaisedIdentity raised;
    return vexo::openTrusted(VEXO::SystemPath(file), O_RDONLY);
}

}  // namespace

int VLIBCFileGetLine(const char* file, const char* key, char* line, int size, const char* separators) try {
    VEXO_GATE("VLIBCFileGetLine", -1);
    if (file == nullptr || key == nullptr || *key == '\0' || line == nullptr || size <= 0 || separators == nullptr) {
        return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    }
    const int before = errno;
    line[0] = '\0';
    const vexo::Descriptor fd = openRecords(file);
    struct stat status {};
    if (!fd || fstat(fd.get(), &status) != 0) return vexo::fail(vexo::errorOfFile(errno));
    orvel::LineBlocks blocks(fd.get(), static_cast<size_t>(status.st_size));
    for (std::string_view lines; blocks.next(lines);) {
        const auto found = findLine(lines, key, separators);
        if (!found) continue;
        line[found->copy(line, static_cast<size_t>(size) - 1)] = '\0';
        errno = before;
        return 1;
    }
    if (blocks.failed()) return vexo::fail(vexo::errorOfFile(errno));
    errno = before;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VLIBCFileAddLine(const char* file, const char* line, int max) try {
    VEXO_GATE("VLIBCFileAddLine", -1);
    if (file == nullptr || line == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const std::string_view text = line;
    if (max < 0 || text.size() > static_cast<size_t>(max) || text.find_first_of("\r\n") != std::string_view::npos) {
        return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    }
    const int before = errno;
    const orvel::RaisedIdentity raised;
    const orvel::Descriptor fd = vexo::openTrusted(VEXO::SystemPath(file), O_RDWR | O_APPEND | O_CREAT, 0600);
    if (!fd || !vexo::appendLine(fd.get(), std::string(text) + '\n')) return vexo::fail(vexo::errorOfFile(errno));
    errno = before;
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VLIBCSysRename(const char* from, const char* to) try {
    VEXO_GATE("VLIBCSysRename", -1);
    if (from == nullptr || to == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const std::string source = VEXO::SystemPath(from);
    const std::string target = VEXO::SystemPath(to);
    if (std::rename(source.c_str(), target.c_str()) == 0) return 0;
    return vexo::fail(vexo::errorOfFile(errno));
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
