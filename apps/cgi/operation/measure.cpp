#include <fcntl.h>

#include <cerrno>
#include <string>
#include <unordered_map>
#include <utility>

#include "base/file.h"
#include "confined.h"
#include "operation/operation.h"
#include "operation/size_report.h"
#include "operation/task_start.h"
#include "operation/tree_size.h"
#include "orvel/error_state.h"

namespace orvel::cgi {
namespace {

// Which of the paths lie in another one that was chosen, or name it once more: they are counted there. Paths as they
// were given; rows of one folder never do.
class Repeated {
 public:
    explicit Repeated(Choice& chosen) {
        if (chosen.isRows()) return;
        for (size_t i = 0; i < chosen.size(); ++i) first_.emplace(cut(chosen.path(i)), i);
    }
    [[nodiscard]] bool has(const std::string& path, size_t position) const {
        if (first_.empty()) return false;
        const std::string whole = cut(path);
        if (first_.at(whole) != position) return true;
        for (size_t end = whole.rfind('/'); end != 0 && end != std::string::npos; end = whole.rfind('/', end - 1)) {
            if (first_.contains(whole.substr(0, end))) return true;
        }
        return false;
    }

 private:
    static std::string cut(std::string path) {
        while (path.size() > 1 && path.back() == '/') path.pop_back();
        return path;
    }
    std::unordered_map<std::string, size_t> first_;
};

// A share's root is no name in a folder of the share: it is opened itself. Left empty for everything else.
int open(Operation& operation, size_t position, Item& item, Descriptor& root) {
    const int code = operation.chosen.open(operation.user, position, {Need::kList}, item);
    if (code != ORV_ERR_PARAMETER || item.info.shareRoot.empty() || item.info.realPath != item.info.shareRoot) {
        return code;
    }
    return confinedOpen(item.info, linkPolicyOf(item.info.shareName), O_RDONLY | O_DIRECTORY, root);
}

// 0 or a library code.
int add(const Item& item, Descriptor root, bool alone, SizeReport& report, TreeSize& tree) {
    const std::string& path = item.info.path;
    if (alone && (root || S_ISDIR(item.status.st_mode))) report.describe(path);
    const int error =
        root ? tree.add(std::move(root), path, alone) : tree.add(item.place.folder.get(), item.place.name, path, alone);
    return error == 0 ? static_cast<int>(ORV_ERR_NONE) : refusalCode(error, item.info.realPath);
}

void run(Operation& operation, Progress& progress) {
    Choice& chosen = operation.chosen;
    SizeReport report;
    TreeSize tree(report, progress);
    progress.measures([&] { return report.json(false); });
    chosen.reportNew(operation.user, progress);
    const Repeated repeated(chosen);
    for (size_t i = 0; i < chosen.size() && !progress.stopped(); ++i) {
        const std::string path = chosen.path(i);
        if (repeated.has(path, i)) {
            progress.skipped();
            continue;
        }
        Item item;
        Descriptor root;
        int code = open(operation, i, item, root);
        if (code == ORV_ERR_NONE) code = add(item, std::move(root), chosen.size() == 1, report, tree);
        if (code != ORV_ERR_NONE) {
            progress.failed(path, code);
        } else if (!progress.stopped()) {
            progress.done();
        }
    }
    progress.expect(report.total.files + report.total.folders + report.total.others, report.total.size);
    progress.measures([last = report.json(true)] { return last; });
}

}  // namespace

int measureOperation(Operation& operation) {
    return startTask(operation, "measure", [&](Progress& progress) { run(operation, progress); });
}

}  // namespace orvel::cgi
