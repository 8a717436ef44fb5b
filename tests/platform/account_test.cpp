// Users and groups: from the system root's files and from NSS, remembered and read again, lists and applications.
#include <grp.h>

#include "application_list.h"
#include "support/testing.h"
#include "vexo/user.h"

namespace {

// "name uid gid type home expiry", or "" with the platform error.
std::string textOf(int result, PVEXOUSER user) {
    EXPECT_EQ(result >= 0, user != nullptr);
    if (user == nullptr) return "";
    std::string text = user->szName;
    for (const long number : {long{user->uid}, long{user->gid}, long{user->authType}}) {
        text += ' ' + std::to_string(number);
    }
    text += ' ' + std::string(user->szHome) + ' ' + std::to_string(user->expiry);
    VEXOUserFree(user);
    return text;
}

std::string userOf(const std::string& name) {
    PVEXOUSER user = nullptr;
    const int result = VEXOUserGet(name.c_str(), &user);
    return textOf(result, user);
}

std::string userOf(uid_t uid) {
    PVEXOUSER user = nullptr;
    const int result = VEXOUserGetByUID(uid, &user);
    return textOf(result, user);
}

std::string groupOf(gid_t gid) {
    PVEXOGROUP group = nullptr;
    const int result = VEXOGroupGetByGID(gid, &group);
    EXPECT_EQ(result >= 0, group != nullptr);
    std::string name = group == nullptr ? "" : group->szName;
    VEXOGroupFree(group);
    return name;
}

std::string groupsOf(const char* user) {
    PVLIBCSZLIST list = VLIBCSzListAlloc(512);
    const int count = VEXOGroupInfoGetgroupList(user, &list, 0);
    std::string out = count < 0 ? "failure" : std::to_string(count) + ":";
    for (int i = 0; i < count; ++i) out += ' ' + std::string(VLIBCSzListGet(list, i));
    VLIBCSzListFree(list);
    return out;
}

// "name id ..." of one kind, by the operations of users or of groups.
template <class Record, class Open, class Next, class Free, class Close>
std::string namesOf(AUTH_TYPE type, Open open, Next next, Free release, Close close) {
    const auto db = open();
    if (db == nullptr) return "failure";
    std::string names;
    Record* record = nullptr;
    while (next(db, &record, type, 1) == 0)
        names += std::string(record->szName) + ' ' + std::to_string(record->gid) + ' ';
    release(record);
    close(db);
    return names;
}

std::string usersOf(AUTH_TYPE type) {
    return namesOf<VEXOUSER>(type, VEXOUserDBOpen, VEXOUserDBGetByCursor, VEXOUserFree, VEXOUserDBClose);
}

std::string groupsOf(AUTH_TYPE type) {
    return namesOf<VEXOGROUP>(type, VEXOGroupDBOpen, VEXOGroupDBGetByCursor, VEXOGroupFree, VEXOGroupDBClose);
}

bool isIn(const char* user, const std::vector<const char*>& entries) {
    PVLIBCSZLIST list = VLIBCSzListAlloc(0);
    for (const char* entry : entries) VLIBCSzListPush(&list, entry);
    const bool in = BlSDKUserIsInList(user, list) != 0;
    VLIBCSzListFree(list);
    return in;
}

class AccountTest : public ApplianceTest {};

TEST_F(AccountTest, RecordsOfEveryKind) {
    const std::string longest(511, 'y');
    addUser("DOM\\dora", 20010, 20100);
    addUser("dan@example.com", 20011, 20101);
    for (const char* name : {"a/b", "..", "\\dora", "DOM\\.."}) addUser(name, 20020, 1);
    addUser(longest + "y", 20024, 1);
    addUser(longest, 20025, 1);
    addUser("alice", 20040, 1);  // the first record of a name or id counts
    addUser("twin", kBobUid, 1);
    addGroup("DOM\\staff", 20160, {});
    writeRootFile("/etc/shadow", "alice:x:1:0:9:7::20000:\nbob:x:1:0:9:7:::\nDOM\\dora:x:::::::\n");
    const std::string homes = shareRoot("homes");
    for (const auto& [name, uid, gid, rest] : Rows<const char*, uid_t, gid_t, std::string>{
             {"alice", kAliceUid, kUsersGid, "0 " + homes + "/alice 20000"},
             {"bob", kBobUid, kUsersGid, "0 " + homes + "/bob -1"},
             {"carol", kCarolUid, kUsersGid, "0 " + homes + "/carol -1"},
             {"DOM\\dora", 20010, 20100, "1 " + homes + "/@DOM/dora -1"},
             {"dan@example.com", 20011, 20101, "2 " + homes + "/dan@example.com -1"},
         }) {
        const std::string expected =
            std::string(name) + ' ' + std::to_string(uid) + ' ' + std::to_string(gid) + ' ' + rest;
        EXPECT_EQ(userOf(name), expected);
        EXPECT_EQ(userOf(uid), expected);
        uid_t sameUid = 0;
        gid_t sameGid = 0;
        EXPECT_EQ(VEXOUserGetUGID(name, &sameUid, &sameGid), 0);
        EXPECT_TRUE(sameUid == uid && sameGid == gid);
    }
    for (const char* name : {"nobody known", "", "a/b", "..", "\\dora", "DOM\\..", "ALICE"}) {
        uid_t uid = 5;
        gid_t gid = 6;
        EXPECT_EQ(userOf(name), "") << name;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING) << name;
        EXPECT_EQ(VEXOUserGetUGID(name, &uid, &gid), -1);
        EXPECT_TRUE(uid == 5 && gid == 6);
    }
    for (const uid_t uid : {20020, 4242}) EXPECT_EQ(userOf(uid), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING);
    EXPECT_EQ(userOf(longest + "y"), "") << "never cut";
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    EXPECT_NE(userOf(longest), "");
    EXPECT_EQ(usersOf(AUTH_LOCAL), "root 0 alice 20100 bob 20100 carol 20100 " + longest + " 1 alice 1 twin 1 ");
    EXPECT_EQ(usersOf(AUTH_DOMAIN), "DOM\\dora 20100 ");
    EXPECT_EQ(usersOf(AUTH_DIRECTORY), "dan@example.com 20101 ");
    EXPECT_EQ(groupsOf(AUTH_LOCAL), "root 0 users 20100 administrators 20101 ");
    EXPECT_EQ(groupsOf(AUTH_DOMAIN), "DOM\\staff 20160 ");
    EXPECT_EQ(groupsOf(AUTH_DIRECTORY), "");
    writeRootFile("/etc/vexo/shares.conf", "");
    EXPECT_EQ(userOf("carol"), "carol 20003 20100 0  -1") << "no share homes";
}

TEST_F(AccountTest, Groups) {
    addGroup("again", kUsersGid, {"alice"});
    addGroup("a", 20170, {"bob", "alice"});
    addGroup("b", 20171, {"alice"});
    addGroup("c", 20170, {"alice"});
    EXPECT_EQ(groupsOf("alice"), "3: 20100 20170 20171");
    EXPECT_EQ(groupsOf("nobody known"), "failure");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING);
    vexo::gate::fail("VLIBCSzListPush", VEXO_ERR_GENERAL, ENOMEM, 2);
    EXPECT_EQ(groupsOf("alice"), "failure");
    writeRootFile("/etc/group", "g:x:30000:\ng:x:30001:\nh:x:30000:\n+:::\n");
    gid_t gid = 0;
    EXPECT_EQ(VEXOGroupGetGID("g", &gid), 0);
    EXPECT_EQ(gid, 30000U);
    EXPECT_EQ(groupOf(30000), "g");
    for (const char* name : {"+", "G"}) EXPECT_NE(VEXOGroupGetGID(name, &gid), 0);
}

TEST_F(AccountTest, ChangedFilesAreReadAgain) {
    EXPECT_EQ(userOf(20050), "");
    addUser("dave", 20050, kUsersGid);
    EXPECT_NE(userOf("dave"), "");
    EXPECT_NE(userOf(20050), "");
    addGroup("late", 20150, {"dave"});
    EXPECT_EQ(groupsOf("dave"), "2: 20100 20150");
    const std::string start = "dave 20050 20100 0 " + shareRoot("homes") + "/dave ";
    writeRootFile("/etc/shadow", "dave:x:::::::\n");
    EXPECT_EQ(userOf("dave"), start + "-1");
    writeRootFile("/etc/shadow", "dave:x::::::5:\n");
    EXPECT_EQ(userOf("dave"), start + "5");
    // An id that nobody has is looked for once, however many files it owns.
    EXPECT_EQ(userOf(20060), "");
    fs::rename(systemRoot() + "/etc/passwd", systemRoot() + "/etc/moved");
    makeFolder(systemRoot() + "/etc/passwd");
    EXPECT_EQ(userOf(20060), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING) << "the files are not looked at";
    EXPECT_EQ(userOf("alice"), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    fs::remove(systemRoot() + "/etc/passwd");
    fs::rename(systemRoot() + "/etc/moved", systemRoot() + "/etc/passwd");
    EXPECT_NE(userOf("alice"), "") << "a failure is not remembered";
}

// The machine's own users must not stand in for files that cannot be read.
TEST_F(AccountTest, UnreadableFilesAreAFailure) {
    SKIP_WITHOUT_ROOT();
    chmod((systemRoot() + "/etc/passwd").c_str(), 0600);
    asUser(kBobUid, kUsersGid, [] {
        for (const char* name : {"root", "nobody known"}) {
            EXPECT_EQ(userOf(name), "");
            EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
            EXPECT_EQ(errno, EACCES);
        }
        EXPECT_EQ(VEXOGroupIsAdminGroupMem("carol"), -1);
        EXPECT_EQ(usersOf(AUTH_LOCAL) + groupsOf(AUTH_LOCAL), "failurefailure");
        EXPECT_FALSE(isIn("bob", {"@users"}));
        return 0;
    });
}

TEST_F(AccountTest, WithoutFilesTheNameServicesAnswer) {
    fs::remove(systemRoot() + "/etc/group");
    for (int round = 0; round < 2; ++round) {  // the second time from memory
        EXPECT_TRUE(userOf("root").starts_with("root 0 0 0 "));
        EXPECT_TRUE(userOf(0).starts_with("root 0 0 0 "));
        EXPECT_EQ(groupOf(0), "root");
        EXPECT_EQ(userOf("nobody known"), "");
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING);
        EXPECT_TRUE(groupsOf("root").find(": 0") != std::string::npos);
    }
    for (const std::string& all : {usersOf(AUTH_LOCAL), groupsOf(AUTH_LOCAL)}) {
        EXPECT_NE(all.find("root 0 "), std::string::npos);
    }
}

TEST_F(AccountTest, ExpiryIsReadAsRootAfterTheSwitch) {
    SKIP_WITHOUT_ROOT();
    writeRootFile("/etc/shadow", "alice:x:1:0:9:7::77:\n");
    chmod((systemRoot() + "/etc/shadow").c_str(), 0600);
    inChild([] {
        if (setegid(kUsersGid) != 0 || seteuid(kBobUid) != 0) return 1;
        EXPECT_TRUE(userOf("alice").ends_with(" 77"));
        EXPECT_EQ(geteuid(), uid_t{kBobUid});
        EXPECT_EQ(getegid(), gid_t{kUsersGid});
        return 0;
    });
    asUser(kBobUid, kUsersGid, [] {
        EXPECT_TRUE(userOf("alice").ends_with(" -1")) << "unknown without the right to look";
        return 0;
    });
    const long today = time(nullptr) / 86400;
    for (const long expiry : {-1L, today + 2}) EXPECT_EQ(VEXOUserIsExpired(expiry), 0);
    for (const long expiry : {0L, today}) EXPECT_EQ(VEXOUserIsExpired(expiry), 1);
}

TEST_F(AccountTest, Administrators) {
    addGroup("Managers", 20180, {"bob"});
    addUser("primary", 20014, kAdminGid);
    const Rows<const char*, const char*, int> rows = {
        {"alice", nullptr, 0},  {"carol", nullptr, 1},  {"primary", nullptr, 1},  {"nobody known", nullptr, -1},
        {nullptr, nullptr, -1}, {"bob", "Managers", 1}, {"carol", "Managers", 0}, {"carol", "no such", 0}};
    for (const auto& [user, group, answer] : rows) {
        if (group != nullptr) setSetting("admin_group", group);
        EXPECT_EQ(VEXOGroupIsAdminGroupMem(user), answer) << testing::PrintToString(user);
        EXPECT_EQ(VEXOGroupIsAdminGroupMemEx(user, 1), answer);
        const int code = user != nullptr ? VEXO_ERR_USER_MISSING : VEXO_ERR_PARAMETER;
        EXPECT_TRUE(answer >= 0 || VLIBCErrGet() == code);
    }
}

TEST_F(AccountTest, Lists) {
    addUser("DOM\\dora", 20010, 20190);
    addGroup("DOM\\Domain Users", 20190, {});
    addGroup("Users", 20191, {});
    for (const auto& [user, entries, expected] : Rows<const char*, std::vector<const char*>, bool>{
             {"alice", {"bob", "ALICE"}, true},
             {"alice", {"alic", "alicex", "", "@", "+&", "*alice", "@alice", "users"}, false},
             {"alice", {"*"}, true},
             {"", {"*", ""}, false},
             {"\xC3\x89RIC", {"\xC3\xA9ric"}, true},
             {"alice", {"+&users"}, true},
             {"alice", {"@USERS"}, true},   // no group has this very spelling
             {"alice", {"@Users"}, false},  // one has, and alice is not in it
             {"nobody known", {"@users"}, false},
             {"nobody known", {"nobody known"}, true},
             {"DOM\\dora", {"dom\\DORA"}, true},
             {"DOM\\dora", {"dora"}, false},
             {"DOM\\dora", {"@dom\\domain users"}, true},
         })
        EXPECT_EQ(isIn(user, entries), expected) << user << ": " << entries.front();
}

TEST_F(AccountTest, Applications) {
    const auto list = vexo::parseApplications(
        "# c\n; c\n\n a.b : alice, @users \"x y\"\r\nnobodys:\n : x\nforgotten alice\na.b: *\nlast:bob");
    EXPECT_EQ(list.users.size(), 4U);
    EXPECT_EQ(list.users.at("a.b"), (std::vector<std::string>{"alice", "@users", "x y", "*"}));
    EXPECT_EQ(list.malformed, (std::vector<int>{6, 7}));
    EXPECT_EQ(VLIBUserPrivilegeHas("alice", "any"), 1) << "no file";
    writeRootFile("/etc/vexo/applications", "files: alice @administrators\nnobodys:\nforgotten bob\n");
    announceLog("line 3 of /etc/vexo/applications has no \"identifier:\"");
    const Rows<const char*, const char*, int> rows = {
        {"alice", "files", 1}, {"carol", "files", 1},   {"bob", "files", 0},     {"bob", "other", 1},
        {"bob", "FILES", 1},   {"alice", "nobodys", 0}, {"bob", "forgotten", 0}, {"", "other", 0},
        {nullptr, "other", 0}, {"alice", nullptr, 0}};
    for (const auto& [user, application, answer] : rows) {
        EXPECT_EQ(VLIBUserPrivilegeHas(user, application), answer)
            << testing::PrintToString(user) << testing::PrintToString(application);
    }
    writeRootFile("/etc/vexo/applications", "files: bob\n");
    EXPECT_EQ(VLIBUserPrivilegeHas("bob", "files"), 1);
    fs::remove(systemRoot() + "/etc/vexo/applications");
    makeFolder(systemRoot() + "/etc/vexo/applications");
    EXPECT_EQ(VLIBUserPrivilegeHas("bob", "files"), 0) << "what cannot be read allows nothing";
}

}  // namespace
