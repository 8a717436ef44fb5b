#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <ctime>
#include <memory>
#include <stdexcept>

#include "arguments.h"
#include "base/owner.h"
#include "command.h"
#include "index/indexer.h"
#include "index/watch.h"
#include "index/work.h"
#include "vexo/error.h"
#include "vexo/index.h"
#include "vexo/share.h"

namespace orvel::ctl {
namespace {

constexpr unsigned long kUsualPause = 300;

int stopRequested = 0;  // a plain int: the walker reads it as one
int fullRequested = 0;

void onSignal(int signal, void (*handler)(int)) {
    struct sigaction action = {};
    action.sa_handler = handler;
    sigemptyset(&action.sa_mask);
    sigaction(signal, &action, nullptr);
}

void stopOnSignals() {
    for (const int signal : {SIGINT, SIGTERM, SIGHUP}) onSignal(signal, [](int) { stopRequested = 1; });
}

using Share = std::unique_ptr<SDK::Share, Releaser<SDK::Share::Release>>;

int printStatus(const SDK::Share& share) {
    FIINDEXSTATUS found = {};
    if (FILEIDXIndexStatus(share.GetName(), &found) < 0) {
        if (VLIBCErrGet() != VEXO_ERR_MISSING) refuse(share.GetName(), platformReason());
        printf("%s: no index\n", terminalText(share.GetName()).c_str());
        return 1;
    }
    printf("%s: %llu entries, %llu of them folders, in %lld KiB; built %s, updated %s\n",
           terminalText(share.GetName()).c_str(), found.records, found.folders,
           static_cast<long long>(found.bytes / 1024), timeText(found.built, true).c_str(),
           timeText(found.updated, true).c_str());
    if (FILEIDXIsIndexEnable(share.GetName()) != 1) printf("not used: the share's option vexo:index is off\n");
    return 0;
}

int drop(const SDK::Share& share) {
    if (FILEIDXIndexDrop(share.GetName()) < 0) refuse(share.GetName(), platformReason());
    printf("%s: index removed\n", terminalText(share.GetName()).c_str());
    return 0;
}

void print(const SDK::Share& share, const IndexCounts& counts) {
    printf("%s: looked at %llu folders, compared %llu; %llu entries added, %llu changed, %llu removed\n",
           terminalText(share.GetName()).c_str(), counts.folders, counts.compared, counts.added, counts.changed,
           counts.removed);
}

int work(const SDK::Share& share, bool build, bool everything) {
    const ShareFiles files = filesOf(share, &stopRequested);
    stopOnSignals();
    IndexWork work(share, build);
    IndexRows rows(files.root(), share.GetName(), work.database());
    IndexCounts counts;
    std::string unread;
    try {
        Indexer indexer(files, rows, &stopRequested);
        if (!(work.builds() ? indexer.build() : indexer.update(everything))) {
            refuse(share.GetName(), work.builds() ? "broken off; the index is what it was before"
                                                  : "broken off; the next update goes on");
        }
        counts = indexer.counts();
        unread = indexer.unread();
    } catch (const Unreadable& error) {
        refuse(share.GetName(), terminalText(error.what()) + "; the index is what it was before");
    }
    if (!unread.empty()) {
        print(share, counts);
        refuse(share.GetName(), terminalText(unread) + (counts.unread > 1 ? ", and more" : "") +
                                    "; the index of it is what it was, and the next update goes on");
    }
    work.done();
    if (work.builds()) return printStatus(share);
    print(share, counts);
    return 0;
}

// The shares whose definitions say that they have an index.
std::vector<std::string> indexedShares() {
    const std::unique_ptr<VEXOSHAREDB, Releaser<VEXOShareDBClose>> shares(VEXOShareDBOpen());
    if (shares == nullptr) throw std::runtime_error("the share definitions cannot be read");
    std::vector<std::string> names;
    PVEXOSHARE share = nullptr;
    int state = 0;
    while ((state = VEXOShareDBCursorGet(shares.get(), &share)) == 0) {
        if (share->index != 0) names.emplace_back(share->szName);
    }
    VEXOShareFree(share);
    if (state < 0) throw std::runtime_error("the share definitions cannot be read");
    return names;
}

// One that fails does not keep the others from being looked after.
int refresh(bool everything) {
    int status = 0;
    for (const std::string& name : indexedShares()) {
        try {
            const Share share(SDK::Share::LoadShare(name.c_str()));
            if (share == nullptr) refuse(name, "no such share");
            int64_t updated = 0;
            int live = 0;
            if (FILEIDXIndexAsOf(name.c_str(), &updated, &live) == 0 && live != 0) {
                printf("%s: its index is live\n", terminalText(name).c_str());
                continue;
            }
            FIINDEXSTATUS found = {};
            const bool missing = FILEIDXIndexStatus(name.c_str(), &found) < 0 && VLIBCErrGet() == VEXO_ERR_MISSING;
            status |= work(*share, missing, everything);
        } catch (const std::exception& error) {
            fprintf(stderr, "orvelctl: %s\n", error.what());
            status = 1;
        }
        if (stopRequested != 0) return 1;
    }
    return status;
}

}  // namespace

int index(const std::vector<std::string>& words) {
    std::vector<std::string> rest = words;
    const std::string action = takeForm("index", rest);
    if (action == "refresh") {
        const Arguments arguments(rest, "index", action, 0);
        if (geteuid() != 0) throw std::runtime_error("only root sees all that an index must hold");
        return refresh(arguments.has("--full"));
    }
    const Arguments arguments(rest, "index", action, 1);
    if (geteuid() != 0 && action != "status") throw std::runtime_error("only root sees all that an index must hold");
    const std::string& name = arguments.position(0);
    const Share share(SDK::Share::LoadShare(name.c_str()));
    if (share == nullptr) refuse(name, "no such share");
    if (action == "status") return printStatus(*share);
    if (action == "drop") return drop(*share);
    if (action == "watch") {
        stopOnSignals();
        onSignal(SIGHUP, [](int) { fullRequested = 1; });
        return watchIndex(*share, arguments.number("--every", kUsualPause), stopRequested, fullRequested);
    }
    return work(*share, action == "build", arguments.has("--full"));
}

}  // namespace orvel::ctl
