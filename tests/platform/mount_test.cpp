// The mount table and what is told from it.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include "mount_table.h"
#include "platform/private_mounts.h"
#include "support/appliance.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"

namespace {

class MountTest : public support::ApplianceTest {};

TEST_F(MountTest, ParsesWhatTheKernelWrites) {
    const vexo::MountTable table = vexo::parseMountTable(
        "/dev/root / ext4 rw 0 0\n"
        "# /dev/none /none ext4 rw 0 0\n"
        "\n"
        "/dev/sdb1\t/volume1/my\\040disk\\011x\\134y vfat rw 0 0\n"
        "server:/export /volume1/remote/ nfs4 rw,vers=4.2 0 0\n"
        "torn /volume1/torn\n"
        "x /volume1/odd\\9 fuse.thing rw 0 0\n"
        "x /volume1/last\\04 vfat");
    ASSERT_EQ(table.size(), 5U);
    const struct {
        const char* folder;
        const char* typeName;
        int type;
    } wanted[] = {{"/", "ext4", 0},
                  {"/volume1/my disk\tx\\y", "vfat", VEXO_FS_FAT},
                  {"/volume1/remote", "nfs4", 8},
                  {"/volume1/odd\\9", "fuse.thing", VEXO_FS_UNKNOWN},
                  {"/volume1/last\\04", "vfat", VEXO_FS_FAT}};
    for (size_t i = 0; i < table.size(); ++i) {
        EXPECT_EQ(table[i].folder, wanted[i].folder);
        EXPECT_EQ(table[i].typeName, wanted[i].typeName);
        EXPECT_EQ(table[i].type, wanted[i].type);
    }
}

TEST_F(MountTest, TypeIsThatOfTheLongestMountAboveThePath) {
    addMount("/volume1", "btrfs");
    addMount("/volume1/usb", "xfs");
    addMount("/volume1/usb", "vfat");  // mounted over it later
    addMount("/volume1/iso", "udf");
    addMount("/volume1/odd", "fuseblk");
    const struct {
        const char* path;
        int type;
    } cases[] = {{"/", 0},
                 {"/etc", 0},
                 {"/volume1", 2},
                 {"/volume10/a", 0},
                 {"/volume1/photo/a.jpg", 2},
                 {"/volume1/usb", VEXO_FS_FAT},
                 {"/volume1/usb/a/b", VEXO_FS_FAT},
                 {"/volume1//usb//a", VEXO_FS_FAT},
                 {"/volume1/usbx", 2},
                 {"/volume1/iso/", 5},
                 {"/volume1/odd/a", VEXO_FS_UNKNOWN},
                 {"relative", VEXO_FS_UNKNOWN},
                 {"", VEXO_FS_UNKNOWN}};
    for (const auto& c : cases) EXPECT_EQ(VEXOGetFSType(c.path, 0), c.type) << c.path;
    EXPECT_EQ(VEXOGetFSType(nullptr, 0), -1);
    EXPECT_EQ(errno, EINVAL);
}

TEST_F(MountTest, MountPointsAreFoundWithoutTouchingTheFileSystem) {
    addMount("/nowhere/remote", "cifs");
    addMount("/nowhere/my\\040disk", "iso9660");
    addMount("/nowhere/other", "fuse.sshfs");
    const struct {
        const char* path;
        int index, remote;
        const char* typeName;
    } cases[] = {{"/", 0, 0, "ext4"},
                 {"//", 0, 0, "ext4"},
                 {"/nowhere/remote", 1, 1, "cifs"},
                 {"/nowhere/remote///", 1, 1, "cifs"},
                 {"/nowhere/remote/a", -1, 0, ""},
                 {"/nowhere/my disk", 2, 0, "iso9660"},
                 {"/nowhere/other", 3, 0, "fuse.sshfs"},
                 {"/nowhere", -1, 0, ""},
                 {"", -1, 0, ""}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.path);
        errno = EHOSTDOWN;
        EXPECT_EQ(VEXOFSIsInMountTable(c.path), c.index);
        EXPECT_EQ(errno, EHOSTDOWN);
        EXPECT_EQ(VEXOFSIsRemoteFS(), c.remote);
        EXPECT_EQ(WebUtils::IsMountPoint(c.path), c.index >= 0);
        EXPECT_EQ(WebUtils::getMountType(c.path), c.typeName);
    }
    EXPECT_EQ(VEXOFSIsInMountTable(nullptr), -1);
    // The questions of WebUtils do not count as the last one.
    EXPECT_EQ(VEXOFSIsInMountTable("/nowhere/remote"), 1);
    EXPECT_FALSE(WebUtils::IsMountPoint("/nowhere"));
    EXPECT_EQ(VEXOFSIsRemoteFS(), 1);
}

TEST_F(MountTest, KindsOfTypes) {
    for (int type = -1; type <= 12; ++type) {
        EXPECT_EQ(VEXOFSIsRemoteFS(type), type == 6 || type == 7 || type == 8 ? 1 : 0) << type;
        EXPECT_EQ(VEXOFSIsImageFS(type), type == 4 || type == 5 ? 1 : 0) << type;
    }
    EXPECT_STREQ(rgszFsType[VEXO_FS_FAT], "vfat");
    EXPECT_STREQ(rgszFsType[8], "nfs4");
}

TEST_F(MountTest, AChangedTableIsReadAgain) {
    EXPECT_EQ(VEXOFSIsInMountTable("/volume9"), -1);
    for (int round = 0; round < 20; ++round) {  // faster than the clock of file times
        addMount("/volume9/" + std::to_string(round), "nfs");
        EXPECT_EQ(VEXOFSIsInMountTable(("/volume9/" + std::to_string(round)).c_str()), round + 1);
    }
}

TEST_F(MountTest, AnUnreadableTableFails) {
    ASSERT_EQ(unlink((systemRoot() + "/proc/mounts").c_str()), 0);
    ASSERT_EQ(mkdir((systemRoot() + "/proc/mounts").c_str(), 0700), 0);
    VLIBCErrSetEx(0, "", 0);
    errno = 0;
    EXPECT_EQ(VEXOGetFSType("/volume1", 0), -1);
    EXPECT_NE(errno, 0);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    EXPECT_EQ(VEXOFSIsInMountTable("/"), -1);
    EXPECT_FALSE(WebUtils::IsMountPoint("/"));
}

TEST_F(MountTest, TheMachinesOwnTableFollowsMountsAndForks) {
    SKIP_WITHOUT_ROOT();
    const std::string place = shareRoot("photo") + "/with blank";
    support::makeFolder(place);
    const std::string table = systemRoot() + "/proc/mounts";
    // In a child also because the table's descriptor stays open in the process that reads it.
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        unlink(table.c_str());
        EXPECT_EQ(VEXOFSIsInMountTable(place.c_str()), -1);
        EXPECT_EQ(mount("none", place.c_str(), "tmpfs", 0, "size=64k"), 0);
        EXPECT_GE(VEXOFSIsInMountTable(place.c_str()), 0);
        EXPECT_EQ(WebUtils::getMountType(place), "tmpfs");
        EXPECT_EQ(umount(place.c_str()), 0);
        // The child's answers take no news away from its parent.
        EXPECT_EQ(support::inChild([&] { return VEXOFSIsInMountTable(place.c_str()) == -1 ? 0 : 1; }), 0);
        EXPECT_EQ(VEXOFSIsInMountTable(place.c_str()), -1);
        return 0;
    }));
}

TEST_F(MountTest, VolumesAndTheirKinds) {
    writeRootFile("/etc/vexo/volumes",
                  "# removable\n/volumeUSB1 4\n/volumeSATA esata\n/mnt/deep/ usb\n/torn\n/volumeX what\n");
    const struct {
        const char* path;
        const char* volume;
        int kind;
    } cases[] = {{"/volume1/photo/a", "/volume1", VEXO_VOLUME_INTERNAL},
                 {"/volumeUSB1", "/volumeUSB1", VEXO_VOLUME_USB},
                 {"/volumeUSB1/share/a", "/volumeUSB1", VEXO_VOLUME_USB},
                 {"/volumeUSB12/share", "/volumeUSB12", VEXO_VOLUME_INTERNAL},
                 {"/volumeSATA/x", "/volumeSATA", VEXO_VOLUME_ESATA},
                 {"/mnt/deep/share", "/mnt", VEXO_VOLUME_USB},
                 {"/mnt/other", "/mnt", VEXO_VOLUME_INTERNAL},
                 {"/volumeX/a", "/volumeX", VEXO_VOLUME_INTERNAL},
                 {"/", "/", VEXO_VOLUME_INTERNAL}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.path);
        VOLUMEPATHINFO info;
        EXPECT_GT(VolumePathParse(c.path, &info), 0);
        EXPECT_STREQ(info.szVolume, c.volume);
        EXPECT_EQ(info.kind, c.kind);
    }
    VOLUMEPATHINFO info;
    // Anything but a regular file is no volumes file, and a pipe's writer is not waited for.
    const std::string file = systemRoot() + "/etc/vexo/volumes";
    ASSERT_EQ(unlink(file.c_str()), 0);
    ASSERT_EQ(mkfifo(file.c_str(), 0600), 0);
    EXPECT_GT(VolumePathParse("/volumeUSB1/a", &info), 0);
    EXPECT_EQ(info.kind, VEXO_VOLUME_INTERNAL);
    ASSERT_EQ(unlink(file.c_str()), 0);
    const std::string longOne = "/" + std::string(4096, 'v');
    for (const char* bad : {static_cast<const char*>(nullptr), "", "volume1/a", longOne.c_str()}) {
        VLIBCErrSetEx(0, "", 0);
        EXPECT_LE(VolumePathParse(bad, &info), 0);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    }
}

TEST_F(MountTest, HiddenNamesAndSmallTexts) {
    const struct {
        const char* name;
        int dir, file;
    } names[] = {{".", 0, 1},   {"..", 0, 1}, {"@tmp", 0, 1}, {"@vexoea", 1, 1}, {"@vexoea2", 0, 0}, {"@Tmp", 0, 0},
                 {"...", 0, 0}, {".x", 0, 0}, {"@", 0, 0},    {"", 0, 0},        {"#recycle", 0, 0}, {nullptr, 0, 0}};
    for (const auto& c : names) {
        EXPECT_EQ(VEXOEAIsHiddenDir(c.name), c.dir) << (c.name ? c.name : "null");
        EXPECT_EQ(VEXOEAIsHiddenFile(c.name), c.file) << (c.name ? c.name : "null");
    }
    using Pieces = std::vector<std::string>;
    EXPECT_EQ(WebUtils::StringExplode("//photo//2012/", "/"), (Pieces{"photo", "2012"}));
    EXPECT_EQ(WebUtils::StringExplode("a::b:c", "::"), (Pieces{"a", "b:c"}));
    EXPECT_EQ(WebUtils::StringExplode("", "/"), Pieces{});
    EXPECT_EQ(WebUtils::StringExplode("ab", ""), Pieces{"ab"});
    const std::string file = shareRoot("photo") + "/a";
    support::writeFile(file, "");
    const timespec times[] = {{5, 0}, {1234567890, 5}};
    ASSERT_EQ(utimensat(AT_FDCWD, file.c_str(), times, 0), 0);
    EXPECT_EQ(WebUtils::GetModifyTime(file.c_str()), "1234567890");
    EXPECT_EQ(WebUtils::GetModifyTime((file + "x").c_str()), "0");
    EXPECT_EQ(WebUtils::GetModifyTime(nullptr), "0");
}

}  // namespace
