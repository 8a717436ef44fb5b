// Folders made with their parents.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <string>

#include "support/appliance.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"

namespace {

namespace fs = std::filesystem;

constexpr uid_t kKeepUser = static_cast<uid_t>(-1);
constexpr gid_t kKeepGroup = static_cast<gid_t>(-1);

class MakeFolderTest : public support::ApplianceTest {
 protected:
    struct stat statusOf(const std::string& path) {
        struct stat status {};
        EXPECT_EQ(lstat(path.c_str(), &status), 0) << path;
        return status;
    }
    std::string root_ = shareRoot("photo");
};

TEST_F(MakeFolderTest, OwnerAndModeGoToWhatItMadeAlone) {
    SKIP_WITHOUT_ROOT();
    support::makeFolder(root_ + "/old", 0711);
    const mode_t before = umask(077);
    EXPECT_EQ(
        VEXOFSMkdirP((root_ + "/old//new/deep/").c_str(), nullptr, 1, support::kAliceUid, support::kUsersGid, 0755), 0);
    umask(before);
    for (const char* made : {"/old/new", "/old/new/deep"}) {
        const struct stat status = statusOf(root_ + made);
        EXPECT_EQ(status.st_uid, support::kAliceUid);
        EXPECT_EQ(status.st_gid, support::kUsersGid);
        EXPECT_EQ(status.st_mode, mode_t{S_IFDIR | 0755});
    }
    EXPECT_EQ(statusOf(root_ + "/old").st_uid, 0U);
    EXPECT_EQ(statusOf(root_ + "/old").st_mode, mode_t{S_IFDIR | 0711});
    // Made already: success, and nothing changes.
    errno = 0;
    EXPECT_EQ(VEXOFSMkdirP((root_ + "/old/new").c_str(), nullptr, 1, support::kBobUid, support::kUsersGid, 0700), 0);
    EXPECT_EQ(errno, 0);
    EXPECT_EQ(statusOf(root_ + "/old/new").st_uid, support::kAliceUid);
    EXPECT_EQ(statusOf(root_ + "/old/new").st_mode, mode_t{S_IFDIR | 0755});
}

TEST_F(MakeFolderTest, KeepsTheSetGroupBitOfItsParent) {
    support::makeFolder(root_ + "/team", 02775);
    ASSERT_EQ(VEXOFSMkdirP((root_ + "/team/new").c_str(), nullptr, 0, kKeepUser, kKeepGroup, 0750), 0);
    EXPECT_EQ(statusOf(root_ + "/team/new").st_mode, mode_t{S_IFDIR | 02750});
}

TEST_F(MakeFolderTest, RefusalsTellWhereTheyStopped) {
    support::writeFile(root_ + "/file", "");
    support::makeFolder(root_ + "/elsewhere");
    fs::create_symlink(root_ + "/elsewhere/gone", root_ + "/dangling");
    fs::create_symlink(root_ + "/elsewhere", root_ + "/link");
    const std::string longName(256, 'n');
    const struct {
        std::string path, stopAt;
        int recursive, systemCode, code;
    } cases[] = {
        {root_ + "/a/b/c", "a/b/c", 0, ENOENT, VEXO_ERR_MISSING},
        {root_ + "/file/x", "file/x", 1, ENOTDIR, VEXO_ERR_BAD_PATH},
        {root_ + "/file", "file", 1, ENOTDIR, VEXO_ERR_BAD_PATH},
        {root_ + "/dangling/x", "dangling/x", 1, ENOTDIR, VEXO_ERR_BAD_PATH},
        {root_ + "/" + longName, longName, 1, ENAMETOOLONG, VEXO_ERR_NAME_TOO_LONG},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.path);
        const char* stopAt = nullptr;
        VLIBCErrSetEx(0, "", 0);
        EXPECT_LT(VEXOFSMkdirP(c.path.c_str(), &stopAt, c.recursive, kKeepUser, kKeepGroup, 0755), 0);
        EXPECT_EQ(errno, c.systemCode);
        EXPECT_EQ(VLIBCErrGet(), c.code);
        ASSERT_NE(stopAt, nullptr);
        EXPECT_EQ(std::string(stopAt), c.stopAt);
    }
    EXPECT_TRUE(fs::is_empty(root_ + "/elsewhere"));
    // An existing link to a folder counts as that folder.
    EXPECT_EQ(VEXOFSMkdirP((root_ + "/link/new").c_str(), nullptr, 0, kKeepUser, kKeepGroup, 0755), 0);
    EXPECT_TRUE(fs::is_directory(root_ + "/elsewhere/new"));
    for (const char* bad : {static_cast<const char*>(nullptr), ""}) {
        EXPECT_LT(VEXOFSMkdirP(bad, nullptr, 1, kKeepUser, kKeepGroup, 0755), 0);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    }
}

TEST_F(MakeFolderTest, AFolderThatCannotBeHandedOverIsNotLeft) {
    SKIP_WITHOUT_ROOT();
    const auto body = [&] {
        const char* stopAt = nullptr;
        const std::string path = root_ + "/mine";
        EXPECT_LT(VEXOFSMkdirP(path.c_str(), &stopAt, 1, support::kBobUid, support::kUsersGid, 0755), 0);
        EXPECT_EQ(errno, EPERM);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED);
        EXPECT_STREQ(stopAt, "mine");
        EXPECT_FALSE(fs::exists(path));
        EXPECT_EQ(VEXOFSMkdirP(path.c_str(), nullptr, 1, support::kAliceUid, support::kUsersGid, 0700), 0);
        return 0;
    };
    EXPECT_EQ(support::asUser(support::kAliceUid, support::kUsersGid, body), 0);
    EXPECT_EQ(statusOf(root_ + "/mine").st_uid, support::kAliceUid);
}

}  // namespace
