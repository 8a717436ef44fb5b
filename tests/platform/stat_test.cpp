// Status records: what they hold, what failures leave.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <string>

#include "file_io.h"
#include "support/appliance.h"
#include "vexo/error.h"
#include "vexo/stat.h"

namespace {

class StatTest : public support::ApplianceTest {
 protected:
    std::string root_ = shareRoot("photo");
};

TEST_F(StatTest, RecordsWhatLstatTells) {
    const std::string file = root_ + "/a";
    support::writeFile(file, "12345", 0640);
    const timespec times[] = {{1000000000, 0}, {1100000000, 999999999}};
    ASSERT_EQ(utimensat(AT_FDCWD, file.c_str(), times, 0), 0);
    ASSERT_EQ(symlink("a", (root_ + "/link").c_str()), 0);
    ASSERT_EQ(link(file.c_str(), (root_ + "/second").c_str()), 0);
    const vexo::Descriptor folder = vexo::openFile(root_, O_RDONLY | O_DIRECTORY);
    for (const char* name : {"a", "link", "."}) {
        SCOPED_TRACE(name);
        struct stat wanted;
        ASSERT_EQ(lstat((root_ + "/" + name).c_str(), &wanted), 0);
        for (const unsigned flags : {unsigned{VEXO_STAT_BASIC}, 9U}) {
            _tag_VEXOSTAT_ byPath;
            _tag_VEXOSTAT_ byName;
            memset(&byPath, 0xAB, sizeof byPath);
            memset(&byName, 0xCD, sizeof byName);
            ASSERT_EQ(VLIBCFileLStat((root_ + "/" + name).c_str(), flags, &byPath), 0);
            ASSERT_EQ(VLIBCFileLStatAt(folder.get(), name, flags, &byName), 0);
            for (const _tag_VEXOSTAT_& got : {byPath, byName}) {
                EXPECT_EQ(got.st_mode, wanted.st_mode);
                EXPECT_EQ(got.st_uid, wanted.st_uid);
                EXPECT_EQ(got.st_gid, wanted.st_gid);
                EXPECT_EQ(got.st_size, wanted.st_size);
                EXPECT_EQ(got.st_access, wanted.st_atim.tv_sec);
                EXPECT_EQ(got.st_modify, wanted.st_mtim.tv_sec);
                EXPECT_EQ(got.st_change, wanted.st_ctim.tv_sec);
                EXPECT_EQ(got.st_device, wanted.st_dev);
                EXPECT_EQ(got.st_inode, wanted.st_ino);
                EXPECT_EQ(got.st_links, wanted.st_nlink);
                EXPECT_EQ(got.st_create != 0, flags == 9U);
            }
            EXPECT_EQ(byPath.st_create, byName.st_create);
        }
    }
}

TEST_F(StatTest, CreationTimeFallsBackToTheSmallerOfTheOtherTwo) {
    _tag_VEXOSTAT_ status;
    // Files of /proc have no time of creation.
    ASSERT_EQ(VLIBCFileLStat("/proc/self/stat", 9, &status), 0);
    EXPECT_NE(status.st_create, 0);
    EXPECT_EQ(status.st_create, std::min(status.st_modify, status.st_change));
}

TEST_F(StatTest, FailuresLeaveErrnoCodeAndAnEmptyRecord) {
    support::writeFile(root_ + "/file", "");
    const struct {
        std::string path;
        int systemCode, code;
    } cases[] = {
        {root_ + "/missing", ENOENT, VEXO_ERR_MISSING},
        {root_ + "/file/below", ENOTDIR, VEXO_ERR_MISSING},
        {"", ENOENT, VEXO_ERR_MISSING},
        {root_ + "/" + std::string(256, 'n'), ENAMETOOLONG, VEXO_ERR_GENERAL},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.path);
        _tag_VEXOSTAT_ status;
        memset(&status, 0xAB, sizeof status);
        VLIBCErrSetEx(0, "", 0);
        errno = 0;
        EXPECT_LT(VLIBCFileLStat(c.path.c_str(), 9, &status), 0);
        EXPECT_EQ(errno, c.systemCode);
        EXPECT_EQ(VLIBCErrGet(), c.code);
        EXPECT_EQ(status.st_mode | status.st_uid | status.st_gid | status.st_links | status.st_attributes, 0U);
        EXPECT_EQ(status.st_size | status.st_access | status.st_modify | status.st_change | status.st_create, 0);
        EXPECT_EQ(status.st_device | status.st_inode, 0U);
    }
    EXPECT_LT(VLIBCFileLStat(nullptr, 1, nullptr), 0);
}

TEST_F(StatTest, DeniedFolder) {
    SKIP_WITHOUT_ROOT();
    support::makeFolder(root_ + "/closed", 0700);
    support::writeFile(root_ + "/closed/a", "");
    const auto body = [&] {
        _tag_VEXOSTAT_ status;
        EXPECT_LT(VLIBCFileLStat((root_ + "/closed/a").c_str(), 1, &status), 0);
        EXPECT_EQ(errno, EACCES);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED);
        return 0;
    };
    EXPECT_EQ(support::asUser(support::kAliceUid, support::kUsersGid, body), 0);
}

}  // namespace
