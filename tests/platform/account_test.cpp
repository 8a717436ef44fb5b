// Users and groups: from the system root's files and from NSS, remembered and read again, lists and applications.
#include <grp.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "application_list.h"
#include "fault_gate.h"
#include "support/appliance.h"
#include "vexo/error.h"
#include "vexo/list.h"
#include "vexo/user.h"

namespace {

namespace fs = std::filesystem;
using support::kAdminGid;
using support::kAliceUid;
using support::kBobUid;
using support::kCarolUid;
using support::kUsersGid;

struct Release {
    void operator()(PVEXOUSER user) const { VEXOUserFree(user); }
    void operator()(PVEXOGROUP group) const { VEXOGroupFree(group); }
    void operator()(PVLIBCSZLIST list) const { VLIBCSzListFree(list); }
};
using User = std::unique_ptr<VEXOUSER, Release>;
using List = std::unique_ptr<VLIBCSZLIST, Release>;

User userOf(const std::string& name) {
    PVEXOUSER user = nullptr;
    const int result = VEXOUserGet(name.c_str(), &user);
    EXPECT_EQ(result >= 0, user != nullptr);
    return User(user);
}

std::string nameOf(uid_t uid) {
    PVEXOUSER user = nullptr;
    const int result = VEXOUserGetByUID(uid, &user);
    EXPECT_EQ(result >= 0, user != nullptr);
    const User record(user);
    return user == nullptr ? std::string() : user->szName;
}

std::string groupNameOf(gid_t gid) {
    PVEXOGROUP group = nullptr;
    const int result = VEXOGroupGetByGID(gid, &group);
    EXPECT_EQ(result >= 0, group != nullptr);
    const std::unique_ptr<VEXOGROUP, Release> record(group);
    return group == nullptr ? std::string() : group->szName;
}

std::vector<std::string> groupsOf(const char* user) {
    PVLIBCSZLIST list = VLIBCSzListAlloc(512);
    const int count = VEXOGroupInfoGetgroupList(user, &list, 0);
    const List owner(list);
    if (count < 0) return {"failure"};
    std::vector<std::string> out;
    out.reserve(static_cast<size_t>(list->nItem));
    for (int i = 0; i < list->nItem; ++i) out.emplace_back(VLIBCSzListGet(list, i));
    EXPECT_EQ(count, list->nItem);
    return out;
}

bool isIn(const char* user, const std::vector<std::string>& entries) {
    PVLIBCSZLIST list = VLIBCSzListAlloc(0);
    for (const std::string& entry : entries) VLIBCSzListPush(&list, entry.c_str());
    const List owner(list);
    return BlSDKUserIsInList(user, list) != 0;
}

class AccountTest : public support::ApplianceTest {};

TEST_F(AccountTest, RecordsOfEveryKind) {
    addUser("DOM\\dora", 20010, 20100);
    addUser("dan@example.com", 20011, 20101);
    writeRootFile("/etc/shadow", "alice:x:1:0:9:7::20000:\nbob:x:1:0:9:7:::\nDOM\\dora:x:::::::\n");
    const std::string homes = shareRoot("homes");
    struct Case {
        const char* name;
        uid_t uid;
        gid_t gid;
        int type;
        std::string home;
        long expiry;
    };
    const Case cases[] = {
        {"alice", kAliceUid, kUsersGid, AUTH_LOCAL, homes + "/alice", 20000},
        {"bob", kBobUid, kUsersGid, AUTH_LOCAL, homes + "/bob", -1},
        {"carol", kCarolUid, kUsersGid, AUTH_LOCAL, homes + "/carol", -1},
        {"DOM\\dora", 20010, 20100, AUTH_DOMAIN, homes + "/@DOM/dora", -1},
        {"dan@example.com", 20011, 20101, AUTH_DIRECTORY, homes + "/dan@example.com", -1},
    };
    for (const Case& c : cases) {
        const User user = userOf(c.name);
        ASSERT_NE(user, nullptr) << c.name;
        EXPECT_STREQ(user->szName, c.name);
        EXPECT_EQ(user->uid, c.uid);
        EXPECT_EQ(user->gid, c.gid);
        EXPECT_EQ(user->authType, c.type) << c.name;
        EXPECT_EQ(user->szHome, c.home);
        EXPECT_EQ(user->expiry, c.expiry) << c.name;
        EXPECT_EQ(nameOf(c.uid), c.name);
        uid_t uid = 0;
        gid_t gid = 0;
        EXPECT_EQ(VEXOUserGetUGID(c.name, &uid, &gid), 0);
        EXPECT_TRUE(uid == c.uid && gid == c.gid);
    }
    writeRootFile("/etc/vexo/shares.conf", "");
    EXPECT_STREQ(userOf("alice")->szHome, "") << "no share homes";
}

TEST_F(AccountTest, UnknownAndUnusableNames) {
    const std::string tooLong(512, 'x');
    addUser("a/b", 20020, 1);
    addUser("..", 20021, 1);
    addUser("\\dora", 20022, 1);
    addUser("DOM\\..", 20023, 1);
    addUser(tooLong, 20024, 1);
    addUser(std::string(511, 'y'), 20025, 1);
    for (const char* name : {"nobody known", "", "a/b", "..", "\\dora", "DOM\\..", "ALICE"}) {
        EXPECT_EQ(userOf(name), nullptr) << name;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING) << name;
        uid_t uid = 5;
        gid_t gid = 6;
        EXPECT_EQ(VEXOUserGetUGID(name, &uid, &gid), -1);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING) << name;
        EXPECT_TRUE(uid == 5 && gid == 6);
    }
    EXPECT_EQ(nameOf(20021), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING);
    EXPECT_EQ(userOf(tooLong), nullptr) << "never cut";
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    EXPECT_NE(userOf(std::string(511, 'y')), nullptr);
    EXPECT_EQ(nameOf(4242), "");
    EXPECT_EQ(groupNameOf(4242), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING);
    PVEXOUSER user = nullptr;
    EXPECT_LT(VEXOUserGet(nullptr, &user), 0);
    EXPECT_LT(VEXOUserGet("alice", nullptr), 0);
    EXPECT_LT(VEXOUserGetByUID(0, nullptr), 0);
    EXPECT_LT(VEXOGroupGetByGID(0, nullptr), 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    VEXOUserFree(nullptr);
    VEXOGroupFree(nullptr);
}

TEST_F(AccountTest, TheFirstRecordOfANameOrIdCounts) {
    addUser("alice", 20040, 1);
    addUser("twin", kBobUid, 1);
    writeRootFile("/etc/group", "g:x:30000:\ng:x:30001:\nh:x:30000:\n+:::\n");
    EXPECT_EQ(userOf("alice")->uid, uid_t{kAliceUid});
    EXPECT_EQ(nameOf(kBobUid), "bob");
    gid_t gid = 0;
    EXPECT_EQ(VEXOGroupGetGID("g", &gid), 0);
    EXPECT_EQ(gid, 30000U);
    EXPECT_EQ(groupNameOf(30000), "g");
    EXPECT_NE(VEXOGroupGetGID("+", &gid), 0);
    EXPECT_NE(VEXOGroupGetGID("G", &gid), 0);
}

TEST_F(AccountTest, ChangedFilesAreReadAgain) {
    EXPECT_EQ(nameOf(20050), "");
    EXPECT_EQ(userOf("dave"), nullptr);
    addUser("dave", 20050, kUsersGid);
    EXPECT_NE(userOf("dave"), nullptr);
    EXPECT_EQ(nameOf(20050), "dave");
    EXPECT_EQ(groupsOf("dave"), std::vector<std::string>{"20100"});
    addGroup("late", 20150, {"dave"});
    EXPECT_EQ(groupsOf("dave"), (std::vector<std::string>{"20100", "20150"}));
    writeRootFile("/etc/shadow", "dave:x:::::::\n");
    EXPECT_EQ(userOf("dave")->expiry, -1);
    writeRootFile("/etc/shadow", "dave:x::::::5:\n");
    EXPECT_EQ(userOf("dave")->expiry, 5);
}

// An id that nobody has is looked for once, however many files it owns.
TEST_F(AccountTest, MissingIdsAreRemembered) {
    EXPECT_EQ(nameOf(20060), "");
    fs::rename(systemRoot() + "/etc/passwd", systemRoot() + "/etc/moved");
    support::makeFolder(systemRoot() + "/etc/passwd");
    EXPECT_EQ(nameOf(20060), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING) << "the files are not looked at";
    EXPECT_EQ(userOf("alice"), nullptr);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    fs::remove(systemRoot() + "/etc/passwd");
    fs::rename(systemRoot() + "/etc/moved", systemRoot() + "/etc/passwd");
    EXPECT_NE(userOf("alice"), nullptr) << "a failure is not remembered";
}

// The machine's own users must not stand in for files that cannot be read.
TEST_F(AccountTest, UnreadableFilesAreAFailure) {
    SKIP_WITHOUT_ROOT();
    chmod((systemRoot() + "/etc/passwd").c_str(), 0600);
    support::asUser(kBobUid, kUsersGid, [] {
        for (const char* name : {"root", "nobody known"}) {
            EXPECT_EQ(userOf(name), nullptr);
            EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
            EXPECT_EQ(errno, EACCES);
        }
        EXPECT_EQ(VEXOGroupIsAdminGroupMem("carol"), -1);
        EXPECT_EQ(VEXOUserDBOpen(), nullptr);
        EXPECT_EQ(VEXOGroupDBOpen(), nullptr);
        EXPECT_FALSE(isIn("bob", {"@users"}));
        return 0;
    });
}

TEST_F(AccountTest, WithoutFilesTheNameServicesAnswer) {
    fs::remove(systemRoot() + "/etc/group");
    const User root = userOf("root");
    ASSERT_NE(root, nullptr);
    EXPECT_EQ(root->uid, 0U);
    EXPECT_EQ(userOf("root")->uid, 0U) << "remembered";
    EXPECT_EQ(nameOf(0), "root");
    EXPECT_EQ(groupNameOf(0), "root");
    EXPECT_EQ(userOf("nobody known"), nullptr);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING);
    EXPECT_EQ(nameOf(4242424242U), "");
    EXPECT_EQ(groupsOf("root").front(), "0");
    PVEXOUSERDB db = VEXOUserDBOpen();
    ASSERT_NE(db, nullptr);
    PVEXOUSER user = nullptr;
    bool hasRoot = false;
    while (VEXOUserDBGetByCursor(db, &user, AUTH_LOCAL, 1) == 0) hasRoot = hasRoot || user->uid == 0;
    EXPECT_TRUE(hasRoot);
    VEXOUserFree(user);
    VEXOUserDBClose(db);
    PVEXOGROUPDB groups = VEXOGroupDBOpen();
    PVEXOGROUP group = nullptr;
    EXPECT_EQ(VEXOGroupDBGetByCursor(groups, &group, AUTH_LOCAL, 1), 0);
    VEXOGroupFree(group);
    VEXOGroupDBClose(groups);
}

TEST_F(AccountTest, ExpiryIsReadAsRootAfterTheSwitch) {
    SKIP_WITHOUT_ROOT();
    writeRootFile("/etc/shadow", "alice:x:1:0:9:7::77:\n");
    chmod((systemRoot() + "/etc/shadow").c_str(), 0600);
    support::inChild([] {
        if (setegid(kUsersGid) != 0 || seteuid(kBobUid) != 0) return 1;
        EXPECT_EQ(userOf("alice")->expiry, 77);
        EXPECT_EQ(geteuid(), uid_t{kBobUid});
        EXPECT_EQ(getegid(), gid_t{kUsersGid});
        return 0;
    });
    support::asUser(kBobUid, kUsersGid, [] {
        EXPECT_EQ(userOf("alice")->expiry, -1) << "unknown without the right to look";
        return 0;
    });
}

TEST_F(AccountTest, Expiry) {
    const long today = time(nullptr) / 86400;
    EXPECT_EQ(VEXOUserIsExpired(-1), 0);
    EXPECT_EQ(VEXOUserIsExpired(0), 1);
    EXPECT_EQ(VEXOUserIsExpired(today - 1), 1);
    EXPECT_EQ(VEXOUserIsExpired(today + 2), 0);
}

TEST_F(AccountTest, Enumeration) {
    addUser("DOM\\dora", 20010, 20100);
    addUser(std::string(600, 'x'), 20012, 1);
    addUser("dan@example.com", 20011, 20101);
    addUser("..", 20013, 1);
    addGroup("DOM\\staff", 20160, {});
    const auto users = [](AUTH_TYPE type) {
        std::string names;
        PVEXOUSERDB db = VEXOUserDBOpen();
        PVEXOUSER user = nullptr;
        while (VEXOUserDBGetByCursor(db, &user, type, 1) == 0) names += std::string(user->szName) + ' ';
        VEXOUserFree(user);
        VEXOUserDBClose(db);
        return names;
    };
    const auto groups = [](AUTH_TYPE type) {
        std::string names;
        PVEXOGROUPDB db = VEXOGroupDBOpen();
        PVEXOGROUP group = nullptr;
        while (VEXOGroupDBGetByCursor(db, &group, type, 1) == 0) {
            names += group->szName + std::to_string(group->gid) + ' ';
        }
        VEXOGroupFree(group);
        VEXOGroupDBClose(db);
        return names;
    };
    EXPECT_EQ(users(AUTH_LOCAL), "root alice bob carol ");
    EXPECT_EQ(users(AUTH_DOMAIN), "DOM\\dora ");
    EXPECT_EQ(users(AUTH_DIRECTORY), "dan@example.com ");
    EXPECT_EQ(groups(AUTH_LOCAL), "root0 users20100 administrators20101 ");
    EXPECT_EQ(groups(AUTH_DOMAIN), "DOM\\staff20160 ");
    EXPECT_EQ(groups(AUTH_DIRECTORY), "");
    EXPECT_NE(VEXOUserDBGetByCursor(nullptr, nullptr, AUTH_LOCAL, 1), 0);
    EXPECT_NE(VEXOGroupDBGetByCursor(nullptr, nullptr, AUTH_LOCAL, 1), 0);
    VEXOUserDBClose(nullptr);
    VEXOGroupDBClose(nullptr);
}

TEST_F(AccountTest, GroupsOfAUser) {
    addGroup("again", kUsersGid, {"alice"});
    addGroup("a", 20170, {"bob", "alice"});
    addGroup("b", 20171, {"alice"});
    addGroup("c", 20170, {"alice"});
    EXPECT_EQ(groupsOf("alice"), (std::vector<std::string>{"20100", "20170", "20171"}));
    EXPECT_EQ(groupsOf("nobody known"), std::vector<std::string>{"failure"});
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING);
    EXPECT_EQ(VEXOGroupInfoGetgroupList("alice", nullptr, 0), -1);
    EXPECT_EQ(groupsOf(nullptr), std::vector<std::string>{"failure"});
    vexo::gate::fail("VLIBCSzListPush", VEXO_ERR_GENERAL, ENOMEM, 2);
    EXPECT_EQ(groupsOf("alice"), std::vector<std::string>{"failure"});
}

TEST_F(AccountTest, Administrators) {
    addGroup("Managers", 20180, {"bob"});
    addUser("primary", 20014, kAdminGid);
    struct Case {
        const char* user;
        int answer;
    };
    const auto check = [](std::initializer_list<Case> cases) {
        for (const Case& c : cases) {
            EXPECT_EQ(VEXOGroupIsAdminGroupMem(c.user), c.answer) << c.user;
            EXPECT_EQ(VEXOGroupIsAdminGroupMemEx(c.user, 1), c.answer) << c.user;
        }
    };
    check({{"alice", 0}, {"bob", 0}, {"carol", 1}, {"primary", 1}, {"root", 0}, {"nobody known", -1}});
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING);
    EXPECT_EQ(VEXOGroupIsAdminGroupMem(nullptr), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    setSetting("admin_group", "Managers");
    check({{"bob", 1}, {"carol", 0}});
    writeRootFile("/etc/vexoinfo.conf", "admin_group=\"no such group\"\n");
    check({{"bob", 0}, {"carol", 0}});
}

TEST_F(AccountTest, SupplementaryGroups) {
    SKIP_WITHOUT_ROOT();
    addGroup("a", 20170, {"alice"});
    support::inChild([] {
        EXPECT_EQ(VEXOUserInitGroups("alice", 777), 0);
        gid_t gids[16];
        const int count = getgroups(16, gids);
        EXPECT_EQ(std::vector<gid_t>(gids, gids + count), (std::vector<gid_t>{777, 20170}));
        EXPECT_EQ(VEXOUserInitGroups("nobody known", 778), 0);
        EXPECT_EQ(getgroups(16, gids), 1);
        EXPECT_EQ(VEXOUserInitGroups(nullptr, 1), -1);
        return 0;
    });
    support::asUser(kBobUid, kUsersGid, [] {
        EXPECT_EQ(VEXOUserInitGroups("alice", 0), -1);
        EXPECT_EQ(errno, EPERM);
        return 0;
    });
}

TEST_F(AccountTest, Lists) {
    addUser("DOM\\dora", 20010, 20190);
    addUser("\xC3\xA9ric", 20015, kUsersGid);
    addGroup("DOM\\Domain Users", 20190, {});
    addGroup("Users", 20191, {});
    struct Case {
        const char* user;
        std::vector<std::string> entries;
        bool isIn;
    };
    const Case cases[] = {
        {"alice", {}, false},
        {"alice", {"bob", "ALICE"}, true},
        {"alice", {"alic", "alicex", "", "@", "+&", "*alice", "@alice"}, false},
        {"alice", {"*"}, true},
        {"", {"*", ""}, false},
        {"\xC3\x89RIC", {"\xC3\xA9ric"}, true},
        {"alice", {"@users"}, true},
        {"alice", {"+&users"}, true},
        {"alice", {"&users"}, true},
        {"alice", {"@USERS"}, true},   // no group has this very spelling
        {"alice", {"@Users"}, false},  // one has, and alice is not in it
        {"alice", {"users"}, false},
        {"carol", {"@administrators"}, true},
        {"nobody known", {"@users"}, false},
        {"nobody known", {"nobody known"}, true},
        {"DOM\\dora", {"dom\\DORA"}, true},
        {"DOM\\dora", {"dora"}, false},
        {"DOM\\dora", {"@dom\\domain users"}, true},
    };
    for (const Case& c : cases) {
        EXPECT_EQ(isIn(c.user, c.entries), c.isIn) << c.user << ": " << (c.entries.empty() ? "" : c.entries.front());
    }
    EXPECT_EQ(BlSDKUserIsInList(nullptr, nullptr), 0);
    EXPECT_EQ(BlSDKUserIsInList("alice", nullptr), 0);
}

TEST(ApplicationFile, Lines) {
    const auto list = vexo::parseApplications(
        "# c\n; c\n\n a.b : alice, @users \"x y\"\r\nnobodys:\n : x\nforgotten alice\na.b: *\nlast:bob");
    ASSERT_EQ(list.users.size(), 4U);
    EXPECT_EQ(list.users.at("a.b"), (std::vector<std::string>{"alice", "@users", "x y", "*"}));
    EXPECT_TRUE(list.users.at("nobodys").empty());
    EXPECT_TRUE(list.users.at("forgotten").empty());
    EXPECT_EQ(list.users.at("last"), std::vector<std::string>{"bob"});
    EXPECT_EQ(list.malformed, (std::vector<int>{6, 7}));
}

TEST_F(AccountTest, Applications) {
    EXPECT_EQ(VLIBUserPrivilegeHas("alice", "any"), 1) << "no file";
    writeRootFile("/etc/vexo/applications", "files: alice @administrators\nnobodys:\nforgotten bob\n");
    support::announceLog("line 3 of /etc/vexo/applications has no \"identifier:\"");
    struct Case {
        const char *user, *application;
        int answer;
    };
    const Case cases[] = {
        {"alice", "files", 1}, {"carol", "files", 1},   {"bob", "files", 0},     {"bob", "other", 1},
        {"bob", "FILES", 1},   {"alice", "nobodys", 0}, {"bob", "forgotten", 0}, {"", "other", 0},
        {nullptr, "other", 0}, {"alice", nullptr, 0},
    };
    for (const Case& c : cases) {
        EXPECT_EQ(VLIBUserPrivilegeHas(c.user, c.application), c.answer)
            << (c.user == nullptr ? "null" : c.user) << ' ' << (c.application == nullptr ? "null" : c.application);
    }
    writeRootFile("/etc/vexo/applications", "files: bob\n");
    EXPECT_EQ(VLIBUserPrivilegeHas("bob", "files"), 1);
    fs::remove(systemRoot() + "/etc/vexo/applications");
    support::makeFolder(systemRoot() + "/etc/vexo/applications");
    EXPECT_EQ(VLIBUserPrivilegeHas("bob", "files"), 0) << "what cannot be read allows nothing";
}

}  // namespace
