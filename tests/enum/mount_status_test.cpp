#include "orvel/mount_status.h"

#include "support/testing.h"

namespace {

class MountStatusTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        for (const auto& [folder, type, options] : Rows<const char*, const char*, const char*>{
                 row("/volume1", "ext4", "rw"), row("/volume1", "nfs", "ro"),  // the first line of a folder counts
                 row("/volume1/usb", "vfat", "noatime,ro"), row("/volume1/usb/deep", "xfs", "rw,errors=remount-ro"),
                 row("/volume1-b", "fuse.thing", "ro"), row("/iso", "iso9660", "ro")})
            addMount(folder, type, options);
    }
};

TEST_F(MountStatusTest, TypeOfTheMountAtExactlyThisFolder) {
    OrvelMountStatus mounts;
    for (const auto& [path, type] :
         Rows<const char*, int>{row("/volume1", 0), row("/volume1///", 0), row("/volume1/usb/deep", 3), row("/iso", 4),
                                row("/volume1-b", 11), row("/volume1/a", 10), row("/", 10), row(nullptr, 10)})
        EXPECT_EQ(mounts.getFSTYPE(path), type) << (path == nullptr ? "null" : path);
}

TEST_F(MountStatusTest, ReadOnlyByTheDeepestMountThatHoldsThePath) {
    OrvelMountStatus mounts;
    for (const auto& [path, readOnly] :
         Rows<const char*, bool>{row("/volume1", false), row("/volume1/usb/a", true), row("/volume1/usbx", false),
                                 row("/volume1/usb/deep/a", false), row("/volume1/usb/deeper", true),
                                 row("/volume1-b/x", true), row("/iso/", true), row(nullptr, false)})
        EXPECT_EQ(mounts.IsReadOnly(path), readOnly) << (path == nullptr ? "null" : path);
    writeRootFile("/proc/mounts", "/dev/root / ext4 ro 0 0\n");
    EXPECT_FALSE(OrvelMountStatus().IsReadOnly("/volume1")) << "the root holds only itself";
    EXPECT_TRUE(OrvelMountStatus().IsReadOnly("/"));
}

// Until a type was asked for, each question about read-only reads the table again.
TEST_F(MountStatusTest, TableIsReadUntilATypeWasAskedFor) {
    OrvelMountStatus mounts;
    EXPECT_FALSE(mounts.IsReadOnly("/late"));
    addMount("/late", "ext4", "ro");
    EXPECT_TRUE(mounts.IsReadOnly("/late"));
    EXPECT_EQ(mounts.getFSTYPE("/late"), 0);
    addMount("/later", "ext4", "ro");
    EXPECT_FALSE(mounts.IsReadOnly("/later"));
    EXPECT_EQ(mounts.getFSTYPE("/later"), 10);
}

TEST_F(MountStatusTest, TableThatCannotBeRead) {
    SKIP_WITHOUT_ROOT();
    ASSERT_EQ(chmod((systemRoot() + "/proc/mounts").c_str(), 0), 0);
    inChild([] {
        OrvelMountStatus mounts;
        EXPECT_EQ(seteuid(kAliceUid), 0);
        EXPECT_FALSE(mounts.GetMountStatus());
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
        EXPECT_STREQ(VLIBCErrorGetFile(), "orvelenum");
        EXPECT_EQ(mounts.getFSTYPE("/iso"), 11);
        EXPECT_FALSE(mounts.IsReadOnly("/iso"));
        EXPECT_EQ(seteuid(0), 0);
        EXPECT_EQ(mounts.getFSTYPE("/iso"), 4) << "a failure is not remembered";
    });
}

}  // namespace
