// Results that stay true: updates after file operations, and pages of them.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <set>
#include <string>

#include "fault_gate.h"
#include "search/search_fixture.h"
#include "support/log_texts.h"
#include "vexo/error.h"

using namespace FileSearch;
using namespace support;
namespace fs = std::filesystem;

namespace {

const Query kEverything{{"/photo", "/docs", "/home"}, {{0, nullptr, "*"}}};

// A search whose results stay on screen.
class Screen {
 public:
    Screen() : criteria_(kEverything.asks) {
        int flag = 0;
        OrvSearchWalker walker("alice", nullptr, &flag);
        EXPECT_TRUE(walker.init(kEverything.folders, criteria_.all) && walker.Walk({}));
        task_ = std::make_unique<OrvSearchDBTask>(walker.getDBVol(), "alice", walker.getDBTaskId());
    }
    ~Screen() { EXPECT_TRUE(task_->remove()); }
    Screen(const Screen&) = delete;
    Screen& operator=(const Screen&) = delete;
    OrvSearchDBTask* operator->() const { return task_.get(); }
    [[nodiscard]] Rows rows() const { return rowsOf(*task_); }

 private:
    Criteria criteria_;
    std::unique_ptr<OrvSearchDBTask> task_;
};

_tag_VEXOSTAT_ statusOf(const std::string& path) {
    _tag_VEXOSTAT_ status{};
    EXPECT_EQ(VLIBCFileLStat(path.c_str(), 9, &status), 0) << path;
    return status;
}

// What a file operation does to the disk and tells the results about it.
void moved(const Screen& screen, const std::string& fromShare, const std::string& from, const std::string& toShare,
           const std::string& to) {
    fs::rename(from, to);
    auto status = statusOf(to);
    EXPECT_TRUE(screen->updateFile(fromShare, from, toShare, to, status));
    EXPECT_TRUE(screen->updateFileInFolder(fromShare, from, toShare, to));
}

void removed(const Screen& screen, const std::string& share, const std::string& path) {
    fs::remove_all(path);
    EXPECT_TRUE(screen->delRecs(share, path));
}

// The folders above what an operation changed have new times.
void touched(const Screen& screen, const std::string& share, const std::string& folder) {
    auto status = statusOf(folder);
    EXPECT_TRUE(screen->updatePermRecs(share, folder, nullptr, nullptr, status));
}

class SearchUpdateTest : public SearchFixture {};

TEST_F(SearchUpdateTest, AfterEachOperationTheResultsAreThoseOfANewSearch) {
    SKIP_WITHOUT_ROOT();
    const std::string photo = shareRoot("photo"), docs = shareRoot("docs"), home = shareRoot("homes") + "/alice";
    // Names that a pattern would take for each other.
    const char* const names[] = {"d", "d_", "dx", "d%", "d*", "d?", "d\\", "d'", "d\"", "D", "d [1]", "\xFF"};
    for (const char* name : names) {
        for (const char* below : {"/f.txt", "/f_.txt", "/f%.txt", "/sub/f'.txt"}) {
            makeFile(photo + "/" + name + below, 3, kBobUid, kUsersGid, 1000);
        }
    }
    for (int i = 0; i < 1000; ++i) makeFile(photo + "/many/" + std::to_string(i % 10) + "/" + std::to_string(i));
    makeFile(home + "/mine.txt");
    makeFile(docs + "/target.txt", 99);
    inOwnProcess([&] {
        const Screen screen;
        size_t step = 0;
        const auto expectTruth = [&] {
            SCOPED_TRACE("step " + std::to_string(++step));
            EXPECT_EQ(screen.rows(), search("alice", kEverything));
        };
        expectTruth();
        for (const char* name : {"d_", "d*", "d%"}) {
            removed(screen, "photo", photo + "/" + name);
            expectTruth();
        }
        removed(screen, "photo", photo + "/d?/f_.txt");
        touched(screen, "photo", photo + "/d?");
        for (const char* name : {"d\\", "d'", "d\"", "\xFF", "d"}) {
            moved(screen, "photo", photo + "/" + name, "photo", photo + "/new_" + name + "%.d");
            expectTruth();
        }
        moved(screen, "photo", photo + "/many", "docs", docs + "/many.moved");
        expectTruth();
        moved(screen, "docs", docs + "/many.moved/7", "home", home + "/seven");
        touched(screen, "docs", docs + "/many.moved");
        expectTruth();
        moved(screen, "home", home + "/seven/177", "docs", docs + "/target.txt");  // over a file that is there
        touched(screen, "home", home + "/seven");
        expectTruth();

        const std::string changed = photo + "/dx/f.txt";
        EXPECT_EQ(chmod(changed.c_str(), 0640), 0);
        EXPECT_EQ(chown(changed.c_str(), kAliceUid, kAdminGid), 0);
        auto status = statusOf(changed);
        EXPECT_TRUE(screen->updatePermRecs("photo", changed, "alice", "administrators", status));
        expectTruth();
        EXPECT_EQ(chown(changed.c_str(), 0, 0), 0);
        status = statusOf(changed);
        EXPECT_TRUE(screen->updatePermRecs("photo", changed, "root", "root", status));
        expectTruth();

        makeFile(photo + "/dx/new.txt", 5, kBobUid, kUsersGid);
        status = statusOf(photo + "/dx/new.txt");
        EXPECT_TRUE(screen->insertFile("photo", photo + "/dx/new.txt", "bob", "users", status));
        status.st_size = 12345;
        EXPECT_TRUE(screen->insertFile("photo", photo + "/dx/new.txt", "eve", "eve", status)) << "there already";
        touched(screen, "photo", photo + "/dx");
        makeFile(home + "/new", 5);
        status = statusOf(home + "/new");
        EXPECT_TRUE(screen->insertFile("home", home + "/new", "", "root", status));
        expectTruth();

        // What is not among the results stays out of them.
        makeFile(photo + "/hidden/f", 5);
        fs::rename(photo + "/hidden", photo + "/still hidden");
        status = statusOf(photo + "/still hidden");
        const Rows before = screen.rows();
        EXPECT_TRUE(screen->updateFile("photo", photo + "/hidden", "photo", photo + "/still hidden", status));
        EXPECT_TRUE(screen->updateFileInFolder("photo", photo + "/hidden", "photo", photo + "/still hidden"));
        EXPECT_TRUE(screen->delRecs("docs", photo + "/dx")) << "another share";
        EXPECT_EQ(screen.rows(), before);
        EXPECT_TRUE(takeLog().empty());
    });
}

TEST_F(SearchUpdateTest, BadPathsAndFailingDatabases) {
    makeFile(shareRoot("photo") + "/d/f");
    inOwnProcess([&] {
        const Screen screen;
        const Rows before = screen.rows();
        auto status = statusOf(shareRoot("photo") + "/d/f");
        const std::string good = shareRoot("photo") + "/d", database = screen->getDBTaskFilePath();
        using Operation = std::function<bool(const std::string&)>;
        const Operation operations[] = {
            [&](const std::string& path) { return screen->delRecs("home", path); },
            [&](const std::string& path) { return screen->updatePermRecs("home", path, nullptr, nullptr, status); },
            [&](const std::string& path) { return screen->insertFile("home", path, "", "", status); },
            [&](const std::string& path) { return screen->updateFile("home", path, "photo", good, status); },
            [&](const std::string& path) { return screen->updateFile("photo", good, "home", path, status); },
            [&](const std::string& path) { return screen->updateFileInFolder("home", path, "photo", good); },
        };
        const std::string tooLong = "/tmp/photo/" + std::string(5000, 'x');
        for (const Operation& operation : operations) {
            vexo::gate::reset();
            for (const std::string path : {"", "/", "/volume1", "volume1", "/volume1/photo"})
                EXPECT_FALSE(operation(path));
            EXPECT_FALSE(operation(tooLong));
            const auto log = takeLogTexts();
            ASSERT_EQ(log.size(), 6U);
            EXPECT_EQ(log[2], "orvelsearch:# Fail to find the share name homes from /volume1");
            EXPECT_EQ(log[4], "orvelsearch:# Fail to find the path name /volume1/photo");
            EXPECT_EQ(vexo::gate::calls("*"), 0) << "the database is not touched";
        }
        struct Fault {
            const char* call;
            int nth;
            std::function<bool()> operation;
            const char* log;
        };
        const Fault faults[] = {
            {"FILEIDXDBDel", 1, [&] { return screen->delRecs("photo", good); }, "delete data in"},
            {"FILEIDXDBDel", 2, [&] { return screen->delRecs("photo", good + "x"); }, "delete data in"},
            {"FILEIDXDBUpdate", 1, [&] { return screen->updatePermRecs("photo", good, "", "", status); },
             "update data in"},
            {"FILEIDXDBSelect", 1, [&] { return screen->insertFile("photo", good + "/n", "", "", status); },
             "select data from"},
            {"FILEIDXDBInsert", 1, [&] { return screen->insertFile("photo", good + "/n", "", "", status); },
             "insert data in"},
            {"FILEIDXDBUpdate", 1, [&] { return screen->updateFile("photo", good, "docs", good, status); },
             "update data in"},
            {"FILEIDXDBSelect", 1, [&] { return screen->updateFileInFolder("photo", good, "photo", good + "2"); },
             "select data from"},
            {"FILEIDXDBUpdate", 1, [&] { return screen->updateFileInFolder("photo", good, "photo", good + "2"); },
             "update data in"},
        };
        for (const Fault& fault : faults) {
            SCOPED_TRACE(fault.log);
            vexo::gate::reset();
            vexo::gate::fail(fault.call, VEXO_ERR_NO_SPACE, ENOSPC, fault.nth);
            EXPECT_FALSE(fault.operation());
            EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
            EXPECT_EQ(takeLogTexts(),
                      std::vector<std::string>{std::string("orvelsearch:# Fail to ") + fault.log + " DB " + database});
        }
        vexo::gate::reset();
        EXPECT_EQ(screen.rows(), before);
    });
}

struct Page {
    std::vector<std::string> names;
    std::vector<std::string> keys;  // what the records are sorted by
};

using Column = std::string (*)(const __tag_FI_FILE_INFO_DATA&);

std::string padded(int64_t number) {
    std::string text = std::to_string(number);
    return std::string(20 - text.size(), '0') + text;
}

struct Collector {
    Column column;
    Page page;
};

BOOL collectPage(__tag_FI_FILE_INFO_DATA* record, void* collector) {
    auto& into = *static_cast<Collector*>(collector);
    into.page.names.push_back(keyOf(*record));
    into.page.keys.push_back(into.column(*record));
    return 1;
}

TEST_F(SearchUpdateTest, PagesInEveryOrder) {
    SKIP_WITHOUT_ROOT();
    const unsigned owners[] = {kAliceUid, kBobUid, 0, 7777777};
    for (unsigned i = 0; i < 60; ++i) {
        const std::string path = (i % 2 == 0 ? shareRoot("photo") : shareRoot("docs")) + "/f" + std::to_string(i % 3) +
                                 "/" + std::string(1, static_cast<char>('a' + i * 7 % 26)) + std::to_string(i) + "." +
                                 std::to_string(i % 5);
        makeFile(path, i * 37 % 60, owners[i % 4], owners[i % 3], i * 41 % 60, i * 43 % 60);
        chmod(path.c_str(), 0600 | (i * 8 % 64));
    }
    inOwnProcess([&] {
        const Screen screen;
        struct Case {
            const char* word;
            Column column;
        };
        const Case cases[] = {
            {"name", [](const auto& r) { return std::string(r.szName); }},
            {"any other word", [](const auto& r) { return std::string(r.szName); }},
            {"size", [](const auto& r) { return padded(r.size); }},
            {"mtime", [](const auto& r) { return padded(r.modified); }},
            {"crtime", [](const auto& r) { return padded(r.created); }},
            {"ctime", [](const auto& r) { return padded(r.changed); }},
            {"atime", [](const auto& r) { return padded(r.accessed); }},
            {"user", [](const auto& r) { return std::string(r.szOwner); }},
            {"group", [](const auto& r) { return std::string(r.szGroup); }},
            {"posix", [](const auto& r) { return std::string(r.szPermission); }},
            {"type", [](const auto& r) { return std::string(r.szExtension); }},
            {"ppath", [](const auto& r) { return std::string(r.szParent); }},
        };
        const size_t total = screen.rows().size();
        for (const Case& test : cases) {
            for (const bool ascending : {true, false}) {
                SCOPED_TRACE(std::string(test.word) + (ascending ? " ascending" : " descending"));
                Collector all{test.column, {}};
                unsigned long long count = 0;
                for (unsigned long offset = 0; offset < total; offset += 7) {
                    EXPECT_TRUE(screen->queryResult(offset, 7, test.word, &ascending, nullptr, nullptr, collectPage,
                                                    &all, &count));
                    EXPECT_EQ(count, total);
                }
                EXPECT_EQ(std::set<std::string>(all.page.names.begin(), all.page.names.end()).size(), total);
                auto sorted = all.page.keys;
                std::sort(sorted.begin(), sorted.end());
                if (!ascending) std::reverse(sorted.begin(), sorted.end());
                EXPECT_EQ(all.page.keys, sorted);
                if (strcmp(test.word, "ppath") != 0) continue;
                // Within a folder the shares stand the other way round.
                for (size_t i = 1; i < all.page.keys.size(); ++i) {
                    if (all.page.keys[i] != all.page.keys[i - 1]) continue;
                    const auto share = [&](size_t at) {
                        return all.page.names[at].substr(0, all.page.names[at].find('/'));
                    };
                    EXPECT_TRUE(ascending ? share(i - 1) >= share(i) : share(i - 1) <= share(i));
                }
            }
        }

        // Without a word or a direction: by name, ascending.
        const bool descending = false;
        for (const char* word : {static_cast<const char*>(nullptr), "size"}) {
            Collector page{cases[0].column, {}};
            unsigned long long count = 0;
            EXPECT_TRUE(screen->queryResult(0, 100, word, word == nullptr ? &descending : nullptr, nullptr, nullptr,
                                            collectPage, &page, &count));
            EXPECT_TRUE(std::is_sorted(page.page.keys.begin(), page.page.keys.end()));
        }

        struct Filter {
            _tag_dir_entry_type_ type;
            const char* name;
            size_t count;
        };
        const Filter filters[] = {
            {DIR_ENTRY_TYPE_ALL, nullptr, 66}, {DIR_ENTRY_TYPE_ALL, "", 66},     {DIR_ENTRY_TYPE_DIR, nullptr, 6},
            {DIR_ENTRY_TYPE_FILE, "", 60},     {DIR_ENTRY_TYPE_DIR, "F1", 2},    {DIR_ENTRY_TYPE_FILE, "f1", 0},
            {DIR_ENTRY_TYPE_ALL, ".4", 12},    {DIR_ENTRY_TYPE_ALL, "?5?.", 10},
        };
        for (const Filter& filter : filters) {
            SCOPED_TRACE(std::to_string(filter.type) + (filter.name == nullptr ? "-" : filter.name));
            unsigned long long count = 0;
            Collector page{cases[0].column, {}};
            EXPECT_TRUE(
                screen->queryResult(1, 1000, nullptr, nullptr, &filter.type, filter.name, collectPage, &page, &count));
            EXPECT_EQ(count, filter.count);
            EXPECT_EQ(page.page.names.size(), filter.count == 0 ? 0 : filter.count - 1);
        }
    });
}

TEST_F(SearchUpdateTest, ResultFilesThatAreNone) {
    makeFile(shareRoot("photo") + "/f");
    inOwnProcess([&] {
        OrvSearchDBTask made("/tmp", "alice", "hostile");
        const std::string path = made.getDBTaskFilePath(), elsewhere = shareRoot("photo") + "/f";
        {
            const Screen screen;
            std::string whole = readFile(screen->getDBTaskFilePath());
            writeFile(path + "-valid", whole, 0600);
            writeFile(path + "-cut", whole.substr(0, whole.size() / 2), 0600);
        }
        const std::function<void()> kinds[] = {
            [&] {},
            [&] { writeFile(path, std::string(10000, 'x'), 0600); },
            [&] { writeFile(path, "", 0600); },
            [&] { fs::copy_file(path + "-cut", path); },
            [&] { fs::create_symlink(path + "-valid", path); },
            [&] { fs::create_hard_link(path + "-valid", path); },
            [&] { fs::create_symlink(elsewhere, path); },
            [&] { EXPECT_EQ(mkfifo(path.c_str(), 0600), 0); },
            [&] { makeFolder(path); },
        };
        for (size_t i = 0; i < std::size(kinds); ++i) {
            SCOPED_TRACE(i);
            fs::remove_all(path);
            kinds[i]();
            OrvSearchDBTask task("/tmp", "alice", "hostile");
            unsigned long long count = 0;
            Rows rows;
            EXPECT_FALSE(task.queryResult(0, 10, nullptr, nullptr, nullptr, nullptr, addRow, &rows, &count));
            auto status = statusOf(elsewhere);
            EXPECT_FALSE(task.delRecs("photo", elsewhere));
            EXPECT_FALSE(task.updatePermRecs("photo", elsewhere, "x", "x", status));
            EXPECT_FALSE(task.insertFile("photo", elsewhere, "x", "x", status));
            EXPECT_TRUE(rows.empty());
            const auto log = takeLogTexts();
            ASSERT_EQ(log.size(), 4U);
            EXPECT_EQ(log[0], "orvelsearch:# Fail to Select the record from DB " + path);
        }
        EXPECT_EQ(readFile(elsewhere), "");
        unsigned long long count = 0;
        EXPECT_FALSE(made.queryResult(0, 0, nullptr, nullptr, nullptr, nullptr, addRow, nullptr, &count));
        EXPECT_FALSE(made.queryResult(0, 1, nullptr, nullptr, nullptr, nullptr, addRow, nullptr, nullptr));
        EXPECT_TRUE(takeLog().empty()) << "refused before the database is touched";
        for (const char* left : {"", "-valid", "-cut"}) fs::remove_all(path + left);
    });
}

}  // namespace
