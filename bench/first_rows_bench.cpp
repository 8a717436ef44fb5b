// How soon a search of an index of a million names shows its first rows, and when it is complete, beside bare SQLite
// that inserts the same rows into a table with the same unique index.
//
//   first_rows_bench [FOLDER [ROUNDS]]    FOLDER: for the databases, default /tmp
#include <sqlite3.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "contest.h"
#include "household.h"
#include "vexo/index_shown.h"

namespace {

using Cond = __tag_FI_SQL_COND;
using Data = __tag_FI_FILE_INFO_DATA;
using Clock = std::chrono::steady_clock;

constexpr int kNames = 1000000;

double since(Clock::time_point start) {
    return std::chrono::duration<double, std::milli>(Clock::now() - start).count();
}

void need(bool done, const char* what) {
    if (done) return;
    fprintf(stderr, "%s failed\n", what);
    exit(1);
}

// Alternatives of one column, and what each of them must hold as well.
struct Chain {
    std::vector<std::unique_ptr<Cond>> nodes;

    void add(__tag_FI_SQL_COND_TYPE type, __tag_FI_SQL_COND_OP op, const std::string& value, Cond* andNext) {
        auto cond = std::make_unique<Cond>();
        cond->type = type;
        cond->op = op;
        cond->pAndNext = andNext;
        cond->pOrNext = head();
        snprintf(cond->szValue, sizeof cond->szValue, "%s", value.c_str());
        nodes.push_back(std::move(cond));
    }
    [[nodiscard]] Cond* head() const { return nodes.empty() ? nullptr : nodes.back().get(); }
};

struct Search {
    std::string name;
    std::vector<std::string> patterns;
    std::vector<std::string> folders;
};

void fillIndex(std::vector<std::string>& folders) {
    char index[4096];
    need(FILEIDXIndexBegin(bench::kShare, FI_INDEX_BUILD, index, sizeof index) == 0, "beginning an index");
    const auto start = Clock::now();
    bench::Files().make(kNames, [&](const Data& data) {
        need(FILEIDXDBInsert(index, &data, 1) == 0, "filling the index");
        if (folders.empty() || folders.back() != data.szParent) folders.emplace_back(data.szParent);
    });
    const double filled = since(start);
    need(FILEIDXIndexEnd(bench::kShare, 1) == 0, "ending the index");
    FIINDEXSTATUS status{};
    need(FILEIDXIndexStatus(bench::kShare, &status) == 0, "the state of the index");
    printf("index of %llu names: %.0f bytes a name, filled in %.1f s, completed in %.1f s more\n", status.records,
           static_cast<double>(status.bytes) / static_cast<double>(status.records), filled / 1e3,
           (since(start) - filled) / 1e3);
}

[[noreturn]] void runSearch(const Search& search, const std::string& out) {
    Chain names;
    for (const auto& pattern : search.patterns) names.add(FI_COL_NAME, FI_OP_WILDCARD, pattern, nullptr);
    Chain paths;
    Chain below;
    for (const auto& folder : search.folders) {
        below.nodes.clear();
        below.add(FI_COL_PATH, FI_OP_BELOW, "/photo/" + folder, nullptr);
        paths.add(FI_COL_PATH, FI_OP_PATH, "/photo/" + folder, below.nodes.back().release());
    }
    const FISORT byName = {FI_COL_NAME, 0};
    need(FILEIDXResultGetShown(bench::kShare, paths.head(), names.head(), out.c_str(), nullptr, nullptr, nullptr,
                               nullptr, nullptr, &byName) == 0,
         "searching");
    exit(0);
}

unsigned long long rowsOf(const std::string& out) {
    FIQUERY query{};
    unsigned long long count = 0;
    return FILEIDXCountGet(out.c_str(), &query, &count) == 0 ? count : 0;
}

// The first page, as somebody sees it who sorts by name.
std::vector<std::string> firstPage(const std::string& out) {
    const FIQUERY query = {{{FI_COL_NAME, 0}, {}}, 1, nullptr, 0, 100};
    std::vector<std::string> paths;
    const auto take = [](Data* data, void* list) -> BOOL {
        static_cast<std::vector<std::string>*>(list)->emplace_back(data->szPath);
        return 1;
    };
    need(FILEIDXDBSelect(out.c_str(), &query, take, &paths) == 0, "a page");
    return paths;
}

// The time of a processor that another process has used, in milliseconds: that of the clock says little on a busy
// machine.
double usedBy(pid_t process) {
    clockid_t clock = 0;
    timespec used{};
    if (clock_getcpuclockid(process, &clock) != 0 || clock_gettime(clock, &used) != 0) return 0;
    return static_cast<double>(used.tv_sec) * 1e3 + static_cast<double>(used.tv_nsec) / 1e6;
}

struct Times {
    double first, firstUsed, complete;
    unsigned long long rows;
    bool isFinal;  // the first page was that of the end
};

Times timeSearch(const Search& search, const std::string& out) {
    std::filesystem::remove(out);
    const auto start = Clock::now();
    fflush(nullptr);
    const pid_t child = fork();
    if (child == 0) {
        need(FILEIDXDBCreate(out.c_str()) == 0, "making a result database");
        runSearch(search, out);
    }
    Times times{-1, 0, -1, 0, false};
    std::vector<std::string> page;
    int status = 0;
    while (waitpid(child, &status, WNOHANG) == 0) {
        if (times.first < 0 && std::filesystem::exists(out) && rowsOf(out) > 0) {
            times.first = since(start);
            times.firstUsed = usedBy(child);
            page = firstPage(out);
        }
        usleep(500);
    }
    times.complete = since(start);
    need(status == 0, "a search");
    times.rows = rowsOf(out);
    times.isFinal = times.first < 0 || page == firstPage(out);
    if (times.first < 0) times.first = times.complete;
    return times;
}

struct Rows {
    sqlite3_stmt* statement;
    bool done = true;
};

BOOL insertBare(Data* d, void* argument) {
    auto& rows = *static_cast<Rows*>(argument);
    int at = 0;
    for (const char* text : {d->szName, d->szShare, d->szPath, d->szParent, d->szShareRoot, d->szExtension,
                             d->szPermission, d->szOwner, d->szGroup}) {
        sqlite3_bind_blob(rows.statement, ++at, text, static_cast<int>(strlen(text)), SQLITE_STATIC);
    }
    for (const int64_t number : {int64_t{d->isDir}, d->size, d->created, d->changed, d->accessed, d->modified,
                                 int64_t{d->mode}, int64_t{d->uid}, int64_t{d->gid}}) {
        sqlite3_bind_int64(rows.statement, ++at, number);
    }
    rows.done = rows.done && sqlite3_step(rows.statement) == SQLITE_DONE;
    sqlite3_reset(rows.statement);
    return 1;
}

BOOL skip(Data*, void*) {
    return 1;
}

// Reading the rows is not part of the floor.
double timeBare(const std::string& found, const std::string& bare) {
    std::filesystem::remove(bare);
    const FIQUERY all = {{}, 0, nullptr, 0, ~0UL};
    auto start = Clock::now();
    need(FILEIDXDBSelect(found.c_str(), &all, skip, nullptr) == 0, "reading the rows");
    const double reading = since(start);
    sqlite3* db = nullptr;
    Rows rows{};
    start = Clock::now();
    need(sqlite3_open(bare.c_str(), &db) == SQLITE_OK &&
             sqlite3_exec(db,
                          "PRAGMA synchronous=OFF;PRAGMA page_size=8192;CREATE TABLE t(a,b,c,d,e,f,g,h,i,j INT,k INT,"
                          "l INT,m INT,n INT,o INT,p INT,q INT,r INT);CREATE UNIQUE INDEX u ON t(c,b);BEGIN",
                          nullptr, nullptr, nullptr) == SQLITE_OK &&
             sqlite3_prepare_v2(db, "INSERT OR IGNORE INTO t VALUES(?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?)", -1,
                                &rows.statement, nullptr) == SQLITE_OK,
         "a bare table");
    need(FILEIDXDBSelect(found.c_str(), &all, insertBare, &rows) == 0 && rows.done, "bare inserts");
    sqlite3_finalize(rows.statement);
    need(sqlite3_exec(db, "COMMIT", nullptr, nullptr, nullptr) == SQLITE_OK, "a bare commit");
    sqlite3_close(db);
    return std::max(since(start) - reading, 0.01);
}

std::vector<std::string> extensions(int count, const char* last) {
    std::vector<std::string> list;
    for (int i = 1; i < count; ++i) list.push_back("*.x" + std::to_string(100 + i));
    list.emplace_back(last);
    return list;
}

std::vector<std::string> some(const std::vector<std::string>& folders, size_t count) {
    std::vector<std::string> chosen;
    for (size_t i = 0; i < count; ++i) chosen.push_back(folders[i * (folders.size() / count)]);
    return chosen;
}

}  // namespace

int main(int argc, char** argv) {
    std::string folder = std::string(argc > 1 ? argv[1] : "/tmp") + "/first-rows-XXXXXX";
    need(mkdtemp(folder.data()) != nullptr, "making a folder");
    bench::prepareRoot(folder);
    const int rounds = argc > 2 ? static_cast<int>(strtol(argv[2], nullptr, 10)) : 5;
    std::vector<std::string> folders;
    fillIndex(folders);
    const std::vector<Search> searches = {
        {"*20100777*", {"*20100777*"}, {}},
        {"*final 77.pdf", {"*final 77.pdf"}, {}},
        {"*ab*", {"*ab*"}, {}},
        {"*.mp3", {"*.mp3"}, {}},
        {"*.jpg", {"*.jpg"}, {}},
        {"*", {"*"}, {}},
        {"20 extensions", extensions(20, "*.mp3"), {}},
        {"100 extensions", extensions(100, "*.mp3"), {}},
        {"100 extensions, none there", extensions(100, "*.q"), {}},
        {"*.mp3 in 1 folder", {"*.mp3"}, some(folders, 1)},
        {"*.mp3 in 500 folders", {"*.mp3"}, some(folders, 500)},
    };
    printf("\n%-28s %9s %9s %9s %8s %10s %12s %8s\n", "ms, median", "rows", "first", "used", "is final", "complete",
           "bare SQLite", "ratio");
    for (const Search& search : searches) {
        std::vector<double> first;
        std::vector<double> used;
        int final = 0;
        std::vector<double> complete;
        std::vector<double> bare;
        unsigned long long rows = 0;
        for (int i = 0; i < rounds; ++i) {
            const Times times = timeSearch(search, folder + "/found");
            first.push_back(times.first);
            used.push_back(times.firstUsed);
            final += times.isFinal ? 1 : 0;
            complete.push_back(times.complete);
            rows = times.rows;
            bare.push_back(timeBare(folder + "/found", folder + "/bare"));
        }
        printf("%-28s %9llu %9.1f %9.1f %5d/%-2d %10.1f %12.1f %8.2f\n", search.name.c_str(), rows,
               bench::median(first), bench::median(used), final, rounds, bench::median(complete), bench::median(bare),
               bench::median(complete) / bench::median(bare));
        fflush(stdout);
    }
    std::filesystem::remove_all(folder);
    return 0;
}
