// A walk with the status of every entry over 300,000 entries, beside the floor and beside other makers' tools, in one
// run.
//   walk_bench [FOLDER [ROUNDS]]    without FOLDER one is made and removed; rounds interleave all contenders
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <string>

#include "contest.h"

namespace fs = std::filesystem;

namespace {

// 20 folders of 15 folders of 10 folders of 99 files: 300,320 entries.
std::string makeTree() {
    char path[] = "/tmp/orvel-bench-XXXXXX";
    if (mkdtemp(path) == nullptr) exit(1);
    for (int leaf = 0; leaf < 20 * 15 * 10; ++leaf) {
        const std::string folder = std::string(path) + "/year " + std::to_string(leaf / 150) + "/event " +
                                   std::to_string(leaf / 10 % 15) + "/camera " + std::to_string(leaf % 10);
        fs::create_directories(folder);
        for (int i = 0; i < 99; ++i) {
            const std::string name = folder + "/IMG_" + std::to_string(leaf * 100 + i) + ".JPG";
            const int fd = open(name.c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0644);
            if (fd < 0) exit(1);
            close(fd);
        }
    }
    return path;
}

}  // namespace

int main(int argc, char** argv) {
    const std::string folder = argc > 1 ? argv[1] : makeTree();
    const std::string here = fs::read_symlink("/proc/self/exe").parent_path().string();
    std::vector<bench::Contender> contenders = {
        {"floor: openat, getdents64, statx", {here + "/floor_walk", folder}, {}, {}, {}},
        {"orvel, every status handed to a callback", {here + "/orvel_walk", folder}, {}, {}, {}},
        {"orvel, every size written", {here + "/orvel_walk", folder, "print"}, {}, {}, {}},
        {"find -printf '%s\\n'", {"find", folder, "-printf", "%s\\n"}, {}, {}, {}},
        {"bfs -printf '%s\\n'", {"bfs", folder, "-printf", "%s\\n"}, {}, {}, {}},
    };
    bench::contest(contenders, argc > 2 ? atoi(argv[2]) : 11);
    if (argc <= 1) fs::remove_all(folder);
    return 0;
}
