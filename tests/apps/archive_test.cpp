// Zips that lack something say so, whichever look at the files fails.
#include "download/archive.h"

#include <sys/mman.h>

#include "support/testing.h"

namespace {

int looks = 0, failingLook = 0;  // of this process at what is open in the share

bool isInShare(int fd) {
    char path[256] = {};
    const std::string name = "/proc/self/fd/" + std::to_string(fd);
    return readlink(name.c_str(), path, sizeof path - 1) > 0 && std::string(path).find("-photo/") != std::string::npos;
}

}  // namespace

extern "C" int fstat(int fd, struct stat* status) noexcept {
    if (failingLook > 0 && isInShare(fd) && ++looks == failingLook) {
        errno = EIO;
        return -1;
    }
    return fstatat(fd, "", status, AT_EMPTY_PATH);
}

namespace {

class Archives : public ApplianceTest {
 protected:
    void TearDown() override {
        failingLook = 0;
        ApplianceTest::TearDown();
    }
};

struct Observer : orvel::cgi::ArchiveObserver {
    bool begins(const std::string&) override { return true; }
    bool wrote(long long) override { return true; }
    void leftOut(const std::string&, int error) override { missing += error == EIO ? 1 : 100; }
    int missing = 0;
};

TEST_F(Archives, SayWhatTheyLack) {
    const std::string root = shareRoot("photo") + "/a";
    writeFile(root + "/b/c", "content");
    bool failed = true;
    for (int nth = 1; failed; ++nth) {
        SCOPED_TRACE(nth);
        ASSERT_LT(nth, 50);
        const orvel::Descriptor out(memfd_create("zip", MFD_CLOEXEC));
        const orvel::Descriptor folder(open(root.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        Observer observer;
        orvel::cgi::ArchiveStream zip(out.get(), &observer);
        looks = 0;
        failingLook = nth;
        EXPECT_TRUE(zip.add(folder, "a"));
        failed = looks >= nth;
        failingLook = 0;
        EXPECT_EQ(zip.isWhole(), !failed);
        EXPECT_EQ(observer.missing, failed ? 1 : 0);
        EXPECT_TRUE(zip.finish());
        std::string bytes(1 << 16, '\0');
        bytes.resize(static_cast<size_t>(pread(out.get(), bytes.data(), bytes.size(), 0)));
        EXPECT_EQ(bytes.find("_not_included.txt") != std::string::npos, failed);
    }
}

}  // namespace
