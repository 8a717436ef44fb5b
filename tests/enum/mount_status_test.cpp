#include "orvel/mount_status.h"

#include "support/testing.h"

namespace {

class MountStatusTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addMount("/volume1", "ext4");
        addMount("/volume1", "nfs", "ro");  // the first line of a folder counts
        addMount("/volume1/usb", "vfat", "noatime,ro");
        addMount("/volume1/usb/deep", "xfs", "rw,errors=remount-ro");
        addMount("/volume1-b", "fuse.thing", "ro");
        addMount("/with\\040blank", "cifs");
        addMount("/iso", "iso9660", "ro");
    }
};

TEST_F(MountStatusTest, TypeOfTheMountAtExactlyThisFolder) {
    OrvelMountStatus mounts;
    for (const auto& [path, type] : Rows<const char*, int>{
             row("/volume1", 0), row("/volume1/", 0), row("/volume1///", 0), row("/volume1/usb", 1),
             row("/volume1/usb/deep", 3), row("/with blank", 6), row("/iso", 4), row("/volume1-b", 11),
             row("/volume1/a", 10), row("/vol", 10), row("/", 10), row("", 10), row(nullptr, 10)}) {
        EXPECT_EQ(mounts.getFSTYPE(path), type) << (path == nullptr ? "null" : path);
    }
}

TEST_F(MountStatusTest, ReadOnlyByTheDeepestMountThatHoldsThePath) {
    OrvelMountStatus mounts;
    const Rows<const char*, bool> rows = {
        {"/volume1", false},           {"/volume1/a", false},    {"/volume1/usb", true},
        {"/volume1/usb/a", true},      {"/volume1/usbx", false}, {"/volume1/usb/deep/a", false},
        {"/volume1/usb/deeper", true}, {"/volume1-b/x", true},   {"/iso/", true},
        {"/elsewhere", false},         {nullptr, false}};
    for (const auto& [path, readOnly] : rows) {
        EXPECT_EQ(mounts.IsReadOnly(path), readOnly) << (path == nullptr ? "null" : path);
    }
}

TEST_F(MountStatusTest, RootMountHoldsOnlyItself) {
    writeRootFile("/proc/mounts", "/dev/root / ext4 ro 0 0\n");
    OrvelMountStatus mounts;
    EXPECT_FALSE(mounts.IsReadOnly("/volume1"));
    EXPECT_TRUE(mounts.IsReadOnly("/"));
    EXPECT_TRUE(mounts.IsReadOnly("//volume1"));
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
    const std::string table = systemRoot() + "/proc/mounts";
    ASSERT_EQ(chmod(table.c_str(), 0), 0);
    OrvelMountStatus mounts;
    asUser(kAliceUid, kUsersGid, [&] {
        EXPECT_FALSE(mounts.GetMountStatus());
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
        EXPECT_STREQ(VLIBCErrorGetFile(), "orvelenum");
        VLIBCErrSetEx(0, "", 0);
        EXPECT_EQ(mounts.getFSTYPE("/iso"), 11);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
        EXPECT_FALSE(mounts.IsReadOnly("/iso"));
        return 0;
    });
    EXPECT_EQ(mounts.getFSTYPE("/iso"), 4) << "a failure is not remembered";
}

}  // namespace
