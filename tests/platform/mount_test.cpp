// The mount table and what is told from it.
#include "filesystem/mount_table.h"
#include "platform/private_mounts.h"
#include "support/testing.h"
#include "vexo/filesystem.h"

namespace {

class MountTest : public ApplianceTest {};

TEST_F(MountTest, ParsesWhatTheKernelWrites) {
    std::string text;
    for (const vexo::Mount& mount : vexo::parseMountTable(
             "/dev/root / ext4 rw 0 0\n# /dev/none /none ext4 rw 0 0\n\n"
             "/dev/sdb1\t/volume1/my\\040disk\\011x\\134y vfat rw 0 0\nserver:/export /volume1/remote/ nfs4 rw 0 0\n"
             "torn /volume1/torn\nx /volume1/odd\\9 fuse.thing rw 0 0\nx /volume1/last\\04 vfat"))
        text += mount.folder + ' ' + mount.typeName + ' ' + std::to_string(mount.type) + '\n';
    EXPECT_EQ(text,
              "/ ext4 0\n/volume1/my disk\tx\\y vfat 1\n/volume1/remote nfs4 8\n/volume1/odd\\9 fuse.thing 11\n"
              "/volume1/last\\04 vfat 1\n");
}

TEST_F(MountTest, TypeIsThatOfTheLongestMountAboveThePath) {
    addMount("/volume1", "btrfs");
    addMount("/volume1/usb", "xfs");
    addMount("/volume1/usb", "vfat");  // mounted over it later
    addMount("/volume1/iso", "udf");
    for (const auto& [path, type] : rowsOf<const char*, int>("platform/mount_types"))
        EXPECT_EQ(VEXOGetFSType(path, 0), type) << path;
    for (int type = -1; type <= 12; ++type) {
        EXPECT_EQ(VEXOFSIsRemoteFS(type), static_cast<int>(type >= 6 && type <= 8)) << type;
        EXPECT_EQ(VEXOFSIsImageFS(type), static_cast<int>(type == 4 || type == 5)) << type;
    }
}

TEST_F(MountTest, MountPointsAreFoundWithoutTouchingTheFileSystem) {
    addMount("/nowhere/remote", "cifs");
    addMount("/nowhere/my\\040disk", "iso9660");
    for (const auto& [path, index, remote, typeName] : Rows<const char*, int, int, const char*>{
             row("//", 0, 0, "ext4"), row("/nowhere/remote///", 1, 1, "cifs"), row("/nowhere/remote/a", -1, 0, ""),
             row("/nowhere/my disk", 2, 0, "iso9660"), row("", -1, 0, "")}) {
        SCOPED_TRACE(path);
        errno = EHOSTDOWN;
        EXPECT_EQ(VEXOFSIsInMountTable(path), index);
        EXPECT_EQ(errno, EHOSTDOWN);
        EXPECT_EQ(WebUtils::IsMountPoint(path), index >= 0);
        EXPECT_EQ(WebUtils::getMountType(path), typeName);
        EXPECT_EQ(VEXOFSIsRemoteFS(), remote) << "the questions of WebUtils do not count as the last one";
    }
}

TEST_F(MountTest, AChangedTableIsReadAgainAndAnUnreadableOneFails) {
    for (int round = 0; round < 20; ++round) {  // faster than the clock of file times
        addMount("/volume9/" + std::to_string(round), "nfs");
        EXPECT_EQ(VEXOFSIsInMountTable(("/volume9/" + std::to_string(round)).c_str()), round + 1);
    }
    fs::remove(systemRoot() + "/proc/mounts");
    makeFolder(systemRoot() + "/proc/mounts");
    EXPECT_FAILS(VEXOGetFSType("/volume1", 0), EINVAL, VEXO_ERR_FILE);
    EXPECT_EQ(VEXOFSIsInMountTable("/"), -1);
}

TEST_F(MountTest, TheMachinesOwnTableFollowsMountsAndForks) {
    SKIP_WITHOUT_ROOT();
    const std::string place = shareRoot("photo") + "/with blank";
    makeFolder(place);
    const std::string table = systemRoot() + "/proc/mounts";
    // In a child also because the table's descriptor stays open in the process that reads it.
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        unlink(table.c_str());
        EXPECT_EQ(VEXOFSIsInMountTable(place.c_str()), -1);
        EXPECT_EQ(mount("none", place.c_str(), "tmpfs", 0, "size=64k"), 0);
        EXPECT_GE(VEXOFSIsInMountTable(place.c_str()), 0);
        EXPECT_EQ(WebUtils::getMountType(place), "tmpfs");
        EXPECT_EQ(umount(place.c_str()), 0);
        // The child's answers take no news away from its parent.
        EXPECT_EQ(inChild([&] { return VEXOFSIsInMountTable(place.c_str()) == -1 ? 0 : 1; }), 0);
        EXPECT_EQ(VEXOFSIsInMountTable(place.c_str()), -1);
        return 0;
    }));
}

TEST_F(MountTest, VolumesAndTheirKinds) {
    const auto text = [](const std::string& path) -> std::string {
        VOLUMEPATHINFO info;
        VLIBCErrSetEx(0, "", 0);
        if (VolumePathParse(path.c_str(), &info) <= 0)
            return VLIBCErrGet() == VEXO_ERR_PARAMETER ? "refused" : "failed";
        const std::string volume = std::string(info.szVolume) + " ";
        return volume + (info.kind == VEXO_VOLUME_INTERNAL ? "internal" : std::to_string(info.kind));
    };
    writeRootFile("/etc/vexo/volumes",
                  "# removable\n/volumeUSB1 4\n/volumeSATA esata\n/mnt/deep/ usb\n/torn\n/volumeX what\n");
    for (const auto& [path, volume] : rowsOf<std::string, std::string>("platform/volumes"))
        EXPECT_EQ(text(path), volume) << path;
    EXPECT_EQ(text("/" + std::string(4096, 'v')), "refused");
    // Anything but a regular file is no volumes file, and a pipe's writer is not waited for.
    const std::string file = systemRoot() + "/etc/vexo/volumes";
    ASSERT_TRUE(fs::remove(file) && mkfifo(file.c_str(), 0600) == 0);
    EXPECT_EQ(text("/volumeUSB1/a"), "/volumeUSB1 internal");
}

TEST_F(MountTest, HiddenNamesAndSmallTexts) {
    for (const auto& [name, file, folder] : rowsOf<const char*, int, int>("platform/hidden_names")) {
        EXPECT_EQ(VEXOEAIsHiddenFile(name), file) << name;
        EXPECT_EQ(VEXOEAIsHiddenDir(name), folder) << name;
    }
    using Pieces = std::vector<std::string>;
    EXPECT_EQ(WebUtils::StringExplode("//photo//2012/", "/"), (Pieces{"photo", "2012"}));
    EXPECT_EQ(WebUtils::StringExplode("a::b:c", "::"), (Pieces{"a", "b:c"}));
    EXPECT_EQ(WebUtils::StringExplode("ab", ""), Pieces{"ab"});
}

}  // namespace
