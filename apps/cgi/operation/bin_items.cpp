#include "operation/bin_items.h"

#include "base/file.h"
#include "folder_names.h"

namespace orvel::cgi {
namespace {

constexpr int kDeepest = 200;

class Scan {
 public:
    Scan(const Deletions& deletions, size_t most, BinItems& items)
        : deletions_(deletions), most_(most), items_(items) {}

    // The entries of a folder of the bin; `path` is "" or ends in "/". Whether there is any.
    // NOLINTNEXTLINE(misc-no-recursion): kDeepest
    bool folder(const Descriptor& opened, const std::string& path, int depth) {
        std::vector<std::string> names;
        if (depth == kDeepest || !namesIn(opened.get(), Hidden::kLeaveOut, names)) return true;
        for (const std::string& name : names) {
            if (items_.looked == most_) {
                items_.cut = true;
                return true;
            }
            entry(opened, name, path + name, depth);
        }
        return !names.empty();
    }

 private:
    // NOLINTNEXTLINE(misc-no-recursion)
    void entry(const Descriptor& parent, const std::string& name, const std::string& path, int depth) {
        BinItem item;
        ++items_.looked;
        if (fstatat(parent.get(), name.c_str(), &item.status, AT_SYMLINK_NOFOLLOW) != 0) return;
        item.path = path;
        item.deleted = item.status.st_ctim.tv_sec;
        const auto known = deletions_.find(path);
        if (known != deletions_.end() && known->second.inode == item.status.st_ino) {
            item.recorded = true;
            item.deleted = known->second.time;
            item.user = known->second.user;
        } else if (S_ISDIR(item.status.st_mode)) {
            const Descriptor inside = openFile(parent.get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
            if (!inside || folder(inside, path + "/", depth + 1)) return;
        }
        items_.list.push_back(std::move(item));
    }

    const Deletions& deletions_;
    size_t most_;
    BinItems& items_;
};

}  // namespace

void addBinItems(const Descriptor& bin, const Deletions& deletions, size_t most, BinItems& items) {
    Scan(deletions, most, items).folder(bin, "", 0);
}

}  // namespace orvel::cgi
