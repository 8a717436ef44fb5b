#include "orvel/privilege.h"
#include "support/testing.h"

namespace {

class AclPrivilegeTest : public ApplianceTest {};

TEST_F(AclPrivilegeTest, FailuresOfThePlatform) {
    for (const auto& [platform, result, code, accessLogs, getLogs] :
         rowsOf<int, int, int, bool, bool>("core/acl_failures")) {
        char reason[8];
        snprintf(reason, sizeof reason, "%X", static_cast<unsigned>(platform));
        vexo::gate::reset();
        vexo::gate::fail("VEXOACLPermGet", platform);
        OrvLibSetErr(7);
        EXPECT_EQ(ACLAccess("/tmp", 31), result) << reason;
        EXPECT_EQ(OrvLibGetErr(), code) << reason;
        const std::string start = "orveldir:# Failed to get the ACL Privilege: file = /tmp, ";
        EXPECT_EQ(takeLogText(), accessLogs ? start + "reason=[" + reason + "]" : "");

        EXPECT_EQ(GetACLPrivilege("/tmp"), 0x1FFFU);
        const std::string line = start + "euid = " + std::to_string(geteuid()) + ", reason=[" + reason + "]";
        EXPECT_EQ(takeLogText(), getLogs ? line : "") << reason;
    }
    OrvLibSetErr(7);
    EXPECT_EQ(ACLAccess(nullptr, 1), -1);
    EXPECT_CODE(ACLAccess("/tmp", 0), -1, 7);
}

TEST_F(AclPrivilegeTest, PermissionsOfTheCaller) {
    SKIP_WITHOUT_ROOT();
    const std::string folder = shareRoot("photo") + "/d", file = folder + "/f";
    makeFolder(folder, 0755);
    writeFile(file, "x", 0644);
    ASSERT_EQ(chown(file.c_str(), kAliceUid, kUsersGid), 0);
    asUser(kAliceUid, kUsersGid, [&] {
        EXPECT_EQ(GetACLPrivilege(file.c_str()), 0xEU) << "no delete: the folder is not hers";
        EXPECT_EQ(ACLAccess(file.c_str(), ORV_ACCESS_READ | ORV_ACCESS_WRITE | ORV_ACCESS_APPEND), 0);
        VLIBCErrSetEx(0, "", 0);
        EXPECT_CODE(ACLAccess(file.c_str(), ORV_ACCESS_READ | ORV_ACCESS_DELETE), -1, 407);
        EXPECT_EQ(VLIBCErrGet(), 0x0300);
    });
    asUser(kBobUid, kUsersGid, [&] {
        EXPECT_EQ(ACLAccess(file.c_str(), ORV_ACCESS_READ), 0);
        EXPECT_EQ(ACLAccess(file.c_str(), ORV_ACCESS_WRITE), -1);
    });
}

TEST_F(AclPrivilegeTest, EnteringAFolder) {
    writeFile(photo_ + "/file", "x");
    EXPECT_FALSE(CheckDirListPrivilege(nullptr));
    for (const auto& [path, code, failure] :
         Rows<std::string, int, int>{{photo_ + "/none", 408, ENOENT},
                                     {photo_ + "/file", 408, ENOTDIR},
                                     {photo_ + "/" + std::string(300, 'x'), 402, ENAMETOOLONG}}) {
        OrvLibSetErr(7);
        EXPECT_CODE(CheckDirListPrivilege(path.c_str()), false, code);
        EXPECT_EQ(takeLogText(), "orveldir:# Failed to chdir " + path + ". [" + strerror(failure) + "]");
    }
    OrvLibSetErr(7);
    EXPECT_CODE(CheckDirListPrivilege(photo_.c_str()), true, 0);
    EXPECT_EQ(fs::current_path(), photo_) << "callers go on from inside the folder";
    const orvel::Descriptor opened(open((photo_ + "/file").c_str(), O_PATH | O_CLOEXEC));
    fs::rename(photo_ + "/file", photo_ + "/moved");
    makeFolder(photo_ + "/file");
    EXPECT_FALSE(CheckDirListPrivilege(opened.path().c_str())) << "what is open is asked about";
    EXPECT_EQ(takeLogText(), "orveldir:# Failed to chdir " + photo_ + "/moved. [Not a directory]");

    SKIP_WITHOUT_ROOT();
    const std::string closed = photo_ + "/closed", unread = photo_ + "/unread";
    makeFolder(closed, 0700);
    makeFolder(unread, 0711);
    asUser(kBobUid, kUsersGid, [&] {
        EXPECT_CODE(CheckDirListPrivilege(closed.c_str()), false, 407);
        EXPECT_EQ(takeLogText(), "orveldir:# Failed to chdir " + closed + ". [Permission denied]");
        EXPECT_CODE(CheckDirListPrivilege(unread.c_str()), false, 407);
        EXPECT_EQ(takeLogText(), "orveldir:# Failed to opendir " + unread + ". [Permission denied]");
        EXPECT_EQ(fs::current_path(), unread);
    });
}

}  // namespace
