// Results that stay true: updates after file operations, and pages of them.
#include "search/search_fixture.h"

using namespace FileSearch;

namespace {

_tag_VEXOSTAT_ recordOf(const std::string& path) {
    _tag_VEXOSTAT_ status{};
    EXPECT_EQ(VLIBCFileLStat(path.c_str(), 9, &status), 0) << path;
    return status;
}

class SearchUpdateTest : public SearchFixture {
 protected:
    // What a file operation does to the disk and tells the results about it. Folders above have new times then.
    void move(const std::string& fromShare, const std::string& from, const std::string& toShare,
              const std::string& to) {
        fs::rename(from, to);
        // To another file system it is a copy, with a status of its own.
        std::error_code isFile;
        for (const auto& entry : fs::recursive_directory_iterator(to, isFile)) {
            if (!entry.is_regular_file()) continue;
            EXPECT_EQ(chown(entry.path().c_str(), kAliceUid, kUsersGid) + chmod(entry.path().c_str(), 0640), 0);
        }
        auto status = recordOf(to);
        EXPECT_TRUE(screen_->updateFile(fromShare, from, toShare, to, status));
        EXPECT_TRUE(screen_->updateFileInFolder(fromShare, from + "//", toShare, to + "/"));
        refresh(fromShare, fs::path(from).parent_path());
        refresh(toShare, fs::path(to).parent_path());
    }
    void remove(const std::string& share, const std::string& path) {
        fs::remove_all(path);
        EXPECT_TRUE(screen_->delRecs(share, path));
        refresh(share, fs::path(path).parent_path());
    }
    void refresh(const std::string& share, const std::string& path, const char* user = nullptr,
                 const char* group = nullptr) {
        if (path == shareRoot("photo") || path == shareRoot("docs")) return;
        auto status = recordOf(path);
        EXPECT_TRUE(screen_->updatePermRecs(share, path, user, group, status));
    }
    void insert(const std::string& share, const std::string& path, const char* owner, const char* group) {
        auto status = recordOf(path);
        EXPECT_TRUE(screen_->insertFile(share, path, owner, group, status));
        refresh(share, fs::path(path).parent_path());
    }
    void expectTruth(const char* when) {
        EXPECT_EQ(rowsOf(*screen_), search("alice", kEverything)) << when;
        EXPECT_TRUE(takeLog().empty());
    }
    // A search whose results stay on screen.
    void onScreen(const std::function<void()>& body) {
        inChild([&] {
            const Criteria criteria(kEverything.asks);
            OneSearch run("alice", kEverything.folders, criteria.all);
            EXPECT_TRUE(run.walker.Walk({}));
            screen_ = &run.task;
            body();
        });
    }

    const Query kEverything{{"/photo", "/docs", "/home"}, {{0, nullptr, "*"}}};
    OrvSearchDBTask* screen_ = nullptr;
};

TEST_F(SearchUpdateTest, AfterEachOperationTheResultsAreThoseOfANewSearch) {
    SKIP_WITHOUT_ROOT();
    const std::string photo = shareRoot("photo"), docs = shareRoot("docs"), home = shareRoot("homes") + "/alice";
    // Names that a pattern would take for each other.
    for (const char* name : {"d", "d_", "dx", "d%", "d*", "d?", "d\\", "d'", "d\"", "D", "d [1]", "\xFF"}) {
        for (const char* below : {"/f.txt", "/f_.txt", "/f%.txt", "/sub/f'.txt"})
            makeFile(photo + "/" + name + below, 3, kBobUid, kUsersGid, 1000);
    }
    for (int i = 0; i < 1000; ++i) makeFile(photo + "/many/" + std::to_string(i % 10) + "/" + std::to_string(i));
    makeFile(home + "/below/mine.txt");
    makeFile(docs + "/d/target.txt", 99);
    onScreen([&] {
        expectTruth("at first");
        for (const char* name : {"d_", "d*", "d%", "d?/f_.txt"}) {
            remove("photo", photo + "/" + name);
            expectTruth(name);
        }
        for (const char* name : {"d\\", "d'", "d\"", "\xFF", "d"}) {
            move("photo", photo + "/" + name, "photo", photo + "/new_" + name + "%.d");
            expectTruth(name);
        }
        move("photo", photo + "/many", "docs", docs + "/many.moved");
        expectTruth("1,000 moved to another share");
        move("docs", docs + "/many.moved/7", "home", home + "/below/seven");
        move("home", home + "/below/seven/177", "docs", docs + "/d/target.txt");
        expectTruth("moved over a file that was there");

        const std::string changed = photo + "/dx/f.txt";
        EXPECT_TRUE(chmod(changed.c_str(), 0640) == 0 && chown(changed.c_str(), kAliceUid, kAdminGid) == 0);
        refresh("photo", changed, "alice", "administrators");
        expectTruth("permissions changed");
        EXPECT_EQ(chown(changed.c_str(), 0, 0), 0);
        refresh("photo", changed, "root", "");
        expectTruth("root's now");

        makeFile(photo + "/dx/new.txt", 5, kBobUid, kUsersGid);
        insert("photo", photo + "/dx/new.txt", "bob", "users");
        insert("photo", photo + "/dx/new.txt", "eve", "eve");  // there already
        makeFile(home + "/below/new", 5);
        insert("home", home + "/below/new", "", "root");
        expectTruth("files added");

        makeFile(photo + "/late/f");
        const Found before = rowsOf(*screen_);
        move("photo", photo + "/late", "photo", photo + "/later");
        EXPECT_TRUE(screen_->delRecs("docs", photo + "/dx")) << "another share";
        EXPECT_EQ(rowsOf(*screen_), before) << "what is not among the results stays out of them";
    });
}

TEST_F(SearchUpdateTest, BadPathsAndFailingDatabases) {
    SKIP_WITHOUT_ROOT();
    makeFile(shareRoot("photo") + "/d/f");
    onScreen([&] {
        const Found before = rowsOf(*screen_);
        auto status = recordOf(shareRoot("photo") + "/d/f");
        const std::string good = shareRoot("photo") + "/d", tooLong = "/tmp/photo/" + std::string(5000, 'x');
        struct Operation {
            std::function<bool(const std::string&)> call;
            std::vector<std::pair<const char*, const char*>> faults;  // of which platform call, and what is logged
        };
        const std::pair<const char*, const char*> select{"FILEIDXDBSelect", "select data from"};
        const std::pair<const char*, const char*> update{"FILEIDXDBUpdate", "update data in"};
        const Operation operations[] = {
            {[&](const auto& path) { return screen_->delRecs("home", path); }, {{"FILEIDXDBDel", "delete data in"}}},
            {[&](const auto& path) { return screen_->updatePermRecs("home", path, "", "", status); }, {update}},
            {[&](const auto& path) { return screen_->insertFile("home", path, "", "", status); },
             {select, {"FILEIDXDBInsert", "insert data in"}}},
            {[&](const auto& path) { return screen_->updateFile("photo", good, "home", path, status); }, {update}},
            {[&](const auto& path) { return screen_->updateFileInFolder("photo", path, "home", good); },
             {select, update}},
        };
        for (const Operation& operation : operations) {
            SCOPED_TRACE(operation.faults[0].second);
            vexo::gate::reset();
            for (const auto& path : {std::string("/volume1"), std::string("/volume1/photo"), tooLong})
                EXPECT_FALSE(operation.call(path));
            const auto log = takeLogTexts();
            ASSERT_EQ(log.size(), 3U);
            EXPECT_EQ(log[0].find("orvelsearch:# Fail to find the share name "), 0U) << log[0];
            EXPECT_EQ(log[1], "orvelsearch:# Fail to find the path name /volume1/photo");
            for (const auto& [call, text] : operation.faults)
                EXPECT_EQ(vexo::gate::calls(call), 0) << "the database is not touched";
            for (const auto& [call, text] : operation.faults) {
                for (int nth = 1; nth == 1 || (nth == 2 && text[0] == 'd'); ++nth) {
                    vexo::gate::reset();
                    vexo::gate::fail(call, VEXO_ERR_NO_SPACE, ENOSPC, nth);
                    EXPECT_FALSE(operation.call(good));
                    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
                    EXPECT_EQ(takeLogText(),
                              std::string("orvelsearch:# Fail to ") + text + " DB " + screen_->getDBTaskFilePath());
                }
            }
        }
        vexo::gate::reset();
        EXPECT_EQ(rowsOf(*screen_), before);
    });
}

struct Page {
    std::function<std::string(const __tag_FI_FILE_INFO_DATA&)> column;
    std::vector<std::string> columns, shares;
};

BOOL addToPage(__tag_FI_FILE_INFO_DATA* record, void* page) {
    auto& [column, columns, shares] = *static_cast<Page*>(page);
    columns.push_back(column(*record));
    shares.emplace_back(record->szShare);
    return 1;
}

TEST_F(SearchUpdateTest, PagesInEveryOrder) {
    SKIP_WITHOUT_ROOT();
    const unsigned owners[] = {kAliceUid, kBobUid, 0, 7777777};
    for (unsigned i = 0; i < 60; ++i) {
        const std::string path = shareRoot(i % 2 == 0 ? "photo" : "docs") + "/f" + std::to_string(i % 3) + "/" +
                                 static_cast<char>('a' + i * 7 % 26) + std::to_string(i) + "." + std::to_string(i % 5);
        makeFile(path, i * 37 % 60, owners[i % 4], owners[i % 3], i * 41 % 60, i * 43 % 60);
        chmod(path.c_str(), 0600 | (i * 8 % 64));
    }
    using Data = __tag_FI_FILE_INFO_DATA;
    const auto text = [](const char* const Data::*member) {
        return [=](const Data& record) { return std::string(record.*member); };
    };
    const auto number = [](int64_t Data::*member) {
        return [=](const Data& record) {
            return std::to_string((uint64_t{1} << 62) + static_cast<uint64_t>(record.*member));
        };
    };
    onScreen([&] {
        unsigned long long count = 0;
        using Column = std::function<std::string(const Data&)>;
        for (const auto& [word, column] : Rows<std::string, Column>{
                 row("name", Column(text(&Data::szName))), row("any other word", Column(text(&Data::szName))),
                 row("size", Column(number(&Data::size))), row("mtime", Column(number(&Data::modified))),
                 row("crtime", Column(number(&Data::created))), row("ctime", Column(number(&Data::changed))),
                 row("atime", Column(number(&Data::accessed))), row("user", Column(text(&Data::szOwner))),
                 row("group", Column(text(&Data::szGroup))), row("posix", Column(text(&Data::szPermission))),
                 row("type", Column(text(&Data::szExtension))), row("ppath", Column(text(&Data::szParent)))}) {
            for (const bool ascending : {true, false}) {
                SCOPED_TRACE(word + (ascending ? " ascending" : " descending"));
                Page page{column, {}, {}};
                for (const unsigned long offset : {0, 30, 60})
                    EXPECT_TRUE(screen_->queryResult(offset, 30, word.c_str(), &ascending, nullptr, "", addToPage,
                                                     &page, &count));
                auto sorted = page.columns;
                std::sort(sorted.begin(), sorted.end());
                if (!ascending) std::reverse(sorted.begin(), sorted.end());
                EXPECT_EQ(page.columns, sorted);
                EXPECT_EQ(sorted.size(), 66U);
                for (size_t i = 1; word == "ppath" && i < 66; ++i) {  // shares the other way round
                    if (page.columns[i] != page.columns[i - 1]) continue;
                    EXPECT_LE(page.shares[ascending ? i : i - 1], page.shares[ascending ? i - 1 : i]);
                }
            }
        }
        // Without a word or a direction: by name, ascending.
        const bool descending = false;
        for (const bool withWord : {true, false}) {
            Page page{text(&Data::szName), {}, {}};
            EXPECT_TRUE(screen_->queryResult(0, 99, withWord ? "size" : nullptr, withWord ? nullptr : &descending,
                                             nullptr, nullptr, addToPage, &page, &count));
            EXPECT_TRUE(page.columns.size() == 66 && std::is_sorted(page.columns.begin(), page.columns.end()));
        }
        vexo::gate::reset();
        const auto query = [&](unsigned long limit, unsigned long long* out) {
            return screen_->queryResult(0, limit, nullptr, nullptr, nullptr, nullptr, addToPage, nullptr, out);
        };
        EXPECT_FALSE(query(0, &count) || query(1, nullptr));
        EXPECT_EQ(vexo::gate::calls("*"), 0) << "refused before the database is touched";
        for (const auto& [call, log] : Rows<const char*, const char*>{{"FILEIDXCountGet", "Select the record from"},
                                                                      {"FILEIDXDBSelect", "select data from"}}) {
            vexo::gate::fail(call, VEXO_ERR_GENERAL, EIO);
            EXPECT_FALSE(query(1, &count));
            EXPECT_EQ(takeLogText(),
                      std::string("orvelsearch:# Fail to ") + log + " DB " + screen_->getDBTaskFilePath());
            vexo::gate::reset();
        }
    });
}

}  // namespace
