#include <unistd.h>

#include <exception>
#include <string>

#include "accounts/account_source.h"
#include "failure.h"
#include "filesystem/mount_table.h"
#include "io/file_io.h"
#include "shares/share_store.h"
#include "vexo/process.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"
#include "vexo/text.h"

namespace {

constexpr const char* kMounts = "/proc/mounts";

// Of a machine's own accounts and mounts nothing is read: the services behind the ones keep connections open, the table
// of the others a descriptor, and a child asks anew anyway.
void warmFiles() {
    if (VEXO::SystemRoot().empty()) return;
    vexo::AccountSource::instance().refreshFiles();
    if (access(VEXO::SystemPath(kMounts).c_str(), R_OK) == 0) static_cast<void>(vexo::mountTable());
}

}  // namespace

void VEXORequestBegin() {
    vexo::RecentLook::beginRequest();
}

void VEXOWarm() try {
    const vexo::KeepErrno keep;
    const int code = VLIBCErrGet();
    static_cast<void>(VexoConf::Info().Get("", ""));
    static_cast<void>(VLIBCFileCheckKeyValue("/etc.defaults/vexoinfo.conf", "", "", 0));
    warmFiles();
    static_cast<void>(vexo::currentShares());
    std::string key;
    VEXO::AppendFoldKey("\xC3\x84", key);  // beyond ASCII, so that the tables are used
    VLIBCErrSetEx(code, __FILE__, __LINE__);
} catch (const std::exception&) {
    // Memory is out: children read for themselves.
}
