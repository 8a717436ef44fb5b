// Searches by walking and from the index: the same rows, and those that the criteria mean.
#include "orvel/search_walker.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <ctime>
#include <filesystem>
#include <set>
#include <string>

#include "fault_gate.h"
#include "orvel/identity.h"
#include "search/search_fixture.h"
#include "support/log_texts.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"
#include "vexo/share.h"

using namespace FileSearch;
using namespace support;
namespace fs = std::filesystem;

namespace {

const char* const kNames[] = {"a.txt",  "report.TXT",           "a_b%.txt",        "x*y.TXT",
                              "q?z.md", "quo'te.jpg",           ".hidden",         "noext",
                              "end.",   "\xC3\x84\xC3\x96.JPG", "back\\slash.doc", "tar.tar.gz",
                              ".JPG",   "\xFF\xFE.bin",         "new\nline.log",   "My Report 7.doc"};
const char* const kFolders[] = {"",    "/2012", "/2012/deep", "/2012/deep/er", "/a*",   "/a*b",    "/a_",
                                "/ab", "/50%",  "/it's",      "/Case",         "/case", "/dot.dir"};
const off_t kSizes[] = {0, 1, 9, 10, 94, 95, 100, 104, 105, 5000, off_t{1} << 33};
const unsigned kOwners[] = {kAliceUid, kBobUid, 0, 54321};
const unsigned kGroups[] = {kUsersGid, kAdminGid, 0, 54321, kUsersGid};

// What a criterion means, told by asking the objects about every file of a folder.
class Model {
 public:
    Model(const Query& query, const std::function<std::string(const std::string&)>& rootOf)
        : query_(query), criteria_(query.asks) {
        for (const std::string& folder : query.folders) {
            const size_t end = std::min(folder.find('/', 1), folder.size());
            std::string share = folder.substr(1, end - 1), within = folder.substr(end);
            if (within.size() > 1 && within.back() == '/') within.pop_back();
            if (share == "home") share = "homes", within = "/alice" + within;
            visit(share, rootOf(share) + within, within.empty() ? "" : within.substr(1) + "/", true);
        }
    }
    [[nodiscard]] std::vector<std::string> keys() const { return {keys_.begin(), keys_.end()}; }

 private:
    void visit(const std::string& share, const std::string& real, const std::string& within, bool top) {
        for (const auto& entry : fs::directory_iterator(real)) {
            const std::string name = entry.path().filename();
            if (VEXOEAIsHiddenFile(name.c_str()) == 1) continue;
            if (top && VEXOShareIsShareRecycle(entry.path().c_str()) == 1) continue;
            _tag_VEXOSTAT_ status{};
            EXPECT_EQ(VLIBCFileLStat(entry.path().c_str(), 9, &status), 0);
            const bool folder = S_ISDIR(status.st_mode);
            const bool matches = std::all_of(criteria_.all.begin(), criteria_.all.end(),
                                             [&](FindComp* one) { return (*one)(entry.path().c_str(), status); });
            if ((folder || S_ISREG(status.st_mode)) && matches) keys_.insert(share + "/" + within + name);
            if (folder && !query_.currentOnly) visit(share, entry.path(), within + name + "/", false);
        }
    }

    const Query& query_;
    Criteria criteria_;
    std::set<std::string> keys_;
};

class SearchWalkerTest : public SearchFixture {
 protected:
    // Every name in every folder of two shares and a home, no two files alike.
    static void makeTree() {
        unsigned n = 0;
        for (const std::string& top : {shareRoot("photo"), shareRoot("docs"), shareRoot("homes") + "/alice"}) {
            for (const char* folder : kFolders) {
                makeFolder(top + folder);
                for (const char* name : kNames) {
                    ++n;
                    makeFile(top + folder + "/" + name, kSizes[n % std::size(kSizes)], kOwners[n % std::size(kOwners)],
                             kGroups[n % std::size(kGroups)], n * 1000, n * 777);
                }
            }
            EXPECT_EQ(symlink("2012", (top + "/link.txt").c_str()), 0);
            EXPECT_EQ(mkfifo((top + "/pipe.txt").c_str(), 0600), 0);
            EXPECT_EQ(symlink("2012", (top + "/link.d").c_str()), 0);
            for (const char* out : {"/@tmp", "/@vexoea", "/#recycle/bin"}) makeFile(top + out + "/a.txt");
            makeFile(top + "/2012/#recycle/a.txt");
        }
        makeFile(shareRoot("homes") + "/bob/a.txt");
    }
};

// Each kind of criterion, the name list with every other one, owner and size, and every way to choose folders.
std::vector<Query> queries() {
    static const std::string soon = std::to_string(time(nullptr) + 1000);
    const std::vector<Ask> singles = {
        {0, nullptr, "report"},   {0, nullptr, "*.txt"},   {0, nullptr, "?_*, \"x\\*y\" ,q\\?z"},
        {0, nullptr, "\xC3\xA4"}, {1, "dir", nullptr},     {1, "file", nullptr},
        {2, nullptr, "jpg,TXT"},  {2, nullptr, "gz"},      {3, nullptr, "alice"},
        {3, nullptr, "root"},     {4, nullptr, "users"},   {4, nullptr, "administrators"},
        {5, "before", "300000"},  {5, "after", "300000"},  {6, "before", soon.c_str()},
        {6, "x", soon.c_str()},   {7, "before", "200000"}, {7, "since", "200000"},
        {8, "equal", "100"},      {8, "less", "10"},       {8, "more", "4294967296"},
        {8, "equal", "0"},
    };
    const Ask names{0, nullptr, "a*,report,*.jpg,new"};
    const std::vector<std::string> both = {"/photo", "/docs"};
    std::vector<Query> all;
    for (const Ask& one : singles) {
        all.push_back({both, {one}});
        if (one.field != 0) all.push_back({{"/home", "/photo/2012"}, {names, one}});
        if (one.field == 8) all.push_back({both, {{3, nullptr, "bob"}, one}});
    }
    all.push_back(
        {both, {names, {1, "file", nullptr}, {3, nullptr, "alice"}, {4, nullptr, "users"}, {8, "less", "200"}}});
    for (const char* folder : {"/photo/a*", "/photo/a_", "/photo/50%", "/docs/it's", "/photo/Case", "/home/dot.dir"}) {
        all.push_back({{folder}, {names}});
        all.push_back({{folder, "/docs/2012"}, {{1, "file", nullptr}}, true});
    }
    all.push_back({{"/photo", "/photo/2012", "/photo/2012"}, {names}});
    all.push_back({both, {names}, true});
    all.push_back({{"/home"}, {{1, "dir", nullptr}}, true});
    all.push_back({{"/homes"}, {names}});
    // What no index holds, beside what it does.
    for (const char* folder :
         {"/photo/link.d/deep", "/photo/#recycle/bin", "/docs/@tmp", "/docs//2012/", "/docs/2012/../ab"}) {
        all.push_back({{"/photo/ab", folder}, {names}});
    }
    return all;
}

TEST_F(SearchWalkerTest, WalkIndexAndModelAgree) {
    SKIP_WITHOUT_ROOT();
    inOwnProcess([&] {
        makeTree();
        const std::vector<Query> all = queries();
        std::vector<Rows> walked;
        search("alice", all.front());  // folders read for the first time change their access times
        for (const Query& query : all) walked.push_back(search("alice", query));
        vexo::gate::reset();
        buildIndex({"photo", "docs", "homes"});
        size_t found = 0, empty = 0;
        for (size_t i = 0; i < all.size(); ++i) {
            SCOPED_TRACE("query " + std::to_string(i));
            EXPECT_EQ(keysOf(walked[i]), Model(all[i], shareRoot).keys());
            EXPECT_EQ(search("alice", all[i]), walked[i]);
            found += walked[i].size();
            empty += walked[i].empty() ? 1 : 0;
        }
        EXPECT_GT(all.size(), 50U);
        EXPECT_GT(found, 4000U);
        EXPECT_LE(empty, 3U) << "queries that find nothing prove little";
        EXPECT_TRUE(takeLog().empty());

        // An index of one share alone.
        EXPECT_GE(FILEIDXIndexDrop("docs"), 0);
        EXPECT_EQ(search("alice", all.front()), walked.front());

        // The index cannot know that a file was read since.
        const std::string file = shareRoot("photo") + "/2012/a.txt";
        const Query sinceNow{{"/photo/2012"}, {{7, "since", "2000000000"}, {1, "file", nullptr}}};
        EXPECT_EQ(search("alice", sinceNow).size(), 0U);
        const timespec times[] = {{2000000000, 0}, {0, UTIME_OMIT}};
        EXPECT_EQ(utimensat(AT_FDCWD, file.c_str(), times, 0), 0);
        EXPECT_EQ(keysOf(search("alice", sinceNow)), std::vector<std::string>{"photo/2012/a.txt"});

        // What no indexer enters is walked.
        makeFile(shareRoot("photo") + "/2012/far/later");
        const Query far{{"/photo/2012/far"}, {{0, nullptr, "later"}}};
        EXPECT_EQ(search("alice", far).size(), 0U);
        addMount(shareRoot("photo") + "/2012", "nfs");
        EXPECT_EQ(keysOf(search("alice", far)), std::vector<std::string>{"photo/2012/far/later"});
    });
}

TEST_F(SearchWalkerTest, RowsSayWhatTheFilesAre) {
    SKIP_WITHOUT_ROOT();
    inOwnProcess([&] {
        const std::string root = shareRoot("photo");
        makeFile(root + "/2012/.a.b.tar", 7, kAliceUid, kAdminGid, 1234567890);
        makeFile(root + "/noext", 5, 0, 54321);
        makeFolder(root + "/fo.lder", 0710);
        chmod((root + "/noext").c_str(), 04641);
        const Rows rows = search("alice", {{"/photo"}, {{0, nullptr, "*"}}});
        ASSERT_EQ(rows.size(), 4U);
        const auto begins = [&](const char* key, const std::string& text) {
            EXPECT_EQ(rows.at(key).substr(0, text.size()), text);
        };
        begins("photo/2012/.a.b.tar", root + "|.a.b.tar|2012|TAR|rw-r--r--|alice|administrators|0|7|");
        begins("photo/noext", root + "|noext|||rw-r----x|0|54321|0|5|");
        begins("photo/fo.lder", root + "|fo.lder||LDER|rwx--x---|0|0|1|0|");
        EXPECT_NE(rows.at("photo/noext").find("|" + std::to_string(S_IFREG | 04641) + "|0|54321|"), std::string::npos);
    });
}

// As a request of this user: real ids root's, effective ones the user's.
void asRequestOf(const char* user, const std::function<void()>& body) {
    inOwnProcess([&] {
        EXPECT_EQ(OrvLibUGIDSet(nullptr, user), 0);
        body();
    });
}

TEST_F(SearchWalkerTest, NobodySeesMoreThanAWalkWouldShow) {
    SKIP_WITHOUT_ROOT();
    const std::string root = shareRoot("photo");
    const auto folder = [&](const char* path, mode_t mode) {
        makeFile(root + path + "/f.txt");
        EXPECT_EQ(chown((root + path).c_str(), kAliceUid, kUsersGid), 0);
        return std::make_pair(root + path, mode);
    };
    const std::pair<std::string, mode_t> folders[] = {
        folder("/open", 0755),           folder("/closed", 0700),           folder("/closed/below", 0777),
        folder("/unreadable", 0711),     folder("/unreadable/below", 0755), folder("/unsearchable", 0744),
        folder("/unsearchable/b", 0755), folder("/open/groupless", 0705),   folder("/swapped", 0755),
    };
    makeFile(shareRoot("homes") + "/alice/f.txt");
    makeFile(shareRoot("homes") + "/bob/f.txt");
    chmod((shareRoot("homes") + "/alice").c_str(), 0700);
    EXPECT_EQ(chown((shareRoot("homes") + "/bob").c_str(), kBobUid, kUsersGid), 0);
    inOwnProcess([&] { buildIndex({"photo", "homes"}); });
    for (const auto& [path, mode] : folders) chmod(path.c_str(), mode);
    fs::rename(root + "/swapped", root + "/open/elsewhere");
    ASSERT_EQ(symlink("open/elsewhere", (root + "/swapped").c_str()), 0);

    const std::vector<Ask> files = {{0, nullptr, "f.txt"}};
    struct Case {
        const char* user;
        std::vector<std::string> folders, seen;
    };
    const Case cases[] = {
        {"bob", {"/photo"}, {"photo/open/f.txt"}},
        {"bob", {"/photo", "/photo/unreadable/below"}, {"photo/open/f.txt", "photo/unreadable/below/f.txt"}},
        {"bob", {"/photo/unreadable/below"}, {"photo/unreadable/below/f.txt"}},
        {"bob", {"/home"}, {"homes/bob/f.txt"}},
        {"bob", {"/homes"}, {"homes/bob/f.txt"}},
        {"carol",
         {"/photo/closed", "/photo/unsearchable"},
         {"photo/closed/below/f.txt", "photo/closed/f.txt", "photo/unsearchable/b/f.txt", "photo/unsearchable/f.txt"}},
    };
    for (const bool indexed : {true, false}) {
        for (const Case& test : cases) {
            SCOPED_TRACE(std::string(indexed ? "index " : "walk ") + test.user + test.folders.back());
            asRequestOf(test.user, [&] {
                auto seen = test.seen;
                // What the index does not know: a folder that came after it was built.
                if (!indexed && test.folders.front() == "/photo")
                    seen.insert(seen.begin(), "photo/open/elsewhere/f.txt");
                EXPECT_EQ(keysOf(search(test.user, {test.folders, files})), seen);
                EXPECT_EQ(vexo::gate::calls("FILEIDXResultGetAndTableGen"), indexed ? 1 : 0);
                EXPECT_EQ(geteuid() == 0, test.user == std::string("carol"));
            });
        }
        for (const char* share : {"photo", "homes"}) EXPECT_GE(FILEIDXIndexDrop(share), 0);
    }
}

}  // namespace
