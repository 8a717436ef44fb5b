// Who may create public sharing links.
#ifndef ORVEL_SHARING_SETTINGS_H
#define ORVEL_SHARING_SETTINGS_H

#include <map>
#include <string>

#include "orvel/export.h"

namespace OrvelSharing {

// The choices made user by user, a settings file below the system root: numeric user id = "true". Changes exclude each
// other by a lock on the file, waited for without limit; questions take no lock. Who changes must be allowed to write
// the file. No member sets the library code; failures go to the system log.
class ORVEL_API SharingManager {
 public:
    static const std::string STR_VEXO_SHARING;  // "/usr/vexo/etc/vexosharing.conf"

    // True when the user's line says "true". False without a line or a file, and, logged, for an unknown user or a file
    // that cannot be read.
    bool hasPrivilege(const std::string& userName);

    // From user name to value: "true" grants, anything else removes the user's line. Each entry is tried; true when all
    // were applied. An entry with an empty name is skipped. The file is made when missing, and has mode 0644 after.
    bool setPrivileges(std::map<std::string, std::string> values);

    // From user id to choice; of several lines with one id the first counts. Empty when there is no line or no file,
    // and, logged, when the file cannot be read or memory is out.
    std::map<unsigned int, bool> getPrivileges();

    // Removes the line of a user id, given as text; true even if there is none.
    bool removePrivilege(const std::string& key);
};

}  // namespace OrvelSharing

// 1 when the user may create sharing links, else 0. He must hold the file manager's application privilege and an
// account that has not ended. The setting "PX_SHARING_SETTING" of /etc/vexoinfo.conf narrows that: "per_user" to users
// chosen above, administrators included; "admin_only" to administrators; any other value, or none, does not. A setting
// that cannot be read refuses everybody but administrators. Sets no library code; failures are logged.
ORVEL_API int OrvLibUserPrivForSharing(const char* userName);

#endif
