// The file index: searching an index of a million names by name, inserting what a search found, and pages of a million
// sorted results. Everything lies in a new folder below FOLDER (default /tmp), which is removed at the end.
//
//   index_bench [FOLDER [ROUNDS]]
#include <sqlite3.h>
#include <sys/stat.h>

#include <array>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>

#include "contest.h"
#include "household.h"
#include "vexo/index.h"

namespace {

using Cond = __tag_FI_SQL_COND;
using Data = __tag_FI_FILE_INFO_DATA;
using bench::Files;
using bench::kShare;
using Clock = std::chrono::steady_clock;

constexpr int kNames = 1000000;
constexpr int kMatches = 300000;

double since(Clock::time_point start) {
    return std::chrono::duration<double, std::milli>(Clock::now() - start).count();
}

[[noreturn]] void give(const char* what) {
    fprintf(stderr, "%s failed\n", what);
    exit(1);
}

void need(bool done, const char* what) {
    if (!done) give(what);
}

Cond nameCondition(const std::string& pattern) {
    Cond cond{};
    cond.type = FI_COL_NAME;
    cond.op = FI_OP_WILDCARD;
    snprintf(cond.szValue, sizeof cond.szValue, "%s", pattern.c_str());
    return cond;
}

// Fills a share's index, a result database and a plain list with the same names.
void prepareNames(const std::string& folder, const std::string& results) {
    char index[4096];
    need(FILEIDXIndexBegin(kShare, FI_INDEX_BUILD, index, sizeof index) == 0, "beginning an index");
    need(FILEIDXDBCreate(results.c_str()) == 0, "making a result database");
    std::ofstream list(folder + "/list");
    const auto start = Clock::now();
    Files().make(kNames, [&](const Data& data) {
        need(FILEIDXDBInsert(index, &data, 1) == 0, "filling the index");
        need(FILEIDXOutputDBInsert(results.c_str(), &data) == 0, "filling the results");
        list << "/volume1/photo/" << data.szPath << '\n';
    });
    const double filled = since(start);
    need(FILEIDXIndexEnd(kShare, 1) == 0, "ending the index");
    FIINDEXSTATUS status{};
    need(FILEIDXIndexStatus(kShare, &status) == 0, "the state of the index");
    printf("index of %llu names: %.0f MB; completed in %.1f s after %.1f s of inserting\n\n", status.records,
           static_cast<double>(status.bytes) / 1e6, (since(start) - filled) / 1e3, filled / 1e3);
}

// Programs of the contests.

int searchIndex(const std::string& folder, const std::string& pattern) {
    const std::string out = folder + "/found";
    std::filesystem::remove(out);
    const Cond cond = nameCondition(pattern);
    need(FILEIDXDBCreate(out.c_str()) == 0, "making a result database");
    need(FILEIDXResultGetAndTableGen(kShare, nullptr, &cond, out.c_str(), nullptr, nullptr, nullptr, nullptr,
                                     nullptr) == 0,
         "searching");
    FIQUERY query{};
    unsigned long long count = 0;
    need(FILEIDXCountGet(out.c_str(), &query, &count) == 0, "counting");
    need(count > 0, "finding");
    return 0;
}

int scanTable(const std::string& results, const std::string& pattern) {
    const Cond cond = nameCondition(pattern);
    FIQUERY query{};
    query.cond = &cond;
    unsigned long long count = 0;
    need(FILEIDXCountGet(results.c_str(), &query, &count) == 0, "scanning");
    return 0;
}

int insertOurs(const std::string& folder) {
    const std::string out = folder + "/inserted";
    std::filesystem::remove(out);
    need(FILEIDXDBCreate(out.c_str()) == 0, "making a result database");
    Files().make(kMatches,
                 [&](const Data& data) { need(FILEIDXOutputDBInsert(out.c_str(), &data) == 0, "inserting"); });
    return 0;
}

int makeOnly() {
    Files().make(kMatches, [](const Data& data) { need(data.size >= 0, "making"); });
    return 0;
}

// The same columns by one prepared statement in one transaction, nothing checked and no index.
int insertBare(const std::string& folder, bool unique) {
    const std::string out = folder + "/bare";
    std::filesystem::remove(out);
    sqlite3* db = nullptr;
    sqlite3_stmt* statement = nullptr;
    need(sqlite3_open(out.c_str(), &db) == SQLITE_OK &&
             sqlite3_exec(db,
                          "PRAGMA synchronous=OFF;CREATE TABLE t(a,b,c,d,e,f,g,h,i,j INT,k INT,l INT,m INT,n INT,o INT,"
                          "p INT,q INT,r INT);BEGIN",
                          nullptr, nullptr, nullptr) == SQLITE_OK,
         "bare table");
    if (unique) sqlite3_exec(db, "CREATE UNIQUE INDEX u ON t(b,c)", nullptr, nullptr, nullptr);
    need(sqlite3_prepare_v2(db, "INSERT INTO t VALUES(?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?)", -1, &statement, nullptr) ==
             SQLITE_OK,
         "bare statement");
    Files().make(kMatches, [&](const Data& d) {
        int at = 0;
        for (const char* text : {d.szName, d.szShare, d.szPath, d.szParent, d.szShareRoot, d.szExtension,
                                 d.szPermission, d.szOwner, d.szGroup}) {
            sqlite3_bind_blob(statement, ++at, text, static_cast<int>(strlen(text)), SQLITE_STATIC);
        }
        for (const int64_t number : {int64_t{d.isDir}, d.size, d.created, d.changed, d.accessed, d.modified,
                                     int64_t{d.mode}, int64_t{d.uid}, int64_t{d.gid}}) {
            sqlite3_bind_int64(statement, ++at, number);
        }
        need(sqlite3_step(statement) == SQLITE_DONE, "bare insert");
        sqlite3_reset(statement);
    });
    sqlite3_finalize(statement);
    need(sqlite3_exec(db, "COMMIT", nullptr, nullptr, nullptr) == SQLITE_OK, "bare commit");
    sqlite3_close(db);
    return 0;
}

BOOL countRow(Data*, void* rows) {
    ++*static_cast<int*>(rows);
    return 1;
}

bench::Time page(const std::string& results, __tag_FI_SQL_COND_TYPE column, unsigned long offset, const Cond* cond) {
    const FIQUERY query = {{{column, 0}, {}}, 1, cond, offset, 100};
    int rows = 0;
    const std::clock_t cpu = std::clock();
    const auto start = Clock::now();
    need(FILEIDXDBSelect(results.c_str(), &query, countRow, &rows) == 0 && rows == 100, "a page");
    return {since(start), static_cast<double>(std::clock() - cpu) * 1e3 / CLOCKS_PER_SEC};
}

bench::Time medianPage(const std::string& results, __tag_FI_SQL_COND_TYPE column, unsigned long offset,
                       const Cond* cond, int rounds) {
    std::vector<double> wall;
    std::vector<double> cpu;
    for (int i = 0; i < rounds; ++i) {
        const bench::Time time = page(results, column, offset, cond);
        wall.push_back(time.wall);
        cpu.push_back(time.cpu);
    }
    return {bench::median(wall), bench::median(cpu)};
}

// The first page makes the order, the others find it made.
void pages(const std::string& results, int rounds) {
    Cond files{};
    files.type = FI_COL_IS_DIR;
    files.szValue[0] = '0';
    printf("\npage of 100 of %d sorted results\n%-44s %9s %8s\n", kNames, "", "ms", "cpu ms");
    for (const auto& [column, word] : {std::pair{FI_COL_NAME, "name"}, {FI_COL_SIZE, "size"}}) {
        const auto print = [word = word](const char* what, bench::Time time) {
            printf("by %s, %-36s %9.2f %8.2f\n", word, what, time.wall, time.cpu);
        };
        print("the first", page(results, column, kNames / 2, nullptr));
        print("at 0", medianPage(results, column, 0, nullptr, rounds));
        print("at 500,000", medianPage(results, column, 500000, nullptr, rounds));
        print("at 999,900", medianPage(results, column, 999900, nullptr, rounds));
        print("at 500,000, files only", medianPage(results, column, 500000, &files, rounds));
    }
}

int runAs(const char* program, const std::string& folder, const std::string& argument) {
    const std::string what = program;
    if (what == "prepare") return prepareNames(folder, folder + "/results"), 0;
    if (what == "search") return searchIndex(folder, argument);
    if (what == "scan") return scanTable(folder + "/results", argument);
    if (what == "insert") return insertOurs(folder);
    if (what == "bare") return insertBare(folder, argument == "unique");
    return makeOnly();
}

void searches(const std::string& self, const std::string& folder, int rounds) {
    const std::string database = folder + "/plocate.db";
    const bool built =
        bench::runProgram({"plocate-build", "-l", "no", "-p", folder + "/list", database}, STDERR_FILENO).wall >= 0;
    if (!built) printf("plocate is not installed and left out\n");
    for (const char* pattern :
         {"*lunker*basa*", "*20100777*", "*final 77.pdf", "*img_2008*_7*7.jpg", "*.mp3", "*ab*"}) {
        printf("\nnames that fit %s\n", pattern);
        std::vector<bench::Contender> contenders;
        contenders.push_back({"plain scan", {self, "--", "scan", folder, pattern}, {}, {}, {}});
        contenders.push_back({"index", {self, "--", "search", folder, pattern}, {}, {}, {}});
        if (built) contenders.push_back({"plocate", {"plocate", "-d", database, "-b", "-i", pattern}, {}, {}, {}});
        bench::contest(contenders, rounds);
    }
}

}  // namespace

int main(int argc, char** argv) {
    if (argc == 5 && strcmp(argv[1], "--") == 0) return runAs(argv[2], argv[3], argv[4]);
    std::string folder = std::string(argc > 1 ? argv[1] : "/tmp") + "/index-bench-XXXXXX";
    need(mkdtemp(folder.data()) != nullptr, "making a folder");
    bench::prepareRoot(folder);
    const int rounds = argc > 2 ? static_cast<int>(strtol(argv[2], nullptr, 10)) : 7;
    const std::string self = std::filesystem::read_symlink("/proc/self/exe");
    const std::string results = folder + "/results";
    prepareNames(folder, results);
    searches(self, folder, rounds);
    printf("\ninserting %d matches, beside making them only\n", kMatches);
    std::vector<bench::Contender> inserts = {
        {"no insert at all", {self, "--", "make", folder, ""}, {}, {}, {}},
        {"bare SQLite", {self, "--", "bare", folder, ""}, {}, {}, {}},
        {"bare SQLite, unique index", {self, "--", "bare", folder, "unique"}, {}, {}, {}},
        {"results", {self, "--", "insert", folder, ""}, {}, {}, {}}};
    bench::contest(inserts, rounds);
    sleep(3);  // so that the results count as complete
    pages(results, rounds);
    std::filesystem::remove_all(folder);
    return 0;
}
