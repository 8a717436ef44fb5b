#include <algorithm>
#include <climits>
#include <csignal>
#include <cstdio>
#include <stdexcept>

#include "arguments.h"
#include "chosen_folders.h"
#include "command.h"
#include "criteria.h"
#include "found_entry.h"
#include "orvel/search_walker.h"
#include "reply.h"
#include "vexo/error.h"

namespace orvel::ctl {
namespace {

using FileSearch::OrvSearchDBTask;
using FileSearch::OrvSearchWalker;

constexpr const char* kColumns = "perm,owner,size,time";

int stopRequested = 0;  // a plain int: the search reads it as one

std::string optionOf(std::string criterion) {
    std::replace(criterion.begin(), criterion.end(), '_', '-');
    return "--" + criterion;
}

void takeCriteria(const Arguments& arguments, cgi::Criteria& criteria) {
    std::string culprit;
    const auto valueOf = [&](const std::string& criterion) { return arguments.value(optionOf(criterion), ""); };
    const int code = cgi::parseCriteria(valueOf, criteria, culprit);
    if (code == 0) return;
    if (culprit.empty()) throw UsageError("nothing to search for");
    throw UsageError(optionOf(culprit) + (code == ORV_ERR_PARAMETER ? ": no such value" : ": unknown"));
}

cgi::ListRequest pageOf(const Arguments& arguments, const std::string& user) {
    const unsigned long limit = arguments.number("--limit", 0);
    return {.user = user,
            .sid = "",
            .path = "",
            .sortBy = arguments.value("--sort", ""),
            .ascending = !arguments.has("--desc"),
            .offset = arguments.number("--offset", 0),
            .limit = limit == 0 ? LONG_MAX : limit,
            .additional = cgi::additionalBits(arguments.value("--additional", arguments.has("--json") ? "" : kColumns)),
            .pattern = ""};
}

// The results, for as long as the command runs.
class Results {
 public:
    Results(const OrvSearchWalker& walker, const std::string& user)
        : task_(walker.getDBVol(), user.c_str(), walker.getDBTaskId()) {}
    ~Results() { task_.remove(); }
    Results(const Results&) = delete;
    Results& operator=(const Results&) = delete;
    OrvSearchDBTask& task() { return task_; }

 private:
    OrvSearchDBTask task_;
};

void print(const cgi::ListRequest& request, const cgi::Listing& listing, bool json) {
    cgi::Output out(1);
    if (json) {
        writeListing(request, listing, cgi::appendEntry, out);
        out.text() += '\n';
    }
    for (const DIRENTRY_INFO& entry : listing.entries) {
        if (json) break;
        DIRENTRY_INFO shown = entry;
        shown.name = entry.path;
        out.text() += entryRow(shown, request.additional, false);
        out.spill();
    }
    if (!json) out.text() += std::to_string(listing.entries.size()) + " of " + std::to_string(listing.total) + "\n";
    if (!out.finish()) throw std::runtime_error("the results cannot be written");
}

void printWays(const std::string& user, const std::vector<std::string>& folders) {
    for (const auto& [share, index] : cgi::searchedShares(folders)) {
        const std::string way = !index        ? "walked"
                                : index->live ? "found in its index, which is live"
                                              : "found in its index, last updated " + timeText(index->updated, true);
        fprintf(stderr, "%s: %s\n", terminalText(share).c_str(), way.c_str());
    }
    for (const std::string& folder : cgi::foldersWithoutMounts(user, folders)) {
        fprintf(stderr, "%s: without what lies on network mounts\n", terminalText(folder).c_str());
    }
    if (stopRequested != 0) fprintf(stderr, "stopped early\n");
}

int find(const cgi::ListRequest& request, const std::vector<std::string>& folders, bool flat, bool json,
         const cgi::Criteria& criteria) {
    OrvSearchWalker walker(request.user.c_str(), nullptr, &stopRequested);
    walker.setSearchCurrentDir(flat);
    if (!walker.init(folders, criteria.list())) return cgi::platformCode();
    Results results(walker, request.user);
    if (!walker.Walk(criteria.accessTimes()) || VLIBCErrGet() != 0) return cgi::platformCode();  // or some were lost
    cgi::Listing listing;
    const int code = readResults(request, results.task(), listing);
    if (code == 0) print(request, listing, json);
    return code;
}

}  // namespace

int search(const std::vector<std::string>& words) {
    const Arguments arguments(words, "search", "", 1, true);
    const std::string user = arguments.required("--user");
    const cgi::ListRequest request = pageOf(arguments, user);
    cgi::Criteria criteria;
    takeCriteria(arguments, criteria);

    struct sigaction action = {};
    action.sa_handler = [](int) { stopRequested = 1; };
    sigemptyset(&action.sa_mask);
    for (const int signal : {SIGINT, SIGTERM}) sigaction(signal, &action, nullptr);

    std::vector<std::string> folders;
    std::string culprit = arguments.position(0);
    int code = becomeUser(user, cgi::anyHome(arguments.positions()));
    if (code == 0) code = cgi::chooseFolders({user, "", ""}, arguments.positions(), folders, culprit);
    if (code == 0) code = find(request, folders, arguments.has("--flat"), arguments.has("--json"), criteria);
    if (code != 0) return refused(culprit, code);
    printWays(user, folders);
    return 0;
}

}  // namespace orvel::ctl
