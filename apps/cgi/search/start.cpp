#include <json/value.h>
#include <unistd.h>

#include <memory>
#include <string>
#include <vector>

#include "background.h"
#include "chosen_folders.h"
#include "criteria.h"
#include "orvel/error_state.h"
#include "orvel/search_walker.h"
#include "search/actions.h"
#include "text.h"
#include "vexo/error.h"
#include "vexo/index.h"

namespace orvel::cgi {
namespace {

using FileSearch::OrvSearchDBTask;
using FileSearch::OrvSearchWalker;

constexpr size_t kMostFolders = 500;

struct Search {
    Search(const User& user, const Criteria& asked)
        : walker(user.name.c_str(), user.sid.empty() ? nullptr : user.sid.c_str(), stopFlag()), criteria(asked) {}

    OrvSearchWalker walker;
    const Criteria& criteria;
    std::unique_ptr<KTR::Task> record;
};

// The search itself, in a process of its own.
int run(Search& search, const Begun& begun) {
    const bool noted = search.record->attach();
    if (!begun(noted ? ORV_ERR_NONE : platformCode()) || !noted) return 1;
    VLIBCErrSetEx(0, __FILE__, __LINE__);
    // Records that could not be stored do not end a walk, but the platform's error says that some are missing.
    const bool walked = search.walker.Walk(search.criteria.accessTimes());
    const int code = walked && VLIBCErrGet() == 0 ? ORV_ERR_NONE : platformCode();

    KTR::Task& record = *search.record;
    if (!record.beginUpdate()) return 1;
    record.setProperty(kStoppedProperty, *stopFlag() != 0);
    if (code != ORV_ERR_NONE) record.setProperty(kCodeProperty, code);
    record.finish();
    return record.endUpdate() ? 0 : 1;
}

Json::Value waysOf(const std::vector<std::string>& folders) {
    Json::Value ways(Json::objectValue);
    for (const auto& [share, indexed] : searchedShares(folders)) ways[readable(share)] = indexed ? "index" : "walk";
    return ways;
}

Json::Value leftOut(const std::string& user, const std::vector<std::string>& folders) {
    Json::Value list(Json::arrayValue);
    for (const std::string& folder : foldersWithoutMounts(user, folders)) list.append(readable(folder));
    return list;
}

bool note(Search& search, const std::vector<std::string>& folders, const User& user) {
    search.record = makeRecord(user.name, search.walker.getDBTaskId());
    if (search.record == nullptr) return false;
    KTR::Task& record = *search.record;
    if (!record.beginUpdate()) return false;
    record.setProperty(kVolumeProperty, search.walker.getDBVol());
    record.setProperty(kSharesProperty, waysOf(folders));
    record.setProperty(kLeftOutProperty, leftOut(user.name, folders));
    return record.endUpdate();
}

int beginSearch(const User& user, const std::vector<std::string>& folders, bool recursive, const Criteria& criteria,
                std::string& id) {
    Search search(user, criteria);
    search.walker.setSearchCurrentDir(!recursive);
    if (!search.walker.init(folders, criteria.list())) return platformCode();
    id = search.walker.getDBTaskId();
    const std::string volume = search.walker.getDBVol();
    int code = note(search, folders, user) ? ORV_ERR_NONE : platformCode();
    if (code == ORV_ERR_NONE) code = startBackground([&](const Begun& begun) { return run(search, begun); });
    if (code == ORV_ERR_NONE) return code;
    unlink(OrvSearchDBTask::getDBTaskFilePath(volume.c_str(), user.name.c_str(), id.c_str()).c_str());
    if (search.record != nullptr) search.record->remove();
    return code;
}

}  // namespace

void startSearch(Output& out, const User& user, const VEXO::WebCGI& web) {
    const auto paths = pathParams(web);
    const std::string recursive = web.GetParam("recursive", "true");
    if (!paths || paths->empty() || paths->size() > kMostFolders || (recursive != "true" && recursive != "false")) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, web.GetParam("path", ""));
    }
    Criteria criteria;
    Json::Value data;
    std::string culprit;
    int code = parseCriteria([&web](const std::string& name) { return web.GetParam(name, ""); }, criteria, culprit);
    if (code != ORV_ERR_NONE) {
        if (!culprit.empty()) data["parameter"] = culprit;
        return reply(out, statusOf(code), user.cookie, code, "", data);
    }
    std::vector<std::string> folders;
    code = actAs(user.sid.c_str(), user.name, anyHome(*paths));
    if (code == ORV_ERR_NONE) code = chooseFolders(user, *paths, folders, culprit);
    if (code == ORV_ERR_NONE) code = makeRoomForTask(user.name);
    if (code == ORV_ERR_NONE) {
        std::string id;
        code = beginSearch(user, folders, recursive == "true", criteria, id);
        if (code == ORV_ERR_NONE) data["taskid"] = id;
    }
    reply(out, statusOf(code), user.cookie, code, culprit, data);
}

}  // namespace orvel::cgi
