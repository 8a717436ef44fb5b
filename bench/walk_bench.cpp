// A walk with the status of every entry over 300,000 entries, beside the floor and beside other makers' tools, in one
// run.
//   walk_bench [FOLDER [ROUNDS]]    without FOLDER one is made and removed; rounds interleave all contenders
#include <cstdlib>
#include <filesystem>
#include <string>

#include "contest.h"
#include "sample_tree.h"

namespace fs = std::filesystem;

int main(int argc, char** argv) {
    const std::string folder = argc > 1 ? argv[1] : bench::makeSampleTree();
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
