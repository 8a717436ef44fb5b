// Folders made with their parents.
#include "support/testing.h"
#include "vexo/filesystem.h"

namespace {

constexpr uid_t kKeepUser = static_cast<uid_t>(-1);
constexpr gid_t kKeepGroup = static_cast<gid_t>(-1);

class MakeFolderTest : public ApplianceTest {
 protected:
    void expectFolder(const std::string& path, uid_t uid, mode_t mode) {
        const struct stat status = statusOf(root_ + path);
        EXPECT_EQ(status.st_mode, mode_t{S_IFDIR | mode}) << path;
        EXPECT_EQ(status.st_uid, uid) << path;
        EXPECT_EQ(status.st_gid == kUsersGid, uid != 0) << path;
    }
    int make(const std::string& path, uid_t uid, mode_t mode, int recursive = 1) {
        const gid_t gid = uid == kKeepUser ? kKeepGroup : gid_t{kUsersGid};
        return VEXOFSMkdirP((root_ + path).c_str(), nullptr, recursive, uid, gid, mode);
    }
    std::string root_ = shareRoot("photo");
};

TEST_F(MakeFolderTest, OwnerAndModeGoToWhatItMadeAlone) {
    SKIP_WITHOUT_ROOT();
    makeFolder(root_ + "/old", 0711);
    const mode_t before = umask(077);
    EXPECT_EQ(make("/old//new/deep/", kAliceUid, 0755), 0);
    umask(before);
    errno = 0;
    EXPECT_EQ(make("/old/new", kBobUid, 0700), 0) << "made already, and nothing changes";
    EXPECT_EQ(errno, 0);
    for (const char* made : {"/old/new", "/old/new/deep"}) expectFolder(made, kAliceUid, 0755);
    expectFolder("/old", 0, 0711);
    makeFolder(root_ + "/team", 02775);
    ASSERT_EQ(make("/team/new", kKeepUser, 0750, 0), 0);
    expectFolder("/team/new", 0, 02750);  // the set-group bit of its parent stays
    asUser(kAliceUid, kUsersGid, [&] {
        const char* stopAt = "";
        const std::string path = root_ + "/mine";
        EXPECT_FAILS(VEXOFSMkdirP(path.c_str(), &stopAt, 1, kBobUid, kUsersGid, 0755), EPERM, VEXO_ERR_DENIED);
        EXPECT_STREQ(stopAt, "mine");
        EXPECT_FALSE(fs::exists(path)) << "what cannot be handed over is not left";
        return make("/mine", kAliceUid, 0700);
    });
    expectFolder("/mine", kAliceUid, 0700);
}

TEST_F(MakeFolderTest, RefusalsTellWhereTheyStopped) {
    writeFile(root_ + "/file", "");
    makeFolder(root_ + "/elsewhere");
    fs::create_symlink(root_ + "/elsewhere/gone", root_ + "/dangling");
    fs::create_symlink(root_ + "/elsewhere", root_ + "/link");
    const std::string longName(256, 'n');
    for (const auto& [name, recursive, systemCode, code] : Rows<std::string, int, int, int>{
             row("a/b/c", 0, ENOENT, VEXO_ERR_MISSING), row("file/x", 1, ENOTDIR, VEXO_ERR_BAD_PATH),
             row("file", 1, ENOTDIR, VEXO_ERR_BAD_PATH), row("dangling/x", 1, ENOTDIR, VEXO_ERR_BAD_PATH),
             row(longName, 1, ENAMETOOLONG, VEXO_ERR_NAME_TOO_LONG)}) {
        const char* stopAt = "";
        const std::string path = root_ + "/" + name;
        EXPECT_FAILS(VEXOFSMkdirP(path.c_str(), &stopAt, recursive, kKeepUser, kKeepGroup, 0755), systemCode, code);
        EXPECT_EQ(stopAt, name);
    }
    EXPECT_TRUE(fs::is_empty(root_ + "/elsewhere"));
    EXPECT_EQ(make("/link/new", kKeepUser, 0755, 0), 0) << "an existing link to a folder counts as that folder";
    EXPECT_TRUE(fs::is_directory(root_ + "/elsewhere/new"));
}

}  // namespace
