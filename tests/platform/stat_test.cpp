// Status records: what they hold, what failures leave.
#include "vexo/stat.h"

#include "io/file_io.h"
#include "support/testing.h"

namespace {

using StatTest = ApplianceTest;

TEST_F(StatTest, RecordsWhatLstatTells) {
    const std::string file = photo_ + "/a";
    writeFile(file, "12345", 0640);
    const timespec times[] = {{1000000000, 0}, {1100000000, 999999999}};
    ASSERT_EQ(utimensat(AT_FDCWD, file.c_str(), times, 0), 0);
    fs::create_symlink("a", photo_ + "/link");
    fs::create_hard_link(file, photo_ + "/second");
    const orvel::Descriptor folder = vexo::openFile(photo_, O_RDONLY | O_DIRECTORY);
    for (const char* name : {"a", "link"}) {
        SCOPED_TRACE(name);
        const struct stat wanted = statusOf(photo_ + "/" + name);
        _tag_VEXOSTAT_ got, basic;
        memset(&got, 0xAB, sizeof got);
        memset(&basic, 0xCD, sizeof basic);
        ASSERT_EQ(VLIBCFileLStatAt(folder.get(), name, 9, &got), 0);
        ASSERT_EQ(VLIBCFileLStat((photo_ + "/" + name).c_str(), VEXO_STAT_BASIC, &basic), 0);
        EXPECT_EQ(
            std::tie(got.st_mode, got.st_uid, got.st_gid, got.st_device, got.st_inode, got.st_links, got.st_size,
                     got.st_access, got.st_modify, got.st_change),
            std::make_tuple(wanted.st_mode, wanted.st_uid, wanted.st_gid, wanted.st_dev, wanted.st_ino, wanted.st_nlink,
                            wanted.st_size, wanted.st_atim.tv_sec, wanted.st_mtim.tv_sec, wanted.st_ctim.tv_sec));
        EXPECT_TRUE(basic.st_inode == got.st_inode && basic.st_create == 0 && got.st_create != 0);
    }
    // Files of /proc have no time of creation: the smaller of the other two.
    _tag_VEXOSTAT_ status;
    ASSERT_EQ(VLIBCFileLStat("/proc/self/stat", 9, &status), 0);
    EXPECT_EQ(status.st_create, std::min(status.st_modify, status.st_change));
}

TEST_F(StatTest, FailuresLeaveErrnoCodeAndAnEmptyRecord) {
    makeFolder(photo_ + "/closed", 0700);
    const auto expectFailure = [](const std::string& path, int systemCode, int code) {
        SCOPED_TRACE(path);
        _tag_VEXOSTAT_ status;
        memset(&status, 0xAB, sizeof status);
        EXPECT_FAILS(VLIBCFileLStat(path.c_str(), 9, &status), systemCode, code);
        EXPECT_EQ(status.st_mode | status.st_uid | status.st_gid | status.st_links | status.st_attributes, 0U);
        EXPECT_EQ(status.st_size | status.st_access | status.st_modify | status.st_change | status.st_create, 0);
        EXPECT_EQ(status.st_device | status.st_inode, 0U);
    };
    expectFailure(photo_ + "/missing", ENOENT, VEXO_ERR_MISSING);
    expectFailure("/dev/null/below", ENOTDIR, VEXO_ERR_MISSING);
    expectFailure(photo_ + "/" + std::string(256, 'n'), ENAMETOOLONG, VEXO_ERR_GENERAL);
    if (geteuid() != 0) return;
    asUser(kAliceUid, kUsersGid, [&] { expectFailure(photo_ + "/closed/a", EACCES, VEXO_ERR_DENIED); });
}

}  // namespace
