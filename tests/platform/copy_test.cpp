// Copies: whole or not at all, by every way, refused with the right number.
#include "vexo/copy.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <random>
#include <set>
#include <string>
#include <vector>

#include "file_io.h"
#include "platform/private_mounts.h"
#include "platform/refuse_calls.h"
#include "support/appliance.h"
#include "vexo/error.h"

namespace {

namespace fs = std::filesystem;
using support::kAliceUid;
using support::kUsersGid;
using support::readFile;
using support::writeFile;

constexpr size_t kBig = (size_t{4} << 20) + 1;  // two pieces

// What happens when the copy asks whether to go on: the n-th question runs `atQuestion`.
int questions = 0;
int questionOfInterest = 0;
int (*atQuestion)() = nullptr;
std::string place;  // the folder of the present test, for the functions that stand in for the outside world

int ask() {
    return ++questions == questionOfInterest ? atQuestion() : 0;
}

class CopyTest : public support::ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        root_ = shareRoot("photo");
        place = root_;
        questions = 0;
        writeFile(root_ + "/source", noise(kBig));
        support::makeFolder(root_ + "/in", 0777);
    }
    static std::string noise(size_t size) {
        std::mt19937_64 generator(7);
        std::string text;
        while (text.size() < size) {
            const auto number = generator();
            text.append(reinterpret_cast<const char*>(&number), sizeof number);
        }
        text.resize(size);
        return text;
    }
    static std::set<std::string> names(const std::string& folder) {
        std::set<std::string> found;
        for (const auto& entry : fs::directory_iterator(folder)) found.insert(entry.path().filename());
        return found;
    }
    static struct stat statusOf(const std::string& path) {
        struct stat status {};
        EXPECT_EQ(lstat(path.c_str(), &status), 0) << path;
        return status;
    }
    static VEXOCOPYOPT options(unsigned switches, int question = 0, int (*event)() = nullptr) {
        questionOfInterest = question;
        atQuestion = event;
        return {static_cast<uid_t>(-1), static_cast<gid_t>(-1), event != nullptr ? ask : nullptr, switches};
    }
    // A copy that fails with these numbers and changes nothing in the target's folder.
    void expectFailure(const std::string& source, const std::string& target, const VEXOCOPYOPT& with, int code,
                       int systemCode) {
        SCOPED_TRACE(source + " -> " + target);
        const auto before = names(root_ + "/in");
        questions = 0;
        VLIBCErrSetEx(0, "", 0);
        errno = 0;
        EXPECT_EQ(VEXOFileCopy(source.c_str(), target.c_str(), &with), -1);
        EXPECT_EQ(errno, systemCode) << strerror(errno);
        EXPECT_EQ(VLIBCErrGet(), code);
        EXPECT_EQ(names(root_ + "/in"), before);
    }
    std::string root_;
};

// Stand-ins for what others do in the middle of a copy.
int cancels() {
    return 1;
}
int appears() {
    writeFile(place + "/in/a", "theirs");
    return 0;
}
int becomesFolder() {
    EXPECT_EQ(unlink((place + "/in/a").c_str()), 0);
    support::makeFolder(place + "/in/a");
    return 0;
}
int shrinks() {
    return truncate((place + "/source").c_str(), 100);
}
int swapsSource() {
    fs::rename(place + "/source", place + "/moved");
    writeFile(place + "/source", "theirs");
    return 0;
}
int dies() {
    return raise(SIGKILL);
}

const support::Refusal kNoNameless{SYS_openat, EOPNOTSUPP, 2, O_TMPFILE & ~O_DIRECTORY};
const support::Refusal kNoClone{SYS_ioctl, EOPNOTSUPP};
const support::Refusal kNoKernelCopy{SYS_copy_file_range, EXDEV};
const support::Refusal kNoExclusiveRename{SYS_renameat2, EINVAL, 4, 1};

TEST_F(CopyTest, TheTargetIsANewFileOfTheGivenOwner) {
    const mode_t before = umask(0);  // as the making of temporary folders leaves it
    const timespec times[] = {{1000000000, 1}, {1100000000, 2}};
    ASSERT_EQ(utimensat(AT_FDCWD, (root_ + "/source").c_str(), times, 0), 0);
    const bool root = geteuid() == 0;
    VEXOCOPYOPT with = options(VEXO_COPY_KEEP_TIMES);
    if (root) with.uid = kAliceUid;
    if (root) with.gid = kUsersGid;
    errno = 0;
    ASSERT_EQ(VEXOFileCopy((root_ + "/source").c_str(), (root_ + "/in/new").c_str(), &with), 0);
    EXPECT_EQ(errno, 0);
    EXPECT_EQ(umask(before), 0U);
    EXPECT_EQ(readFile(root_ + "/in/new"), readFile(root_ + "/source"));
    const struct stat status = statusOf(root_ + "/in/new");
    EXPECT_EQ(status.st_mode, mode_t{S_IFREG | 0644});
    EXPECT_EQ(status.st_uid, root ? uid_t{kAliceUid} : geteuid());
    EXPECT_EQ(status.st_gid, root ? gid_t{kUsersGid} : getegid());
    EXPECT_EQ(status.st_mtim.tv_sec, 1100000000);
    EXPECT_EQ(status.st_mtim.tv_nsec, 2);
    EXPECT_EQ(names(root_ + "/in"), std::set<std::string>{"new"});

    writeFile(root_ + "/empty", "");
    ASSERT_EQ(chdir(root_.c_str()), 0);
    EXPECT_EQ(VEXOFileCopy("empty", "nothing", nullptr), 0);
    EXPECT_EQ(statusOf(root_ + "/nothing").st_size, 0);
    EXPECT_GT(statusOf(root_ + "/nothing").st_mtim.tv_sec, 1100000000);
}

TEST_F(CopyTest, ReplacingTakesOverThePermissions) {
    const std::string target = root_ + "/in/a";
    const VEXOCOPYOPT with = options(VEXO_COPY_OVERWRITE);
    writeFile(target, "old", 0660);
    ASSERT_EQ(VEXOFileCopy((root_ + "/source").c_str(), target.c_str(), &with), 0);
    EXPECT_EQ(statusOf(target).st_mode, mode_t{S_IFREG | 0660});
    EXPECT_EQ(statusOf(target).st_size, off_t{kBig});
    // user::rw-, user:20002:rw-, group::---, mask::rw-, other::---: without the ACL, mode 0660 would let the group in.
    const unsigned char acl[] = {2, 0,    0,    0,   1,   0,   6,  0, 255, 255, 255, 255, 2,   0,  6,
                                 0, 0x22, 0x4E, 0,   0,   4,   0,  0, 0,   255, 255, 255, 255, 16, 0,
                                 6, 0,    255,  255, 255, 255, 32, 0, 0,   0,   255, 255, 255, 255};
    if (setxattr(target.c_str(), "system.posix_acl_access", acl, sizeof acl, 0) != 0) GTEST_SKIP() << "no ACLs here";
    ASSERT_EQ(VEXOFileCopy((root_ + "/source").c_str(), target.c_str(), &with), 0);
    unsigned char got[sizeof acl] = {};
    EXPECT_EQ(getxattr(target.c_str(), "system.posix_acl_access", got, sizeof got), ssize_t{sizeof acl});
    EXPECT_EQ(memcmp(got, acl, sizeof acl), 0);
    EXPECT_EQ(names(root_ + "/in"), std::set<std::string>{"a"});
    // A new file gets what the folder's default ACL says.
    ASSERT_EQ(setxattr((root_ + "/in").c_str(), "system.posix_acl_default", acl, sizeof acl, 0), 0);
    for (const unsigned switches : {0U, unsigned{VEXO_COPY_TAKE}}) {
        const VEXOCOPYOPT how = options(switches);
        const std::string made = root_ + "/in/" + std::to_string(switches);
        ASSERT_EQ(VEXOFileCopy((root_ + "/source").c_str(), made.c_str(), &how), 0);
        EXPECT_EQ(getxattr(made.c_str(), "system.posix_acl_access", got, sizeof got), ssize_t{sizeof acl});
        EXPECT_EQ(memcmp(got, acl, sizeof acl), 0);
    }
}

TEST_F(CopyTest, ASourceThatIsGivenAwayBecomesTheTarget) {
    const VEXOCOPYOPT give = {getuid(), getgid(), nullptr, VEXO_COPY_OVERWRITE | VEXO_COPY_TAKE};
    const std::string source = root_ + "/source", target = root_ + "/in/taken", data = readFile(source);
    chmod(source.c_str(), 0600);
    const ino_t inode = statusOf(source).st_ino;
    ASSERT_EQ(VEXOFileCopy(source.c_str(), target.c_str(), &give), 0);
    EXPECT_EQ(statusOf(target).st_ino, inode);
    EXPECT_EQ(statusOf(target).st_mode & 0777, 0644U) << "as a new file has them";
    EXPECT_FALSE(fs::exists(source));

    // One that replaces a file takes over its permissions; one with a second name is copied, and so is any when not
    // given.
    writeFile(source, "second", 0600);
    chmod(target.c_str(), 0640);
    ASSERT_EQ(VEXOFileCopy(source.c_str(), target.c_str(), &give), 0);
    EXPECT_EQ(readFile(target), "second");
    EXPECT_EQ(statusOf(target).st_mode & 0777, 0640U);
    writeFile(source, "third");
    fs::create_hard_link(source, root_ + "/other name");
    ASSERT_EQ(VEXOFileCopy(source.c_str(), target.c_str(), &give), 0);
    EXPECT_EQ(readFile(target), "third");
    EXPECT_TRUE(fs::exists(source));

    // Where a file cannot have two names it is copied too.
    fs::remove(root_ + "/other name");
    const auto withoutLinks = [&] {
        if (!support::refuseCalls({{SYS_linkat, EPERM}, kNoNameless})) return 97;
        EXPECT_EQ(VEXOFileCopy(source.c_str(), (target + "3").c_str(), &give), 0);
        return readFile(target + "3") == "third" && fs::exists(source) ? 0 : 1;
    };
    EXPECT_EQ(support::inChild(withoutLinks), 0);

    // Another file put under the source's name in the middle is neither taken nor removed.
    const VEXOCOPYOPT swapped = {getuid(), getgid(), swapsSource, VEXO_COPY_OVERWRITE | VEXO_COPY_TAKE};
    ASSERT_EQ(VEXOFileCopy(source.c_str(), target.c_str(), &swapped), 0);
    EXPECT_EQ(readFile(target), "third");
    EXPECT_EQ(readFile(source), "theirs");

    const VEXOCOPYOPT cancelled = {getuid(), getgid(), [] { return 1; }, VEXO_COPY_TAKE};
    EXPECT_EQ(VEXOFileCopy(source.c_str(), (target + "2").c_str(), &cancelled), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_CANCELLED);
    EXPECT_TRUE(fs::exists(source));
}

TEST_F(CopyTest, HolesStayHoles) {
    const std::string sparse = root_ + "/sparse";
    {
        const vexo::Descriptor fd = vexo::openFile(sparse, O_RDWR | O_CREAT, 0644);
        ASSERT_EQ(pwrite(fd.get(), "head", 4, 0), 4);
        ASSERT_EQ(pwrite(fd.get(), "middle", 6, off_t{3} << 20), 6);
        ASSERT_EQ(ftruncate(fd.get(), off_t{8} << 20), 0);
    }
    const struct stat from = statusOf(sparse);
    if (from.st_blocks * 512 > (off_t{1} << 20)) GTEST_SKIP() << "no sparse files here";
    ASSERT_EQ(VEXOFileCopy(sparse.c_str(), (root_ + "/in/s").c_str(), nullptr), 0);
    const struct stat to = statusOf(root_ + "/in/s");
    EXPECT_EQ(to.st_size, from.st_size);
    EXPECT_LE(to.st_blocks, from.st_blocks);
    EXPECT_TRUE(readFile(root_ + "/in/s") == readFile(sparse));
}

TEST_F(CopyTest, SourcesAndTargetsThatAreRefused) {
    const std::string in = root_ + "/in";
    const std::string source = root_ + "/source";
    support::makeFolder(root_ + "/folder");
    fs::create_symlink("source", root_ + "/link");
    ASSERT_EQ(mkfifo((root_ + "/pipe").c_str(), 0666), 0);
    fs::create_hard_link(source, in + "/same");
    writeFile(in + "/old", "old");
    support::makeFolder(in + "/folder");
    fs::create_symlink("old", in + "/link");
    ASSERT_EQ(mkfifo((in + "/pipe").c_str(), 0666), 0);
    addMount(in, "vfat");
    const struct {
        std::string source, target;
        unsigned switches;
        int code, systemCode;
    } cases[] = {
        {root_ + "/missing", in + "/a", 1, VEXO_ERR_MISSING, ENOENT},
        {root_ + "/folder", in + "/a", 1, VEXO_ERR_BAD_PATH, EISDIR},
        {root_ + "/link", in + "/a", 1, VEXO_ERR_BAD_PATH, ELOOP},
        {root_ + "/pipe", in + "/a", 1, VEXO_ERR_BAD_PATH, EINVAL},
        {"/dev/null", in + "/a", 1, VEXO_ERR_BAD_PATH, EINVAL},
        {source + "/a", in + "/a", 1, VEXO_ERR_BAD_PATH, ENOTDIR},
        {source, root_ + "/nowhere/a", 1, VEXO_ERR_MISSING, ENOENT},
        {source, source + "/a", 1, VEXO_ERR_BAD_PATH, ENOTDIR},
        {source, in + "/", 1, VEXO_ERR_BAD_PATH, EINVAL},
        {source, in + "/..", 1, VEXO_ERR_BAD_PATH, EINVAL},
        {source, in + "/same", 1, VEXO_ERR_EXISTS, EEXIST},
        {source, source, 1, VEXO_ERR_EXISTS, EEXIST},
        {source, in + "/old", 0, VEXO_ERR_TARGET_EXISTS, EEXIST},
        {source, in + "/folder", 1, VEXO_ERR_TARGET_EXISTS_OTHER, EEXIST},
        {source, in + "/link", 1, VEXO_ERR_TARGET_EXISTS_OTHER, EEXIST},
        {source, in + "/pipe", 0, VEXO_ERR_TARGET_EXISTS_OTHER, EEXIST},
        {source, in + "/" + std::string(256, 'n'), 1, VEXO_ERR_NAME_TOO_LONG, ENAMETOOLONG},
        {source, in + "/what?", 1, VEXO_ERR_FAT_NAME, EINVAL},
        {source, in + "/a:b", 1, VEXO_ERR_FAT_NAME, EINVAL},
        {"", in + "/a", 1, VEXO_ERR_PARAMETER, EINVAL},
        {source, "", 1, VEXO_ERR_PARAMETER, EINVAL},
    };
    for (const auto& c : cases) expectFailure(c.source, c.target, options(c.switches), c.code, c.systemCode);
    EXPECT_EQ(VEXOFileCopy(nullptr, in.c_str(), nullptr), -1);
    EXPECT_EQ(VEXOFileCopy(in.c_str(), nullptr, nullptr), -1);
    EXPECT_EQ(readFile(in + "/old"), "old");
    EXPECT_EQ(readFile(source).size(), kBig);
    // The names that only FAT refuses are names elsewhere.
    EXPECT_EQ(VEXOFileCopy(source.c_str(), (root_ + "/what?").c_str(), nullptr), 0);
}

TEST_F(CopyTest, EachWayGivesTheSameAndLeavesNothing) {
    const std::string source = root_ + "/source";
    const std::string target = root_ + "/in/a";
    const VEXOCOPYOPT overwrite = options(VEXO_COPY_OVERWRITE);
    const struct {
        const char* name;
        std::vector<support::Refusal> refusals;
    } ways[] = {{"as the machine likes", {}},
                {"nameless, copied by the kernel", {kNoClone}},
                {"nameless, through the buffer", {kNoClone, kNoKernelCopy}},
                {"named part", {kNoNameless}},
                {"named part, no exclusive rename", {kNoNameless, kNoExclusiveRename, kNoClone, kNoKernelCopy}}};
    for (const auto& way : ways) {
        SCOPED_TRACE(way.name);
        const int result = support::inChild([&] {
            if (!support::refuseCalls(way.refusals)) return 97;
            EXPECT_EQ(VEXOFileCopy(source.c_str(), target.c_str(), nullptr), 0);
            EXPECT_TRUE(readFile(target) == readFile(source));
            EXPECT_EQ(statusOf(target).st_mode, mode_t{S_IFREG | 0644});
            expectFailure(source, target, options(0), VEXO_ERR_TARGET_EXISTS, EEXIST);
            writeFile(target, "old", 0600);
            EXPECT_EQ(VEXOFileCopy(source.c_str(), target.c_str(), &overwrite), 0);
            EXPECT_TRUE(readFile(target) == readFile(source));
            EXPECT_EQ(statusOf(target).st_mode, mode_t{S_IFREG | 0600});
            // Somebody else's file appears under the name: it stays, unless it may be replaced.
            for (const bool replaced : {false, true}) {
                EXPECT_EQ(unlink(target.c_str()), 0);
                const VEXOCOPYOPT with = options(replaced ? VEXO_COPY_OVERWRITE : 0, 1, appears);
                questions = 0;
                EXPECT_EQ(VEXOFileCopy(source.c_str(), target.c_str(), &with), replaced ? 0 : -1);
                EXPECT_EQ(readFile(target) == "theirs", !replaced);
                EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_TARGET_EXISTS);
            }
            expectFailure(source, target, options(VEXO_COPY_OVERWRITE, 1, becomesFolder), VEXO_ERR_TARGET_EXISTS_OTHER,
                          EISDIR);
            EXPECT_EQ(rmdir(target.c_str()), 0);
            EXPECT_EQ(names(root_ + "/in"), std::set<std::string>{});
            return 0;
        });
        EXPECT_EQ(result, 0);
    }
}

TEST_F(CopyTest, CancelledAtEveryQuestion) {
    const std::string source = root_ + "/source";
    const std::string target = root_ + "/in/a";
    const auto body = [&] {
        if (!support::refuseCalls({kNoClone})) return 97;
        VEXOCOPYOPT with = options(0, -1, cancels);
        questions = 0;
        EXPECT_EQ(VEXOFileCopy(source.c_str(), (root_ + "/counted").c_str(), &with), 0);
        const int asked = questions;
        EXPECT_GE(asked, 4);  // at first, before each of two pieces, at last
        for (int nth = 1; nth <= asked; ++nth) {
            expectFailure(source, target, options(0, nth, cancels), VEXO_ERR_CANCELLED, ECANCELED);
        }
        writeFile(target, "old");
        expectFailure(source, target, options(VEXO_COPY_OVERWRITE, asked, cancels), VEXO_ERR_CANCELLED, ECANCELED);
        EXPECT_EQ(readFile(target), "old");
        return 0;
    };
    EXPECT_EQ(support::inChild(body), 0);
}

TEST_F(CopyTest, ASourceThatShrinksIsNoCopy) {
    expectFailure(root_ + "/source", root_ + "/in/a", options(0, 1, shrinks), VEXO_ERR_GENERAL, EIO);
    // A hole at the end looks the same to a search for data.
    writeFile(root_ + "/source", "data");
    ASSERT_EQ(truncate((root_ + "/source").c_str(), off_t{kBig}), 0);
    expectFailure(root_ + "/source", root_ + "/in/a", options(0, 1, shrinks), VEXO_ERR_GENERAL, EIO);
}

TEST_F(CopyTest, AKilledCopyLeavesTheTargetAsItWas) {
    writeFile(root_ + "/in/a", "old");
    for (const bool nameless : {true, false}) {
        SCOPED_TRACE(nameless);
        const pid_t child = fork();
        if (child == 0) {
            support::refuseCalls(nameless ? std::vector{kNoClone} : std::vector{kNoClone, kNoNameless});
            const VEXOCOPYOPT with = options(VEXO_COPY_OVERWRITE, 2, dies);
            VEXOFileCopy((root_ + "/source").c_str(), (root_ + "/in/a").c_str(), &with);
            _exit(0);
        }
        int status = 0;
        ASSERT_EQ(waitpid(child, &status, 0), child);
        ASSERT_TRUE(WIFSIGNALED(status));
        EXPECT_EQ(readFile(root_ + "/in/a"), "old");
        auto left = names(root_ + "/in");
        left.erase("a");
        // A file system without nameless files keeps the part, under a hidden name that no later copy meets.
        // Until it has the permissions of what it replaces it is closed to others.
        EXPECT_LE(left.size(), nameless ? 0U : 1U);
        for (const std::string& name : left) {
            EXPECT_TRUE(name.starts_with(".part-")) << name;
            EXPECT_EQ(statusOf(root_ + "/in/" + name).st_mode, mode_t{S_IFREG | 0600});
            EXPECT_EQ(unlink((root_ + "/in/" + name).c_str()), 0);
        }
        EXPECT_EQ(VEXOFileCopy((root_ + "/source").c_str(), (root_ + "/in/b").c_str(), nullptr), 0);
        EXPECT_EQ(unlink((root_ + "/in/b").c_str()), 0);
    }
}

TEST_F(CopyTest, FailuresOfTheFileSystem) {
    const struct {
        support::Refusal refusal;
        int code;
    } cases[] = {{{SYS_copy_file_range, EDQUOT}, VEXO_ERR_QUOTA},
                 {{SYS_copy_file_range, ENOSPC}, VEXO_ERR_NO_SPACE},
                 {{SYS_copy_file_range, EFBIG}, VEXO_ERR_FILE_TOO_LARGE},
                 {{SYS_linkat, EINVAL}, VEXO_ERR_FAT_NAME},
                 {{SYS_linkat, EDQUOT}, VEXO_ERR_QUOTA},
                 {{SYS_ftruncate, EIO}, VEXO_ERR_GENERAL}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.refusal.call);
        const int result = support::inChild([&] {
            if (!support::refuseCalls({c.refusal, kNoClone})) return 97;
            expectFailure(root_ + "/source", root_ + "/in/a", options(0), c.code, c.refusal.systemCode);
            return 0;
        });
        EXPECT_EQ(result, 0);
    }
    const int result = support::inChild([&] {
        const rlimit limit{1 << 20, 1 << 20};
        signal(SIGXFSZ, SIG_IGN);
        if (setrlimit(RLIMIT_FSIZE, &limit) != 0) return 97;
        expectFailure(root_ + "/source", root_ + "/in/a", options(0), VEXO_ERR_FILE_TOO_LARGE, EFBIG);
        return 0;
    });
    EXPECT_EQ(result, 0);
}

TEST_F(CopyTest, FullAndReadOnlyFileSystems) {
    SKIP_WITHOUT_ROOT();
    const std::string in = root_ + "/in";
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        EXPECT_EQ(mount("none", in.c_str(), "tmpfs", 0, "size=2m,mode=0777"), 0);
        writeFile(in + "/old", "old");
        expectFailure(root_ + "/source", in + "/new", options(0), VEXO_ERR_NO_SPACE, ENOSPC);
        expectFailure(root_ + "/source", in + "/old", options(VEXO_COPY_OVERWRITE), VEXO_ERR_NO_SPACE, ENOSPC);
        EXPECT_EQ(readFile(in + "/old"), "old");
        writeFile(root_ + "/small", std::string(1 << 20, 's'));
        EXPECT_EQ(VEXOFileCopy((root_ + "/small").c_str(), (in + "/small").c_str(), nullptr), 0);  // to another device
        EXPECT_EQ(readFile(in + "/small").size(), 1U << 20);
        EXPECT_EQ(mount("none", in.c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr), 0);
        expectFailure(root_ + "/small", in + "/new", options(0), VEXO_ERR_READ_ONLY, EROFS);
        return 0;
    }));
}

TEST_F(CopyTest, DeniedToTheUser) {
    SKIP_WITHOUT_ROOT();
    writeFile(root_ + "/private", "secret", 0600);
    support::makeFolder(root_ + "/closed", 0755);
    const auto body = [&] {
        expectFailure(root_ + "/private", root_ + "/in/a", options(0), VEXO_ERR_DENIED, EACCES);
        expectFailure(root_ + "/source", root_ + "/closed/a", options(0), VEXO_ERR_DENIED, EACCES);
        VEXOCOPYOPT toBob = options(0);
        toBob.uid = support::kBobUid;
        expectFailure(root_ + "/source", root_ + "/in/a", toBob, VEXO_ERR_DENIED, EPERM);
        VEXOCOPYOPT own = options(VEXO_COPY_OVERWRITE);
        own.uid = kAliceUid;
        own.gid = kUsersGid;
        EXPECT_EQ(VEXOFileCopy((root_ + "/source").c_str(), (root_ + "/in/mine").c_str(), &own), 0);
        EXPECT_EQ(VEXOFileCopy((root_ + "/source").c_str(), (root_ + "/in/mine").c_str(), &own), 0);
        return 0;
    };
    EXPECT_EQ(support::asUser(kAliceUid, kUsersGid, body), 0);
    EXPECT_EQ(statusOf(root_ + "/in/mine").st_uid, kAliceUid);
}

}  // namespace
