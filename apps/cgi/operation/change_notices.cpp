#include "operation/change_notices.h"

#include "orvel/activity_log.h"

namespace orvel::cgi {

ChangeNotices::ChangeNotices(const Operation& operation, const char* search)
    : user_(operation.user.name), search_(user_, operation.web.GetParam(search, "")) {}

void ChangeNotices::deleted(const std::string& path, const ChangedFile& file, bool isFolder, bool whole) {
    OrvLibDoLog(user_, path, 0, ORVEL_ACTION_DELETE, isFolder);
    if (whole) {
        search_.removed(file);
    } else {
        search_.reduced(file);
    }
}

void ChangeNotices::copied(const Item& from, const ChangedFile& to, long long bytes) {
    OrvLibDoLog(user_, from.info.path, bytes, ORVEL_ACTION_COPY, S_ISDIR(from.status.st_mode));
    search_.added(to);
}

void ChangeNotices::moved(const Item& from, const ChangedFile& to, long long bytes, bool whole) {
    OrvLibDoLog(user_, from.info.path, bytes, ORVEL_ACTION_MOVE, S_ISDIR(from.status.st_mode));
    if (whole) {
        search_.moved(from.changed(), to);
    } else {
        search_.movedPartly(from.changed(), &to);
    }
}

void ChangeNotices::permitted(const Item& item) {
    OrvLibDoLog(user_, item.info.path, 0, ORVEL_ACTION_PROPERTY_SET, S_ISDIR(item.status.st_mode));
}

}  // namespace orvel::cgi
