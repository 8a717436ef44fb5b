#include "orvel/mount_status.h"

#include <sys/stat.h>

#include "support/appliance.h"
#include "vexo/error.h"

namespace {

class MountStatusTest : public support::ApplianceTest {
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
    struct Case {
        const char* path;
        int type;
    };
    OrvelMountStatus mounts;
    for (const auto& [path, type] :
         {Case{"/volume1", 0}, Case{"/volume1/", 0}, Case{"/volume1///", 0}, Case{"/volume1/usb", 1},
          Case{"/volume1/usb/deep", 3}, Case{"/with blank", 6}, Case{"/iso", 4}, Case{"/volume1-b", 11},
          Case{"/volume1/a", 10}, Case{"/vol", 10}, Case{"/", 10}, Case{"", 10}, Case{nullptr, 10}}) {
        EXPECT_EQ(mounts.getFSTYPE(path), type) << (path == nullptr ? "null" : path);
    }
}

TEST_F(MountStatusTest, ReadOnlyByTheDeepestMountThatHoldsThePath) {
    struct Case {
        const char* path;
        bool readOnly;
    };
    OrvelMountStatus mounts;
    for (const auto& [path, readOnly] :
         {Case{"/volume1", false}, Case{"/volume1/a", false}, Case{"/volume1/usb", true}, Case{"/volume1/usb/a", true},
          Case{"/volume1/usbx", false}, Case{"/volume1/usb/deep/a", false}, Case{"/volume1/usb/deeper", true},
          Case{"/volume1-b/x", true}, Case{"/iso/", true}, Case{"/elsewhere", false}, Case{nullptr, false}}) {
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
    support::asUser(support::kAliceUid, support::kUsersGid, [&] {
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
