#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <ctime>
#include <memory>
#include <stdexcept>

#include "arguments.h"
#include "base/owner.h"
#include "command.h"
#include "index/indexer.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"
#include "vexo/index.h"
#include "vexo/share.h"

namespace orvel::ctl {
namespace {

int stopRequested = 0;  // a plain int: the walker reads it as one

void stopOnSignals() {
    struct sigaction action = {};
    action.sa_handler = [](int) { stopRequested = 1; };
    sigemptyset(&action.sa_mask);
    for (const int signal : {SIGINT, SIGTERM, SIGHUP}) sigaction(signal, &action, nullptr);
}

using Share = std::unique_ptr<SDK::Share, Releaser<SDK::Share::Release>>;

[[noreturn]] void refuse(const std::string& share, const std::string& reason) {
    throw std::runtime_error(terminalText(share) + ": " + reason);
}

const char* platformReason() {
    switch (VLIBCErrGet()) {
        case VEXO_ERR_SHARE_MISSING:
            return "no such share";
        case VEXO_ERR_MISSING:
            return "has no index to update";
        case VEXO_ERR_EXISTS:
            return "another process is working on its index";
        case VEXO_ERR_NO_SPACE:
            return "no space is left for its index";
        default:
            return "its index cannot be used";
    }
}

std::string timeText(int64_t seconds) {
    const auto time = static_cast<time_t>(seconds);
    tm parts = {};
    char text[32];
    if (localtime_r(&time, &parts) == nullptr || strftime(text, sizeof text, "%Y-%m-%d %H:%M:%S", &parts) == 0)
        return "?";
    return text;
}

int printStatus(const SDK::Share& share) {
    FIINDEXSTATUS found = {};
    if (FILEIDXIndexStatus(share.GetName(), &found) < 0) {
        if (VLIBCErrGet() != VEXO_ERR_MISSING) refuse(share.GetName(), platformReason());
        printf("%s: no index\n", terminalText(share.GetName()).c_str());
        return 1;
    }
    printf("%s: %llu entries, %llu of them folders, in %lld KiB; built %s, updated %s\n",
           terminalText(share.GetName()).c_str(), found.records, found.folders,
           static_cast<long long>(found.bytes / 1024), timeText(found.built).c_str(), timeText(found.updated).c_str());
    if (FILEIDXIsIndexEnable(share.GetName()) != 1) printf("not used: the share's option vexo:index is off\n");
    return 0;
}

int drop(const SDK::Share& share) {
    if (FILEIDXIndexDrop(share.GetName()) < 0) refuse(share.GetName(), platformReason());
    printf("%s: index removed\n", terminalText(share.GetName()).c_str());
    return 0;
}

// The platform's work on the index of a share: given up unless it is done. An index that cannot be read is not updated
// but built anew.
class Work {
 public:
    Work(const SDK::Share& share, bool build) : share_(share.GetName()), builds_(build) {
        if (begin()) return;
        if (builds_ || VLIBCErrGet() != VEXO_ERR_GENERAL || errno == EBUSY) refuse(share_, platformReason());
        printf("%s: its index is damaged or of another version, and is built anew\n", terminalText(share_).c_str());
        builds_ = true;
        if (!begin()) refuse(share_, platformReason());
    }
    ~Work() {
        if (open_) FILEIDXIndexEnd(share_.c_str(), 0);
    }
    Work(const Work&) = delete;
    Work& operator=(const Work&) = delete;

    [[nodiscard]] const std::string& database() const { return database_; }
    [[nodiscard]] bool builds() const { return builds_; }
    void done() {
        open_ = false;
        if (FILEIDXIndexEnd(share_.c_str(), 1) < 0) refuse(share_, platformReason());
    }

 private:
    bool begin() {
        char path[4096];
        open_ = FILEIDXIndexBegin(share_.c_str(), builds_ ? FI_INDEX_BUILD : FI_INDEX_UPDATE, path, sizeof path) >= 0;
        database_ = open_ ? path : "";
        return open_;
    }

    std::string share_, database_;
    bool builds_;
    bool open_ = false;
};

void print(const SDK::Share& share, const IndexCounts& counts) {
    printf("%s: looked at %llu folders, compared %llu; %llu entries added, %llu changed, %llu removed\n",
           terminalText(share.GetName()).c_str(), counts.folders, counts.compared, counts.added, counts.changed,
           counts.removed);
}

int work(const SDK::Share& share, bool build, bool everything) {
    const std::string root = share.GetFullPath();
    if (VEXOFSIsRemoteFS(VEXOGetFSType(root.c_str(), 0)) == 1) refuse(share.GetName(), "lies on a network mount");
    const ShareFiles files(root, &stopRequested);
    _tag_VEXOSTAT_ status;
    // A volume that is not mounted must not empty the index.
    if (files.status("", status) != Presence::kThere || !S_ISDIR(status.st_mode)) {
        refuse(share.GetName(), "its folder is not there");
    }
    stopOnSignals();
    Work work(share, build);
    IndexRows rows(root, share.GetName(), work.database());
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
    return work(*share, action == "build", arguments.has("--full"));
}

}  // namespace orvel::ctl
