// What the platform's files rely on: knowing a version again.
#include "io/file_io.h"

#include "support/testing.h"

namespace {

class FileIo : public ApplianceTest {
 protected:
    static std::string path(const std::string& name) { return systemRoot() + "/files/" + name; }
    void SetUp() override {
        ApplianceTest::SetUp();
        writeFile(path("a"), "0123456789", 0600);
    }
};

TEST_F(FileIo, AVersionIsKnownAgainUntilTheFileChanges) {
    const auto age = [](const char* name) {
        const timespec hourAgo[] = {{time(nullptr) - 3600, 0}, {time(nullptr) - 3600, 5}};
        EXPECT_EQ(utimensat(AT_FDCWD, path(name).c_str(), hourAgo, 0), 0);
        return statusOf(path(name));
    };
    struct stat young = statusOf(path("a"));
    young.st_mtim.tv_sec += 3600;  // no older than the look at it, however slow this machine is
    EXPECT_FALSE(vexo::FileVersion(young).isCurrent(young)) << "the next write may look alike";
    const vexo::FileVersion version(age("a"));
    EXPECT_TRUE(version.isCurrent(statusOf(path("a"))));
    writeFile(path("b"), "0123456789");
    EXPECT_FALSE(version.isCurrent(age("b"))) << "another inode";
    writeFile(path("a"), "9876543210");
    EXPECT_FALSE(version.isCurrent(statusOf(path("a")))) << "another time";
    writeFile(path("a"), "longer");
    EXPECT_FALSE(version.isCurrent(age("a"))) << "another size";
}

}  // namespace
