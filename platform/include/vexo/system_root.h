// Where the appliance's fixed paths lie on this machine.
#ifndef VEXO_SYSTEM_ROOT_H
#define VEXO_SYSTEM_ROOT_H

#include <string>
#include <string_view>

#include "vexo/export.h"

namespace VEXO {

// The folder that stands for "/" of the appliance: the environment variable VEXO_ROOT, read once (never in a program
// that gained privileges by exec) and made absolute then; "" when unset or "/". Without a trailing slash.
VEXO_API const std::string& SystemRoot();

// `path`, an absolute path of the appliance ("/etc/vexoinfo.conf"), below the system root. Roots of shares are real
// paths and are never passed here.
VEXO_API std::string SystemPath(std::string_view path);

}  // namespace VEXO

#endif
