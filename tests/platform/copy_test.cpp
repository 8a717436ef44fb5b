// Copies: whole or not at all, by every way, refused with the right number.
#include "vexo/copy.h"

#include <sys/xattr.h>

#include "support/testing.h"
#include "vexo/filesystem.h"

namespace {

constexpr size_t kSize = 300001;                // two buffers
constexpr size_t kBig = (size_t{4} << 20) + 1;  // two pieces
constexpr const char* kSource = "from/source";
constexpr const char* kTarget = "in/a";

// What happens when the copy asks whether to go on: the n-th question runs `atQuestion`.
int questions = 0;
int questionOfInterest = 0;
int (*atQuestion)() = nullptr;

int ask() {
    return ++questions == questionOfInterest ? atQuestion() : 0;
}

VEXOCOPYOPT options(unsigned switches, int question = 0, int (*event)() = nullptr) {
    questions = 0;
    questionOfInterest = question;
    atQuestion = event;
    return {static_cast<uid_t>(-1), static_cast<gid_t>(-1), event != nullptr ? ask : nullptr, switches};
}

int cancel() {
    return 1;
}

// The tests' working directory is a share's root.
class CopyTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        ASSERT_EQ(chdir(shareRoot("photo").c_str()), 0);
        std::mt19937_64 generator(7);
        std::string noise(kSize, ' ');
        for (char& c : noise) c = static_cast<char>(generator());
        writeFile(kSource, noise);
        makeFolder("in", 0777);
    }
    static std::set<std::string> names() {
        std::set<std::string> found;
        for (const auto& entry : fs::directory_iterator("in")) found.insert(entry.path().filename());
        return found;
    }
    static int copy(const VEXOCOPYOPT& with, const char* source = kSource, const char* target = kTarget) {
        return VEXOFileCopy(source, target, &with);
    }
    static bool isCopied() { return readFile(kTarget) == readFile(kSource); }
    // A copy that fails with these numbers and changes nothing in the target's folder.
    static void expectFailure(const VEXOCOPYOPT& with, int code, int systemCode, const std::string& source = kSource,
                              const std::string& target = kTarget) {
        SCOPED_TRACE(source + " -> " + target);
        const auto before = names();
        EXPECT_FAILS(copy(with, source.c_str(), target.c_str()), systemCode, code);
        EXPECT_EQ(names(), before);
    }
};

const Refusal kNoNameless{SYS_openat, EOPNOTSUPP, 2, O_TMPFILE & ~O_DIRECTORY};
const Refusal kNoClone{SYS_ioctl, EOPNOTSUPP};
const Refusal kNoKernelCopy{SYS_copy_file_range, EXDEV};
const Refusal kNoExclusiveRename{SYS_renameat2, EINVAL, 4, 1};

// Runs `body` in a child whose kernel refuses these calls.
void withRefusals(const std::vector<Refusal>& refusals, const std::function<void()>& body) {
    EXPECT_EQ(inChild([&] { return refuseCalls(refusals) ? (body(), 0) : 97; }), 0);
}

TEST_F(CopyTest, TheTargetIsANewFileOfTheGivenOwner) {
    const mode_t before = umask(0);  // as the making of temporary folders leaves it
    const timespec times[] = {{1000000000, 1}, {1100000000, 2}};
    ASSERT_EQ(utimensat(AT_FDCWD, kSource, times, 0), 0);
    VEXOCOPYOPT with = options(VEXO_COPY_KEEP_TIMES);
    with.uid = geteuid() == 0 ? uid_t{kAliceUid} : geteuid();
    with.gid = geteuid() == 0 ? gid_t{kUsersGid} : getegid();
    errno = 0;
    ASSERT_EQ(copy(with), 0);
    EXPECT_EQ(errno, 0);
    EXPECT_EQ(umask(before), 0U);
    const struct stat status = statusOf(kTarget);
    EXPECT_EQ(status.st_mode, mode_t{S_IFREG | 0644});
    EXPECT_TRUE(status.st_uid == with.uid && status.st_gid == with.gid);
    EXPECT_TRUE(status.st_mtim.tv_sec == 1100000000 && status.st_mtim.tv_nsec == 2);
    // The times of now when they are not to be kept; holes stay holes.
    ASSERT_EQ(truncate(kSource, off_t{16} << 20) + unlink(kTarget), 0);
    ASSERT_EQ(copy(options(0)), 0);
    EXPECT_GT(statusOf(kTarget).st_mtim.tv_sec, 1100000000);
    EXPECT_LE(statusOf(kTarget).st_blocks, statusOf(kSource).st_blocks);
    EXPECT_TRUE(isCopied());
}

TEST_F(CopyTest, PermissionsComeFromWhatIsReplacedOrFromTheFolder) {
    const VEXOCOPYOPT with = options(VEXO_COPY_OVERWRITE);
    writeFile(kTarget, "old", 0660);
    ASSERT_EQ(copy(with), 0);
    EXPECT_EQ(statusOf(kTarget).st_mode, mode_t{S_IFREG | 0660});
    // user::rw-, user:20002:rw-, group::---, mask::rw-, other::---: without the ACL, mode 0660 would let the group in.
    const std::string acl(
        "\2\0\0\0\1\0\6\0\xFF\xFF\xFF\xFF\2\0\6\0\x22\x4E\0\0\4\0\0\0\xFF\xFF\xFF\xFF\x10\0\6\0"
        "\xFF\xFF\xFF\xFF\x20\0\0\0\xFF\xFF\xFF\xFF",
        44);
    const auto aclOfTarget = [] {
        std::string got(100, '\0');
        const ssize_t length = getxattr(kTarget, "system.posix_acl_access", got.data(), got.size());
        return got.substr(0, static_cast<size_t>(std::max(length, ssize_t{0})));
    };
    if (setxattr(kTarget, "system.posix_acl_access", acl.data(), acl.size(), 0) != 0) GTEST_SKIP() << "no ACLs here";
    ASSERT_EQ(copy(with), 0);
    EXPECT_EQ(aclOfTarget(), acl);
    ASSERT_EQ(setxattr("in", "system.posix_acl_default", acl.data(), acl.size(), 0), 0);
    std::string limited = acl;
    limited[30] = 4;  // the mask entry, by the mask of new files
    for (const unsigned switches : {0U, unsigned{VEXO_COPY_TAKE}}) {
        unlink(kTarget);
        ASSERT_EQ(copy(options(switches)), 0);
        EXPECT_EQ(aclOfTarget(), limited);
    }
}

TEST_F(CopyTest, ASourceThatIsGivenAwayBecomesTheTarget) {
    VEXOCOPYOPT give{getuid(), getgid(), nullptr, VEXO_COPY_OVERWRITE | VEXO_COPY_TAKE};
    chmod(kSource, 0600);
    const ino_t inode = statusOf(kSource).st_ino;
    ASSERT_EQ(copy(give), 0);
    EXPECT_EQ(statusOf(kTarget).st_ino, inode);
    EXPECT_EQ(statusOf(kTarget).st_mode & 0777, 0644U) << "as a new file has them";
    EXPECT_FALSE(fs::exists(kSource));
    // One that replaces a file takes over its permissions; one with a second name is copied.
    chmod(kTarget, 0640);
    writeFile(kSource, "second", 0600);
    ASSERT_EQ(copy(give), 0);
    EXPECT_EQ(readFile(kTarget), "second");
    EXPECT_EQ(statusOf(kTarget).st_mode & 0777, 0640U);
    writeFile(kSource, "third");
    fs::create_hard_link(kSource, "from/other name");
    ASSERT_EQ(copy(give), 0);
    EXPECT_EQ(readFile(kTarget), "third");
    EXPECT_TRUE(fs::remove("from/other name") && fs::exists(kSource));
    withRefusals({{SYS_linkat, EPERM}, kNoNameless}, [&] {  // where a file cannot have two names
        EXPECT_EQ(copy(give, kSource, "in/b"), 0);
        EXPECT_TRUE(readFile("in/b") == "third" && fs::exists(kSource));
    });
    // Another file put under the source's name in the middle is neither taken nor removed.
    give.isCancelled = [] {
        fs::rename(kSource, "from/moved");
        writeFile(kSource, "theirs");
        return 0;
    };
    ASSERT_EQ(copy(give), 0);
    EXPECT_EQ(readFile(kTarget), "third");
    EXPECT_EQ(readFile(kSource), "theirs");
    give.isCancelled = cancel;
    expectFailure(give, VEXO_ERR_CANCELLED, ECANCELED, kSource, "in/c");
    EXPECT_TRUE(fs::exists(kSource));
}

TEST_F(CopyTest, SourcesAndTargetsThatAreRefused) {
    const std::string in = fs::current_path() / "in";
    const std::string source = kSource;
    writeFile("in/old", "old");
    for (const std::string folder : {"from", "in"}) {
        makeFolder(folder + "/folder");
        fs::create_symlink("old", folder + "/link");
        ASSERT_EQ(mkfifo((folder + "/pipe").c_str(), 0666), 0);
    }
    fs::create_hard_link(source, "in/same");
    addMount(in, "vfat");
    for (const auto& [from, to, switches, code, systemCode] : Rows<std::string, std::string, unsigned, int, int>{
             {"from/missing", "in/a", 1, VEXO_ERR_MISSING, ENOENT},
             {"from/folder", "in/a", 1, VEXO_ERR_BAD_PATH, EISDIR},
             {"from/link", "in/a", 1, VEXO_ERR_BAD_PATH, ELOOP},
             {"from/pipe", "in/a", 1, VEXO_ERR_BAD_PATH, EINVAL},
             {source + "/a", "in/a", 1, VEXO_ERR_BAD_PATH, ENOTDIR},
             {source, "nowhere/a", 1, VEXO_ERR_MISSING, ENOENT},
             {source, "in/..", 1, VEXO_ERR_BAD_PATH, EINVAL},
             {source, "in/same", 1, VEXO_ERR_EXISTS, EEXIST},
             {source, "in/old", 0, VEXO_ERR_TARGET_EXISTS, EEXIST},
             {source, "in/folder", 1, VEXO_ERR_TARGET_EXISTS_OTHER, EEXIST},
             {source, "in/link", 1, VEXO_ERR_TARGET_EXISTS_OTHER, EEXIST},
             {source, "in/pipe", 0, VEXO_ERR_TARGET_EXISTS_OTHER, EEXIST},
             {source, "in/" + std::string(256, 'n'), 1, VEXO_ERR_NAME_TOO_LONG, ENAMETOOLONG},
             {source, in + "/what?", 1, VEXO_ERR_FAT_NAME, EINVAL},
             {source, "", 1, VEXO_ERR_PARAMETER, EINVAL}})
        expectFailure(options(switches), code, systemCode, from, to);
    EXPECT_EQ(readFile("in/old"), "old");
    EXPECT_EQ(copy(options(0), kSource, (fs::current_path() / "what?").c_str()), 0) << "not on FAT";
}

TEST_F(CopyTest, EachWayGivesTheSameAndLeavesNothing) {
    const std::vector<Refusal> ways[] = {
        {}, {kNoClone}, {kNoClone, kNoKernelCopy}, {kNoNameless, kNoExclusiveRename, kNoClone, kNoKernelCopy}};
    for (const auto& refusals : ways) {
        SCOPED_TRACE(&refusals - ways);
        withRefusals(refusals, [&] {
            EXPECT_EQ(copy(options(0)), 0);
            EXPECT_TRUE(isCopied());
            EXPECT_EQ(statusOf(kTarget).st_mode, mode_t{S_IFREG | 0644});
            writeFile(kTarget, "old", 0640);
            // What is made beside it is hidden, and closed to others until it has the permissions of what it replaces.
            const auto partIsClosed = [] {
                for (const std::string& name : names()) {
                    if (name == "a") continue;
                    EXPECT_EQ(VEXOEAIsHiddenFile(name.c_str()), 1) << name;
                    EXPECT_EQ(statusOf("in/" + name).st_mode, mode_t{S_IFREG | 0600});
                }
                return 0;
            };
            EXPECT_EQ(copy(options(VEXO_COPY_OVERWRITE, 1, partIsClosed)), 0);
            EXPECT_TRUE(isCopied());
            EXPECT_EQ(statusOf(kTarget).st_mode, mode_t{S_IFREG | 0640});
            // Somebody else's file appears under the name: it stays, unless it may be replaced.
            const auto appears = [] { return writeFile(kTarget, "theirs"), 0; };
            for (const bool replaced : {false, true}) {
                EXPECT_EQ(unlink(kTarget), 0);
                EXPECT_EQ(copy(options(replaced ? VEXO_COPY_OVERWRITE : 0, 1, appears)), replaced ? 0 : -1);
                EXPECT_EQ(readFile(kTarget) == "theirs", !replaced);
                EXPECT_TRUE(replaced || VLIBCErrGet() == VEXO_ERR_TARGET_EXISTS);
            }
            const auto becomesFolder = [] { return unlink(kTarget), mkdir(kTarget, 0755); };
            expectFailure(options(VEXO_COPY_OVERWRITE, 1, becomesFolder), VEXO_ERR_TARGET_EXISTS_OTHER, EISDIR);
            EXPECT_EQ(names(), std::set<std::string>{"a"});
            EXPECT_EQ(rmdir(kTarget), 0);
        });
    }
}

TEST_F(CopyTest, ACancelledCopyAndASourceThatShrinksLeaveNothing) {
    writeFile(kSource, std::string(kBig, 'x'));
    withRefusals({kNoClone}, [&] {
        EXPECT_EQ(copy(options(0, -1, cancel), kSource, "counted"), 0);
        const int asked = questions;
        EXPECT_GE(asked, 4);  // at first, before each of two pieces, at last
        for (int nth = 1; nth < asked; ++nth) expectFailure(options(0, nth, cancel), VEXO_ERR_CANCELLED, ECANCELED);
        writeFile(kTarget, "old");
        expectFailure(options(VEXO_COPY_OVERWRITE, asked, cancel), VEXO_ERR_CANCELLED, ECANCELED);
        EXPECT_EQ(readFile(kTarget), "old");
        EXPECT_EQ(unlink(kTarget), 0);
    });
    const auto shrinks = [] { return truncate(kSource, 100); };
    expectFailure(options(0, 1, shrinks), VEXO_ERR_GENERAL, EIO);
    // A hole at the end looks the same to a search for data.
    ASSERT_EQ(truncate(kSource, off_t{kBig}), 0);
    expectFailure(options(0, 1, shrinks), VEXO_ERR_GENERAL, EIO);
}

TEST_F(CopyTest, FailuresOfTheFileSystem) {
    for (const auto& [call, systemCode, code] : Rows<long, int, int>{
             row(SYS_copy_file_range, EDQUOT, VEXO_ERR_QUOTA), row(SYS_copy_file_range, ENOSPC, VEXO_ERR_NO_SPACE),
             row(SYS_linkat, EINVAL, VEXO_ERR_FAT_NAME), row(SYS_linkat, EROFS, VEXO_ERR_READ_ONLY),
             row(SYS_ftruncate, EIO, VEXO_ERR_GENERAL)})
        withRefusals({{call, systemCode}, kNoClone},
                     [code = code, systemCode = systemCode] { expectFailure(options(0), code, systemCode); });
    // Waiting for the disk, for what must be there.
    for (const unsigned way : {0U, unsigned{VEXO_COPY_TAKE}})
        withRefusals({{SYS_fsync, EIO}}, [way] {
            expectFailure(options(way | VEXO_COPY_SYNC), VEXO_ERR_GENERAL, EIO);
            EXPECT_EQ(copy(options(way)), 0);
            fs::rename(kTarget, kSource);
        });
}

TEST_F(CopyTest, DeniedToTheUser) {
    SKIP_WITHOUT_ROOT();
    writeFile("from/private", "secret", 0600);
    makeFolder("closed", 0755);
    asUser(kAliceUid, kUsersGid, [&] {
        expectFailure(options(0), VEXO_ERR_DENIED, EACCES, "from/private");
        expectFailure(options(0), VEXO_ERR_DENIED, EACCES, kSource, "closed/a");
        VEXOCOPYOPT with = options(VEXO_COPY_OVERWRITE);
        with.uid = kBobUid;
        expectFailure(with, VEXO_ERR_DENIED, EPERM);
        with.uid = kAliceUid;
        for (int time = 0; time < 2; ++time) EXPECT_EQ(copy(with), 0);
    });
    EXPECT_EQ(statusOf(kTarget).st_uid, kAliceUid);
}

}  // namespace
