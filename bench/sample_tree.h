// The tree that walks and searches are measured on.
#ifndef ORVEL_BENCH_SAMPLE_TREE_H
#define ORVEL_BENCH_SAMPLE_TREE_H

#include <fcntl.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <string>

namespace bench {

// A new folder with 20 folders of 15 folders of 10 folders of 99 files: 300,320 entries.
inline std::string makeSampleTree() {
    char path[] = "/tmp/orvel-bench-XXXXXX";
    if (mkdtemp(path) == nullptr) exit(1);
    for (int leaf = 0; leaf < 20 * 15 * 10; ++leaf) {
        const std::string folder = std::string(path) + "/year " + std::to_string(leaf / 150) + "/event " +
                                   std::to_string(leaf / 10 % 15) + "/camera " + std::to_string(leaf % 10);
        std::filesystem::create_directories(folder);
        for (int i = 0; i < 99; ++i) {
            const std::string name = folder + "/IMG_" + std::to_string(leaf * 100 + i) + ".JPG";
            const int fd = open(name.c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0644);
            if (fd < 0) exit(1);
            close(fd);
        }
    }
    return path;
}

}  // namespace bench

#endif
