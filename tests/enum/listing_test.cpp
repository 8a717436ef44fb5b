#include "orvel/listing.h"

#include <dirent.h>

#include <climits>

#include "orvel/directory_walker.h"
#include "orvel/privilege.h"
#include "orvel/search_criteria.h"
#include "support/system_faults.h"
#include "support/testing.h"
#include "vexo/acl.h"
#include "vexo/stat.h"

namespace {

using Names = std::vector<std::string>;

constexpr int kEverything = 0x7F;

Names namesOf(const std::list<DIRENTRY_INFO>& entries) {
    Names names;
    for (const auto& entry : entries) names.push_back(entry.name);
    return names;
}

class ListingTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addUser("owner", geteuid(), getegid());  // whoever runs the tests has a name
        addGroup("owners", getegid(), {});
    }

    bool list(const char* sortBy = "name", int additional = 0, unsigned long offset = 0, unsigned long limit = 0,
              bool ascending = true, _tag_dir_entry_type_ type = DIR_ENTRY_TYPE_ALL) {
        entries_.clear();
        return listing_.OrvLibDirEntryListEnum("/photo", photo_.c_str(), sortBy, additional, offset, limit, ascending,
                                               type, criteria_, entries_, &total_);
    }
    Names listed(const char* sortBy = "name", int additional = 0, unsigned long offset = 0, unsigned long limit = 0,
                 bool ascending = true, _tag_dir_entry_type_ type = DIR_ENTRY_TYPE_ALL) {
        EXPECT_TRUE(list(sortBy, additional, offset, limit, ascending, type)) << OrvLibGetErr();
        return namesOf(entries_);
    }
    void file(const std::string& name, const std::string& text = "") { writeFile(photo_ + "/" + name, text); }
    void folder(const std::string& name) { makeFolder(photo_ + "/" + name); }
    // Two folders and four files that every column orders differently.
    void makeMixedFolder() {
        folder("beta");
        folder("Alpha.zip");
        for (const auto& [name, size] :
             Rows<const char*, size_t>{row("c.txt", 3), row("B.jpg", 1), row("a", 5), row("d.TXT", 2)})
            file(name, std::string(size, 'x'));
        for (const auto& [name, mode, time] :
             Rows<const char*, mode_t, time_t>{row("beta", 0755, 5), row("Alpha.zip", 0777, 4), row("c.txt", 0600, 300),
                                               row("B.jpg", 0644, 200), row("a", 0640, 100), row("d.TXT", 0400, 400)}) {
            const std::string path = photo_ + "/" + name;
            const timespec times[2] = {{1000 - time, 0}, {time, 0}};
            ASSERT_EQ(chmod(path.c_str(), mode) + utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
        }
    }

    OrvEnum listing_;
    std::vector<FileSearch::FindComp*> criteria_;
    std::list<DIRENTRY_INFO> entries_;
    unsigned long total_ = 99;
};

TEST_F(ListingTest, FolderThatCannotBeListed) {
    file("plain");
    addMount(photo_ + "/dead", "nfs");
    addMount(photo_ + "/plain", "nfs");
    const std::string tmp = "/tmp", longName = photo_ + "/" + std::string(300, 'x');
    for (const auto& [path, real, code, logged] : Rows<const char*, std::string, int, bool>{
             row("", tmp, 400, false), row("/photo", "", 400, false), row("/", "", 400, false),
             row("/", tmp, 407, false), row("/photo", photo_ + "/none", ORV_ERR_MISSING, false),
             row("/photo", photo_ + "/dead", ORV_ERR_REMOTE, false),
             row("/photo", photo_ + "/plain", ORV_ERR_DIRECTORY, true),
             row("/photo", longName, ORV_ERR_DIRECTORY, true)}) {
        if (logged) announceLog("Failed to access " + real);
        total_ = 99;
        EXPECT_FALSE(listing_.OrvLibDirEntryListEnum(path, real.c_str(), "name", 0, 0, 0, true, DIR_ENTRY_TYPE_ALL, {},
                                                     entries_, &total_));
        EXPECT_EQ(OrvLibGetErr(), code);
        EXPECT_EQ(total_, code == 400 || code == 407 ? 99U : 0U);
    }
    EXPECT_FALSE(
        listing_.OrvLibDirEntryListEnum("/", "/tmp", "name", 0, 0, 0, true, DIR_ENTRY_TYPE_ALL, {}, entries_, nullptr));
    EXPECT_EQ(OrvLibGetErr(), 400);
}

// What the caller holds open is listed, wherever it lies by now; what goes by text gets the path where it was found.
TEST_F(ListingTest, AnOpenFolder) {
    const std::string listed = photo_ + "/listed", moved = photo_ + "/moved";
    for (const char* name : {"/listed/disc", "/other/secret"}) makeFolder(photo_ + name);
    file("listed/f");
    const orvel::Descriptor opened(open(listed.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    fs::rename(listed, moved);
    fs::create_symlink("other", listed);
    addMount(moved + "/disc", "cifs");
    addMount(moved, "nfs");
    const auto ask = [&] {
        entries_.clear();
        return OrvEnum().OrvLibDirEntryListEnum("/photo/listed", opened.path().c_str(), "name", kEverything, 0, 0, true,
                                                DIR_ENTRY_TYPE_ALL, {}, entries_, &total_);
    };
    ASSERT_TRUE(ask());
    ASSERT_EQ(namesOf(entries_), (Names{"disc", "f"}));
    EXPECT_EQ(entries_.front().realPath + entries_.front().mountPointType, moved + "/discremote");
    EXPECT_EQ(entries_.back().path + entries_.back().realPath, "/photo/listed/f" + moved + "/f");
    EXPECT_EQ(entries_.back().aclPrivilege, GetACLPrivilege((moved + "/f").c_str())) << "the parent has its say";
    {
        const ReadingFault fault(moved, EACCES);
        EXPECT_FALSE(ask());
        EXPECT_EQ(OrvLibGetErr(), ORV_ERR_DENIED);
    }
    vexo::gate::fail("VEXOACLFolderPermGet", VEXO_ERR_GENERAL);
    vexo::gate::fail("VEXOACLPermGet", VEXO_ERR_GENERAL);
    announceLog("Failed to get the ACL Privilege: file = " + moved + "/disc");
    announceLog("Failed to get the ACL Privilege: file = " + moved + "/f");
    EXPECT_TRUE(ask());
    EXPECT_EQ(entries_.front().aclPrivilege, 0x1FFFU);
    inChild([&] {
        EXPECT_TRUE(refuseCalls({{SYS_fchdir, EHOSTDOWN}, {SYS_chdir, EHOSTDOWN}}));
        EXPECT_FALSE(ask());
        EXPECT_EQ(OrvLibGetErr(), ORV_ERR_REMOTE) << "a mount by its real path";
    });
}

// Whether a file system keeps ACLs is known of an entry whose path is longer than the kernel takes, too. In memory,
// since what was once known of a device is not asked again.
TEST_F(ListingTest, AnEntryDeeperThanAPath) {
    std::string base = "/dev/shm/orveltest-XXXXXX";
    if (mkdtemp(base.data()) == nullptr) GTEST_SKIP() << "no file system in memory";
    std::string deep = base;
    while (deep.size() < 3900) deep += "/" + std::string(90, 'd');
    makeFolder(deep);
    ASSERT_EQ(chdir(deep.c_str()), 0);
    const std::string name(200, 'f');
    writeFile("./" + name, "x");
    inChild([&] {
        EXPECT_TRUE(listing_.OrvLibDirEntryListEnum("/photo", deep.c_str(), "name", kEverything, 0, 0, true,
                                                    DIR_ENTRY_TYPE_ALL, {}, entries_, &total_));
        const int known = entries_.empty() ? -1 : static_cast<int>(entries_.back().isAclMode);
        EXPECT_EQ(known, VEXOACLIsSupport(base.c_str(), -1, 2) > 0 ? 1 : 0);
    });
    ASSERT_EQ(chdir(deep.c_str()) + unlink(name.c_str()) + chdir("/"), 0);
    fs::remove_all(base);
}

TEST_F(ListingTest, FolderOfAnotherUser) {
    SKIP_WITHOUT_ROOT();
    for (const mode_t mode : {0, 0444, 0111}) {  // neither entering nor opening alone is enough
        ASSERT_EQ(chmod(photo_.c_str(), mode), 0);
        asUser(kBobUid, kUsersGid, [&] {
            EXPECT_FALSE(list());
            EXPECT_EQ(OrvLibGetErr(), ORV_ERR_DENIED);
            std::vector<_tag_SUBDIR_ENTRY_INFO_> folders;
            EXPECT_FALSE(OrvLibEnumSubDir(photo_, folders));
            EXPECT_EQ(OrvLibGetErr(), ORV_ERR_DENIED);
        });
    }
}

TEST_F(ListingTest, KeepsFilesAndFoldersOnly) {
    for (const char* name : {"folder", "@tmp", "@vexoea", "@tmpx"}) folder(name);
    for (const char* name : {"file", ".hidden-by-dot", "\xC3\xA4.\xC3\xA4\xFF"}) file(name);
    for (const char* target : {"file", "folder", "nowhere"})
        ASSERT_EQ(symlink(target, (photo_ + "/link-" + target).c_str()), 0);
    ASSERT_EQ(mkfifo((photo_ + "/fifo").c_str(), 0666), 0);

    const Names folders{"@tmpx", "folder"}, files{".hidden-by-dot", "file", "\xC3\xA4.\xC3\xA4\xFF"};
    Names all = folders;
    all.insert(all.end(), files.begin(), files.end());
    for (const int additional : {0, 1, kEverything}) {
        EXPECT_EQ(listed("name", additional, 0, 0, true, DIR_ENTRY_TYPE_DIR), folders) << additional;
        EXPECT_EQ(listed("name", additional, 0, 0, true, DIR_ENTRY_TYPE_FILE), files) << additional;
        EXPECT_EQ(listed("name", additional, 0, 0, true, static_cast<_tag_dir_entry_type_>(3)), all) << additional;
    }
    EXPECT_EQ(entries_.back().type, "\xC3\xA4\xFF") << "upper case of the C locale";
    EXPECT_EQ(fs::current_path(), "/");
}

// What the listing fills, by descriptor and folder, is what FillFileInfo fills, by path.
TEST_F(ListingTest, RecordsEqualThoseOfFillFileInfo) {
    makeMixedFolder();
    folder("mounted");
    folder("image");
    addMount(photo_ + "/mounted", "cifs");
    addMount(photo_ + "/image", "udf");
    const auto compare = [&] {
        for (int additional = 0; additional <= kEverything; ++additional) {
            EXPECT_TRUE(list("name", additional));
            EXPECT_EQ(entries_.size(), 8U);
            for (const auto& entry : entries_) {
                DIRENTRY_INFO info;
                EXPECT_EQ(listing_.FillFileInfo(("/photo/" + entry.name).c_str(), (photo_ + "/" + entry.name).c_str(),
                                                entry.name.c_str(), DIR_ENTRY_TYPE_ALL,
                                                entry.isDirectory ? DT_DIR : DT_REG, additional, info),
                          0);
                const auto fields = [](const DIRENTRY_INFO& i) {
                    return std::tie(i.name, i.path, i.realPath, i.type, i.size, i.mode, i.aclPrivilege, i.isAclMode,
                                    i.mtime, i.ctime, i.crtime, i.atime, i.uid, i.owner, i.gid, i.group, i.isDirectory,
                                    i.mountPointType, i.shareAccessRight, i.freeSpace);
                };
                EXPECT_EQ(fields(entry), fields(info)) << entry.name << " " << additional;
            }
        }
        return 0;
    };
    compare();
    if (geteuid() == 0) asUser(kBobUid, kUsersGid, compare);
}

TEST_F(ListingTest, Properties) {
    file("report.tar.gz", "12345");
    folder("disc.d");
    addMount(photo_ + "/disc.d", "iso9660");
    const std::string path = photo_ + "/report.tar.gz";
    ASSERT_TRUE(geteuid() != 0 || chown(path.c_str(), kAliceUid, kUsersGid) == 0);
    const timespec times[2] = {{1000, 0}, {0x1'0000'0005, 0}};
    ASSERT_EQ(chmod(path.c_str(), 0640) + utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
    const struct stat status = support::statusOf(path);
    ASSERT_EQ(listed("name", kEverything), (Names{"disc.d", "report.tar.gz"}));
    EXPECT_EQ(entries_.front().type + entries_.front().mountPointType, "iso") << "folders have no type";
    const auto& info = entries_.back();
    EXPECT_EQ(info.type + info.mountPointType + info.path, "GZ/photo/report.tar.gz");
    EXPECT_EQ(std::tie(info.size, info.mode, info.atime, info.mtime, info.uid, info.gid, info.shareAccessRight),
              std::make_tuple(5, 0100640U, 1000U, 5U, status.st_uid, status.st_gid, 4U));
    EXPECT_EQ(info.ctime, static_cast<uint32_t>(status.st_ctime));
    EXPECT_NE(info.crtime, 0U);
    EXPECT_EQ(info.owner + info.group, geteuid() == 0 ? "aliceusers" : "ownerowners");
    EXPECT_EQ(info.aclPrivilege, GetACLPrivilege(path.c_str()));
    EXPECT_EQ(info.isAclMode, VEXOACLIsSupport(path.c_str(), -1, 2) > 0 ? 1 : 0);

    ASSERT_TRUE(list("size", 0));
    const auto& bare = entries_.back();
    EXPECT_EQ(bare.realPath + bare.type + bare.owner + bare.group + bare.mountPointType, "");
    EXPECT_EQ(bare.mode + bare.mtime + bare.uid + bare.gid, 0);
    EXPECT_EQ(bare.size, 5) << "the sort column is filled";
}

TEST_F(ListingTest, NothingIsAskedWithoutNeedOrTwice) {
    for (const char* name : {"a", "b", "c", "d"}) file(name);
    ASSERT_TRUE(list("name", ADDITIONAL_REAL_PATH));
    EXPECT_EQ(entries_.back().realPath, photo_ + "/d");
    EXPECT_EQ(vexo::gate::calls("VLIBCFileLStatAt"), 0);
    ASSERT_TRUE(list("name", kEverything));
    for (const auto& [operation, calls] :
         Rows<const char*, int>{row("VEXOUserGetByUID", 1), row("VEXOGroupGetByGID", 1), row("VLIBCFileLStatAt", 4),
                                row("VEXOACLFolderOpen", 1), row("VEXOACLPermGet", 0)})
        EXPECT_EQ(vexo::gate::calls(operation), calls) << operation;
}

TEST_F(ListingTest, ColumnsAndPages) {
    makeMixedFolder();
    auto rows = rowsOf<const char*, Names>("enum/columns");
    rows.emplace_back(nullptr, listed(nullptr));
    for (const auto& [key, order] : rows) {
        SCOPED_TRACE(testing::PrintToString(key));
        const Names reversed(order.rbegin(), order.rend());
        EXPECT_EQ(listed(key), order);
        EXPECT_EQ(listed(key, 0, 0, 0, false), reversed);
        EXPECT_EQ(listed(key, 0, 1, 3), Names(order.begin() + 1, order.begin() + 4));
        EXPECT_EQ(listed(key, 0, 4, ULONG_MAX, false), Names(reversed.begin() + 4, reversed.end()));
        EXPECT_EQ(listed(key, 0, ULONG_MAX, 1), Names{});
        EXPECT_EQ(total_, 6U) << "counted before the page is cut";
        EXPECT_EQ(listed(key, 0, 3, 0), order) << "limit 0 ignores the offset";
    }
}

TEST_F(ListingTest, EntriesThatTheCallerHadTakePart) {
    for (const char* name : {"a", "c", "e"}) file(name);
    for (const bool ascending : {true, false}) {
        entries_.clear();
        for (const char* name : {"d", "b"}) entries_.emplace_back().name = name;
        ASSERT_TRUE(listing_.OrvLibDirEntryListEnum("/photo", photo_.c_str(), "name", 0, 1, 3, ascending,
                                                    DIR_ENTRY_TYPE_ALL, {}, entries_, &total_));
        EXPECT_EQ(namesOf(entries_), (ascending ? Names{"b", "c", "d"} : Names{"d", "c", "b"}));
        EXPECT_EQ(total_, 5U);
    }
}

struct Accepting : public FileSearch::FindComp {
    explicit Accepting(const char* wanted) : part(wanted) {}
    bool operator()(const char* path, const _tag_VEXOSTAT_& status) override {
        asked.emplace_back(path);
        EXPECT_EQ(status.st_mode + status.st_size + status.st_modify, 0);
        return asked.back().find(part) != std::string::npos;
    }
    const char* part;
    Names asked;
};

TEST_F(ListingTest, AllCriteriaMustAcceptTheName) {
    for (const char* name : {"ax", "bx", "ay", "@tmp"}) file(name);
    Accepting first("a"), second("x");
    criteria_ = {&first, &second};
    EXPECT_EQ(listed("name", kEverything), Names{"ax"});
    EXPECT_EQ(total_, 1U);
    EXPECT_EQ(first.asked.size(), 3U) << "hidden names are not asked about";
    EXPECT_EQ(second.asked.size(), 2U) << "the first refusal decides";
    EXPECT_EQ(vexo::gate::calls("VLIBCFileLStatAt"), 1);
}

TEST_F(ListingTest, FailingStatusOfOneEntry) {
    for (const char* name : {"/local/dir", "/server/dir"}) makeFolder(photo_ + name);
    addMount(photo_ + "/server/dir", "nfs4");
    constexpr int kShown = 1, kVanished = 0, kFatal = -1;  // how many entries, or the end
    for (const auto& [systemCode, place, result, code] : Rows<int, const char*, int, int>{
             row(ENOENT, "/local", kVanished, 0), row(EIO, "/local", kFatal, 0), row(EPERM, "/local", kFatal, 407),
             row(ENOENT, "/server", kShown, 0), row(EIO, "/server", kShown, 0), row(ENXIO, "/server", kShown, 0),
             row(EHOSTDOWN, "/server", kShown, 0), row(EACCES, "/server", kFatal, 407),
             row(ESTALE, "/server", kFatal, 401)}) {
        SCOPED_TRACE(std::string(strerror(systemCode)) + place);
        const std::string parent = photo_ + place, child = parent + "/dir";
        if (result == kFatal) announceLog("Failed to stat " + child + ". " + strerror(systemCode));
        OrvLibSetErr(0);
        vexo::gate::fail("VLIBCFileLStatAt", VEXO_ERR_GENERAL, systemCode, 1);
        entries_.clear();
        EXPECT_EQ(listing_.OrvLibDirEntryListEnum("/photo", parent.c_str(), "name", kEverything, 0, 0, true,
                                                  DIR_ENTRY_TYPE_ALL, {}, entries_, &total_),
                  result != kFatal);
        EXPECT_EQ(OrvLibGetErr(), code);
        ASSERT_EQ(entries_.size(), result == kShown ? 1U : 0U);
        if (result != kShown) continue;
        const auto& entry = entries_.front();
        EXPECT_TRUE(entry.isDirectory && entry.mode == 0 && entry.aclPrivilege == 0);
        EXPECT_EQ(entry.mountPointType + entry.realPath, "remotefail" + child);
    }
}

TEST_F(ListingTest, EntriesBeforeTheFailureStay) {
    for (const char* name : {"a", "b", "c"}) file(name);
    const auto order = listed(nullptr);
    vexo::gate::fail("VLIBCFileLStatAt", VEXO_ERR_DENIED, EACCES, 3);
    vexo::gate::fail("VEXOUserGetByUID", VEXO_ERR_USER_MISSING, ENOENT);
    announceLog("Failed to stat " + photo_ + "/" + order[2]);
    EXPECT_FALSE(list("name", kEverything, 1, 1));
    EXPECT_EQ(OrvLibGetErr(), ORV_ERR_DENIED);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED) << "what failed, not what was tried after";
    EXPECT_EQ(namesOf(entries_), Names(order.begin(), order.begin() + 2)) << "in reading order, not paged";
    EXPECT_EQ(total_, 0U);
    const ReadingFault fault(photo_, EIO, 2);
    announceLog("Failed to access " + photo_);
    EXPECT_FALSE(list()) << "half a folder";
    EXPECT_EQ(OrvLibGetErr(), ORV_ERR_DIRECTORY);
}

TEST_F(ListingTest, PermissionsThatCannotBeAsked) {
    file("a");
    vexo::gate::fail("VEXOACLFolderOpen", VEXO_ERR_GENERAL);
    vexo::gate::fail("VEXOACLIsSupport", VEXO_ERR_GENERAL);
    ASSERT_TRUE(list("name", ADDITIONAL_PERM));
    EXPECT_EQ(entries_.front().aclPrivilege, GetACLPrivilege((photo_ + "/a").c_str()));
    EXPECT_EQ(entries_.front().isAclMode, 0);
}

TEST_F(ListingTest, FillFileInfoByTypeOfEntry) {
    file("f");
    folder("d");
    ASSERT_EQ(mkfifo((photo_ + "/p").c_str(), 0666), 0);
    constexpr auto kAll = DIR_ENTRY_TYPE_ALL;
    constexpr auto kDirs = DIR_ENTRY_TYPE_DIR;
    constexpr auto kFiles = DIR_ENTRY_TYPE_FILE;
    for (const auto& [name, dType, filter, additional, result, statusCalls] :
         Rows<const char*, unsigned char, _tag_dir_entry_type_, int, int, int>{
             {"f", DT_REG, kAll, 1, 0, 0},
             {"f", DT_REG, kDirs, 2, 1, 0},
             {"f", DT_LNK, kAll, 0, 1, 0},
             {"d", DT_UNKNOWN, kFiles, 0, 1, 1},
             {"d", DT_UNKNOWN, kDirs, 0, 0, 1},
             {"p", DT_UNKNOWN, kAll, 0, 1, 1},
             // What readdir said may be out of date when the status is read.
             {"d", DT_REG, kFiles, 2, 1, 1},
             {"d", DT_REG, kAll, 2, 0, 1}}) {
        vexo::gate::reset();
        DIRENTRY_INFO info;
        const std::string real = photo_ + "/" + name;
        EXPECT_EQ(listing_.FillFileInfo("/x", real.c_str(), "shown", filter, dType, additional, info), result) << name;
        EXPECT_EQ(vexo::gate::calls("VLIBCFileLStat"), statusCalls) << name << int{dType};
        EXPECT_EQ(info.name + info.path + info.realPath, "shown/x" + ((additional & 1) != 0 ? real : ""));
        EXPECT_TRUE(result != 0 || info.isDirectory == (*name == 'd'));
    }
    DIRENTRY_INFO info;
    EXPECT_EQ(listing_.FillFileInfo(nullptr, "/tmp", "x", DIR_ENTRY_TYPE_ALL, DT_DIR, 0, info), -1);
    EXPECT_EQ(OrvLibGetErr(), ORV_ERR_PARAMETER);
}

}  // namespace
