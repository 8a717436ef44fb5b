#include <json/value.h>
#include <unistd.h>

#include <chrono>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <thread>
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
constexpr std::chrono::milliseconds kPatience(50), kNap(2);

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

void noteShares(KTR::Task& record, const std::vector<std::string>& folders) {
    Json::Value ways(Json::objectValue);
    Json::Value indexes(Json::objectValue);
    for (const auto& [share, index] : searchedShares(folders)) {
        ways[readable(share)] = index ? "index" : "walk";
        if (!index) continue;
        indexes[readable(share)]["updated"] = Json::Int64(index->updated);
        indexes[readable(share)]["live"] = index->live;
    }
    record.setProperty(kSharesProperty, ways);
    record.setProperty(kIndexesProperty, indexes);
}

// Whoever reads the results is judged by these once more.
Json::Value searchedPaths(const std::vector<std::string>& folders) {
    std::set<std::string> shares;
    for (const std::string& folder : folders) shares.insert(percentEncode(folder.substr(0, folder.find('/', 1))));
    Json::Value list(Json::arrayValue);
    for (const std::string& share : shares) list.append(share);
    return list;
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
    noteShares(record, folders);
    record.setProperty(kSearchedProperty, searchedPaths(folders));
    record.setProperty(kLeftOutProperty, leftOut(user.name, folders));
    return record.endUpdate();
}

int beginSearch(const User& user, const std::vector<std::string>& folders, bool recursive, const Criteria& criteria,
                const std::optional<ListRequest>& shown, std::string& id) {
    Search search(user, criteria);
    search.walker.setSearchCurrentDir(!recursive);
    if (shown) search.walker.setShownOrder(shown->sortBy.c_str(), &shown->ascending);
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

// Whether there is something to show, or nothing more will come.
bool hasRows(const SearchTask& task) {
    const FIQUERY all{};
    unsigned long long count = 0;
    if (FILEIDXCountGet(task.results->getDBTaskFilePath(), &all, &count) == 0 && count > 0) return true;
    return !task.record->reload() || task.record->isFinished();
}

// A page of what was found within the time that a reply may wait for it. False when there is none yet.
bool firstPage(const User& user, const std::string& id, const ListRequest& request, ResultPage& page) {
    using Clock = std::chrono::steady_clock;
    SearchTask task;
    if (findTask(user.name, id, task) != ORV_ERR_NONE || task.results == nullptr) return false;
    const auto end = Clock::now() + kPatience;
    while (!hasRows(task)) {
        if (Clock::now() >= end) return false;
        std::this_thread::sleep_for(kNap);
    }
    return task.record->reload() && readPage(request, task, page) == ORV_ERR_NONE;
}

void replyStarted(Output& out, const User& user, const std::string& id, const std::optional<ListRequest>& request) {
    ResultPage page;
    const bool shows = request && firstPage(user, id, *request, page);
    beginReply(out, Status::kOk, user.cookie);
    out.text() += "{\"success\":true,\"data\":{\"taskid\":\"" + id + '"';
    if (shows) {
        out.text() += ",\"first\":";
        writeResults(*request, page, out);
    }
    out.text() += "}}";
}

}  // namespace

void startSearch(Output& out, const User& user, const VEXO::WebCGI& web) {
    const auto paths = pathParams(web);
    const std::string recursive = web.GetParam("recursive", "true");
    auto page = parsePage(user, web);
    if (!paths || paths->empty() || paths->size() > kMostFolders || (recursive != "true" && recursive != "false") ||
        !page) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, web.GetParam("path", ""));
    }
    if (std::string(web.GetParam("limit", "")).empty()) page.reset();
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
        code = beginSearch(user, folders, recursive == "true", criteria, page, id);
        if (code == ORV_ERR_NONE) return replyStarted(out, user, id, page);
    }
    reply(out, statusOf(code), user.cookie, code, culprit, data);
}

}  // namespace orvel::cgi
