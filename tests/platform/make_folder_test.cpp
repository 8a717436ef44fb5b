// Folders made with their parents.
#include "support/testing.h"
#include "vexo/filesystem.h"

namespace {

constexpr uid_t kKeepUser = static_cast<uid_t>(-1);
constexpr gid_t kKeepGroup = static_cast<gid_t>(-1);

class MakeFolderTest : public ApplianceTest {
 protected:
    // "uid mode" of a folder.
    std::string textOf(const std::string& path) {
        struct stat status {};
        EXPECT_EQ(lstat((root_ + path).c_str(), &status), 0) << path;
        return std::to_string(status.st_uid) + (status.st_gid == kUsersGid ? " users " : " ") +
               std::to_string(status.st_mode);
    }
    static std::string expected(uid_t uid, mode_t mode) {
        return std::to_string(uid) + (uid == 0 ? " " : " users ") + std::to_string(S_IFDIR | mode);
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
    for (const char* made : {"/old/new", "/old/new/deep"}) EXPECT_EQ(textOf(made), expected(kAliceUid, 0755));
    EXPECT_EQ(textOf("/old"), expected(0, 0711));
    // Made already: success, and nothing changes.
    errno = 0;
    EXPECT_EQ(make("/old/new", kBobUid, 0700), 0);
    EXPECT_EQ(errno, 0);
    EXPECT_EQ(textOf("/old/new"), expected(kAliceUid, 0755));
    makeFolder(root_ + "/team", 02775);
    ASSERT_EQ(make("/team/new", kKeepUser, 0750, 0), 0);
    EXPECT_EQ(textOf("/team/new"), expected(0, 02750)) << "the set-group bit of its parent stays";
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
    for (const char* bad : {static_cast<const char*>(nullptr), ""}) {
        EXPECT_LT(VEXOFSMkdirP(bad, nullptr, 1, kKeepUser, kKeepGroup, 0755), 0);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    }
}

TEST_F(MakeFolderTest, AFolderThatCannotBeHandedOverIsNotLeft) {
    SKIP_WITHOUT_ROOT();
    const auto body = [&] {
        const char* stopAt = "";
        const std::string path = root_ + "/mine";
        EXPECT_FAILS(VEXOFSMkdirP(path.c_str(), &stopAt, 1, kBobUid, kUsersGid, 0755), EPERM, VEXO_ERR_DENIED);
        EXPECT_STREQ(stopAt, "mine");
        EXPECT_FALSE(fs::exists(root_ + "/mine"));
        return make("/mine", kAliceUid, 0700);
    };
    EXPECT_EQ(asUser(kAliceUid, kUsersGid, body), 0);
    EXPECT_EQ(textOf("/mine"), expected(kAliceUid, 0700));
}

}  // namespace
