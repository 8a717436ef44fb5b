#include "shown_search.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <climits>
#include <exception>
#include <utility>
#include <vector>

#include "confined.h"
#include "orvel/user_directory.h"
#include "vexo/stat.h"

namespace orvel::cgi {
namespace {

// The path that rows have: no links below the share's root. "" when it cannot be told.
std::string rowPath(const ChangedFile& file) {
    const std::string& shareRoot = file.info.shareRoot;
    const Descriptor root(open(shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!root) return "";
    const std::string top = realPathOf(root), folder = realPathOf(file.folder);
    if (top.empty() || !folder.starts_with(top)) return "";
    return shareRoot + folder.substr(top.size()) + "/" + file.name;
}

bool statusOf(const std::string& path, _tag_VEXOSTAT_& status) {
    return VLIBCFileLStat(path.c_str(), VEXO_STAT_BASIC | VEXO_STAT_CREATE_TIME, &status) >= 0;
}

// The rows whose files are gone from a folder.
struct GoneRows {
    std::string below;                                      // the folder's path and "/"
    std::vector<std::pair<std::string, std::string>> list;  // share, path
};

BOOL collectGone(__tag_FI_FILE_INFO_DATA* row, void* gone) try {
    auto& rows = *static_cast<GoneRows*>(gone);
    const std::string path = std::string(row->szShareRoot) + "/" + row->szPath;
    struct stat status {};
    if (path.starts_with(rows.below) && lstat(path.c_str(), &status) != 0 && (errno == ENOENT || errno == ENOTDIR)) {
        rows.list.emplace_back(row->szShare, path);
    }
    return 1;
} catch (const std::exception&) {
    return 0;
}

}  // namespace

ShownSearch::ShownSearch(const std::string& user, const std::string& taskId) {
    if (isTaskId(taskId)) findTask(user, taskId, task_);
}

void ShownSearch::added(const ChangedFile& file) {
    _tag_VEXOSTAT_ status;
    if (task_.results == nullptr) return;
    const std::string path = rowPath(file);
    if (path.empty() || !statusOf(path, status)) return;
    const std::string share = definedShareName(file.info.shareName);
    OrvelUserEnum names;
    // The first leaves a row that is there as it is, the second refreshes it.
    task_.results->insertFile(share, path, names.GetUserNameByUID(status.st_uid),
                              names.GetGroupNameByGID(status.st_gid), status);
    task_.results->updateFile(share, path, share, path, status);
}

void ShownSearch::removed(const ChangedFile& file) {
    if (task_.results == nullptr) return;
    const std::string path = rowPath(file);
    if (!path.empty()) task_.results->delRecs(definedShareName(file.info.shareName), path);
}

void ShownSearch::movedPartly(const ChangedFile& from, const ChangedFile* to) {
    if (task_.results == nullptr) return;
    GoneRows gone;
    const std::string source = rowPath(from), target = to == nullptr ? "" : rowPath(*to);
    if (source.empty()) return;
    gone.below = source + "/";
    FIQUERY everyRow{};
    everyRow.limit = ULONG_MAX;
    // A database that is read is not written to: first all of them.
    if (FILEIDXDBSelect(task_.results->getDBTaskFilePath(), &everyRow, collectGone, &gone) < 0) return;
    for (const auto& [share, path] : gone.list) {
        _tag_VEXOSTAT_ status;
        const std::string there = target + path.substr(source.size());
        if (!target.empty() && statusOf(there, status)) {
            task_.results->updateFile(share, path, definedShareName(to->info.shareName), there, status);
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
    if (target.empty() || !statusOf(target, status)) {  // whatever became of it, it is there no more
        task_.results->delRecs(sourceShare, source);
        return;
    }
    const std::string targetShare = definedShareName(to.info.shareName);
    task_.results->updateFile(sourceShare, source, targetShare, target, status);
    if (S_ISDIR(status.st_mode)) task_.results->updateFileInFolder(sourceShare, source, targetShare, target);
}

}  // namespace orvel::cgi
