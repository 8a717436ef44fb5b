// A place is opened once: whoever puts something else in its place afterwards shows nothing that is not meant to be
// seen.
//
// ORVEL_RACE_SECONDS: how long each race lasts, 200 rounds without it.
#include <linux/fs.h>

#include <iostream>

#include "chosen_folders.h"
#include "confined.h"
#include "criteria.h"
#include "link_making.h"
#include "listing.h"
#include "orvel/identity.h"
#include "orvel/search_criteria.h"
#include "orvel/search_task.h"
#include "orvel/search_walker.h"
#include "share/place.h"
#include "support/testing.h"
#include "temporary_folder.h"

using namespace orvel::cgi;

namespace {

class Places : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        SKIP_WITHOUT_ROOT();
        for (const char* path : {"/shared/sub/one.txt", "/shared/one.txt", "/beside/secret.txt"})
            writeFile(photo_ + path, "x");
        for (const char* path : {"", "/shared", "/shared/sub", "/shared/one.txt", "/beside", "/beside/secret.txt"})
            EXPECT_EQ(chown((photo_ + path).c_str(), kAliceUid, kUsersGid), 0);
    }
    // As a request of alice, in a process of its own.
    static void asAlice(const std::function<void()>& body) {
        inChild([&] {
            EXPECT_EQ(OrvLibUGIDSet(nullptr, "alice"), 0);
            body();
            takeLog();
        });
    }
    static ListRequest request(const std::string& path) {
        return {
            .user = "alice", .sid = "", .path = path, .sortBy = "", .additional = ADDITIONAL_REAL_PATH, .pattern = ""};
    }
    static std::string namesIn(const Listing& listing) {
        std::string names;
        for (const DIRENTRY_INFO& entry : listing.entries) names += entry.name + " ";
        return names;
    }
    static void exchange(const std::string& a, const std::string& b) {
        syscall(SYS_renameat2, AT_FDCWD, a.c_str(), AT_FDCWD, b.c_str(), RENAME_EXCHANGE);
    }
};

TEST_F(Places, WhatIsOpenIsListed) {
    asAlice([&] {
        Place place;
        ASSERT_EQ(findPlace("alice", "/photo/shared", "sub", place), 0);
        fs::rename(photo_ + "/shared/sub", photo_ + "/moved");
        fs::create_symlink("../beside", photo_ + "/shared/sub");
        Listing listing;
        EXPECT_EQ(listOpened(request(place.path), place.found, place.path, place.realPath, listing), 0);
        EXPECT_EQ(namesIn(listing), "one.txt ");
        EXPECT_EQ(listing.entries.front().realPath, photo_ + "/shared/sub/one.txt") << "the path that was opened";
        ASSERT_EQ(findPlace("alice", "/photo/shared", "one.txt", place), 0);
        EXPECT_EQ(listOpened(request(place.path), place.found, place.path, place.realPath, listing), 408);
    });
    addMount(photo_ + "/shared", "nfs");
    asAlice([&] {
        EXPECT_TRUE(refuseCalls({{SYS_fchdir, EHOSTDOWN}, {SYS_chdir, EHOSTDOWN}}));
        Listing listing;
        EXPECT_EQ(listFolder(request("/photo/shared"), listing), 410) << "a server that does not answer";
    });
}

// A visitor reaches what was published, whatever took a place in its path since.
TEST_F(Places, ALinkIsToWhatWasPublished) {
    makeFolder(systemRoot() + "/usr/vexo/etc/pexlander");
    fs::create_symlink("shared", photo_ + "/pub");
    fs::create_symlink("one.txt", photo_ + "/shared/file");
    for (const auto& [path, published] : Rows<std::string, std::string>{
             row("/photo/pub", "/photo/shared"), row("/photo/shared/sub/..", "/photo/shared"),
             row("/photo/pub/./file/", "/photo/shared/one.txt"), row("/photo/shared/..", "/photo")})
        inChild([&, asked = path, expected = published] {
            Link link;
            EXPECT_EQ(makeLink({.user = "alice", .sid = "", .path = asked, .terms = {}}, link), 0) << asked;
            EXPECT_EQ(link.path, expected);
            takeLog();
        });
    asAlice([&] {
        Place place;
        // Those made before paths were resolved still get a name that leads nowhere.
        ASSERT_EQ(findPlace("alice", "/photo/shared/sub/..", "", place), 0);
        EXPECT_EQ(place.name + place.path, "shared/photo/shared");
        ASSERT_EQ(findPlace("alice", "/photo/shared/.", "sub", place), 0);
        EXPECT_EQ(place.name + place.path, "sub/photo/shared/sub");
        fs::rename(photo_ + "/shared", photo_ + "/was");
        fs::create_symlink("beside", photo_ + "/shared");
        EXPECT_EQ(findPlace("alice", "/photo/shared", "", place), 407);
        EXPECT_EQ(findPlace("alice", "/photo/shared", "secret.txt", place), 407);
    });
}

// Both folders are everybody's: nothing in them is trusted but what is ours, and nobody takes that away.
TEST_F(Places, TheTemporaryFolder) {
    const std::string volume = shareRoot("photo") + "/volume", outer = volume + "/@tmp", inner = outer + "/orvel";
    const std::string own = inner + "/upload-" + std::to_string(kAliceUid);
    const auto makeOf = [](const std::string& path, uid_t uid, mode_t mode) {
        makeFolder(path, mode);
        EXPECT_EQ(lchown(path.c_str(), uid, kUsersGid), 0);
    };
    const auto squat = [&](const std::string& path) { makeOf(path, kBobUid, 0777); };
    for (const auto& [what, opens, prepare] : Rows<const char*, bool, std::function<void()>>{
             {"nothing", true, [] {}},
             {"without the sticky bit", true, [&] { makeFolder(inner, 0777), chmod(outer.c_str(), 0777); }},
             {"a link at orvel", true, [&] { makeFolder(outer, 0777), fs::create_symlink("/tmp", inner); }},
             {"another's orvel", true, [&] { makeFolder(outer, 0777), squat(inner); }},
             {"a file at orvel", true, [&] { makeFolder(outer, 0777), writeFile(inner, ""); }},
             {"another's upload folder", true, [&] { makeFolder(inner, 01777), squat(own); }},
             {"a link at the upload folder", true, [&] { makeFolder(inner, 01777), fs::create_symlink("/tmp", own); }},
             {"an upload folder that others enter", true, [&] { makeOf(own, kAliceUid, 0755); }},
             {"another's @tmp", false, [&] { squat(outer); }},
             {"a file at @tmp", false, [&] { writeFile(outer, ""); }},
         }) {
        SCOPED_TRACE(what);
        makeFolder(volume, 0755);
        const mode_t mask = umask(0);
        prepare();
        umask(mask);
        asAlice([&, expected = opens] {
            const orvel::Descriptor temporary = openTemporaryFolder(volume);
            EXPECT_EQ(static_cast<bool>(temporary), expected);
            if (!temporary) return;
            const orvel::Descriptor folder = openOwnFolder(temporary, fs::path(own).filename());
            ASSERT_TRUE(folder) << strerror(errno);
            EXPECT_EQ(orvel::realPathOf(folder), own);
            for (const auto& [path, mode, uid] :
                 Rows<std::string, mode_t, uid_t>{{outer, 01777, 0}, {inner, 01777, 0}, {own, 0700, kAliceUid}}) {
                const struct stat status = statusOf(path);
                EXPECT_TRUE((status.st_mode & 07777) == mode && status.st_uid == uid) << path;
            }
        });
        fs::remove_all(volume);
    }
}

TEST_F(Places, TheTemporaryFolderBesideAnotherUser) {
    const std::string volume = shareRoot("photo") + "/volume", inner = volume + "/@tmp/orvel";
    const std::string own = inner + "/upload-" + std::to_string(kAliceUid), target = photo_ + "/bobs";
    makeFolder(target, 0777);
    makeFolder(volume, 0755);
    const Rival bob(
        [&] {
            rename(own.c_str(), (own + "-mine").c_str());
            rename(inner.c_str(), (inner + "-mine").c_str());
            if (symlink(target.c_str(), own.c_str()) == 0) unlink(own.c_str());
            if (symlink(target.c_str(), inner.c_str()) == 0) unlink(inner.c_str());
            if (::mkdir(own.c_str(), 0777) == 0) rmdir(own.c_str());
        },
        kBobUid);
    asAlice([&] {
        long refusals = 0, leaks = 0;
        const long rounds = race([&] {
            const orvel::Descriptor temporary = openTemporaryFolder(volume);
            const orvel::Descriptor folder =
                temporary ? openOwnFolder(temporary, fs::path(own).filename()) : orvel::Descriptor();
            const orvel::Descriptor file(
                folder ? openat(folder.get(), "f", O_CREAT | O_EXCL | O_WRONLY | O_CLOEXEC, 0600) : -1);
            refusals += file ? 0 : 1;
            leaks += access((target + "/f").c_str(), F_OK) == 0 || (file && orvel::realPathOf(file) != own + "/f");
            if (seteuid(0) != 0) return;
            for (std::error_code failed; fs::exists(volume, failed);) fs::remove_all(volume, failed);
            makeFolder(volume, 0755);
            EXPECT_EQ(seteuid(kAliceUid), 0);
        });
        EXPECT_EQ(std::to_string(refusals) + " " + std::to_string(leaks), "0 0") << "of " << rounds;
        std::cout << rounds << " openings of the temporary folder\n";
    });
}

// A sub-folder changes places with a link beside it; what the link leads to is the owner's, but not published.
TEST_F(Places, NothingIsSeenBesideAnExchange) {
    fs::create_symlink("../beside", photo_ + "/link");
    addShare("shut", "read only = no\nvalid users = alice, bob\ninvalid users = alice\n");
    writeFile(shareRoot("shut") + "/secret.txt", "x");
    fs::create_symlink(shareRoot("shut"), photo_ + "/out");
    makeFolder(photo_ + "/dir");
    writeFile(photo_ + "/dir/one.txt", "x");
    const Rival rival([&] {
        exchange(photo_ + "/shared/sub", photo_ + "/link");
        exchange(photo_ + "/dir", photo_ + "/out");
    });
    asAlice([&] {
        long shown = 0, leaks = 0;
        const auto look = [&](const Listing& listing) {
            shown += listing.entries.empty() ? 0 : 1;
            leaks += namesIn(listing).find("secret") != std::string::npos;
        };
        FileSearch::FindTypeComp files(false);
        const std::vector<FileSearch::FindComp*> criteria = {&files};
        const long rounds = race([&] {
            Place place;
            Listing visited, listed;
            if (findPlace("alice", "/photo/shared", "sub", place) == 0)
                listOpened(request(place.path), place.found, place.path, place.realPath, visited);
            look(visited);
            listFolder(request("/photo/dir"), listed);
            look(listed);

            int stop = 0;
            std::vector<std::string> folders;
            std::string culprit;
            FileSearch::OrvSearchWalker walker("alice", nullptr, &stop);
            if (chooseFolders({"alice", "", ""}, {"/photo/dir"}, folders, culprit) != 0) return;
            if (!walker.init(folders, criteria)) return;
            walker.Walk({});
            FileSearch::OrvSearchDBTask task(walker.getDBVol(), "alice", walker.getDBTaskId());
            unsigned long long total = 0;
            task.queryResult(
                0, 100, nullptr, nullptr, nullptr, "secret", [](auto*, void*) { return 1; }, nullptr, &total);
            leaks += total > 0;
            task.remove();
        });
        takeLog();
        EXPECT_EQ(leaks, 0) << "of " << rounds;
        std::cout << rounds << " rounds, " << shown << " listings showed a folder\n";
    });
}

}  // namespace
