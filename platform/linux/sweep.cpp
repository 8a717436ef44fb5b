#include "vexo/sweep.h"

#include <sys/stat.h>

#include <cerrno>
#include <charconv>
#include <ctime>
#include <exception>
#include <string>

#include "base/new_file.h"
#include "base/raised_identity.h"
#include "failure.h"
#include "fault_gate.h"
#include "io/file_io.h"
#include "vexo/critical_section.h"
#include "vexo/filesystem.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"
#include "web/session_store.h"

namespace {

constexpr const char* kLock = "/run/vexo/sweep.lock";
constexpr const char* kFolder = "/var/lib/vexo";
constexpr const char* kStamp = "sweep";

int makeFolder(const char* path) {
    constexpr uid_t keep = static_cast<uid_t>(-1);
    return VEXOFSMkdirP(VEXO::SystemPath(path).c_str(), nullptr, 1, keep, keep, 0755);
}

bool writeStamp(int failures) {
    const vexo::Descriptor folder = vexo::openFile(VEXO::SystemPath(kFolder), O_RDONLY | O_DIRECTORY);
    orvel::NewFile file(folder.get());
    const std::string text = "version=\"1\"\ntime=\"" + std::to_string(time(nullptr)) + "\"\nfailures=\"" +
                             std::to_string(failures) + "\"\n";
    return folder && file.create(kStamp, 0644) && fchmod(file.get(), 0644) == 0 && vexo::writeAll(file.get(), text) &&
           file.publish(kStamp, true);
}

// False with the slot for a file without such a number.
template <class Number>
bool readNumber(const std::string& file, const char* key, Number& number) {
    char text[32] = {};
    const int found = VLIBCFileGetKeyValue(file.c_str(), key, text, sizeof text, 0);
    const char* end = text + std::char_traits<char>::length(text);
    const bool whole = found == 1 && std::from_chars(text, end, number).ptr == end && end != text;
    if (found >= 0 && !whole) vexo::fail(VEXO_ERR_GENERAL, EINVAL);
    return whole;
}

}  // namespace

int VEXOSweepBegin() try {
    VEXO_GATE("VEXOSweepBegin", -1);
    const orvel::RaisedIdentity raised;
    if (makeFolder("/run/vexo") != 0 || makeFolder(kFolder) != 0) return -1;
    return VexoCgiBeginCriticalSection(kLock, 0);
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOSweepEnd(int handle, int failures) try {
    VEXO_GATE("VEXOSweepEnd", -1);
    const orvel::RaisedIdentity raised;
    const bool written = failures < 0 || writeStamp(failures);
    VexoCgiEndCriticalSection(handle);
    return written ? 0 : vexo::fail(vexo::errorOfErrno(errno));
} catch (const std::exception&) {
    VexoCgiEndCriticalSection(handle);
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

int VEXOSweepLast(VEXOSWEEP* last) try {
    VEXO_GATE("VEXOSweepLast", -1);
    if (last == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const std::string file = std::string(kFolder) + "/" + kStamp;
    struct stat status {};
    if (stat(VEXO::SystemPath(file).c_str(), &status) != 0 && errno == ENOENT) return 0;
    return readNumber(file, "time", last->time) && readNumber(file, "failures", last->failures) ? 1 : -1;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}

long VEXOSessionsSweep() try {
    VEXO_GATE("VEXOSessionsSweep", -1);
    const long removed = vexo::sweepSessions();
    return removed >= 0 ? removed : vexo::fail(vexo::errorOfErrno(errno));
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
