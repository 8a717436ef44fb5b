// Shares on a running appliance: records, rights from the lists, files that change, homes.
#include "vexo/share.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "fault_gate.h"
#include "support/appliance.h"
#include "vexo/error.h"

namespace {

namespace fs = std::filesystem;
using support::announceLog;
using support::kAliceUid;
using support::kUsersGid;

constexpr const char* kDefinitions = "/etc/vexo/shares.conf";
constexpr useconds_t kTick = 20000;  // longer than the clock that stamps files stands still

struct Release {
    void operator()(PVEXOSHARE share) const { VEXOShareFree(share); }
    void operator()(SDK::Share* share) const { SDK::Share::Release(share); }
};
using Record = std::unique_ptr<VEXOSHARE, Release>;
using Loaded = std::unique_ptr<SDK::Share, Release>;

std::vector<std::string> items(PVLIBCSZLIST list) {
    std::vector<std::string> out;
    out.reserve(static_cast<size_t>(list->nItem));
    for (int i = 0; i < list->nItem; ++i) out.emplace_back(VLIBCSzListGet(list, i));
    return out;
}

// The root of a share, or "" with the platform error when there is none.
std::string rootOf(const char* name) {
    PVEXOSHARE share = nullptr;
    const int result = VEXOShareGet(name, &share);
    const Record record(share);
    EXPECT_EQ(result == 0, share != nullptr);
    return share == nullptr ? std::string() : share->szPath;
}

std::vector<std::string> allNames() {
    std::vector<std::string> names;
    const PVEXOSHAREDB db = VEXOShareDBOpen();
    if (db == nullptr) return {"no database"};
    PVEXOSHARE share = nullptr;
    while (VEXOShareDBCursorGet(db, &share) == 0) names.emplace_back(share->szName);
    VEXOShareFree(share);
    VEXOShareDBClose(db);
    return names;
}

class ShareTest : public support::ApplianceTest {
 protected:
    void define(const std::string& text) { writeRootFile(kDefinitions, text); }
};

TEST_F(ShareTest, RecordsAreFoundWithoutCase) {
    addShare("Music",
             "valid users = alice, @users\ninvalid users = bob\nwrite list = \"DOM\\carl x\"\nbrowseable = no\n"
             "vexo:restriction = 5\nvexo:encrypted = yes\nvexo:ftp = 2\nvexo:acl = yes\nvexo:synced = yes\n");
    PVEXOSHARE share = nullptr;
    ASSERT_EQ(VEXOShareGet("mUSIC", &share), 0);
    const Record record(share);
    EXPECT_STREQ(share->szName, "Music");
    EXPECT_EQ(share->szPath, shareRoot("Music"));
    EXPECT_EQ(share->fStatus, unsigned{VEXO_SHARE_HIDDEN | VEXO_SHARE_ENCRYPTED});
    EXPECT_EQ(items(share->naList), std::vector<std::string>{"bob"});
    EXPECT_EQ(items(share->rwList), std::vector<std::string>{"DOM\\carl x"});
    EXPECT_EQ(items(share->roList), (std::vector<std::string>{"alice", "@users"}));
    EXPECT_EQ(share->mask, 5U);
    EXPECT_EQ(share->ftp, 2);
    EXPECT_TRUE(share->acl == 1 && share->synced == 1 && share->index == 0);
    EXPECT_EQ(VEXOS2SIsSyncedShare("music"), 1);
    EXPECT_EQ(VEXOS2SIsSyncedShare("photo"), 0);
    EXPECT_EQ(VEXOS2SIsSyncedShare("none"), 0);
}

TEST_F(ShareTest, FailuresSayWhy) {
    PVEXOSHARE share = nullptr;
    for (const char* name : {"none", "", "photo/x"}) {
        EXPECT_NE(VEXOShareGet(name, &share), 0);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_SHARE_MISSING) << name;
    }
    EXPECT_NE(VEXOShareGet(nullptr, &share), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    EXPECT_NE(VEXOShareGet("photo", nullptr), 0);
    fs::remove(systemRoot() + kDefinitions);
    EXPECT_EQ(rootOf("photo"), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_EQ(VEXOShareDBOpen(), nullptr);
    EXPECT_LT(VEXOShareIsShareRecycle("/v/photo/#recycle"), 0);
    VEXOShareFree(nullptr);
    SDK::Share::Release(nullptr);
}

// Every list that can fail to be made, fails once: nothing leaks, and the caller hears of it.
TEST_F(ShareTest, ListsThatCannotBeMade) {
    for (int nth = 1; nth <= 5; ++nth) {
        const char* operation = nth <= 3 ? "VLIBCSzListAlloc" : "VLIBCSzListPush";
        vexo::gate::fail(operation, VEXO_ERR_GENERAL, ENOMEM, nth <= 3 ? nth : nth - 3);
        EXPECT_EQ(rootOf("photo"), "") << nth;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
        EXPECT_EQ(rootOf("photo"), shareRoot("photo"));
    }
}

TEST_F(ShareTest, MalformedSectionsDoNotHideTheOthers) {
    define(
        "[a]\npath = /v/a\n[no path]\nread only = no\n[deep]\npath = /v/w/deep\n[a/b]\npath = /v/b\n"
        "[mask]\npath = /v/m\nvexo:restriction = 0x\n[home]\npath = /v/home\n[off]\navailable = no\n[z\x07]\n[z\nx\n"
        "[global]\nnonsense\n[b]\npath = /v/b\n");
    announceLog("share [no path] is left out: no path");
    announceLog("share [deep] is left out: the path \"/v/w/deep\" is not of the form /<volume>/<share>");
    announceLog("share [a/b] is left out: no name for a share");
    announceLog("share [mask] is left out: \"0x\" is no number or too large");
    announceLog("share [home] is left out: no name for a share");
    announceLog("share [z\\x07] is left out: no name for a share");
    announceLog("share definitions: line 17: a section without a name");
    announceLog("share definitions: line 20: neither a section nor an option");
    EXPECT_EQ(allNames(), (std::vector<std::string>{"a", "b"}));
    EXPECT_EQ(rootOf("b"), "/v/b") << "and said once";
    EXPECT_EQ(rootOf("deep"), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_SHARE_MISSING);
}

struct Right {
    const char* options;
    int alice, bob, erin;  // erin is in the group "Editors"
};

// No access beats read-write beats read-only.
TEST_F(ShareTest, RightsFromLists) {
    addUser("erin", 20030, kUsersGid);
    addGroup("Editors", 20130, {"erin"});
    const Right cases[] = {
        {"", 1, 1, 1},
        {"read only = no\n", 2, 2, 2},
        {"valid users = alice\n", 1, 0, 0},
        {"valid users = alice\nread only = no\n", 2, 0, 0},
        {"valid users = ALICE, @editors\nwrite list = bob\n", 1, 2, 1},
        {"valid users = +Editors\nread list = alice\nread only = no\n", 1, 0, 2},
        {"valid users = &Editors\ninvalid users = +users\n", 0, 0, 0},
        {"invalid users = bob @none\nwrite list = bob @Editors\nread only = yes\n", 1, 0, 2},
        {"invalid users = *\nread only = no\n", 0, 0, 0},
        {"valid users = \"\"\nread only = no\n", 0, 0, 0},
        {"write list = erin\nread list = erin alice\nvalid users = @users\ninvalid users = @\"no such\"\n", 1, 1, 2},
    };
    for (const Right& c : cases) {
        addShare("music", c.options);
        const Loaded share(SDK::Share::LoadShare("music"));
        ASSERT_NE(share, nullptr);
        EXPECT_EQ(share->GetAccessRight("alice"), c.alice) << c.options;
        EXPECT_EQ(share->GetAccessRight("bob"), c.bob) << c.options;
        EXPECT_EQ(share->GetAccessRight("erin"), c.erin) << c.options;
        EXPECT_EQ(share->GetAccessRight(""), 0);
        EXPECT_EQ(share->GetAccessRight(nullptr), 0);
    }
}

TEST_F(ShareTest, LoadedShareShowsItsRecord) {
    addShare("music", "browseable = no\nvexo:ftp = 7\nvexo:acl = yes\n");
    const Loaded share(SDK::Share::LoadShare("MUSIC"));
    ASSERT_NE(share, nullptr);
    EXPECT_EQ(share->GetStatus(), VEXO_SHARE_HIDDEN);
    EXPECT_EQ(share->GetFTPPrivilege(), 7);
    EXPECT_TRUE(share->GetACLEnable());
    EXPECT_STREQ(share->GetName(), "music");
    EXPECT_EQ(share->GetFullPath(), shareRoot("music"));
    EXPECT_EQ(SDK::Share::LoadShare("none"), nullptr);
    EXPECT_EQ(SDK::Share::LoadShare(nullptr), nullptr);
    vexo::gate::fail("SDK::Share::LoadShare", VEXO_ERR_GENERAL);
    EXPECT_EQ(SDK::Share::LoadShare("music"), nullptr);
}

// The files are read once, and again when one of them, an included one too, is another.
TEST_F(ShareTest, ChangesAreSeen) {
    writeRootFile("/etc/vexo/more.conf", "[b]\npath = /v/b\n");
    define("[a]\npath = /v/a\n[global]\ninclude = /etc/vexo/more.conf\n");
    EXPECT_EQ(allNames(), (std::vector<std::string>{"a", "b"}));
    writeRootFile("/etc/vexo/more.conf", "[c]\npath = /v/c\n");
    EXPECT_EQ(allNames(), (std::vector<std::string>{"a", "c"})) << "same size, another inode";
    support::writeFile(systemRoot() + "/etc/vexo/more.conf", "[d]\npath = /v/d\n");
    EXPECT_EQ(allNames(), (std::vector<std::string>{"a", "d"})) << "same inode and size, within one tick of the clock";
    define("[e]\npath = /v/e\n[global]\ninclude = later.conf\n");
    usleep(kTick);
    announceLog("share definitions: line 4: the included file cannot be read");
    EXPECT_EQ(allNames(), std::vector<std::string>{"e"});
    EXPECT_EQ(allNames(), std::vector<std::string>{"e"});
    writeRootFile("/etc/vexo/later.conf", "[f]\npath = /v/f\n");
    EXPECT_EQ(allNames(), (std::vector<std::string>{"e", "f"})) << "a relative name lies beside the definitions";
    writeRootFile("/etc/other.conf", "[g]\npath = /v/g\n");
    setSetting("share_definitions", "/etc/other.conf");
    EXPECT_EQ(allNames(), std::vector<std::string>{"g"});
}

// Reading again is the exception: inode, size and time decide, not the text.
TEST_F(ShareTest, UnchangedFilesAreNotReadAgain) {
    define("[a]\npath = /v/a\n");
    usleep(kTick);
    EXPECT_EQ(allNames(), std::vector<std::string>{"a"});
    const std::string file = systemRoot() + kDefinitions;
    struct stat before {};
    ASSERT_EQ(stat(file.c_str(), &before), 0);
    support::writeFile(file, "[b]\npath = /v/b\n");
    const timespec times[] = {before.st_atim, before.st_mtim};
    ASSERT_EQ(utimensat(AT_FDCWD, file.c_str(), times, 0), 0);
    EXPECT_EQ(allNames(), std::vector<std::string>{"a"});
    ASSERT_EQ(utimensat(AT_FDCWD, file.c_str(), nullptr, 0), 0);
    EXPECT_EQ(allNames(), std::vector<std::string>{"b"});
}

TEST_F(ShareTest, ACursorKeepsWhatItBegan) {
    define("[a]\npath = /v/a\n[b]\npath = /v/b\n");
    const PVEXOSHAREDB db = VEXOShareDBOpen();
    PVEXOSHARE share = nullptr;
    ASSERT_EQ(VEXOShareDBCursorGet(db, &share), 0);
    const PVEXOSHARE first = share;
    define("[x]\npath = /v/x\n");
    ASSERT_EQ(VEXOShareDBCursorGet(db, &share), 0);
    EXPECT_EQ(share, first) << "one record, reused";
    EXPECT_STREQ(share->szName, "b");
    EXPECT_NE(VEXOShareDBCursorGet(db, &share), 0);
    EXPECT_NE(VEXOShareDBCursorGet(nullptr, &share), 0);
    VEXOShareFree(share);
    VEXOShareDBClose(db);
    VEXOShareDBClose(nullptr);
}

TEST_F(ShareTest, RootsWithVariablesFollowTheUser) {
    addUser("DOM\\dora", 20031, kUsersGid);
    addUser("..", 20032, kUsersGid);
    define("[own]\npath = /v/%U\n[all]\npath = /v/%S.%g.%u\n[dom]\npath = /%D/%U\n");
    struct Case {
        const char *user, *own, *all, *dom;
    };
    const Case cases[] = {
        {"alice", "/v/alice", "/v/all.users.alice", ""},
        {"DOM\\dora", "/v/dora", "/v/all.users.DOM\\dora", "/DOM/dora"},
        {"..", "", "/v/all.users...", ""},
        {"nobody known", "", "/v/all..", ""},
    };
    for (const Case& c : cases) {
        setenv("REMOTE_USER", c.user, 1);
        EXPECT_EQ(rootOf("own"), c.own) << c.user;
        EXPECT_EQ(rootOf("all"), c.all) << c.user;
        EXPECT_EQ(rootOf("dom"), c.dom) << c.user;
        EXPECT_EQ(allNames().size(), size_t{1} + (*c.own != '\0') + (*c.dom != '\0')) << c.user;
        EXPECT_EQ(VEXOShareIsShareRecycle("/v/alice/#recycle"), std::string(c.user) == "alice");
    }
    unsetenv("REMOTE_USER");
    if (geteuid() == 0) {
        EXPECT_EQ(rootOf("own"), "/v/root") << "without a request, the effective user";
    }
}

TEST_F(ShareTest, RecycleBins) {
    const std::string photo = shareRoot("photo");
    struct Case {
        std::string path;
        int answer;
    };
    const Case cases[] = {{photo + "/#recycle", 1},
                          {photo + "/#recycle/", 0},
                          {photo + "/x/#recycle", 0},
                          {photo + "/#Recycle", 0},
                          {photo, 0},
                          {"/#recycle", 0},
                          {"", 0},
                          {photo + "//#recycle", 0},
                          {"/v/none/#recycle", 0}};
    for (const Case& c : cases) EXPECT_EQ(VEXOShareIsShareRecycle(c.path.c_str()), c.answer) << c.path;
    EXPECT_LT(VEXOShareIsShareRecycle(nullptr), 0);
}

TEST_F(ShareTest, Homes) {
    char path[4096];
    const std::string home = shareRoot("homes") + "/alice";
    EXPECT_EQ(VEXOServiceUserHomeIsEnabled(AUTH_LOCAL, kAliceUid), 1);
    EXPECT_NE(VEXOServiceHomePathGet("alice", path, sizeof path), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_MISSING);
    EXPECT_FALSE(fs::exists(home)) << "asking makes nothing";
    support::writeFile(home, "");
    EXPECT_NE(VEXOServiceHomePathGet("alice", path, sizeof path), 0);
    fs::remove(home);
    support::makeFolder(home);
    EXPECT_EQ(VEXOServiceHomePathGet("alice", path, sizeof path), 0);
    EXPECT_EQ(path, home);
    EXPECT_NE(VEXOServiceHomePathGet("alice", path, static_cast<int>(home.size())), 0) << "never cut";
    EXPECT_STREQ(path, "");
    for (const char* user : {"nobody known", "..", "", "alice/../bob"}) {
        EXPECT_NE(VEXOServiceHomePathGet(user, path, sizeof path), 0);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING) << user;
    }
    EXPECT_NE(VEXOServiceHomePathGet(nullptr, path, sizeof path), 0);
    EXPECT_NE(VEXOServiceHomePathGet("alice", nullptr, 1), 0);
    EXPECT_NE(VEXOServiceHomePathGet("alice", path, 0), 0);
}

TEST_F(ShareTest, HomesAreOff) {
    support::makeFolder(shareRoot("homes") + "/alice");
    char path[4096];
    for (const char* settings : {"userhome_enable=\"no\"\n", "userhome_enable=\"\"\n", ""}) {
        writeRootFile("/etc/vexoinfo.conf", settings);
        EXPECT_EQ(VEXOServiceUserHomeIsEnabled(AUTH_LOCAL, kAliceUid), 0) << settings;
        EXPECT_NE(VEXOServiceHomePathGet("alice", path, sizeof path), 0);
    }
    writeRootFile("/etc/vexoinfo.conf", "userhome_enable=\"YES\"\n");
    EXPECT_EQ(VEXOServiceUserHomeIsEnabled(AUTH_DOMAIN, 0), 1);
    define("[photo]\npath = /v/photo\n");
    EXPECT_EQ(VEXOServiceUserHomeIsEnabled(AUTH_LOCAL, kAliceUid), 0) << "without the share";
}

}  // namespace
