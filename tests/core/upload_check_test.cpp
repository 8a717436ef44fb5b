#include "orvel/upload_check.h"

#include "support/testing.h"

namespace {

constexpr auto kError = static_cast<_tag__type_>(0);

class UploadCheckTest : public ApplianceTest {};

TEST(UploadErrors, Table) {
    const int codes[] = {401, 1803, 401, 401, 415, 412, 401, 1802, 1801, 1800, 1800, 408, 411, 416, 407, 401};
    for (int error = -15; error <= 0; ++error)
        EXPECT_EQ(ConvUploadErrnoToAPIErr(static_cast<_tag_cgi_upload_errno_>(error)), codes[error + 15]) << error;
}

TEST_F(UploadCheckTest, CopyFailuresHaveCodesOfTheirOwn) {
    for (const auto& [platformError, code] : rowsOf<int, int>("core/copy_failures")) {
        vexo::gate::fail("VEXOFileCopy", platformError);
        announceLog("Failed to copy /a to /b, reason=[");
        EXPECT_FALSE(MoveFile("alice", "/a", "/b", nullptr));
        EXPECT_EQ(OrvLibGetErr(), code) << platformError;
        vexo::gate::reset();
    }
    OrvLibSetErr(7);
    EXPECT_FALSE(MoveFile("alice", nullptr, "/b", nullptr));
    EXPECT_FALSE(MoveFile("alice", "/a", nullptr, nullptr));
    announceLog("Failed to get user data");
    EXPECT_FALSE(MoveFile("nobody-here", "/a", "/b", nullptr));
    EXPECT_EQ(OrvLibGetErr(), 7) << "these set no code";
}

TEST_F(UploadCheckTest, MoveGivesTheFileToItsUser) {
    SKIP_WITHOUT_ROOT();
    const std::string source = shareRoot("photo") + "/src", target = shareRoot("photo") + "/dst";
    writeFile(source, "data", 0600);
    ASSERT_TRUE(MoveFile("alice", source.c_str(), target.c_str(), nullptr));
    EXPECT_EQ(std::make_tuple(statusOf(target).st_uid, statusOf(target).st_gid), std::make_tuple(kAliceUid, kUsersGid));
    EXPECT_EQ(readFile(target), "data");
    EXPECT_FALSE(fs::exists(source)) << "taken, not copied";

    writeFile(source, "data", 0600);
    announceLog("reason=[A400]");
    EXPECT_CODE(MoveFile("alice", source.c_str(), (target + "2").c_str(), [] { return 1; }), false, 1804);
    EXPECT_NE(access((target + "2").c_str(), F_OK), 0);
}

// CheckFile changes the identity for good: each case in a process of its own.
TEST_F(UploadCheckTest, CheckedInOrder) {
    SKIP_WITHOUT_ROOT();
    writeFile(photo_ + "/there", "x", 0666);
    makeFolder(photo_ + "/closed", 0755);
    addShare("fixed", "read only = no\nvexo:restriction = 2\n");
    for (const auto& [user, path, before, result, switched, log, after] :
         rowsOf<const char*, const char*, int, int, bool, const char*, int>("core/checked_files")) {
        SCOPED_TRACE(path);
        int mode = before;
        inChild([&, path = path, user = user, result = result, switched = switched, log = log, after = after] {
            OrvLibSetErr(0);
            auto changed = static_cast<_tag__type_>(mode);
            EXPECT_EQ(CheckFile(path, user, nullptr, changed), result);
            EXPECT_TRUE(result == 0 || OrvLibGetErr() == result);
            EXPECT_EQ(geteuid() != 0, switched);
            EXPECT_EQ(static_cast<int>(changed), after);
            EXPECT_NE(takeLogText().find(log), std::string::npos) << log;
        });
    }
}

// The look-up of permissions can fail without a code; what was stored before is answered then, but never "acceptable".
TEST_F(UploadCheckTest, ARefusalIsNeverZero) {
    for (const auto& [before, answer, log] : Rows<int, int, const char*>{{0, 401, "reason=[191]"}, {7, 7, "=[7]"}})
        inChild([before = before, answer = answer, log = log] {
            OrvLibSetErr(before);
            vexo::gate::fail("VEXOACLPermGet", VEXO_ERR_GENERAL);
            auto mode = kError;
            EXPECT_EQ(CheckFile("/photo/a", "alice", nullptr, mode), answer);
            EXPECT_TRUE(OrvLibGetErr() == answer && takeLogText().ends_with(log));
        });
}

TEST_F(UploadCheckTest, ASwitchThatLeavesRootIsRefused) {
    SKIP_WITHOUT_ROOT();
    addUser("toor", 0, 0);
    addShare("open", "read only = no\n");
    inChild([] {
        OrvLibSetErr(5);
        auto mode = kError;
        EXPECT_EQ(CheckFile("/open/a", "toor", nullptr, mode), 401);
        const std::string log = takeLogText();
        EXPECT_NE(log.find("left the process at uid 0"), std::string::npos) << log;
        EXPECT_NE(log.find("Failed to set UGID for user=toor, sid=(null)"), std::string::npos) << log;
    });
}

}  // namespace
