#include "shown_search.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <climits>
#include <exception>
#include <utility>
#include <vector>

#include "confined.h"
#include "vexo/index.h"
#include "vexo/stat.h"

namespace orvel::cgi {
namespace {

// The path that rows have: no links below the share's root. "" when it cannot be determined.
std::string rowPath(const ChangedFile& file) {
    const auto folder = pathInShare(file.info, file.folder);
    return folder ? file.info.shareRoot + *folder + "/" + file.name : "";
}

bool statusOf(const Descriptor& folder, const std::string& name, _tag_VEXOSTAT_& status) {
    return VLIBCFileLStatAt(folder.get(), name.c_str(), VEXO_STAT_BASIC | VEXO_STAT_CREATE_TIME, &status) >= 0;
}

// The status of what lies at `path` (a name and what follows it) below an open folder, no link followed. False with
// errno.
bool statusBelow(const Descriptor& folder, const std::string& path, _tag_VEXOSTAT_& status) {
    const size_t slash = path.rfind('/');
    if (slash == std::string::npos) return statusOf(folder, path, status);
    const Descriptor parent =
        openBeneath(folder, path.substr(0, slash), LinkPolicy::kNone, O_PATH | O_DIRECTORY | O_NOFOLLOW);
    return parent && statusOf(parent, path.substr(slash + 1), status);
}

// The rows whose files are gone from a folder.
struct GoneRows {
    const ChangedFile& folder;
    std::string path;                                       // of its row
    std::vector<std::pair<std::string, std::string>> list;  // share, path
};

BOOL collectGone(__tag_FI_FILE_INFO_DATA* row, void* gone) try {
    auto& rows = *static_cast<GoneRows*>(gone);
    const std::string path = std::string(row->szShareRoot) + "/" + row->szPath;
    if (!path.starts_with(rows.path + "/")) return 1;
    _tag_VEXOSTAT_ status;
    const std::string& folder = rows.folder.name;
    if (statusBelow(rows.folder.folder, folder + path.substr(rows.path.size()), status)) return 1;
    if (errno == ENOENT || errno == ENOTDIR || errno == ELOOP) rows.list.emplace_back(row->szShare, path);
    return 1;
} catch (const std::exception&) {
    return 0;
}

}  // namespace

ShownSearch::ShownSearch(const std::string& user, const std::string& taskId) {
    if (isTaskId(taskId)) findTask(user, taskId, task_);
}

ShownSearch::~ShownSearch() {
    if (task_.results != nullptr) FILEIDXDBFlush(task_.results->getDBTaskFilePath());
}

void ShownSearch::added(const ChangedFile& file) {
    _tag_VEXOSTAT_ status;
    if (task_.results == nullptr) return;
    const std::string path = rowPath(file);
    if (path.empty() || !statusOf(file.folder, file.name, status)) return;
    const std::string share = definedShareName(file.info.shareName);
    // The first leaves a row that is there as it is, the second refreshes it.
    task_.results->insertFile(share, path, names_.GetUserNameByUID(status.st_uid),
                              names_.GetGroupNameByGID(status.st_gid), status);
    task_.results->updateFile(share, path, share, path, status);
}

void ShownSearch::refreshed(const ChangedFile& file) {
    _tag_VEXOSTAT_ status;
    if (task_.results == nullptr) return;
    const std::string path = rowPath(file);
    if (path.empty() || !statusOf(file.folder, file.name, status)) return;
    task_.results->updatePermRecs(definedShareName(file.info.shareName), path,
                                  names_.GetUserNameByUID(status.st_uid).c_str(),
                                  names_.GetGroupNameByGID(status.st_gid).c_str(), status);
}

void ShownSearch::removed(const ChangedFile& file) {
    if (task_.results == nullptr) return;
    const std::string path = rowPath(file);
    if (!path.empty()) task_.results->delRecs(definedShareName(file.info.shareName), path);
}

void ShownSearch::movedPartly(const ChangedFile& from, const ChangedFile* to) {
    if (task_.results == nullptr) return;
    const std::string source = rowPath(from), target = to == nullptr ? "" : rowPath(*to);
    if (source.empty()) return;
    GoneRows gone = {from, source, {}};
    FIQUERY everyRow{};
    everyRow.limit = ULONG_MAX;
    // A database that is read is not written to: first all of them.
    if (FILEIDXDBSelect(task_.results->getDBTaskFilePath(), &everyRow, collectGone, &gone) < 0) return;
    for (const auto& [share, path] : gone.list) {
        _tag_VEXOSTAT_ status;
        const std::string rest = path.substr(source.size());
        if (!target.empty() && statusBelow(to->folder, to->name + rest, status)) {
            task_.results->updateFile(share, path, definedShareName(to->info.shareName), target + rest, status);
        } else {
            task_.results->delRecs(share, path);
        }
    }
}

void ShownSearch::moved(const ChangedFile& from, const ChangedFile& to) {
    _tag_VEXOSTAT_ status;
    if (task_.results == nullptr) return;
    const std::string source = rowPath(from), target = rowPath(to);
    if (source.empty()) return;
    const std::string sourceShare = definedShareName(from.info.shareName);
    if (target.empty() || !statusOf(to.folder, to.name, status)) {  // whatever became of it, it is no longer there
        task_.results->delRecs(sourceShare, source);
        return;
    }
    const std::string targetShare = definedShareName(to.info.shareName);
    task_.results->updateFile(sourceShare, source, targetShare, target, status);
    if (S_ISDIR(status.st_mode)) task_.results->updateFileInFolder(sourceShare, source, targetShare, target);
}

}  // namespace orvel::cgi
