// The wildcard comparison over a million ordinary names: compiled once, through the export (compiled for each name),
// and in the plain recursive form, beside the C library's fnmatch without case, which folds ASCII alone.
#include <fnmatch.h>

#include <functional>
#include <string>

#include "../src/base/wildcard.cpp"  // the matcher itself is not exported
#include "../tests/base/wildcard_model.h"
#include "contest.h"
#include "orvel/text.h"

namespace {

constexpr int kBackslash = 92;
constexpr int kRounds = 5;

std::vector<std::string> makeNames() {
    std::vector<std::string> names;
    for (int i = 0; i < 1000000; ++i) {
        names.push_back("IMG_2012" + std::to_string(1000 + i % 1231) + "_Ausfl\xC3\xBCge_" +
                        std::to_string(100000 + i) + (i % 3 == 0 ? ".tar.gz" : ".jpg"));
    }
    return names;
}

struct Way {
    const char* name;
    std::function<int(const char* pattern)> matches;
    std::vector<double> times;
};

void compare(const char* pattern, std::vector<Way>& ways) {
    int expected = -1;
    for (auto& way : ways) way.times.clear();
    for (int round = 0; round < kRounds; ++round) {
        for (auto& way : ways) {
            const auto start = std::chrono::steady_clock::now();
            const int found = way.matches(pattern);
            const std::chrono::duration<double, std::milli> time = std::chrono::steady_clock::now() - start;
            way.times.push_back(time.count());
            if (expected < 0) expected = found;
            if (found != expected) printf("%s differs: %d instead of %d\n", way.name, found, expected);
        }
    }
    printf("%-18s", pattern);
    const double floor = bench::median(ways.front().times);
    for (const auto& way : ways) {
        const double time = bench::median(way.times);
        printf("  %s %.0f ms (%.2f)", way.name, time, time / floor);
    }
    printf("\n");
}

}  // namespace

int main() {
    const auto names = makeNames();
    const auto each = [&](const auto& matches) {
        int found = 0;
        for (const auto& name : names) found += matches(name) ? 1 : 0;
        return found;
    };
    std::vector<Way> ways = {
        {"compiled once",
         [&](const char* pattern) {
             const orvel::Wildcard compiled(pattern, kBackslash);
             return each([&](const std::string& name) { return compiled.match(name); });
         },
         {}},
        {"export",
         [&](const char* pattern) {
             return each(
                 [&](const std::string& name) { return OrvLibStrLikeCompare(pattern, name.c_str(), kBackslash) == 1; });
         },
         {}},
        {"recursive",
         [&](const char* pattern) {
             return each(
                 [&](const std::string& name) { return wildcard_model::compare(pattern, name.c_str(), kBackslash); });
         },
         {}},
        {"fnmatch",
         [&](const char* pattern) {
             return each([&](const std::string& name) { return fnmatch(pattern, name.c_str(), FNM_CASEFOLD) == 0; });
         },
         {}},
    };
    for (const char* pattern : {"*.jpg", "*ausfl*", "*2012*9?.jpg", "IMG_*", "*zzz*"}) compare(pattern, ways);
}
