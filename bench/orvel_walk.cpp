// Walks a tree through the library.
//   orvel_walk FOLDER          prints how many entries there are and the sum of their sizes
//   orvel_walk FOLDER print    prints the size of every entry
#include <cinttypes>
#include <cstdio>
#include <string>

#include "orvel/directory_walker.h"

namespace {

class Sum : public OrvDirectoryWalkerCallBack {
 public:
    bool operator()(const std::string&, const std::string&, const std::string&, const std::string&,
                    _tag_VEXOSTAT_& status, const std::string*) override {
        ++entries;
        bytes += status.st_size;
        return true;
    }
    unsigned long long entries = 0;
    int64_t bytes = 0;
};

class Print : public OrvDirectoryWalkerCallBack {
 public:
    bool operator()(const std::string&, const std::string&, const std::string&, const std::string&,
                    _tag_VEXOSTAT_& status, const std::string*) override {
        return printf("%" PRId64 "\n", status.st_size) > 0;
    }
};

}  // namespace

int main(int argc, char** argv) {
    if (argc < 2) return 2;
    OrvDirectoryWalker walker(ENUM_IGNORE_NO_ERR, nullptr);
    if (argc > 2) {
        Print print;
        return walker.Walk_TopDown("", "", argv[1], print, nullptr, false) ? 0 : 1;
    }
    Sum sum;
    if (!walker.Walk_TopDown("", "", argv[1], sum, nullptr, false)) return 1;
    printf("%llu %" PRId64 "\n", sum.entries, sum.bytes);
    return 0;
}
