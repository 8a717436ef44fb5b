#include "orvel/activity_log.h"

#include <strings.h>
#include <syslog.h>

#include <cstdlib>

#include "base/printable.h"
#include "core/boundary.h"
#include "vexo/settings.h"
#include "vexo/xferlog.h"

namespace {

constexpr const char* kSource = "orvelmisc";

const char* actionText(ORVEL_ACTIONS action) {
    switch (action) {
        case ORVEL_ACTION_DOWNLOAD:
            return "download";
        case ORVEL_ACTION_UPLOAD:
            return "upload";
        case ORVEL_ACTION_DELETE:
            return "delete";
        case ORVEL_ACTION_RENAME:
            return "rename";
        case ORVEL_ACTION_COPY:
            return "copy";
        case ORVEL_ACTION_MOVE:
            return "move";
        case ORVEL_ACTION_PROPERTY_SET:
            return "property set";
        case ORVEL_ACTION_MKDIR:
            return "mkdir";
        case ORVEL_ACTION_DOWNLOAD_TEST:
            return "download test";
    }
    return nullptr;
}

bool writeEntry(const std::string& userName, const std::string& path, long long size, ORVEL_ACTIONS action, bool flag) {
    const char* remote = getenv("REMOTE_ADDR");
    const std::string client = remote == nullptr ? "" : remote;
    if (userName.empty() || path.empty() || client.empty()) {
        syslog(LOG_ERR, "%s:%d Bad parameters.", kSource, __LINE__);
        return false;
    }
    const char* text = actionText(action);
    if (text == nullptr) return false;
    if (VEXOLogKTRFMXferLog(client.c_str(), userName.c_str(), text, size, path.c_str(), flag) == -1) {
        syslog(LOG_ERR, "%s:%d Failed to add the Pexlander log for %s", kSource, __LINE__,
               orvel::printable(path).c_str());
        return false;
    }
    return true;
}

}  // namespace

bool OrvLibDoPexlanderLog(std::string userName, std::string path, long long size, ORVEL_ACTIONS action, bool flag) {
    return orvel::guardedQuietly(false, [&] { return writeEntry(userName, path, size, action, flag); });
}

bool OrvLibDoLog(std::string userName, std::string path, long long size, ORVEL_ACTIONS action, bool flag) {
    return orvel::guardedQuietly(false, [&] {
        const std::string wanted = VexoConf::Info().Get("pexlanderxferlog", "no");
        return strcasecmp(wanted.c_str(), "yes") == 0 && writeEntry(userName, path, size, action, flag);
    });
}
