// What the platform's files rely on: whole replacement, limits, trust, and knowing a version again.
#include "file_io.h"

#include <sys/stat.h>

#include <ctime>
#include <filesystem>
#include <iterator>
#include <string>

#include "raise.h"
#include "support/appliance.h"

namespace {

using support::readFile;
using support::writeFile;

class FileIo : public support::ApplianceTest {
 protected:
    static std::string path(const std::string& name) { return systemRoot() + "/files/" + name; }
    void SetUp() override {
        ApplianceTest::SetUp();
        support::makeFolder(path(""), 0755);
    }
    static struct stat statusOf(const std::string& name) {
        struct stat status {};
        EXPECT_EQ(lstat(path(name).c_str(), &status), 0);
        return status;
    }
    static long entries() {
        return std::distance(std::filesystem::directory_iterator(path("")), std::filesystem::directory_iterator());
    }
};

TEST_F(FileIo, ReplaceIsWholeOrNothing) {
    writeFile(path("a"), "old");
    writeFile(path("elsewhere"), "untouched");
    std::filesystem::create_symlink("elsewhere", path("link"));
    EXPECT_TRUE(vexo::replaceFile(path("a"), "new", 0640));
    EXPECT_EQ(readFile(path("a")), "new");
    EXPECT_EQ(statusOf("a").st_mode & 07777, 0640U);
    EXPECT_TRUE(vexo::replaceFile(path("link"), "new", 0600));
    EXPECT_EQ(readFile(path("elsewhere")), "untouched");
    EXPECT_EQ(entries(), 3);

    support::makeFolder(path("folder"), 0755);
    writeFile(path("folder/inside"), "");
    errno = 0;
    EXPECT_FALSE(vexo::replaceFile(path("folder"), "new", 0600));
    EXPECT_EQ(errno, EISDIR);
    EXPECT_FALSE(vexo::replaceFile(path("missing/a"), "new", 0600));
    EXPECT_EQ(errno, ENOENT);
    EXPECT_EQ(entries(), 4) << "no temporary stays behind";
}

TEST_F(FileIo, ReadStopsAtTheLimitAndAtAnythingButAFile) {
    writeFile(path("ten"), "0123456789");
    std::string text = "before";
    vexo::FileVersion version;
    EXPECT_TRUE(vexo::readRegularFile(path("ten"), 10, text, version));
    EXPECT_EQ(text, "0123456789");
    EXPECT_FALSE(vexo::readRegularFile(path("ten"), 9, text, version));
    EXPECT_EQ(errno, EFBIG);
    ASSERT_EQ(mkfifo(path("pipe").c_str(), 0600), 0);
    EXPECT_FALSE(vexo::readRegularFile(path("pipe"), 10, text, version)) << "and does not wait for a writer";
    EXPECT_EQ(errno, EINVAL);
    EXPECT_FALSE(vexo::readRegularFile(path("none"), 10, text, version));
    EXPECT_EQ(errno, ENOENT);
}

TEST_F(FileIo, OnlyWhatNobodyElseCanHaveMadeIsTrusted) {
    writeFile(path("a"), "", 0600);
    EXPECT_TRUE(vexo::isTrusted(statusOf("a"), S_IFREG));
    EXPECT_FALSE(vexo::isTrusted(statusOf("a"), S_IFDIR));
    EXPECT_TRUE(vexo::isTrusted(statusOf(""), S_IFDIR));
    struct Case {
        mode_t mode;
        uid_t owner;
        nlink_t links;
    };
    for (const auto& [mode, owner, links] :
         {Case{0620, 0, 1}, Case{0602, 0, 1}, Case{0600, 4242, 1}, Case{0600, 0, 2}}) {
        struct stat status = statusOf("a");
        status.st_mode = S_IFREG | mode;
        status.st_uid = owner;
        status.st_nlink = links;
        EXPECT_FALSE(vexo::isTrusted(status, S_IFREG)) << mode << ' ' << owner << ' ' << links;
    }
    std::filesystem::create_symlink("a", path("link"));
    EXPECT_FALSE(vexo::isTrusted(statusOf("link"), S_IFREG));
}

TEST_F(FileIo, AVersionIsKnownAgainUntilTheFileChanges) {
    const timespec hourAgo[] = {{time(nullptr) - 3600, 0}, {time(nullptr) - 3600, 5}};
    writeFile(path("a"), "text");
    EXPECT_FALSE(vexo::FileVersion(statusOf("a")).isCurrent(statusOf("a")))
        << "just written: the next write may look alike";
    ASSERT_EQ(utimensat(AT_FDCWD, path("a").c_str(), hourAgo, 0), 0);
    const vexo::FileVersion version(statusOf("a"));
    EXPECT_TRUE(version.isCurrent(statusOf("a")));
    EXPECT_FALSE(vexo::FileVersion().isCurrent(statusOf("a")));
    writeFile(path("b"), "text");
    ASSERT_EQ(utimensat(AT_FDCWD, path("b").c_str(), hourAgo, 0), 0);
    EXPECT_FALSE(version.isCurrent(statusOf("b"))) << "another inode";
    writeFile(path("a"), "next");
    EXPECT_FALSE(version.isCurrent(statusOf("a"))) << "another time";
    writeFile(path("a"), "longer");
    ASSERT_EQ(utimensat(AT_FDCWD, path("a").c_str(), hourAgo, 0), 0);
    EXPECT_FALSE(version.isCurrent(statusOf("a"))) << "another size";
}

TEST_F(FileIo, RaisedIdentityGoesBack) {
    SKIP_WITHOUT_ROOT();
    support::inChild([] {
        EXPECT_EQ(setresgid(support::kUsersGid, support::kUsersGid, 0), 0);
        EXPECT_EQ(setresuid(support::kAliceUid, support::kAliceUid, 0), 0);
        {
            errno = EBUSY;
            const vexo::RaisedIdentity raised;
            EXPECT_EQ(geteuid(), 0U);
            EXPECT_EQ(getegid(), 0U);
            const vexo::RaisedIdentity inner;
            EXPECT_EQ(geteuid(), 0U);
        }
        EXPECT_EQ(errno, EBUSY);
        EXPECT_EQ(geteuid(), uid_t{support::kAliceUid});
        EXPECT_EQ(getegid(), gid_t{support::kUsersGid});
        // Without the saved uid 0 there is nothing to raise to.
        EXPECT_EQ(setresuid(support::kAliceUid, support::kAliceUid, support::kAliceUid), 0);
        const vexo::RaisedIdentity raised;
        EXPECT_EQ(geteuid(), uid_t{support::kAliceUid});
        return 0;
    });
}

}  // namespace
