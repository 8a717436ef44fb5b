// Volumes: what stands in front of every share root, and of which kind it is.
#include <algorithm>
#include <cstring>
#include <exception>
#include <string>
#include <string_view>

#include "failure.h"
#include "fault_gate.h"
#include "io/file_io.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"

namespace {

struct KindName {
    std::string_view word;
    int kind;
};
constexpr KindName kKinds[] = {
    {"internal", VEXO_VOLUME_INTERNAL}, {"1", VEXO_VOLUME_INTERNAL}, {"usb", VEXO_VOLUME_USB}, {"4", VEXO_VOLUME_USB},
    {"esata", VEXO_VOLUME_ESATA},       {"8", VEXO_VOLUME_ESATA},
};

constexpr std::string_view kBlanks = " \t\r\v\f";
constexpr size_t kMaxFile = size_t{1} << 20;

bool isBelow(std::string_view path, std::string_view folder) {
    return path.starts_with(folder) && (path.size() == folder.size() || path[folder.size()] == '/');
}

// The next word of `line`, which moves behind it; empty at the end.
std::string_view takeWord(std::string_view& line) {
    line.remove_prefix(std::min(line.find_first_not_of(kBlanks), line.size()));
    const std::string_view word = line.substr(0, line.find_first_of(kBlanks));
    line.remove_prefix(word.size());
    return word;
}

// The kind that a volumes file gives `path`: the entry with the longest folder that holds it decides.
int kindOf(std::string_view path, std::string_view file) {
    int kind = VEXO_VOLUME_INTERNAL;
    size_t longest = 0;
    while (!file.empty()) {
        std::string_view line = file.substr(0, file.find('\n'));
        file.remove_prefix(std::min(line.size() + 1, file.size()));
        std::string_view folder = takeWord(line);
        const std::string_view word = takeWord(line);
        if (folder.size() < 2 || folder.front() != '/') continue;
        if (folder.back() == '/') folder.remove_suffix(1);
        if (folder.size() < longest || !isBelow(path, folder)) continue;
        for (const KindName& known : kKinds) {
            if (known.word != word) continue;
            kind = known.kind;
            longest = folder.size();
        }
    }
    return kind;
}

}  // namespace

int VolumePathParse(const char* path, VOLUMEPATHINFO* info) try {
    VEXO_GATE("VolumePathParse", -1);
    if (path == nullptr || info == nullptr || *path != '/') return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const std::string_view whole = path;
    const std::string_view volume = whole.substr(0, whole.find('/', 1));
    if (volume.size() >= sizeof info->szVolume) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const vexo::KeepErrno keep;
    std::string file;
    vexo::FileVersion version;
    // Without a file that can be read every volume is internal.
    if (!vexo::readRegularFile(VEXO::SystemPath("/etc/vexo/volumes"), kMaxFile, file, version)) file.clear();
    *info = {};
    info->kind = kindOf(whole, file);
    memcpy(info->szVolume, volume.data(), volume.size());
    return 1;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
