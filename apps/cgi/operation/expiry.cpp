#include "operation/expiry.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstring>
#include <ctime>
#include <memory>
#include <set>
#include <vector>

#include "base/beneath.h"
#include "base/file.h"
#include "base/owner.h"
#include "folder_names.h"
#include "operation/bin_items.h"
#include "operation/tree_remove.h"
#include "request.h"
#include "vexo/settings.h"
#include "vexo/share.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

constexpr size_t kMostLooked = 1'000'000;  // of one bin, which are some 250 MB
constexpr int kDeepest = 200;
constexpr long long kMiB = 1024LL * 1024;

struct Limits {
    long long seconds = LLONG_MAX, bytes = LLONG_MAX;
    [[nodiscard]] bool none() const { return seconds == LLONG_MAX && bytes == LLONG_MAX; }
};

// What is no number, or 0, limits nothing.
long long settingOf(const std::string& key, const std::string& share, long long unit) {
    const std::string all = VexoConf::Info().Get(key, "");
    const std::string text = VexoConf::Info().Get(key + "_" + share, all);
    const auto number = parseNumber(text);
    constexpr unsigned long kMost = 1'000'000'000;
    return number && *number > 0 && *number <= kMost ? static_cast<long long>(*number) * unit : LLONG_MAX;
}

Limits limitsOf(const std::string& share) {
    return {settingOf("recycle_days", share, 24LL * 60 * 60), settingOf("recycle_mib", share, kMiB)};
}

void addError(Expiry& expiry, const std::string& what) {
    if (!expiry.error.empty()) expiry.error += "; ";
    expiry.error += what + ": " + strerror(errno);
}

// What a file or folder takes, with all below it on its file system.
// NOLINTNEXTLINE(misc-no-recursion): kDeepest
long long sizeOf(int folder, const std::string& name, const struct stat& status, int depth) {
    long long sum = status.st_blocks * 512LL;
    if (!S_ISDIR(status.st_mode) || depth == kDeepest) return sum;
    const Descriptor inside = openFile(folder, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
    std::vector<std::string> names;
    if (!inside || !namesIn(inside.get(), Hidden::kInclude, names)) return sum;
    for (const std::string& child : names) {
        struct stat below {};
        if (fstatat(inside.get(), child.c_str(), &below, AT_SYMLINK_NOFOLLOW) != 0) continue;
        if (below.st_dev == status.st_dev) sum += sizeOf(inside.get(), child, below, depth + 1);
    }
    return sum;
}

// The folder that holds an item, and its name there.
Descriptor parentOf(const Descriptor& bin, const std::string& path, std::string& name) {
    const size_t slash = path.rfind('/');
    name = slash == std::string::npos ? path : path.substr(slash + 1);
    const std::string folder = slash == std::string::npos ? "." : path.substr(0, slash);
    return openBeneath(bin, folder, LinkPolicy::kNone, O_PATH | O_DIRECTORY);
}

bool remove(const Descriptor& bin, const BinItem& item) {
    std::string name, path = item.path;
    Descriptor parent = parentOf(bin, path, name);
    struct stat status {};
    const bool same = parent && fstatat(parent.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
                      isSameFile(status, item.status);
    if (!same) return false;
    removeTreeQuietly(parent.get(), name);
    if (fstatat(parent.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0) return false;
    // With the folders above it, as far as they are empty.
    while (path.find('/') != std::string::npos) {
        path.resize(path.rfind('/'));
        parent = parentOf(bin, path, name);
        if (!parent || unlinkat(parent.get(), name.c_str(), AT_REMOVEDIR) != 0) break;
    }
    return true;
}

class Expiring {
 public:
    Expiring(const std::function<bool()>& isOver, Expiry& expiry) : isOver_(isOver), expiry_(expiry) {}

    // `path`: a real one, in which no link is followed.
    void bin(const RecordedBin& recorded) {
        if (isOver_() || !seen_.insert(recorded.path).second) return;
        const Descriptor top = openFile("/", O_PATH | O_DIRECTORY);
        const Descriptor folder =
            openBeneath(top, pathBelow("/", recorded.path), LinkPolicy::kNone, O_RDONLY | O_DIRECTORY);
        if (!folder && errno != ENOENT && errno != ENOTDIR && errno != ELOOP) return addError(expiry_, recorded.path);
        const Deletions deletions = deletionsIn(recorded.path);
        const Limits limits = limitsOf(recorded.share);
        if (!folder || (limits.none() && deletions.empty())) return;
        BinItems items;
        addBinItems(folder, deletions, kMostLooked, items);
        expire(folder, limits, items);
        forget(recorded, deletions, items);
    }

 private:
    void expire(const Descriptor& folder, const Limits& limits, BinItems& items) {
        if (limits.none()) return;
        std::sort(items.list.begin(), items.list.end(),
                  [](const BinItem& a, const BinItem& b) { return a.deleted < b.deleted; });
        std::vector<long long> sizes;
        long long sum = 0;
        for (const BinItem& item : items.list) {
            std::string name;
            const Descriptor parent = limits.bytes == LLONG_MAX ? Descriptor() : parentOf(folder, item.path, name);
            sizes.push_back(parent ? sizeOf(parent.get(), name, item.status, 0) : 0);
            sum += sizes.back();
        }
        const long long now = time(nullptr);
        for (size_t i = 0; i < items.list.size() && !isOver_(); ++i) {
            BinItem& item = items.list[i];
            if (now - item.deleted <= limits.seconds && sum <= limits.bytes) return;
            if (!remove(folder, item)) continue;
            sum -= sizes[i];
            ++expiry_.removed;
            item.recorded = false;
        }
    }

    // Records of what is gone.
    static void forget(const RecordedBin& recorded, const Deletions& deletions, const BinItems& items) {
        Deletions kept;
        for (const BinItem& item : items.list) {
            if (item.recorded) kept[item.path] = {item.deleted, item.status.st_ino, item.user};
        }
        if (!items.cut && kept.size() < deletions.size()) static_cast<void>(keepDeletions(recorded, kept));
    }

    const std::function<bool()>& isOver_;
    Expiry& expiry_;
    std::set<std::string> seen_;
};

void expireShares(Expiring& expiring, Expiry& expiry) {
    const std::unique_ptr<VEXOSHAREDB, Releaser<VEXOShareDBClose>> shares(VEXOShareDBOpen());
    PVEXOSHARE share = nullptr;
    while (shares != nullptr && VEXOShareDBCursorGet(shares.get(), &share) == 0) {
        char bin[PATH_MAX] = {}, root[PATH_MAX] = {};
        // A share that is not there now is none of the sweep's business.
        if (realpath(share->szPath, root) == nullptr) continue;
        if (VEXOShareRecyclePath(share->szPath, bin, sizeof bin) == 0) {
            expiring.bin({share->szName, std::string(root) + "/" + bin});
        } else {
            addError(expiry, share->szName);
        }
    }
    VEXOShareFree(share);
}

}  // namespace

Expiry expireBins(const std::function<bool()>& isOver) {
    Expiry expiry;
    Expiring expiring(isOver, expiry);
    std::vector<RecordedBin> bins;
    if (!recordedBins(bins)) addError(expiry, "records of deletions");
    for (const RecordedBin& bin : bins) expiring.bin(bin);
    expireShares(expiring, expiry);
    return expiry;
}

}  // namespace orvel::cgi
