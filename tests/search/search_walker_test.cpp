// Searches by walking and from the index: the same rows.
#include "search/indexed_folder.h"
#include "search/search_fixture.h"

using namespace FileSearch;

namespace {

const char* const kNames[] = {"a.txt", "report.TXT", "x*y.TXT", "q?z.md", ".JPG", "tar.tar.gz", "\xFF\xFE.bin"};
const char* const kFolders[] = {"", "/2012/deep/er", "/a*", "/a*b", "/a_", "/ab", "/50%", "/it's", "/Case", "/case"};
const off_t kSizes[] = {0, 9, 95, 100, 105, 5000};
const unsigned kOwners[] = {kAliceUid, kBobUid, 0, 54321, kBobUid};

class SearchWalkerTest : public SearchFixture {
 protected:
    // Every name in every folder of two shares and a home.
    static void makeTree() {
        unsigned n = 0;
        for (const std::string& top : {shareRoot("photo"), shareRoot("docs"), shareRoot("homes") + "/alice"}) {
            for (const char* folder : kFolders) {
                for (const char* name : kNames) {
                    ++n;
                    makeFile(top + folder + "/" + name, kSizes[n % std::size(kSizes)], kOwners[n % std::size(kOwners)],
                             n % 2 == 0 ? gid_t{kUsersGid} : 0, n * 1000, n * 777);
                }
            }
            EXPECT_EQ(symlink("2012", (top + "/link.d").c_str()), 0);
            EXPECT_EQ(mkfifo((top + "/pipe.txt").c_str(), 0600), 0);
            for (const char* out : {"/@tmp", "/#recycle/bin", "/2012/#recycle"}) makeFile(top + out + "/a.txt");
        }
        makeFile(shareRoot("homes") + "/bob/a.txt");
    }
};

// Every way to choose folders; what each criterion finds either way is tested where the program is asked.
std::vector<Query> queries() {
    const std::vector<Ask> names = {{0, nullptr, "a*,report,*.jpg,x\\*y"}};
    std::vector<Query> all = {{{"/photo", "/docs"}, {{3, nullptr, "root"}}},
                              {{"/home", "/photo/2012"}, {names[0], {8, "equal", "100"}}},
                              {{"/photo", "/photo/2012", "/photo/2012"}, names},
                              {{"/photo", "/docs"}, names, true},
                              {{"/homes"}, names}};
    for (const char* folder : {"/photo/a*", "/photo/a_", "/photo/50%", "/docs/it's", "/photo/Case", "/home/case"}) {
        all.push_back({{folder}, names});
        all.push_back({{folder, "/docs/ab"}, {{1, "file", nullptr}}, true});
    }
    // What no index holds, beside what it does.
    for (const char* folder :
         {"/photo/link.d/deep", "/photo/#recycle/bin", "/docs/@tmp", "/docs//2012/", "/docs/2012/../ab"})
        all.push_back({{"/photo/ab", folder}, names});
    return all;
}

TEST_F(SearchWalkerTest, WalkAndIndexAgree) {
    SKIP_WITHOUT_ROOT();
    inChild([&] {
        makeTree();
        const std::vector<Query> all = queries();
        std::vector<Found> walked;
        search("alice", all.front());  // folders read for the first time change their access times
        for (const Query& query : all) walked.push_back(search("alice", query));
        buildIndex({"photo", "docs", "homes"});
        for (size_t i = 0; i < all.size(); ++i) {
            EXPECT_EQ(search("alice", all[i]), walked[i]) << i;
            EXPECT_FALSE(walked[i].empty()) << i << ": what finds nothing proves little";
        }
        EXPECT_TRUE(takeLog().empty());
        EXPECT_GE(FILEIDXIndexDrop("docs"), 0);
        EXPECT_EQ(search("alice", all.front()), walked.front()) << "an index of one share alone";

        // The index cannot know that a file was read since.
        const std::string file = shareRoot("photo") + "/2012/deep/er/a.txt";
        const Query sinceNow{{"/photo/2012"}, {{7, "since", "2000000000"}, {1, "file", nullptr}}};
        EXPECT_EQ(search("alice", sinceNow).size(), 0U);
        const timespec times[] = {{2000000000, 0}, {0, UTIME_OMIT}};
        EXPECT_EQ(utimensat(AT_FDCWD, file.c_str(), times, 0), 0);
        EXPECT_EQ(keysOf(search("alice", sinceNow)), std::vector<std::string>{"photo/2012/deep/er/a.txt"});

        // What no indexer enters is walked.
        makeFile(shareRoot("photo") + "/2012/far/later");
        const Query far{{"/photo/2012/far"}, {{0, nullptr, "later"}}};
        EXPECT_EQ(search("alice", far).size(), 0U);
        addMount(shareRoot("photo") + "/2012", "nfs");
        EXPECT_EQ(keysOf(search("alice", far)), std::vector<std::string>{"photo/2012/far/later"});
    });
    PathInfo folder;
    folder.shareRoot = shareRoot("photo");
    for (const size_t length : {1000, 4100}) {
        folder.path = "/photo/" + std::string(length, 'n');
        folder.realPath = folder.shareRoot + folder.path.substr(6);
        EXPECT_EQ(orvel::indexHolds(folder), length == 1000) << "a path that a condition would cut is walked";
    }
}

TEST_F(SearchWalkerTest, RowsSayWhatTheFilesAre) {
    SKIP_WITHOUT_ROOT();
    inChild([&] {
        const std::string root = shareRoot("photo");
        makeFile(root + "/2012/.a.b.tar", 7, kAliceUid, kAdminGid, 1234567890);
        makeFile(root + "/noext", 5, 0, 54321);
        makeFolder(root + "/fo.lder", 0710);
        chmod((root + "/noext").c_str(), 04641);
        const Found rows = search("alice", {{"/photo"}, {{0, nullptr, "*"}}});
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

TEST_F(SearchWalkerTest, NobodySeesMoreThanAWalkWouldShow) {
    SKIP_WITHOUT_ROOT();
    const auto folder = [&](const char* path, mode_t mode) {
        makeFile(photo_ + path + "/f.txt");
        EXPECT_EQ(chown((photo_ + path).c_str(), kAliceUid, kUsersGid), 0);
        return std::make_pair(photo_ + path, mode);
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
    inChild([&] { buildIndex({"photo", "homes"}); });
    for (const auto& [path, mode] : folders) chmod(path.c_str(), mode);
    fs::rename(photo_ + "/swapped", photo_ + "/open/elsewhere");
    ASSERT_EQ(symlink("open/elsewhere", (photo_ + "/swapped").c_str()), 0);

    const std::vector<Ask> files = {{0, nullptr, "f.txt"}};
    using Texts = std::vector<std::string>;
    const Rows<const char*, Texts, Texts> cases = rowsOf<const char*, Texts, Texts>("search/visible_files");
    for (const bool indexed : {true, false}) {
        for (const auto& [user, chosen, visible] : cases) {
            SCOPED_TRACE(std::string(indexed ? "index " : "walk ") + user + chosen.back());
            inChild([&, user = user, folders = chosen, visible = visible] {
                Texts seen = visible;
                // As a request of this user: real ids root's, effective ones the user's.
                EXPECT_EQ(OrvLibUGIDSet(nullptr, user), 0);
                // What the index does not know: a folder that came after it was built.
                if (!indexed && folders.front() == "/photo") seen.insert(seen.begin(), "photo/open/elsewhere/f.txt");
                EXPECT_EQ(keysOf(search(user, {folders, files})), seen);
                EXPECT_EQ(vexo::gate::calls("FILEIDXResultGetAndTableGen"), indexed ? 1 : 0);
                EXPECT_EQ(geteuid() == 0, user == std::string("carol"));
            });
        }
        inChild([&] {
            EXPECT_EQ(OrvLibUGIDSet(nullptr, "bob"), 0);
            EXPECT_FALSE(search("carol", {{"/photo"}, files}).contains("photo/closed/f.txt"))
                << "an administrator's name opens nothing";
        });
        for (const char* share : {"photo", "homes"}) EXPECT_GE(FILEIDXIndexDrop(share), 0);
    }
}

}  // namespace
