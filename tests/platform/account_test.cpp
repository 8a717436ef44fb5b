// Users and groups: from the system root's files and from NSS, remembered and read again, lists and applications.
#include "accounts/application_list.h"
#include "platform/trust.h"
#include "support/system_faults.h"
#include "vexo/user.h"

namespace {

std::string error(int code) {
    return "error " + std::to_string(code);
}

const std::string kUnknown = error(VEXO_ERR_USER_MISSING), kFailed = error(VEXO_ERR_GENERAL);

// "name uid gid type home expiry", or the error.
template <class Key>
std::string asked(int (*get)(Key, PVEXOUSER*), Key key) {
    PVEXOUSER user = nullptr;
    const bool found = get(key, &user) >= 0;
    EXPECT_EQ(found, user != nullptr);
    if (user == nullptr) return error(VLIBCErrGet());
    std::string text = user->szName;
    for (const long number : {long{user->uid}, long{user->gid}, long{user->authType}})
        text += ' ' + std::to_string(number);
    text += ' ' + std::string(user->szHome) + ' ' + std::to_string(user->expiry);
    VEXOUserFree(user);
    return text;
}

std::string userOf(const std::string& name) {
    return asked(VEXOUserGet, name.c_str());
}

std::string userOf(uid_t uid) {
    return asked(VEXOUserGetByUID, uid);
}

std::string groupsOf(const char* user) {
    PVLIBCSZLIST list = VLIBCSzListAlloc(512);
    std::string text = VEXOGroupInfoGetgroupList(user, &list, 0) < 0 ? error(VLIBCErrGet()) : joined(list);
    VLIBCSzListFree(list);
    return text;
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
    writeRootFile("/etc/shadow", "alice:x:1:0:9:7::20000:\nbob:x:1:0:9:7:::\n");
    const std::string homes = shareRoot("homes");
    for (const auto& [name, uid, rest] : Rows<std::string, uid_t, std::string>{
             {"alice", kAliceUid, "20100 0 " + homes + "/alice 20000"},
             {"bob", kBobUid, "20100 0 " + homes + "/bob -1"},
             {"DOM\\dora", 20010, "20100 1 " + homes + "/@DOM/dora -1"},
             {"dan@example.com", 20011, "20101 2 " + homes + "/dan@example.com -1"}}) {
        EXPECT_EQ(userOf(name), name + ' ' + std::to_string(uid) + ' ' + rest);
        EXPECT_EQ(userOf(uid), userOf(name));
        uid_t same = 0;
        EXPECT_EQ(VEXOUserGetUGID(name.c_str(), &same, nullptr), 0);
        EXPECT_EQ(same, uid);
    }
    for (const char* name : {"nobody known", "", "a/b", "..", "\\dora", "DOM\\..", "ALICE"}) {
        uid_t uid = 5;
        EXPECT_EQ(userOf(name), kUnknown) << name;
        EXPECT_EQ(VEXOUserGetUGID(name, &uid, nullptr), -1);
        EXPECT_EQ(uid, 5U);
    }
    for (const uid_t uid : {20020, 4242}) EXPECT_EQ(userOf(uid), kUnknown);
    EXPECT_EQ(userOf(longest + "y"), kFailed) << "never cut";
    EXPECT_TRUE(userOf(longest).starts_with(longest + ' '));
    // Those which can be no accounts are not listed either.
    const PVEXOUSERDB db = VEXOUserDBOpen();
    PVEXOUSER listed = nullptr;
    EXPECT_EQ(VEXOUserDBGetByCursor(db, &listed, AUTH_DOMAIN, 1), 0);
    EXPECT_STREQ(listed->szName, "DOM\\dora");
    EXPECT_EQ(VEXOUserDBGetByCursor(db, &listed, AUTH_DOMAIN, 1), 1);
    VEXOUserFree(listed);
    VEXOUserDBClose(db);
    writeRootFile("/etc/vexo/shares.conf", "");
    EXPECT_EQ(userOf("carol"), "carol 20003 20100 0  -1") << "no share homes";
}

TEST_F(AccountTest, Groups) {
    for (const auto& [name, gid] : Rows<const char*, gid_t>{{"again", kUsersGid}, {"a", 20170}, {"b", 20170}})
        addGroup(name, gid, {"bob", "alice"});
    EXPECT_EQ(groupsOf("alice"), "20100|20170|");
    EXPECT_EQ(groupsOf("nobody known"), kUnknown);
    writeRootFile("/etc/group", "g:x:30000:\ng:x:30001:\nh:x:30000:\n+:::\n");
    gid_t gid = 0;
    EXPECT_EQ(VEXOGroupGetGID("g", &gid), 0);
    EXPECT_EQ(gid, 30000U);
    for (const char* name : {"+", "G"}) EXPECT_NE(VEXOGroupGetGID(name, &gid), 0);
}

TEST_F(AccountTest, ChangedFilesAreReadAgain) {
    EXPECT_EQ(userOf(20050), kUnknown);
    addUser("dave", 20050, kUsersGid);
    EXPECT_TRUE(userOf("dave").starts_with("dave "));
    EXPECT_TRUE(userOf(20050).starts_with("dave "));
    addGroup("late", 20150, {"dave"});
    EXPECT_EQ(groupsOf("dave"), "20100|20150|");
    writeRootFile("/etc/shadow", "dave:x:::::::\n");
    EXPECT_TRUE(userOf("dave").ends_with(" -1"));
    writeRootFile("/etc/shadow", "dave:x::::::5:\n");
    EXPECT_TRUE(userOf("dave").ends_with(" 5"));
    // An id that nobody has is looked for once, however many files it owns.
    EXPECT_EQ(userOf(20060), kUnknown);
    fs::rename(systemRoot() + "/etc/passwd", systemRoot() + "/etc/moved");
    makeFolder(systemRoot() + "/etc/passwd");
    EXPECT_EQ(userOf(20060), kUnknown) << "the files are not looked at";
    EXPECT_EQ(userOf("alice"), kFailed);
    fs::remove(systemRoot() + "/etc/passwd");
    fs::rename(systemRoot() + "/etc/moved", systemRoot() + "/etc/passwd");
    EXPECT_TRUE(userOf("alice").starts_with("alice ")) << "a failure is not remembered";
}

// The machine's own users must not stand in for files that cannot be read.
TEST_F(AccountTest, UnreadableFilesAreAFailure) {
    SKIP_WITHOUT_ROOT();
    chmod((systemRoot() + "/etc/passwd").c_str(), 0600);
    asUser(kBobUid, kUsersGid, [] {
        for (const char* name : {"root", "nobody known"}) {
            EXPECT_EQ(userOf(name), kFailed);
            EXPECT_EQ(errno, EACCES);
        }
        EXPECT_EQ(VEXOGroupIsAdminGroupMem("carol"), -1);
        EXPECT_TRUE(VEXOUserDBOpen() == nullptr && VEXOGroupDBOpen() == nullptr);
        EXPECT_FALSE(isIn("bob", {"@users"}));
    });
}

TEST_F(AccountTest, WithoutFilesTheNameServicesAnswer) {
    fs::remove(systemRoot() + "/etc/group");
    for (int round = 0; round < 2; ++round) {  // the second time from memory
        EXPECT_TRUE(userOf("root").starts_with("root 0 0 0 "));
        EXPECT_TRUE(userOf(0).starts_with("root 0 0 0 "));
        EXPECT_EQ(userOf("nobody known"), kUnknown);
        EXPECT_TRUE(groupsOf("root").starts_with("0|"));
    }
}

TEST_F(AccountTest, ExpiryIsReadAsRootAfterTheSwitch) {
    SKIP_WITHOUT_ROOT();
    writeRootFile("/etc/shadow", "alice:x:1:0:9:7::77:\n");
    chmod((systemRoot() + "/etc/shadow").c_str(), 0600);
    actingForAlice([] { EXPECT_TRUE(userOf("alice").ends_with(" 77")); });
    asUser(kBobUid, kUsersGid,
           [] { EXPECT_TRUE(userOf("alice").ends_with(" -1")) << "unknown without the right to look"; });
    fs::remove(systemRoot() + "/etc/shadow");
    makeFolder(systemRoot() + "/etc/shadow");
    EXPECT_EQ(userOf("alice"), kFailed) << "that it has not ended is not known either";
    EXPECT_TRUE(userOf(kAliceUid).starts_with("alice ")) << "who it is, is";
    const long today = time(nullptr) / 86400;
    for (const long expiry : {-1L, today + 2}) EXPECT_EQ(VEXOUserIsExpired(expiry), 0);
    for (const long expiry : {0L, today}) EXPECT_EQ(VEXOUserIsExpired(expiry), 1);
}

TEST_F(AccountTest, Administrators) {
    addGroup("Managers", 20180, {"bob"});
    addUser("primary", 20014, kAdminGid);
    for (const auto& [user, group, answer] : rowsOf<const char*, const char*, int>("platform/administrators")) {
        if (group != nullptr) setSetting("admin_group", group);
        EXPECT_EQ(VEXOGroupIsAdminGroupMem(user), answer) << user;
        EXPECT_TRUE(answer >= 0 || VLIBCErrGet() == VEXO_ERR_USER_MISSING);
    }
    fs::remove(systemRoot() + "/etc/vexoinfo.conf");
    makeFolder(systemRoot() + "/etc/vexoinfo.conf");
    EXPECT_EQ(VEXOGroupIsAdminGroupMem("carol"), -1) << "which group it is cannot be determined";
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
}

TEST_F(AccountTest, Lists) {
    addUser("DOM\\dora", 20010, 20190);
    addGroup("DOM\\Domain Users", 20190, {});
    addGroup("Users", 20191, {});
    for (const auto& [user, entries, expected] :
         rowsOf<const char*, std::vector<const char*>, bool>("platform/user_lists"))
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
    for (const auto& [user, application, answer] : Rows<const char*, const char*, int>{
             row("alice", "files", 1), row("carol", "files", 1), row("bob", "files", 0), row("bob", "FILES", 1),
             row("alice", "nobodys", 0), row("bob", "forgotten", 0), row("", "other", 0)})
        EXPECT_EQ(VLIBUserPrivilegeHas(user, application), answer) << user << application;
    writeRootFile("/etc/vexo/applications", "files: bob\n");
    EXPECT_EQ(VLIBUserPrivilegeHas("bob", "files"), 1);
    fs::remove(systemRoot() + "/etc/vexo/applications");
    makeFolder(systemRoot() + "/etc/vexo/applications");
    EXPECT_EQ(VLIBUserPrivilegeHas("bob", "files"), 0) << "what cannot be read allows nothing";
}

// "No" and "could not be determined" are one answer, which ends a visitor's session: what may pass is asked again.
TEST_F(AccountTest, ReadErrorsThatPassAreNoAnswer) {
    const std::string applications = "/etc/vexo/applications";
    writeRootFile(applications, "files: alice @administrators\n");
    for (const auto& [error, times, passes] : Rows<int, int, bool>{
             row(EIO, 1, true), row(EIO, 2, true), row(ENOMEM, 2, true), row(EIO, 3, false), row(EACCES, 1, false)}) {
        SCOPED_TRACE(std::to_string(error) + " " + std::to_string(times));
        for (const char* file : {"/etc/passwd", "/etc/group", "/etc/vexo/applications"}) {
            fs::last_write_time(systemRoot() + file, fs::file_time_type::clock::now() - std::chrono::hours(times));
            const OpeningFault fault(systemRoot() + file, error, times);
            const bool isUser = strcmp(file, "/etc/passwd") == 0;
            EXPECT_EQ(isUser ? userOf("carol").starts_with("carol ") : VLIBUserPrivilegeHas("carol", "files") == 1,
                      passes)
                << file;
        }
    }
}

}  // namespace
