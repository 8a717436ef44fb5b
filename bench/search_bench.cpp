// Walking searches over 300,000 entries, beside the library's walk with every status (the floor here), the least that
// such a walk costs, and `find` with the same tests.
//   search_bench [FOLDER [ROUNDS]]    FOLDER: a path of two components, which serves as a share's root; without it one
//                                     is made and removed
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include "contest.h"
#include "sample_tree.h"

namespace fs = std::filesystem;

namespace {

// An appliance with one user and one share; the programs that are run find it by the environment.
std::string makeAppliance(const std::string& shareRoot) {
    char path[] = "/tmp/orvel-bench-root-XXXXXX";
    if (mkdtemp(path) == nullptr) exit(1);
    const std::string root = path;
    chmod(path, 0755);
    for (const char* folder : {"/etc/vexo", "/proc"}) fs::create_directories(root + folder);
    std::ofstream(root + "/etc/passwd") << "bench:x:" << getuid() << ":" << getgid() << "::/:/bin/false\n";
    std::ofstream(root + "/etc/group") << "bench:x:" << getgid() << ":\n";
    std::ofstream(root + "/etc/vexo/shares.conf") << "[bench]\npath = " << shareRoot << "\nwrite list = bench\n";
    std::ofstream(root + "/proc/mounts") << "/dev/root / ext4 rw 0 0\n";
    setenv("VEXO_ROOT", path, 1);
    return root;
}

}  // namespace

int main(int argc, char** argv) {
    const std::string folder = argc > 1 ? argv[1] : bench::makeSampleTree();
    const std::string root = makeAppliance(folder);
    const std::string here = fs::read_symlink("/proc/self/exe").parent_path().string();
    const std::string search = here + "/orvel_search";
    std::vector<bench::Contender> contenders = {
        {"orvel, every status handed to a callback", {here + "/orvel_walk", folder}, {}, {}, {}},
        {"floor: openat, getdents64, statx", {here + "/floor_walk", folder}, {}, {}, {}},
        {"orvel, search that finds 1 in 100", {search, "/bench", "*77.jpg"}, {}, {}, {}},
        {"orvel, search that finds everything", {search, "/bench", "*"}, {}, {}, {}},
        {"find, every status and 1 in 100 printed",
         {"find", folder, "-size", "-1000000", ",", "-iname", "*77.jpg"},
         {},
         {},
         {}},
        {"find, everything printed with ls's columns", {"find", folder, "-ls"}, {}, {}, {}},
    };
    bench::contest(contenders, argc > 2 ? atoi(argv[2]) : 11);
    if (argc <= 1) fs::remove_all(folder);
    fs::remove_all(root);
    return 0;
}
