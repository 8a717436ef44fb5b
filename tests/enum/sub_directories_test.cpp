#include "orvel/directory_walker.h"
#include "support/system_faults.h"
#include "support/testing.h"

namespace {

class SubDirectoriesTest : public ApplianceTest {
 protected:
    // False with this code; nothing is added.
    static void expectFailure(const std::string& path, int code) {
        std::vector<_tag_SUBDIR_ENTRY_INFO_> found{{"kept", "/kept", 0, 0, 0, 0, 0, false, ""}};
        OrvLibSetErr(1);
        EXPECT_FALSE(OrvLibEnumSubDir(path, found));
        EXPECT_EQ(OrvLibGetErr(), code) << path;
        EXPECT_EQ(found.size(), 1U);
    }
};

TEST_F(SubDirectoriesTest, Failures) {
    writeFile(photo_ + "/file", "x");
    expectFailure("", 400);
    EXPECT_EQ(takeLogText(), "orveldir:# Bad parameter");
    expectFailure(photo_ + "/missing", 408);
    expectFailure(photo_ + "/file", 408);
    expectFailure(photo_ + "/" + std::string(5000, 'p'), 402);
    makeFolder(photo_ + "/sub");
    const ReadingFault fault(photo_, EIO, 2);
    expectFailure(photo_, 402);
}

TEST_F(SubDirectoriesTest, ListsFoldersSortedWithoutCase) {
    for (const char* folder : {"/b", "/A", "/c\xFF", "/Ä", "/@tmp", "/@vexoea", "/.dot", "/B/inner"})
        makeFolder(photo_ + folder, 0750);
    writeFile(photo_ + "/file", "x");
    ASSERT_EQ(symlink("A", (photo_ + "/link").c_str()), 0);
    const timespec times[2] = {{1, 0}, {1234567890, 0}};
    ASSERT_EQ(utimensat(-1, (photo_ + "/A").c_str(), times, 0), 0);

    std::vector<_tag_SUBDIR_ENTRY_INFO_> found{{"ab", "elsewhere", 0, 0, 0, 0, 0, false, ""}};
    OrvLibSetErr(1);
    ASSERT_TRUE(OrvLibEnumSubDir(photo_, found));
    EXPECT_EQ(OrvLibGetErr(), 0);
    std::string names;
    for (const auto& one : found) names += (one.name == "B" ? "b" : one.name) + ",";
    EXPECT_EQ(names, ".dot,A,ab,b,b,c\xFF,Ä,") << "what the vector held is sorted with the rest";

    const struct stat status = statusOf(photo_ + "/A");
    const auto& folder = found[1];
    EXPECT_EQ(
        std::tie(folder.path, folder.size, folder.mode, folder.mtime, folder.uid, folder.gid),
        std::make_tuple(photo_ + "/A", status.st_size, S_IFDIR | 0750U, 1234567890, status.st_uid, status.st_gid));
    EXPECT_TRUE(!folder.isMountPoint && folder.mountType.empty());
    EXPECT_EQ(fs::current_path(), photo_);
}

// What the caller holds open is listed, wherever it lies by now, and its mounts are known by where that is.
TEST_F(SubDirectoriesTest, AnOpenFolder) {
    const std::string chosen = photo_ + "/chosen", moved = photo_ + "/moved";
    for (const char* name : {"/disk", "/plain"}) makeFolder(chosen + name);
    const orvel::Descriptor opened(open(chosen.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    fs::rename(chosen, moved);
    fs::create_symlink("/etc", chosen);
    addMount(moved + "/disk", "ext4");
    std::vector<_tag_SUBDIR_ENTRY_INFO_> found;
    ASSERT_TRUE(OrvLibEnumSubDir(opened.path(), found));
    ASSERT_EQ(found.size(), 2U);
    EXPECT_EQ(found[0].path + found[0].mountType + found[1].path, moved + "/diskext4" + moved + "/plain");
}

TEST_F(SubDirectoriesTest, MountPoints) {
    for (const char* folder : {"/disk", "/server", "/local"}) makeFolder(photo_ + folder);
    addMount(photo_ + "/disk", "ext4");
    addMount(photo_ + "/server", "nfs4");
    writeFile(photo_ + "/file", "x");
    addMount(photo_ + "/file", "nfs4");
    for (const auto& [dead, expected] : rowsOf<const char*, std::string>("enum/mount_points")) {
        const StatusFault fault(photo_ + dead, EHOSTDOWN);
        std::vector<_tag_SUBDIR_ENTRY_INFO_> found;
        ASSERT_TRUE(OrvLibEnumSubDir(photo_, found));
        std::string text;
        for (const auto& one : found) {
            text += one.name + ":" + one.mountType;
            EXPECT_EQ(one.isMountPoint, !one.mountType.empty());
            EXPECT_EQ(one.path, photo_ + "/" + one.name);
            text += one.size == 0 && one.mode == 0 && one.mtime == 0 ? "(0) " : " ";
        }
        EXPECT_EQ(text, expected);
    }
}

}  // namespace
