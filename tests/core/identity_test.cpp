#include "orvel/identity.h"

#include <grp.h>

#include "support/testing.h"
#include "vexo/session.h"

namespace {

std::vector<gid_t> groupList() {
    std::vector<gid_t> groups(static_cast<std::size_t>(getgroups(0, nullptr)));
    groups.resize(static_cast<std::size_t>(getgroups(static_cast<int>(groups.size()), groups.data())));
    std::sort(groups.begin(), groups.end());
    return groups;
}

class IdentityTest : public ApplianceTest {};

TEST_F(IdentityTest, UsersActAsThemselves) {
    SKIP_WITHOUT_ROOT();
    addGroup("editors", 20110, {"alice"});
    const std::string mine = shareRoot("photo") + "/mine", foreign = shareRoot("photo") + "/foreign",
                      shared = shareRoot("photo") + "/shared";
    for (const auto& path : {mine, foreign, shared}) writeFile(path, "x", 0600);
    ASSERT_EQ(chown(mine.c_str(), kAliceUid, kUsersGid), 0);
    ASSERT_EQ(chown(shared.c_str(), 0, 20110), 0);
    ASSERT_EQ(chmod(shared.c_str(), 0640), 0);

    inChild([&] {
        EXPECT_EQ(OrvLibUGIDSet(nullptr, "alice"), 0);
        EXPECT_EQ(geteuid(), kAliceUid);
        EXPECT_EQ(getegid(), gid_t{kUsersGid});
        EXPECT_EQ(groupList(), (std::vector<gid_t>{kUsersGid, 20110}));
        const auto canRead = [](const std::string& path) {
            return faccessat(AT_FDCWD, path.c_str(), R_OK, AT_EACCESS);
        };
        EXPECT_EQ(canRead(mine) + canRead(shared), 0);
        EXPECT_EQ(canRead(foreign), -1);
    });
    inChild([&] {  // an administrator stays root, with the groups of its own
        EXPECT_EQ(OrvLibUGIDSet(nullptr, "carol"), 0);
        EXPECT_EQ(geteuid(), 0U);
        EXPECT_EQ(getegid(), gid_t{kUsersGid});
        EXPECT_EQ(groupList(), (std::vector<gid_t>{kUsersGid, kAdminGid}));
    });
}

TEST_F(IdentityTest, RefusedArguments) {
    for (const auto& [code, log, call] : Rows<int, std::string, std::function<int()>>{
             {400, "orveluser:", [] { return OrvLibUGIDSet("s", nullptr); }},
             {403, "Failed to get GID for user=nobody-here", [] { return OrvLibUGIDSet(nullptr, "nobody-here"); }},
             {403, "user=nobody-here, sid=none", [] { return OrvLibUGIDSet("none", "nobody-here"); }},
             {400, "bad parameter", [] { return OrvLibEGIDSet(nullptr, "alice", static_cast<gid_t>(-1)); }},
             {401, "", [] { return OrvLibEGIDSet("none", "alice", static_cast<gid_t>(-1)); }},
             {400, "bad parameter", [] { return OrvLibEUIDSet("s", nullptr, 1); }},
             {400, "bad parameter", [] { return OrvLibEUIDSet(nullptr, "alice", static_cast<uid_t>(-1)); }},
             {401, "(nobody-here) failed. [0x1D00 ", [] { return OrvLibEUIDSet(nullptr, "nobody-here", 1); }},
             {401, "", [] { return OrvLibEUIDSet("none", "alice", static_cast<uid_t>(-1)); }}}) {
        OrvLibSetErr(0);
        if (!log.empty()) announceLog(log);
        EXPECT_EQ(call(), -1);
        EXPECT_EQ(OrvLibGetErr(), code) << log;
    }
    EXPECT_EQ(vexo::gate::calls("VEXOGroupIsAdminGroupMem"), 4) << "asked before the arguments are looked at";
    vexo::gate::reset();
    vexo::gate::fail("VexoCgiGIDGet", VEXO_ERR_GENERAL);
    vexo::gate::fail("VEXOUserGetUGID", VEXO_ERR_GENERAL);
    announceLog("Failed to get GID for user=alice, sid=s");
    EXPECT_EQ(OrvLibUGIDSet("s", "alice"), -1);
    EXPECT_EQ(OrvLibGetErr(), 401) << "only an unknown user is 403";
    EXPECT_EQ(vexo::gate::calls("VEXOUserGetUGID"), 1) << "asked once the session failed";
}

// A session of `user`, as a request that the web server let in gets it.
std::string sessionOf(const char* user) {
    setenv("REMOTE_USER", user, 1);
    WebMan web;
    EXPECT_TRUE(web.IsAuthorized("app", 15, CGI_POSITION_DESKTOP));
    unsetenv("REMOTE_USER");
    return web.GetSessionId();
}

TEST_F(IdentityTest, TheSessionTellsBothIds) {
    SKIP_WITHOUT_ROOT();
    const std::string sid = sessionOf("alice");
    inChild([&] {
        vexo::gate::reset();
        EXPECT_EQ(OrvLibUGIDSet(sid.c_str(), "alice"), 0);
        EXPECT_EQ(vexo::gate::calls("VexoCgiGIDGet"), 1);
        EXPECT_EQ(vexo::gate::calls("VexoCgiUIDGet"), 1) << "the uid is not read from the user source";
    });
    inChild([&] {
        vexo::gate::fail("VexoCgiUIDGet", VEXO_ERR_GENERAL);
        EXPECT_CODE(OrvLibUGIDSet(sid.c_str(), "alice"), -1, 401);
        EXPECT_EQ(takeLogText(), "orveluser:# Failed to set UID for user=alice, sid=" + sid);
    });
}

// Whatever fails, success means that nothing of root is left.
TEST_F(IdentityTest, SwitchUnderEveryFault) {
    SKIP_WITHOUT_ROOT();
    const std::string session = sessionOf("alice");
    for (const char* sid : {static_cast<const char*>(nullptr), session.c_str()}) {
        const auto meetsFault = [&](int nth) {
            SCOPED_TRACE("call " + std::to_string(nth) + " fails");
            const gid_t roots[] = {0, 4};
            EXPECT_EQ(setgroups(2, roots), 0);
            vexo::gate::reset();
            vexo::gate::fail("*", VEXO_ERR_GENERAL, EIO, nth);
            if (OrvLibUGIDSet(sid, "alice") != 0) {
                EXPECT_EQ(OrvLibGetErr(), 401);
            } else {
                EXPECT_EQ(std::make_tuple(geteuid(), getegid()), std::make_tuple(kAliceUid, kUsersGid));
                for (const gid_t gid : groupList()) EXPECT_EQ(gid, gid_t{kUsersGid});
            }
            return vexo::gate::calls("*") >= nth ? 1 : 0;
        };
        int nth = 1;
        while (nth < 50 && inChild([&] { return meetsFault(nth); }) == 1) ++nth;
        EXPECT_TRUE(nth > 3 && nth < 50) << nth;
    }
}

TEST_F(IdentityTest, FailedGroupListIsLoggedAndLeavesNoneOfRoots) {
    SKIP_WITHOUT_ROOT();
    inChild([&] {
        const gid_t roots[] = {0, 4, 27};
        EXPECT_EQ(setgroups(3, roots), 0);
        vexo::gate::fail("VEXOUserInitGroups", VEXO_ERR_GENERAL, EPERM);
        EXPECT_EQ(OrvLibUGIDSet(nullptr, "alice"), 0);
        EXPECT_EQ(geteuid(), kAliceUid);
        EXPECT_EQ(groupList(), std::vector<gid_t>{});
        EXPECT_EQ(takeLogText(), "orveluser:# Failed to initgroup for user=alice, sid=(null)");
    });
}

TEST_F(IdentityTest, HandOver) {
    SKIP_WITHOUT_ROOT();
    const std::string file = shareRoot("photo") + "/f", link = shareRoot("photo") + "/link",
                      target = shareRoot("photo") + "/target";
    writeFile(file, "x");
    writeFile(target, "x");
    ASSERT_EQ(symlink(target.c_str(), link.c_str()), 0);

    const auto ownerOf = [](const std::string& path) { return statusOf(path).st_uid; };
    EXPECT_EQ(OrvLibChown2Admin(file.c_str(), "alice"), 0);
    EXPECT_EQ(ownerOf(file), kAliceUid);
    EXPECT_EQ(OrvLibChown2Admin(link.c_str(), "alice"), 0);
    EXPECT_EQ(ownerOf(link), kAliceUid);
    EXPECT_EQ(ownerOf(target), 0U) << "a link is never followed";
    EXPECT_EQ(OrvLibChown2Admin(file.c_str(), "nobody-here"), -1);

    announceLog("orveluser(");
    EXPECT_EQ(OrvLibChown2Admin(nullptr, "alice"), -1);
    announceLog("owner to admin fail(No such file or directory)");
    EXPECT_EQ(OrvLibChown2Admin((shareRoot("photo") + "/none").c_str(), "alice"), -1);
    vexo::gate::fail("VEXOGetFSType", VEXO_ERR_GENERAL, EIO);
    announceLog("(orveluser) : failed to get file-system type dir = " + file);
    EXPECT_EQ(OrvLibChown2Admin(file.c_str(), "alice"), -1);
    vexo::gate::reset();

    for (const char* type : {"vfat", "nfs", "iso9660"}) {
        addMount(file, type);
        EXPECT_EQ(OrvLibChown2Admin(file.c_str(), "bob"), 0) << type;
        EXPECT_EQ(ownerOf(file), kAliceUid) << "owners are not kept on " << type;
    }
}

}  // namespace
