// What a page costs, out of a kept listing and without one.
//   VEXO_ROOT=ROOT kept_bench USER PATH...      share-relative folders, such as ones of 1,000, 100,000 and 1,000,000 entries
// The last lines compare the folders: a page should cost the same in all of them.
#include <time.h>
#include <unistd.h>

#include <fcntl.h>
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <string>
#include <vector>

#include "kept_listing.h"
#include "orvel/error_state.h"

namespace {

using namespace orvel::cgi;

constexpr unsigned long kPage = 200;
constexpr int kEverything = 0x7F;

// Processor time of one call, the median of several.
double milliseconds(int rounds, const std::function<int()>& work) {
    const auto now = [] {
        timespec time{};
        clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &time);
        return static_cast<double>(time.tv_sec) * 1e3 + static_cast<double>(time.tv_nsec) / 1e6;
    };
    std::vector<double> times;
    for (int round = 0; round < rounds; ++round) {
        const double start = now();
        if (const int code = work(); code != ORV_ERR_NONE) {
            std::fprintf(stderr, "kept_bench: failed with %d\n", code);
            std::exit(1);
        }
        times.push_back(now() - start);
    }
    std::sort(times.begin(), times.end());
    return times[times.size() / 2];
}

ListRequest requestFor(const char* user, const char* path, unsigned long offset) {
    ListRequest request;
    request.user = user;
    request.path = path;
    request.sortBy = "name";
    request.offset = offset;
    request.limit = kPage;
    request.additional = kEverything;
    return request;
}

// As the action "page" does it, text included.
int keptPage(const ListRequest& request, const std::string& id) {
    KeptListing listing;
    OpenedFolder opened;
    std::vector<KeptPageRow> rows;
    int code = listing.find(request.user, id);
    if (code == ORV_ERR_NONE) code = listing.openFolder(request, opened);
    if (code == ORV_ERR_NONE) code = listing.page(request, opened, rows);
    std::string text;
    for (const KeptPageRow& row : rows) appendEntry(row.entry, request.additional, text);
    return code;
}

int plainPage(const ListRequest& request) {
    Listing listing;
    const int code = listFolder(request, listing);
    std::string text;
    for (const DIRENTRY_INFO& entry : listing.entries) appendEntry(entry, request.additional, text);
    return code;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 3) return 2;
    std::vector<double> pages;
    for (int i = 2; i < argc; ++i) {
        KeptAnew anew;
        const double keeping = milliseconds(1, [&] {
            return keepFolder(requestFor(argv[1], argv[i], 0), {"en", true}, anew);
        });
        const ListRequest middle = requestFor(argv[1], argv[i], anew.total / 2);
        const double plain = milliseconds(3, [&] { return plainPage(middle); });
        pages.push_back(milliseconds(31, [&] { return keptPage(middle, anew.id); }));
        std::printf(
            "%-24s %8lu entries  keep %9.2f ms  page of %lu: plain %9.2f ms  kept %6.2f ms  %8.1f times cheaper\n",
            argv[i], anew.total, keeping, kPage, plain, pages.back(), plain / pages.back());
    }
    for (size_t i = 1; i < pages.size(); ++i)
        std::printf("kept page of %s: %.2f of that of %s\n", argv[i + 2], pages[i] / pages[0], argv[2]);
    return 0;
}
