// Runs the fuzz targets over the kept corpus, without libFuzzer: replay CORPUS, a folder for each target below it.
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <vector>

#include "fuzz_targets.h"  // TARGET(name) for each

using Run = int (*)(const std::uint8_t*, std::size_t);

#define TARGET(name) extern "C" int fuzz_##name(const std::uint8_t* data, std::size_t size);
FUZZ_TARGETS
#undef TARGET

int main(int count, char** arguments) {
    namespace fs = std::filesystem;
    struct {
        const char* name;
        Run run;
    } const targets[] = {
#define TARGET(name) {#name, fuzz_##name},
        FUZZ_TARGETS
#undef TARGET
    };
    bool complete = count == 2;
    for (const auto& [name, run] : targets) {
        std::vector<fs::path> files;
        std::error_code missing;
        const fs::path corpus = fs::path(complete ? arguments[1] : "") / name;
        for (const auto& entry : fs::directory_iterator(corpus, missing)) files.push_back(entry.path());
        for (const fs::path& file : files) {
            std::ifstream in(file, std::ios::binary);
            const std::vector<char> bytes{std::istreambuf_iterator<char>(in), {}};
            fprintf(stderr, "%s\n", file.c_str());  // the last one named is what stopped it
            run(reinterpret_cast<const std::uint8_t*>(bytes.data()), bytes.size());
        }
        complete = complete && !files.empty();
        printf("%s: %zu inputs\n", name, files.size());
    }
    return complete ? 0 : 1;
}
