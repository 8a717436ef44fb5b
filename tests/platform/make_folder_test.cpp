// Folders made with their parents.
#include "support/testing.h"
#include "vexo/filesystem.h"
#include "vexo/user.h"

namespace {

constexpr uid_t kKeepUser = static_cast<uid_t>(-1);
constexpr gid_t kKeepGroup = static_cast<gid_t>(-1);

class MakeFolderTest : public ApplianceTest {
 protected:
    void expectFolder(const std::string& path, uid_t uid, mode_t mode) {
        const struct stat status = statusOf(photo_ + path);
        EXPECT_EQ(status.st_mode, mode_t{S_IFDIR | mode}) << path;
        EXPECT_EQ(status.st_uid, uid) << path;
        EXPECT_EQ(status.st_gid == kUsersGid, uid != 0) << path;
    }
    int make(const std::string& path, uid_t uid, mode_t mode, int recursive = 1) {
        const gid_t gid = uid == kKeepUser ? kKeepGroup : gid_t{kUsersGid};
        return VEXOFSMkdirP((photo_ + path).c_str(), nullptr, recursive, uid, gid, mode);
    }
};

TEST_F(MakeFolderTest, OwnerAndModeGoToWhatItMadeAlone) {
    SKIP_WITHOUT_ROOT();
    makeFolder(photo_ + "/old", 0711);
    const mode_t before = umask(077);
    EXPECT_EQ(make("/old//new/deep/", kAliceUid, 0755), 0);
    umask(before);
    errno = 0;
    EXPECT_EQ(make("/old/new", kBobUid, 0700), 0) << "made already, and nothing changes";
    EXPECT_EQ(errno, 0);
    for (const char* made : {"/old/new", "/old/new/deep"}) expectFolder(made, kAliceUid, 0755);
    expectFolder("/old", 0, 0711);
    makeFolder(photo_ + "/team", 02775);
    ASSERT_EQ(make("/team/new", kKeepUser, 0750, 0), 0);
    expectFolder("/team/new", 0, 02750);  // the set-group bit of its parent stays
    asUser(kAliceUid, kUsersGid, [&] {
        const char* stopAt = "";
        const std::string path = photo_ + "/mine";
        EXPECT_FAILS(VEXOFSMkdirP(path.c_str(), &stopAt, 1, kBobUid, kUsersGid, 0755), EPERM, VEXO_ERR_DENIED);
        EXPECT_STREQ(stopAt, "mine");
        EXPECT_EQ(std::distance(fs::directory_iterator(photo_), {}), 2) << "what cannot be handed over is not left";
        return make("/mine", kAliceUid, 0700);
    });
    expectFolder("/mine", kAliceUid, 0700);
}

TEST_F(MakeFolderTest, RefusalsTellWhereTheyStopped) {
    writeFile(photo_ + "/file", "");
    makeFolder(photo_ + "/elsewhere");
    fs::create_symlink(photo_ + "/elsewhere/gone", photo_ + "/dangling");
    fs::create_symlink(photo_ + "/elsewhere", photo_ + "/link");
    const std::string longName(256, 'n');
    for (const auto& [name, recursive, systemCode, code] : Rows<std::string, int, int, int>{
             row("a/b/c", 0, ENOENT, VEXO_ERR_MISSING), row("file/x", 1, ENOTDIR, VEXO_ERR_BAD_PATH),
             row("file", 1, ENOTDIR, VEXO_ERR_BAD_PATH), row("dangling/x", 1, ENOTDIR, VEXO_ERR_BAD_PATH),
             row(longName, 1, ENAMETOOLONG, VEXO_ERR_NAME_TOO_LONG)}) {
        const char* stopAt = "";
        const std::string path = photo_ + "/" + name;
        EXPECT_FAILS(VEXOFSMkdirP(path.c_str(), &stopAt, recursive, kKeepUser, kKeepGroup, 0755), systemCode, code);
        EXPECT_EQ(stopAt, name);
    }
    EXPECT_TRUE(fs::is_empty(photo_ + "/elsewhere"));
    EXPECT_EQ(make("/link/new", kKeepUser, 0755, 0), 0) << "an existing link to a folder counts as that folder";
    EXPECT_TRUE(fs::is_directory(photo_ + "/elsewhere/new"));
}

// What the file manager shows of a folder.
std::vector<std::string> shownIn(const std::string& folder) {
    std::vector<std::string> names;
    for (const auto& entry : fs::directory_iterator(folder)) {
        const std::string name = entry.path().filename();
        if (VEXOEAIsHiddenFile(name.c_str()) == 0) names.push_back(name);
    }
    return names;
}

// What a first request does: the home as root, then everything else as its user. 0, or at which step it was refused.
int useHome(const std::string& home) {
    if (VEXOFSMkdirP(home.c_str(), nullptr, 1, kAliceUid, kUsersGid, 0755) != 0) return 1;
    if (setegid(kUsersGid) != 0 || seteuid(kAliceUid) != 0) return 2;
    const std::string file = home + "/" + std::to_string(getpid());
    return close(open(file.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600)) == 0 ? 0 : 3;
}

TEST_F(MakeFolderTest, FirstRequestsAtOnceAllFindTheirHome) {
    SKIP_WITHOUT_ROOT();
    const std::string homes = shareRoot("homes");
    for (int made = 0; made < 100; ++made) {
        const std::string home = homes + "/home" + std::to_string(made);
        EXPECT_EQ(countAtOnce(8, [&] { return useHome(home) == 0; }), 8) << made;
    }
    EXPECT_EQ(shownIn(homes).size(), 100U);
}

// Whenever a process is killed: nobody sees what it left, and the next one ends its work.
TEST_F(MakeFolderTest, WhatAKilledProcessLeftIsEndedByTheNext) {
    SKIP_WITHOUT_ROOT();
    const std::string homes = shareRoot("homes"), home = homes + "/@CORP/eve";
    for (const long call : {SYS_flock, SYS_newfstatat, SYS_getdents64, SYS_fchownat, SYS_fchmod, SYS_renameat2}) {
        SCOPED_TRACE(call);
        fs::remove_all(homes + "/@CORP");
        makeFolder(homes + "/@CORP");
        expectKilled([&] { return refuseCalls({{call, kKilled}}) ? useHome(home) : 0; });
        EXPECT_TRUE(shownIn(homes + "/@CORP").empty());
        EXPECT_EQ(inChild([&] { return useHome(home); }), 0);
        EXPECT_EQ(std::distance(fs::directory_iterator(homes + "/@CORP"), {}), 1) << "and nothing else is left";
    }
    // An old kernel or a foreign file system.
    EXPECT_EQ(inChild([&] { return refuseCalls({{SYS_renameat2, EINVAL}}) ? useHome(homes + "/@CORP/old") : 5; }), 0);
}

// Whoever owns the folder of a domain owns every home in it.
TEST_F(MakeFolderTest, FoldersAboveHomesAreTheSystems) {
    SKIP_WITHOUT_ROOT();
    const std::string homes = shareRoot("homes"), domain = homes + "/@CORP";
    fs::remove_all(homes);
    const auto makeHome = [](const std::string& home, uid_t uid) {
        EXPECT_EQ(VEXOFSMkdirP(home.c_str(), nullptr, 1, uid, kUsersGid, 0755), 0);
        EXPECT_EQ(statusOf(home).st_uid, uid);
    };
    makeHome(domain + "/eve", kAliceUid);
    makeHome(homes + "/@", kBobUid);  // a home, whatever its name
    makeHome(domain + "/eve/sub/deeper", kAliceUid);
    EXPECT_EQ(statusOf(domain + "/eve/sub").st_uid, uid_t{kAliceUid});
    for (const std::string& folder : {homes, domain}) {
        EXPECT_EQ(statusOf(folder).st_uid, 0U) << folder;
        EXPECT_EQ(statusOf(folder).st_mode & 07777, 0755U) << folder;
    }
    // One that was its first user's is taken back from that user, not from anybody else; a link leads to no domain.
    for (const auto& [asks, owner] : Rows<uid_t, uid_t>{{kBobUid, kAliceUid}, {kAliceUid, 0}}) {
        ASSERT_EQ(chown(domain.c_str(), kAliceUid, kUsersGid), 0);
        makeHome(domain + "/" + std::to_string(asks), asks);
        EXPECT_EQ(statusOf(domain).st_uid, owner);
    }
    makeFolder(photo_ + "/elsewhere");
    ASSERT_EQ(chown((photo_ + "/elsewhere").c_str(), kAliceUid, kUsersGid), 0);
    fs::create_symlink(photo_ + "/elsewhere", homes + "/@LINK");
    makeHome(homes + "/@LINK/eve", kAliceUid);
    EXPECT_EQ(statusOf(photo_ + "/elsewhere").st_uid, uid_t{kAliceUid});
    // What root keeps closed is nobody's home, under whatever name somebody moved it.
    const std::string part = homes + "/" VEXO_PART_PREFIX + std::to_string(kAliceUid) + "-closed";
    writeFile(part + "/secret", "");
    VEXOFSMkdirP((homes + "/closed").c_str(), nullptr, 1, kAliceUid, kUsersGid, 0755);
    EXPECT_EQ(statusOf(homes + "/closed").st_uid, 0U);
}

}  // namespace
