#include "sharing/link_lookup.h"

#include <syslog.h>

#include <cstdlib>
#include <ctime>

#include "base/printable.h"
#include "core/owned.h"
#include "orvel/sharing_link.h"
#include "sharing/link_window.h"
#include "vexo/database.h"
#include "vexo/link_store.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvellogin";

// The rows of the statement, null when it could not be run. The connection is closed before any row is fetched.
DatabaseResult execute(const char* statement) {
    const DatabaseConnection database(VEXODBConnect(VEXO::kLinkDatabase));
    if (database == nullptr) {
        syslog(LOG_ERR, "%s:%d Failed to connect to database", kSource, __LINE__);
        return nullptr;
    }
    DatabaseResult result;
    if (VEXODBExecute(database.get(), statement, acquire(result)) == -1) {
        syslog(LOG_ERR, "%s:%d Failed to exec [%s] (%s)", kSource, __LINE__, printable(statement).c_str(),
               printable(VEXODBErrorGet(database.get())).c_str());
        return nullptr;
    }
    return result;
}

// Reads the window of the row and reports whether it is open. A date that is missing closes it for good; the other
// steps then take it for 0.
bool isOpen(PVEXODBRESULT result, int row, time_t now) {
    bool valid = true;
    LinkWindow window;
    const char* available = VEXODBFetchField(result, row, "AvailDate");
    if (available == nullptr) {
        syslog(LOG_ERR, "%s:%d faild to fetch AvailDate", kSource, __LINE__);
        valid = false;
    } else {
        window.available = strtoll(available, nullptr, 10);
    }
    const char* expires = VEXODBFetchField(result, row, "ExpDate");
    if (expires == nullptr) {
        syslog(LOG_ERR, "%s:%d ExpDate", kSource, __LINE__);
        valid = false;
    } else {
        window.expires = strtoll(expires, nullptr, 10);
    }
    if (!isWithin(window, now)) {
        syslog(LOG_ERR, "%s:%d sharing link out of valid duration", kSource, __LINE__);
        valid = false;
    }
    return valid;
}

// Reads the first row; false for a link that is not valid, whose path may be there all the same.
bool readLink(PVEXODBRESULT result, time_t now, std::string& path) {
    int row = 0;
    if (VEXODBFetchRow(result, &row) == -1) {
        syslog(LOG_ERR, "%s:%d faild to fetch query result", kSource, __LINE__);
        return false;
    }
    VEXODBFetchField(result, row, "uid");  // kept: fetched twice, and the second answer counts
    if (VEXODBFetchField(result, row, "uid") == nullptr) {
        syslog(LOG_ERR, "%s:%d faild to fetch uid", kSource, __LINE__);
        return false;
    }
    const char* stored = VEXODBFetchField(result, row, "filepath");
    if (stored != nullptr) path = stored;
    for (const char* unused : {"filename", "password"}) VEXODBFetchField(result, row, unused);  // kept
    return isOpen(result, row, now);
}

}  // namespace

std::string sharedPathOf(const std::string& link) {
    const SqlText statement(sqlite3_mprintf("SELECT * FROM sharingLinks WHERE linkID = %Q LIMIT 1;", link.c_str()));
    const DatabaseResult result = statement == nullptr ? nullptr : execute(statement.get());
    if (result == nullptr) syslog(LOG_ERR, "%s:%d DB Query failed", kSource, __LINE__);
    const time_t now = time(nullptr);
    std::string path;
    if (result == nullptr || !readLink(result.get(), now, path)) {
        syslog(LOG_ERR, "%s:%d Sharing download DBquery failed", kSource, __LINE__);
    }
    return path;
}

}  // namespace orvel

bool OrvelLogin::IsLinkOpen(long long available, long long expires, long long now) {
    return orvel::isWithin({.available = available, .expires = expires}, now);
}
