// Volumes: what stands in front of every share root, and of which kind it is.
#include <cstring>
#include <fstream>
#include <sstream>
#include <string>
#include <string_view>

#include "failure.h"
#include "fault_gate.h"
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

bool isBelow(std::string_view path, std::string_view folder) {
    return path.starts_with(folder) && (path.size() == folder.size() || path[folder.size()] == '/');
}

// The kind that the volumes file gives `path`: the entry with the longest folder that holds it decides.
int kindOf(std::string_view path) {
    std::ifstream file(VEXO::SystemPath("/etc/vexo/volumes"));
    int kind = VEXO_VOLUME_INTERNAL;
    size_t longest = 0;
    for (std::string line; std::getline(file, line);) {
        std::istringstream fields(line);
        std::string folder, word;
        if (!(fields >> folder >> word) || folder.size() < 2 || folder.front() != '/') continue;
        if (folder.back() == '/') folder.pop_back();
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

int VolumePathParse(const char* path, VOLUMEPATHINFO* info) {
    VEXO_GATE("VolumePathParse", -1);
    if (path == nullptr || info == nullptr || *path != '/') return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const std::string_view whole = path;
    const std::string_view volume = whole.substr(0, whole.find('/', 1));
    if (volume.size() >= sizeof info->szVolume) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const vexo::KeepErrno keep;
    *info = {};
    info->kind = kindOf(whole);
    memcpy(info->szVolume, volume.data(), volume.size());
    return 1;
}
