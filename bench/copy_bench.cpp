// Copying 20,000 small files, and one file of 2 GiB, beside cp in one run.
//   copy_bench [FOLDER [ROUNDS]]    FOLDER (where all of it is made and removed) decides about the file system
#include <fcntl.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <map>
#include <string>

#include "contest.h"

namespace fs = std::filesystem;

namespace {

void makeFile(const std::string& path, size_t size) {
    const int fd = open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644);
    std::string block(std::min<size_t>(size, 1 << 20), '\0');
    for (size_t i = 0; i < block.size(); ++i) block[i] = static_cast<char>(i * 2654435761U >> 13);
    for (size_t done = 0; done < size; done += block.size()) {
        if (write(fd, block.data(), block.size()) != static_cast<ssize_t>(block.size())) exit(2);
    }
    close(fd);
}

void run(const std::string& title, const std::string& source, const std::string& target, int rounds) {
    const std::string here = fs::read_symlink("/proc/self/exe").parent_path().string();
    const std::pair<std::string, bench::Arguments> contenders[] = {
        {"cp -r", {"cp", "-r", source, target}},
        {"cp -r, modes and times kept", {"cp", "-r", "--preserve=mode,timestamps", source, target}},
        {"orvel", {here + "/orvel_copy", source, target}}};
    const int null = open("/dev/null", O_WRONLY | O_CLOEXEC);
    std::map<std::string, std::vector<double>> wall, cpu;
    for (int round = -1; round < rounds; ++round) {  // one that only warms the caches
        bench::Time floor{};
        for (const auto& [name, arguments] : contenders) {
            fs::remove_all(target);
            fs::create_directory(target);
            sync();
            const bench::Time time = bench::runProgram(arguments, null);
            if (time.wall < 0) exit(1);
            if (name == "cp -r") floor = time;
            if (round < 0) continue;
            wall[name].push_back(time.wall / floor.wall);
            cpu[name].push_back(time.cpu / floor.cpu);
        }
    }
    close(null);
    fs::remove_all(target);
    printf("%s, ratios to cp -r of elapsed and of processor time\n", title.c_str());
    for (const auto& [name, arguments] : contenders) {
        printf("  %-32s %6.2f %6.2f\n", name.c_str(), bench::median(wall[name]), bench::median(cpu[name]));
    }
}

}  // namespace

int main(int argc, char** argv) {
    std::string base = std::string(argc > 1 ? argv[1] : "/tmp") + "/orvel-copy-bench-XXXXXX";
    if (mkdtemp(base.data()) == nullptr) return 2;
    const int rounds = argc > 2 ? atoi(argv[2]) : 7;
    for (int i = 0; i < 20000; ++i) {
        const std::string folder = base + "/tree/" + std::to_string(i / 200);
        if (i % 200 == 0) fs::create_directories(folder);
        makeFile(folder + "/" + std::to_string(i), 1500);
    }
    run("20,000 files of 1.5 kB", base + "/tree", base + "/target", rounds);
    fs::remove_all(base + "/tree");
    makeFile(base + "/large", size_t{2} << 30);
    run("one file of 2 GiB", base + "/large", base + "/target", std::min(rounds, 5));
    fs::remove_all(base);
    return 0;
}
