// Permissions: the listing's short cut against the kernel's verdict and against what really succeeds, over a table of
// identities, folders, modes, owners and ACLs.
#include "vexo/acl.h"

#include <grp.h>
#include <linux/capability.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/xattr.h>

#include "filesystem/acl_rules.h"
#include "io/file_io.h"
#include "platform/private_mounts.h"
#include "support/testing.h"

namespace {

// An entry of an ACL as the kernel stores it behind a 4-byte version.
struct AclEntry {
    uint16_t tag, permission;
    uint32_t id = 0xFFFFFFFF;
};
enum : uint16_t { kOwnerTag = 1, kUserTag = 2, kGroupObjectTag = 4, kGroupTag = 8, kMaskTag = 16, kOtherTag = 32 };

bool setAcl(const std::string& path, const std::vector<AclEntry>& entries) {
    std::string blob("\2\0\0\0", 4);
    for (const AclEntry& entry : entries) blob.append(reinterpret_cast<const char*>(&entry), sizeof entry);
    return setxattr(path.c_str(), "system.posix_acl_access", blob.data(), blob.size(), 0) == 0;
}

struct Acting {
    const char* name;
    uid_t uid;
    gid_t gid;
    std::vector<gid_t> groups;
    uint32_t capabilities;  // effective ones; all is "as the ids give them"
};
constexpr uint32_t kAsIds = 0xFFFFFFFF;

// Root's real identity stays, as in the programs: access(2) would answer for root.
bool become(const Acting& who) {
    if (setgroups(who.groups.size(), who.groups.data()) != 0 || setegid(who.gid) != 0) return false;
    if (seteuid(who.uid) != 0) return false;
    if (who.capabilities == kAsIds) return true;
    __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
    __user_cap_data_struct data[2] = {};
    if (syscall(SYS_capget, &header, data) != 0) return false;
    data[0].effective = who.capabilities;
    data[1].effective = 0;
    return syscall(SYS_capset, &header, data) == 0;
}

class AclTest : public ApplianceTest {
 protected:
    static unsigned byPath(const std::string& path) {
        unsigned permission = 0xFFFF;
        EXPECT_EQ(VEXOACLPermGet(path.c_str(), &permission), 0) << path << strerror(errno);
        return permission;
    }
    // Whether renaming, which takes what removing takes, works.
    static bool canRename(const std::string& path) {
        const std::string away = path + ".away";
        return rename(path.c_str(), away.c_str()) == 0 && rename(away.c_str(), path.c_str()) == 0;
    }
    static void compare(const std::string& folder, const std::vector<std::string>& names) {
        const orvel::Descriptor opened = vexo::openFile(folder, O_PATH | O_DIRECTORY);
        const PVEXOACLFOLDER permissions = VEXOACLFolderOpen(opened.get());
        ASSERT_NE(permissions, nullptr);
        for (const std::string& name : names) {
            const std::string path = std::string(folder).append("/").append(name);
            SCOPED_TRACE(path);
            _tag_VEXOSTAT_ status;
            if (VLIBCFileLStatAt(opened.get(), name.c_str(), 1, &status) != 0) continue;  // the folder is closed to it
            unsigned inFolder = 0xFFFF;
            EXPECT_EQ(VEXOACLFolderPermGet(permissions, name.c_str(), &status, &inFolder), 0);
            EXPECT_EQ(inFolder, byPath(path));
            EXPECT_EQ((inFolder & VEXO_ACL_DELETE) != 0, canRename(path));
        }
        VEXOACLFolderClose(permissions);
    }
    static std::vector<std::string> fill(const std::string& folder);
};

// Files and folders of all the modes, owners and ACLs that tell different rules apart.
std::vector<std::string> AclTest::fill(const std::string& folder) {
    std::vector<std::string> names;
    for (const mode_t mode : {0000, 0644, 0600, 0755, 0070, 0007, 0604, 0640, 0664, 0775, 0711, 0111, 0010, 04755}) {
        const auto bits = [&](unsigned shift) { return static_cast<uint16_t>((mode >> shift) & 7); };
        const std::vector<AclEntry> acls[] = {
            {},
            // More than the mode shows for carol, less for the owning group; the mask is the mode's.
            {{kOwnerTag, bits(6)},
             {kUserTag, 7, kCarolUid},
             {kGroupObjectTag, 0},
             {kMaskTag, bits(3)},
             {kOtherTag, bits(0)}},
            // Less for carol.
            {{kOwnerTag, bits(6)},
             {kUserTag, 0, kCarolUid},
             {kGroupObjectTag, 7},
             {kGroupTag, 5, kAdminGid},
             {kMaskTag, 7},
             {kOtherTag, bits(0)}}};
        for (const uid_t owner : {uid_t{0}, uid_t{kAliceUid}, uid_t{kBobUid}}) {
            for (const auto& acl : acls) {
                const bool isFolder = (names.size() & 1) != 0;
                names.push_back(std::to_string(names.size()));
                const std::string path = folder + "/" + names.back();
                isFolder ? makeFolder(path) : writeFile(path, "#!/bin/sh\n");
                EXPECT_EQ(chown(path.c_str(), owner, kUsersGid), 0);
                EXPECT_TRUE(acl.empty() ? chmod(path.c_str(), mode) == 0 : setAcl(path, acl));
            }
        }
    }
    return names;
}

TEST_F(AclTest, FolderFormAgreesWithTheKernelAndWithTheDeed) {
    SKIP_WITHOUT_ROOT();
    const std::vector<Acting> identities = {
        {"root", 0, 0, {0}, kAsIds},
        {"root without capabilities", 0, 0, {0}, 0},
        {"alice", kAliceUid, 1, {}, kAsIds},
        {"bob of the group", kBobUid, kUsersGid, {kUsersGid}, kAsIds},
        {"carol, named in ACLs", kCarolUid, 1, {1}, kAsIds},
        {"carol of both groups", kCarolUid, 1, {kUsersGid, kAdminGid}, kAsIds},
        {"a stranger", 29999, 29999, {}, kAsIds},
        {"a stranger who reads all", 29999, 29999, {}, 1U << CAP_DAC_READ_SEARCH},
        {"a stranger who overrides", 29999, 29999, {}, 1U << CAP_DAC_OVERRIDE},
        {"a stranger who owns all", 29999, 29999, {}, 1U << CAP_FOWNER},
    };
    const auto folders = rowsOf<const char*, mode_t, uid_t>("platform/acl_folders");
    std::vector<std::string> names;
    for (const auto& [folder, mode, owner] : folders) {
        const std::string path = photo_ + "/" + folder;
        makeFolder(path);
        names = fill(path);
        ASSERT_TRUE(chown(path.c_str(), owner, kUsersGid) == 0 && chmod(path.c_str(), mode) == 0);
    }
    for (const Acting& who : identities) {
        SCOPED_TRACE(who.name);
        inChild([&] {
            if (!become(who)) return 97;
            for (const auto& row : folders) compare(photo_ + "/" + std::get<0>(row), names);
            return 0;
        });
    }
}

TEST_F(AclTest, MountsJudgeToo) {
    SKIP_WITHOUT_ROOT();
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        std::vector<std::string> names;
        for (const char* name : {"read-only", "no-execute", "bound"}) {
            const std::string folder = photo_ + "/" + name;
            makeFolder(folder, 0777);
            EXPECT_EQ(mount("none", folder.c_str(), "tmpfs", 0, "size=4m,mode=0777"), 0);
            names = fill(folder);
        }
        EXPECT_EQ(mount("none", (photo_ + "/read-only").c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr), 0);
        EXPECT_EQ(mount("none", (photo_ + "/no-execute").c_str(), nullptr, MS_REMOUNT | MS_NOEXEC, nullptr), 0);
        // A folder of the same device whose mount is read-only while the one around it is not.
        const std::string inner = photo_ + "/bound/inner";
        makeFolder(inner, 0777);
        EXPECT_EQ(mount(inner.c_str(), inner.c_str(), nullptr, MS_BIND, nullptr), 0);
        EXPECT_EQ(mount("none", inner.c_str(), nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
        EXPECT_EQ(byPath(inner) & VEXO_ACL_WRITE, 0U);
        const orvel::Descriptor around = vexo::openFile(photo_ + "/bound", O_PATH | O_DIRECTORY);
        const PVEXOACLFOLDER permissions = VEXOACLFolderOpen(around.get());
        _tag_VEXOSTAT_ status;
        unsigned inFolder = 0;
        EXPECT_EQ(VLIBCFileLStatAt(around.get(), "inner", 1, &status), 0);
        EXPECT_EQ(VEXOACLFolderPermGet(permissions, "inner", &status, &inFolder), 0);
        EXPECT_EQ(inFolder, byPath(inner));
        VEXOACLFolderClose(permissions);
        for (const char* name : {"read-only", "no-execute"}) compare(photo_ + "/" + name, names);
        EXPECT_EQ(seteuid(kAliceUid), 0);
        compare(photo_ + "/read-only", names);
        return 0;
    }));
}

TEST_F(AclTest, ImmutableAndAppendOnly) {
    SKIP_WITHOUT_ROOT();
    const auto mark = [this](const char* name, int flags) {
        return ioctl(vexo::openFile(photo_ + name, O_RDONLY).get(), FS_IOC_SETFLAGS, &flags) == 0;
    };
    for (const char* name : {"/plain", "/fixed", "/growing", "/log/plain"}) writeFile(photo_ + name, "", 0666);
    if (!mark("/fixed", FS_IMMUTABLE_FL)) GTEST_SKIP() << "no immutable files here: " << strerror(errno);
    EXPECT_TRUE(mark("/growing", FS_APPEND_FL) && mark("/log", FS_APPEND_FL));
    EXPECT_EQ(byPath(photo_ + "/fixed"), unsigned{VEXO_ACL_READ});
    EXPECT_EQ(byPath(photo_ + "/growing") & VEXO_ACL_DELETE, 0U);
    compare(photo_, {"plain", "fixed", "growing"});
    compare(photo_ + "/log", {"plain"});
    for (const char* name : {"/fixed", "/growing", "/log"}) EXPECT_TRUE(mark(name, 0));
}

// Whatever makes the status no proof leaves every bit to the kernel, even for root.
TEST_F(AclTest, OnlyAProofSettles) {
    for (int spoilt = 0; spoilt <= 5; ++spoilt) {
        vexo::FolderFacts folder{};
        _tag_VEXOSTAT_ entry{};
        folder.device = 5;
        folder.plain = spoilt != 1;
        entry.st_device = spoilt == 2 ? 6 : 5;
        entry.st_attributes = spoilt == 3 ? 0 : VEXO_ATTRIBUTE_KNOWN;
        entry.st_mode = spoilt == 4 ? S_IFLNK | 0777 : S_IFREG | 0640;
        entry.st_gid = spoilt == 5 ? 65534 : 0;
        EXPECT_EQ(vexo::settle({0, true, true, true}, folder, entry).open, spoilt == 0 ? 0U : 7U) << spoilt;
    }
}

TEST_F(AclTest, FailuresAndOddPaths) {
    for (const auto& [target, link] : Rows<const char*, const char*>{{"gone", "/dangling"}, {"a", "/link"}})
        fs::create_symlink(target, photo_ + link);
    writeFile(photo_ + "/a", "", 0444);
    for (const auto& [path, systemCode, code] :
         Rows<std::string, int, int>{{photo_ + "/missing", ENOENT, VEXO_ERR_MISSING},
                                     {photo_ + "/a/below", ENOTDIR, VEXO_ERR_MISSING},
                                     {photo_ + "/dangling", ENOENT, VEXO_ERR_ACL_TARGET_MISSING},
                                     {std::string(5000, 'n'), ENAMETOOLONG, VEXO_ERR_GENERAL}}) {
        unsigned permission = 0;
        EXPECT_FAILS(VEXOACLPermGet(path.c_str(), &permission), systemCode, code);
    }
    makeFolder(photo_ + "/closed", 0700);  // denied is no failure
    writeFile(photo_ + "/closed/b", "", 0666);
    if (geteuid() == 0) {
        EXPECT_EQ(asUser(kAliceUid, kUsersGid, [&] { return int(byPath(photo_ + "/closed/b")); }), 0);
    }
    errno = 0;
    for (const char* never : {"/", "/..", "."}) EXPECT_EQ(byPath(never) & VEXO_ACL_DELETE, 0U) << never;
    EXPECT_NE(byPath(photo_ + "//") & VEXO_ACL_DELETE, 0U);
    ASSERT_EQ(chdir(photo_.c_str()), 0);
    EXPECT_NE(byPath("link") & VEXO_ACL_DELETE, 0U);  // the link goes, not its target
    EXPECT_EQ(errno, 0);
    inChild([&] {
        const vexo::Descriptor folder = vexo::openFile(photo_, O_RDONLY | O_DIRECTORY);
        unsigned permission = 0;
        EXPECT_TRUE(refuseCalls({{SYS_statx, EIO}}));
        EXPECT_FAILS(VEXOACLPermGet("a", &permission), EIO,
                     VEXO_ERR_GENERAL);  // whether it may be removed is not known
        EXPECT_EQ(VEXOACLFolderOpen(folder.get()), nullptr);
    });
}

TEST_F(AclTest, SupportIsAskedOncePerDevice) {
    writeFile(photo_ + "/a", "");
    const struct stat status = statusOf(photo_ + "/a");
    const bool kept = getxattr((photo_ + "/a").c_str(), "system.posix_acl_access", nullptr, 0) >= 0 || errno == ENODATA;
    EXPECT_EQ(VEXOACLIsSupport((photo_ + "/a").c_str(), -1, 2) > 0, kept);
    EXPECT_EQ(VEXOACLIsSupportOnDevice("/nowhere", status.st_dev) > 0, kept);  // known, so the path is not needed
    EXPECT_EQ(VEXOACLIsSupport("/proc/self/stat", -1, 2), 0);
    EXPECT_FAILS(VEXOACLIsSupport((photo_ + "/missing").c_str(), -1, 2), ENOENT, VEXO_ERR_MISSING);
}

}  // namespace
