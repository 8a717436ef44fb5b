// What older programs keep of one web request: where its session is recorded, and its cookies.
#ifndef VEXO_WEB_RECORD_H
#define VEXO_WEB_RECORD_H

#include <string>
#include <utility>
#include <vector>

#include "vexo/export.h"

struct _tag_VexoCgi {
    std::string szLockFile;    // name for VexoCgiBeginCriticalSection
    std::string szRecordFile;  // the login records, an appliance path (below the system root)
    std::vector<std::pair<std::string, std::string>> cookies;  // name and value, in the order of the request
};

VEXO_BEGIN_C
// Fills the record for the request of the CGI environment: the files of the sharing sessions
// ("/tmp/foldersharing.current.users" and the same with ".lock") and every cookie of HTTP_COOKIE. 0, or -1 for null or
// no memory.
VEXO_API int VexoCgiInit(_tag_VexoCgi* request);
// The value of the first cookie of that name, the record's until it changes; null when there is none or for a null.
VEXO_API const char* VexoCgiGetInCookies(_tag_VexoCgi* request, const char* name);
VEXO_END_C

#endif
