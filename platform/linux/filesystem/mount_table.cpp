#include "filesystem/mount_table.h"

#include <poll.h>

#include <algorithm>
#include <utility>

#include "failure.h"
#include "io/file_io.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"

namespace vexo {
namespace {

// `path` without repeated and trailing slashes; "/" itself stays.
std::string trimmed(std::string_view path) {
    std::string out;
    out.reserve(path.size());
    for (const char c : path) {
        if (c != '/' || out.empty() || out.back() != '/') out += c;
    }
    if (out.size() > 1 && out.back() == '/') out.pop_back();
    return out;
}

bool isOctal(char c) {
    return c >= '0' && c <= '7';
}

// Undoes the kernel's escapes of blank, tab, newline, backslash and "#": a backslash and three octal digits.
std::string decoded(std::string_view field) {
    std::string out;
    out.reserve(field.size());
    for (size_t i = 0; i < field.size(); ++i) {
        if (field[i] == '\\' && i + 3 < field.size() && isOctal(field[i + 1]) && isOctal(field[i + 2]) &&
            isOctal(field[i + 3])) {
            out += static_cast<char>(((field[i + 1] - '0') << 6) | ((field[i + 2] - '0') << 3) | (field[i + 3] - '0'));
            i += 3;
        } else {
            out += field[i];
        }
    }
    return out;
}

std::string_view takeField(std::string_view& line) {
    line.remove_prefix(std::min(line.find_first_not_of(" \t"), line.size()));
    const std::string_view field = line.substr(0, line.find_first_of(" \t"));
    line.remove_prefix(field.size());
    return field;
}

int typeOf(std::string_view name) {
    int number = 0;
    for (const char* known : rgszFsType) {
        if (name == known) return number;
        ++number;
    }
    return VEXO_FS_UNKNOWN;
}

constexpr size_t kLimit = size_t{16} << 20;  // far beyond any table, so that a wrong file cannot fill the memory

const MountTable* failed() {
    fail(VEXO_ERR_FILE);
    return nullptr;
}

// The machine's table. Its descriptor stays open, since the kernel marks it when mounts change.
const MountTable* kernelTable() {
    static MountTable table;
    static Descriptor kept;
    static pid_t owner = 0;
    // A forked child shares the mark with its parent, and may have closed the number and given it to another file: it
    // opens its own and leaves the old one alone.
    if (owner != getpid()) static_cast<void>(kept.release());
    pollfd mark{kept.get(), POLLPRI, 0};
    if (kept && poll(&mark, 1, 0) == 0) return &table;
    kept.reset();
    std::string text;
    Descriptor fd = openFile("/proc/self/mounts", O_RDONLY);
    if (!fd || !readAll(fd.get(), text, kLimit)) return failed();
    table = parseMountTable(text);
    kept = std::move(fd);
    owner = getpid();
    return &table;
}

// The table of the system root, a plain file.
const MountTable* fileTable(const std::string& path, const struct stat& now) {
    static MountTable table;
    static FileVersion version;
    if (version.isCurrent(now)) return &table;
    std::string text;
    FileVersion read;
    if (!readRegularFile(path, kLimit, text, read)) return failed();
    table = parseMountTable(text);
    version = read;  // last: a reading that memory cut short is not remembered
    return &table;
}

}  // namespace

MountTable parseMountTable(std::string_view text) {
    MountTable table;
    while (!text.empty()) {
        std::string_view line = text.substr(0, text.find('\n'));
        text.remove_prefix(std::min(line.size() + 1, text.size()));
        const std::string_view device = takeField(line);
        const std::string_view folder = takeField(line);
        const std::string_view type = takeField(line);
        if (type.empty() || device.starts_with('#')) continue;
        table.push_back({trimmed(decoded(folder)), decoded(type), typeOf(type)});
    }
    return table;
}

const MountTable* mountTable() {
    if (VEXO::SystemRoot().empty()) return kernelTable();
    const std::string path = VEXO::SystemPath("/proc/mounts");
    struct stat status;
    if (stat(path.c_str(), &status) != 0) {
        if (errno != ENOENT && errno != ENOTDIR) return failed();
        return kernelTable();
    }
    return fileTable(path, status);
}

const Mount* mountAt(const MountTable& table, std::string_view path) {
    const std::string wanted = trimmed(path);
    for (auto mount = table.rbegin(); mount != table.rend(); ++mount) {
        if (mount->folder == wanted) return &*mount;
    }
    return nullptr;
}

const Mount* mountHolding(const MountTable& table, std::string_view path) {
    const std::string wanted = trimmed(path);
    const Mount* best = nullptr;
    for (const Mount& mount : table) {
        if (best != nullptr && mount.folder.size() < best->folder.size()) continue;
        if (!wanted.starts_with(mount.folder)) continue;
        const bool whole =
            mount.folder == "/" || wanted.size() == mount.folder.size() || wanted[mount.folder.size()] == '/';
        if (whole) best = &mount;
    }
    return best;
}

}  // namespace vexo
