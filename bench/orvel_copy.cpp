// Copies a file or folder as the background process of the program "operation" does, with a task record.
//   orvel_copy SOURCE TARGET-FOLDER
#include <fcntl.h>
#include <sys/stat.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <memory>

#include "operation/transfer.h"

namespace fs = std::filesystem;
using namespace orvel::cgi;
using orvel::Descriptor;

int main(int argc, char** argv) {
    std::string root = fs::temp_directory_path() / "orvel-copy-XXXXXX";
    if (argc < 3 || mkdtemp(root.data()) == nullptr) return 2;
    setenv("VEXO_ROOT", root.c_str(), 1);
    const fs::path source = argv[1];
    Item item;
    item.info.path = "/bench/" + source.filename().string();
    item.place.folder = Descriptor(open(source.parent_path().c_str(), O_PATH | O_DIRECTORY));
    item.place.name = source.filename();
    const Descriptor target(open(argv[2], O_PATH | O_DIRECTORY));
    if (!target || fstatat(item.place.folder.get(), item.place.name.c_str(), &item.status, 0) != 0) return 2;

    bool copied = false;
    {
        const std::unique_ptr<KTR::Task> task(KTR::TaskMgr("bench").createTask("Quorvane_copy"));
        if (task == nullptr) return 2;
        Progress progress(*task, "bench", "copy");
        measure(item, progress);
        Transfer transfer(progress, {.conflict = Conflict::kError, .move = false, .owner = {}, .onFat = false});
        Entry to = {target.get(), item.place.name, "/target/" + item.place.name};
        copied = transfer.run(item, to);
        progress.end();
    }
    fs::remove_all(root);
    return copied ? 0 : 1;
}
