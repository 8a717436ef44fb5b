#include "orvel/privilege.h"

#include "orvel/privilege_reason.h"
#include "support/fault_sweep.h"
#include "support/testing.h"

namespace {

struct Answer {
    int result = 99, privilege = 99, mask = 99;
};

Answer ask(const char* path, const char* user, const char* sid = nullptr) {
    Answer out;
    out.result = OrvLibGetPrivilege(path, user, sid, &out.privilege, &out.mask);
    return out;
}

class PrivilegeTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addUser("CORP\\eve", 20010, kUsersGid);
        addUser("fay@corp", 20011, kUsersGid);
        addGroup("editors", 20110, {"bob", "CORP\\eve"});
        addShare("mixed",
                 "invalid users = bob\nwrite list = bob, alice, CORP\\eve\nread list = alice\nvexo:restriction = 5\n"
                 "valid users = alice, bob, CORP\\eve, fay@corp\n");
        addShare("drop", "write list = alice, carol\nvalid users = alice, bob, carol\nvexo:restriction = 2\n");
        addShare("quiet", "write list = alice, carol\nvalid users = alice, bob, carol\nvexo:restriction = 1\n");
        addShare("view", "write list = alice\nvalid users = alice, bob, @editors\nvexo:restriction = 4\n");
    }
};

TEST_F(PrivilegeTest, ListsAndMasks) {
    for (const auto& [path, user, privilege, mask] : rowsOf<const char*, const char*, int, int>("core/privileges")) {
        const Answer out = ask(path, user);
        EXPECT_EQ(std::tie(out.result, out.privilege, out.mask), std::make_tuple(0, privilege, mask)) << path << user;
    }
    int privilege = 99;
    EXPECT_EQ(OrvLibGetPrivilege("/photo", "bob", nullptr, &privilege, nullptr), 0);
    EXPECT_EQ(privilege, 1);
}

TEST_F(PrivilegeTest, RefusedLookups) {
    for (const auto& [path, user, code, log] :
         rowsOf<const char*, const char*, int, std::string>("core/refused_lookups")) {
        OrvLibSetErr(0);
        const Answer out = ask(path, user);
        EXPECT_EQ(std::tie(out.result, out.privilege, out.mask), std::make_tuple(-1, -1, 99));
        EXPECT_EQ(OrvLibGetErr(), code);
        EXPECT_EQ(takeLogText().substr(0, log.ends_with(' ') ? log.size() : std::string::npos), log);
    }
    int mask = 99;
    EXPECT_EQ(OrvLibGetPrivilege("/photo", "alice", nullptr, nullptr, &mask), -1);
    EXPECT_EQ(takeLogText(), "orveldir(#): bad parameter!");
}

TEST_F(PrivilegeTest, DomainAndDirectoryUsersWithASession) {
    for (const char* user : {"CORP\\eve", "fay@corp"}) {
        const bool domain = user[0] == 'C';
        const char* service = domain ? "VexoCgiDomGetPrivilege" : "VexoCgiLDAPGetPrivilege";
        vexo::gate::reset();
        EXPECT_EQ(ask("/mixed", user, nullptr).privilege, domain ? 2 : 1) << user;
        EXPECT_EQ(vexo::gate::calls(service), 0);
        EXPECT_EQ(ask("/mixed", user, "sid").privilege, domain ? 2 : 1) << user;
        EXPECT_EQ(vexo::gate::calls(service), 1);
        vexo::gate::fail(service, VEXO_ERR_GENERAL);
        EXPECT_CODE(ask("/mixed", user, "sid").result, -1, 402);
        vexo::gate::reset();
        vexo::gate::fail("DirectoryServer", VEXO_ERR_GENERAL);
        EXPECT_EQ(ask("/mixed", user, "sid").result, -1);
        EXPECT_EQ(OrvLibGetErr(), 406) << "the server was not reached";
    }
    vexo::gate::reset();
    EXPECT_EQ(ask("/photo", "alice", "sid").privilege, 2) << "a local user never asks a service";
    EXPECT_EQ(vexo::gate::calls("VexoCgiDomGetPrivilege") + vexo::gate::calls("VexoCgiLDAPGetPrivilege"), 0);
}

TEST_F(PrivilegeTest, HasPrivilegeIsExact) {
    EXPECT_EQ(OrvLibHasPrivilege("/photo", "alice", nullptr, 1), 0);
    OrvLibSetErr(408);
    EXPECT_CODE(OrvLibHasPrivilege("/photo", "bob", nullptr, 1), 1, 0);

    EXPECT_CODE(OrvLibHasPrivilege(nullptr, "alice", nullptr, 1), -1, 401);
    EXPECT_EQ(takeLogText(), "orveldir(#): bad parameter! username=alice, path=(null)");
    EXPECT_CODE(OrvLibHasPrivilege("/none", "alice", nullptr, 0), -1, 408);
    EXPECT_EQ(takeLogText(),
              "orveldir(#): VEXOShareGet none fail\norveldir(#): failed to get privilege of alice at /none");
}

TEST_F(PrivilegeTest, ListingAndDownloading) {
    for (const auto& [path, user, list, download] :
         rowsOf<const char*, const char*, bool, bool>("core/listing_rights")) {
        const std::string line = std::string("orveldir:# No privilege in path ") + path;
        OrvLibSetErr(7);
        EXPECT_EQ(CheckShareListPrivilege(user, nullptr, path), list) << path << user;
        EXPECT_EQ(OrvLibGetErr(), 7) << "a refused listing sets no code";
        EXPECT_EQ(takeLogText(), list ? "" : line);
        EXPECT_EQ(CheckShareDownloadPrivilege(user, nullptr, path), download) << path << user;
        EXPECT_EQ(OrvLibGetErr(), download ? 7 : 407);
        EXPECT_EQ(takeLogText(), download ? "" : line);
    }
    for (const auto check : {CheckShareListPrivilege, CheckShareDownloadPrivilege}) {
        OrvLibSetErr(7);
        for (const char* home : {"home", "/home", "/home/x"}) EXPECT_TRUE(check(nullptr, nullptr, home));
        EXPECT_FALSE(check("alice", nullptr, nullptr));
        EXPECT_EQ(OrvLibGetErr(), check == CheckShareListPrivilege ? 7 : 400);
        EXPECT_CODE(check("alice", nullptr, "/none"), false, 408);
        EXPECT_TRUE(takeLogText().ends_with("Gailed to check privilege of path /none, reason=[408] "));
    }
}

TEST_F(PrivilegeTest, Uploads) {
    for (const char* folder : {"photo", "drop", "quiet", "homes/bob"})
        writeFile(shareRoot("") + folder + "/there", "x");
    for (const auto& [path, user, mode, granted, modeAfter, code, log] :
         rowsOf<const char*, const char*, int, bool, int, int, const char*>("core/upload_privileges")) {
        SCOPED_TRACE(std::string(path != nullptr ? path : "null") + " mode " + std::to_string(mode));
        OrvLibSetErr(7);
        auto changed = static_cast<_tag__type_>(mode);
        EXPECT_EQ(CheckShareUploadPrivilege(user, nullptr, path, changed), granted);
        EXPECT_EQ(changed, modeAfter);
        EXPECT_EQ(OrvLibGetErr(), code);
        EXPECT_EQ(takeLogText(), log);
    }
}

// A fault never gives more than the user has, and always leaves a code when it is one.
TEST_F(PrivilegeTest, LookupUnderEveryFault) {
    for (const auto& [user, sid, privilege] :
         Rows<const char*, const char*, int>{{"alice", nullptr, 2}, {"CORP\\eve", "sid", 2}, {"bob", nullptr, 0}}) {
        const int faults = sweepFaults(VEXO_ERR_GENERAL, [&, name = user, session = sid, most = privilege](int nth) {
            OrvLibSetErr(0);
            const Answer out = ask("/mixed/x", name, session);
            if (out.result == 0) {
                EXPECT_LE(out.privilege, most);
            } else {
                EXPECT_NE(nth, 0);
                EXPECT_EQ(out.privilege, -1);
                EXPECT_EQ(out.mask, 99);
                const int code = OrvLibGetErr();
                EXPECT_TRUE(code == 401 || code == 402 || code == 406 || code == 408) << code;
            }
        });
        EXPECT_GE(faults, 4) << user;
    }
}

TEST_F(PrivilegeTest, Explanations) {
    PrivilegeReason reason;
    writeFile(shareRoot("mixed") + "/a", "x");
    addMount(shareRoot("view"), "nfs", "ro");
    ASSERT_TRUE(ExplainPrivilege("/mixed/a", "bob", nullptr, reason));
    EXPECT_EQ(reason.rule, PrivilegeRule::kNoAccess);
    EXPECT_TRUE(reason.inNoAccessList && reason.inReadWriteList && reason.inReadOnlyList);
    EXPECT_TRUE(reason.exists && !reason.remote && !reason.readOnly);
    EXPECT_EQ(std::tie(reason.privilege, reason.shareMask, reason.effectiveMask), std::make_tuple(0, 5U, 5U));
    EXPECT_EQ(reason.shareName + reason.fsType, "mixedext4");
    EXPECT_EQ(reason.realPath, reason.shareRoot + "/a");
    EXPECT_EQ(reason.aclBits, GetACLPrivilege((shareRoot("mixed") + "/a").c_str()));

    ASSERT_TRUE(ExplainPrivilege("/view", "bob", nullptr, reason));
    EXPECT_TRUE(reason.remote && reason.readOnly);
    EXPECT_FALSE(reason.exists) << "a server that may be dead is not asked";
    ASSERT_TRUE(ExplainPrivilege("/drop/none", "carol", nullptr, reason));
    EXPECT_TRUE(reason.administrator && !reason.exists && reason.shareMask == 2 && reason.effectiveMask == 0);
    ASSERT_TRUE(ExplainPrivilege("/mixed", "fay@corp", "sid", reason));
    EXPECT_EQ(reason.rule, PrivilegeRule::kService);
    makeFolder(shareRoot("homes") + "/alice");
    ASSERT_TRUE(ExplainPrivilege("/home/x", "alice", nullptr, reason));
    EXPECT_EQ(reason.rule, PrivilegeRule::kHome);
    // What lies outside the share, or is reached that way, is told to nobody; a link within it is.
    fs::create_symlink("/etc", shareRoot("mixed") + "/out");
    fs::create_symlink("a", shareRoot("mixed") + "/in");
    for (const auto& [path, seen] : Rows<std::string, bool>{
             row("/mixed/../../etc/passwd", false), row("/home/../../../etc/passwd", false), row("/mixed/out", false),
             row("/mixed/out/passwd", false), row("/mixed", true), row("/mixed/./in", true)}) {
        ASSERT_TRUE(ExplainPrivilege(path.c_str(), "alice", nullptr, reason)) << path;
        EXPECT_TRUE(reason.exists == seen && (reason.aclBits != 0) == seen && !reason.readOnly) << path;
    }
    vexo::gate::fail("VEXOACLFolderPermGet", VEXO_ERR_GENERAL, EIO);
    EXPECT_FALSE(ExplainPrivilege("/mixed/a", "alice", nullptr, reason)) << "rights that could not be asked";
    vexo::gate::reset();
    for (const auto& [path, code] : Rows<const char*, int>{{"/none", 408}, {nullptr, 401}})
        EXPECT_CODE(ExplainPrivilege(path, "alice", nullptr, reason), false, code);
    takeLog();
}

}  // namespace
