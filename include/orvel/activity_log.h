// What users do with files, written to the appliance's transfer log.
#ifndef ORVEL_ACTIVITY_LOG_H
#define ORVEL_ACTIVITY_LOG_H

#include <string>

#include "orvel/export.h"

// The kind of a logged operation; the comment is the text of its entry.
enum ORVEL_ACTIONS : int {
    ORVEL_ACTION_DOWNLOAD = 1,       // "download"
    ORVEL_ACTION_UPLOAD = 2,         // "upload"
    ORVEL_ACTION_DELETE = 3,         // "delete"
    ORVEL_ACTION_RENAME = 4,         // "rename"
    ORVEL_ACTION_COPY = 5,           // "copy"
    ORVEL_ACTION_MOVE = 6,           // "move"
    ORVEL_ACTION_PROPERTY_SET = 7,   // "property set"
    ORVEL_ACTION_MKDIR = 8,          // "mkdir"
    ORVEL_ACTION_DOWNLOAD_TEST = 9,  // "download test"
};

// Writes one entry when the administrator has switched the log on (setting "pexlanderxferlog" is "yes" in any case).
// Arguments and result as below; false, with nothing written, when the log is off.
ORVEL_API bool OrvLibDoLog(std::string userName, std::string path, long long size, ORVEL_ACTIONS action, bool flag);

// Writes one entry, whatever the setting: the client's address (environment variable REMOTE_ADDR), the user, the
// action, the path and the bytes transferred. `flag` is handed to the platform's log as it is. True when written. False
// for an empty user, path or client address and for a failure of the log, both logged, and for an action without a
// text. Sets no error code.
ORVEL_API bool OrvLibDoPexlanderLog(std::string userName, std::string path, long long size, ORVEL_ACTIONS action,
                                    bool flag);

#endif
