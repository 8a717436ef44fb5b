// Which file systems keep ACLs.
#include <sys/stat.h>
#include <sys/xattr.h>

#include <cerrno>
#include <exception>
#include <vector>

#include "failure.h"
#include "fault_gate.h"
#include "vexo/acl.h"

namespace {

// Which devices keep ACLs, as far as they were met. A listing asks for each entry, mostly of one device.
struct DeviceSupport {
    unsigned long long device;
    int supported;
};
std::vector<DeviceSupport> knownDevices;

}  // namespace

int VEXOACLIsSupport(const char* path, int /*fd*/, int /*kind*/) {
    if (path == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    struct stat status;
    if (stat(path, &status) != 0) return vexo::fail(vexo::errorOfErrno(errno));
    return VEXOACLIsSupportOnDevice(path, status.st_dev);
}

int VEXOACLIsSupportOnDevice(const char* path, unsigned long long device) try {
    VEXO_GATE("VEXOACLIsSupport", -1);
    for (const DeviceSupport& known : knownDevices) {
        if (known.device == device) return known.supported;
    }
    if (path == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const int before = errno;
    const bool has = getxattr(path, "system.posix_acl_access", nullptr, 0) >= 0 || errno == ENODATA;
    if (!has && errno != ENOTSUP) return vexo::fail(vexo::errorOfErrno(errno));
    errno = before;
    knownDevices.push_back({device, has ? 1 : 0});
    return has ? 1 : 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
