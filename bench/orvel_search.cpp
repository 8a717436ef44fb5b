// Searches a share through the library, as a search program does.
//   orvel_search FOLDER PATTERN    FOLDER: share-relative; prints how many files and folders were found
// The share comes from the system root that VEXO_ROOT names.
#include <cstdio>
#include <memory>
#include <vector>

#include "orvel/search_criteria.h"
#include "orvel/search_task.h"
#include "orvel/search_walker.h"

int main(int argc, char** argv) {
    if (argc != 3) return 2;
    FileSearch::FindNameComp name(argv[2]);
    const std::vector<FileSearch::FindComp*> criteria{&name};
    int cancel = 0;
    FileSearch::OrvSearchWalker walker("bench", nullptr, &cancel);
    if (!walker.init({argv[1]}, criteria) || !walker.Walk({})) return 1;
    FileSearch::OrvSearchDBTask task(walker.getDBVol(), "bench", walker.getDBTaskId());
    unsigned long long count = 0;
    const auto ignore = [](__tag_FI_FILE_INFO_DATA*, void*) -> BOOL { return 0; };
    if (!task.queryResult(0, 1, nullptr, nullptr, nullptr, nullptr, ignore, nullptr, &count)) return 1;
    printf("%llu\n", count);
    return task.remove() ? 0 : 1;
}
