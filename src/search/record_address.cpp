#include "search/record_address.h"

#include <syslog.h>

#include <algorithm>
#include <string_view>

#include "base/printable.h"
#include "orvel/search_criteria.h"
#include "orvel/share_path.h"
#include "search/share_address.h"

namespace orvel {
namespace {

constexpr const char* kSource = "orvelsearch";
constexpr std::string_view kAnythingBelow = "/*";

// A path that a condition would cut names another record.
bool fitsCondition(std::size_t length) {
    return length < sizeof(__tag_FI_SQL_COND::szValue) - kAnythingBelow.size();
}

bool reportPath(const std::string& realPath, int line) {
    syslog(LOG_ERR, "%s:%d Fail to find the path name %s", kSource, line, printable(realPath).c_str());
    return false;
}

}  // namespace

bool deriveAddress(const std::string& share, const std::string& realPath, const std::string& user, RecordAddress& out) {
    std::size_t begin = 0;
    out.share = IsDirUserHome(share, nullptr) ? kHomesShare : share;
    const std::string root = rootAbove(out.share, user, realPath);
    const FileSearch::PathFault fault = splitRealPath(realPath, root, begin);
    if (fault == FileSearch::PathFault::kNoShare) {
        syslog(LOG_ERR, "%s:%d Fail to find the share name %s from %s", kSource, __LINE__, printable(out.share).c_str(),
               printable(realPath).c_str());
        return false;
    }
    if (fault == FileSearch::PathFault::kNoPath || !fitsCondition(realPath.size() - begin)) {
        return reportPath(realPath, __LINE__);
    }
    const std::size_t end = std::max(realPath.find_last_not_of('/') + 1, begin);
    out.realPath = realPath.substr(0, end);
    out.shareRoot = realPath.substr(0, begin - 1);
    out.within = out.realPath.substr(begin);
    return true;
}

bool addressWithin(const RecordAddress& folder, const std::string& within, RecordAddress& out) {
    out = {folder.share, folder.shareRoot + "/" + within, folder.shareRoot, within};
    return fitsCondition(within.size()) || reportPath(out.realPath, __LINE__);
}

RecordCondition::RecordCondition(const RecordAddress& address, Reach reach) {
    FileSearch::setSqlCond(share_, FI_COL_SHARE, FI_OP_EQUAL, address.share, nullptr, nullptr);
    const bool itself = reach == Reach::kItself;
    FileSearch::setSqlCond(path_, FI_COL_PATH, itself ? FI_OP_EQUAL : FI_OP_PATH,
                           itself ? address.within : address.within + std::string(kAnythingBelow), &share_, nullptr);
}

}  // namespace orvel
