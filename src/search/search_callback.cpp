// What a walking search does with each entry.
#include <syslog.h>

#include <algorithm>

#include "base/printable.h"
#include "core/boundary.h"
#include "orvel/search_walker.h"
#include "vexo/error.h"

namespace FileSearch {
namespace {

constexpr const char* kSource = "orvelsearch";
constexpr mode_t kFileTypeBits = 0xF000;
constexpr mode_t kFolder = 0x4000;
constexpr mode_t kRegularFile = 0x8000;

bool matches(const std::vector<FindComp*>& criteria, const std::string& name, const _tag_VEXOSTAT_& status) {
    if (criteria.empty()) return true;
    const mode_t type = status.st_mode & kFileTypeBits;
    return (type == kRegularFile || type == kFolder) &&
           std::all_of(criteria.begin(), criteria.end(), [&](FindComp* one) { return (*one)(name.c_str(), status); });
}

// False when the entry does not lie in a share.
bool reportFault(PathFault fault, const std::string& realPath) {
    switch (fault) {
        case PathFault::kNone:
            return true;
        case PathFault::kNoShare:
            syslog(LOG_ERR, "%s:%d Can't find volume name %s", kSource, __LINE__, orvel::printable(realPath).c_str());
            return false;
        case PathFault::kNoPath:
            syslog(LOG_ERR, "%s:%d Can't find path name %s", kSource, __LINE__, orvel::printable(realPath).c_str());
            return false;
    }
    return false;
}

}  // namespace

OrvSearchCallBack::OrvSearchCallBack(const char* taskDatabasePath)
    : database_(taskDatabasePath == nullptr ? "" : taskDatabasePath) {}

OrvSearchCallBack::~OrvSearchCallBack() = default;

bool OrvSearchCallBack::operator()(const std::string& /*displayPath*/, const std::string& context,
                                   const std::string& realPath, const std::string& name, _tag_VEXOSTAT_& status,
                                   const std::string* extra) {
    return orvel::guardedQuietly(false, [&] {
        static const std::string none;
        const PathFault fault = record_.fill(realPath, context, extra == nullptr ? none : *extra, name, status);
        if (!reportFault(fault, realPath)) return true;
        if (FILEIDXOutputDBInsert(database_.c_str(), &record_.data()) >= 0) {
            stored_ = true;
        } else {
            lossReason_ = VLIBCErrGet() != 0 ? VLIBCErrGet() : static_cast<int>(VEXO_ERR_GENERAL);
            syslog(LOG_ERR, "%s:%d Fail to insert data into DB %s", kSource, __LINE__,
                   orvel::printable(database_).c_str());
        }
        return true;
    });
}

OrvSearchCompWalkerCB::OrvSearchCompWalkerCB(const char* taskDatabasePath, const std::vector<FindComp*>& criteria,
                                             int* cancelFlag)
    : results_(std::make_unique<OrvSearchCallBack>(taskDatabasePath)), criteria_(criteria), cancelFlag_(cancelFlag) {}

OrvSearchCompWalkerCB::~OrvSearchCompWalkerCB() = default;

bool OrvSearchCompWalkerCB::operator()(const std::string& displayPath, const std::string& context,
                                       const std::string& realPath, const std::string& name, _tag_VEXOSTAT_& status,
                                       const std::string* extra) {
    return orvel::guardedQuietly(false, [&] {
        const bool goesOn =
            !matches(criteria_, name, status) || (*results_)(displayPath, context, realPath, name, status, extra);
        return goesOn && cancelFlag_ != nullptr;  // kept: the flag's presence, its value is the walker's to read
    });
}

}  // namespace FileSearch
