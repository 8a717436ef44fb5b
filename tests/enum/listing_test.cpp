#include "orvel/listing.h"

#include <dirent.h>

#include <climits>

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
        real_ = shareRoot("photo");
        addUser("owner", geteuid(), getegid());  // whoever runs the tests has a name
        addGroup("owners", getegid(), {});
    }

    bool list(const char* sortBy = "name", int additional = 0, unsigned long offset = 0, unsigned long limit = 0,
              bool ascending = true, _tag_dir_entry_type_ type = DIR_ENTRY_TYPE_ALL) {
        entries_.clear();
        return listing_.OrvLibDirEntryListEnum("/photo", real_.c_str(), sortBy, additional, offset, limit, ascending,
                                               type, criteria_, entries_, &total_);
    }
    Names listed(const char* sortBy = "name", int additional = 0, unsigned long offset = 0, unsigned long limit = 0,
                 bool ascending = true, _tag_dir_entry_type_ type = DIR_ENTRY_TYPE_ALL) {
        EXPECT_TRUE(list(sortBy, additional, offset, limit, ascending, type)) << OrvLibGetErr();
        return namesOf(entries_);
    }
    void file(const std::string& name, const std::string& text = "") { writeFile(real_ + "/" + name, text); }
    void folder(const std::string& name) { makeFolder(real_ + "/" + name); }
    // Two folders and four files that every column orders differently.
    void makeMixedFolder();

    std::string real_;
    OrvEnum listing_;
    std::vector<FileSearch::FindComp*> criteria_;
    std::list<DIRENTRY_INFO> entries_;
    unsigned long total_ = 99;
};

void ListingTest::makeMixedFolder() {
    folder("beta");
    folder("Alpha.zip");
    file("c.txt", "123");
    file("B.jpg", "1");
    file("a", "12345");
    file("d.TXT", "12");
    const Rows<const char*, mode_t, time_t> rows = {{"beta", 0755, 5},    {"Alpha.zip", 0777, 4}, {"c.txt", 0600, 300},
                                                    {"B.jpg", 0644, 200}, {"a", 0640, 100},       {"d.TXT", 0400, 400}};
    for (const auto& [name, mode, time] : rows) {
        const std::string path = real_ + "/" + name;
        ASSERT_EQ(chmod(path.c_str(), mode), 0);
        const timespec times[2] = {{1000 - time, 0}, {time, 0}};
        ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
    }
}

TEST_F(ListingTest, FolderThatCannotBeListed) {
    file("plain");
    const std::string longName = real_ + "/" + std::string(300, 'x'), longPath = std::string(5000, '/') + "tmp";
    const std::string missing = real_ + "/none", remote = real_ + "/none2", plain = real_ + "/plain";
    addMount(remote, "nfs");
    addMount(plain, "nfs");
    const struct {
        const char *path, *real;
        int code;
        bool logged = false;
    } cases[] = {
        {nullptr, "/tmp", 400},
        {"", "/tmp", 400},
        {"/photo", nullptr, 400},
        {"/photo", "", 400},
        {"/", "/tmp", 407},
        {"/", "", 400},
        {"/photo", missing.c_str(), ORV_ERR_MISSING},
        {"/photo", remote.c_str(), ORV_ERR_REMOTE},
        {"/photo", plain.c_str(), ORV_ERR_DIRECTORY, true},
        {"/photo", longName.c_str(), ORV_ERR_DIRECTORY, true},
        {"/photo", longPath.c_str(), ORV_ERR_DIRECTORY, true},
    };
    for (const auto& [path, real, code, logged] : cases) {
        if (logged) announceLog(std::string("Failed to access ") + real);
        total_ = 99;
        EXPECT_FALSE(listing_.OrvLibDirEntryListEnum(path, real, "name", 0, 0, 0, true, DIR_ENTRY_TYPE_ALL, {},
                                                     entries_, &total_));
        EXPECT_EQ(OrvLibGetErr(), code);
        EXPECT_EQ(total_, code == 400 || code == 407 ? 99U : 0U);
    }
    EXPECT_FALSE(listing_.OrvLibDirEntryListEnum("/photo", "/tmp", "name", 0, 0, 0, true, DIR_ENTRY_TYPE_ALL, {},
                                                 entries_, nullptr));
    EXPECT_EQ(OrvLibGetErr(), 400);
}

TEST_F(ListingTest, FolderOfAnotherUser) {
    SKIP_WITHOUT_ROOT();
    for (const mode_t mode : {0, 0444, 0111}) {  // neither entering nor opening alone is enough
        ASSERT_EQ(chmod(real_.c_str(), mode), 0);
        asUser(kBobUid, kUsersGid, [&] {
            EXPECT_FALSE(list());
            EXPECT_EQ(OrvLibGetErr(), ORV_ERR_DENIED);
            return 0;
        });
    }
    ASSERT_EQ(chmod(real_.c_str(), 0755), 0);
    writeFile(real_ + "/secret", "x", 0);
    asUser(kBobUid, kUsersGid, [&] {
        EXPECT_EQ(listed("name", kEverything), Names{"secret"}) << "a status needs no right to read the file";
        EXPECT_EQ(entries_.front().aclPrivilege, 0U);
        return 0;
    });
}

TEST_F(ListingTest, KeepsFilesAndFoldersOnly) {
    folder("folder");
    folder("@tmp");
    folder("@vexoea");
    folder("@tmpx");
    file("file");
    file(".hidden-by-dot");
    ASSERT_EQ(symlink("file", (real_ + "/link-file").c_str()), 0);
    ASSERT_EQ(symlink("folder", (real_ + "/link-folder").c_str()), 0);
    ASSERT_EQ(symlink("nowhere", (real_ + "/link-broken").c_str()), 0);
    ASSERT_EQ(mkfifo((real_ + "/fifo").c_str(), 0666), 0);
    ASSERT_EQ(mknod((real_ + "/socket").c_str(), S_IFSOCK | 0666, 0), 0);

    const Names folders{"@tmpx", "folder"}, files{".hidden-by-dot", "file"};
    const Names all{"@tmpx", "folder", ".hidden-by-dot", "file"};
    for (const int additional : {0, 1, kEverything}) {
        EXPECT_EQ(listed("name", additional), all) << additional;
        EXPECT_EQ(listed("name", additional, 0, 0, true, DIR_ENTRY_TYPE_DIR), folders) << additional;
        EXPECT_EQ(listed("name", additional, 0, 0, true, DIR_ENTRY_TYPE_FILE), files) << additional;
        EXPECT_EQ(listed("name", additional, 0, 0, true, static_cast<_tag_dir_entry_type_>(3)), all) << additional;
    }
    char cwd[PATH_MAX];
    EXPECT_STREQ(getcwd(cwd, sizeof cwd), "/");
}

TEST_F(ListingTest, NamesAreBytes) {
    const Names names{"%s%n", std::string(255, 'a'), "\xC3\xA4.\xC3\xA4", "new\nline", "\x80\xFF"};
    for (const auto& name : names) file(name);
    auto found = listed(nullptr, kEverything);
    EXPECT_TRUE(std::is_permutation(found.begin(), found.end(), names.begin(), names.end()));
    for (const auto& entry : entries_) {
        EXPECT_EQ(entry.path, "/photo/" + entry.name);
        EXPECT_EQ(entry.realPath, real_ + "/" + entry.name);
        EXPECT_EQ(entry.type, entry.name == names[2] ? "\xC3\xA4" : "") << "upper case of the C locale";
    }
}

// What the listing fills, by descriptor and folder, is what FillFileInfo fills, by path.
TEST_F(ListingTest, RecordsEqualThoseOfFillFileInfo) {
    makeMixedFolder();
    folder("mounted");
    folder("image");
    addMount(real_ + "/mounted", "cifs");
    addMount(real_ + "/image", "udf");
    const auto compare = [&] {
        for (int additional = 0; additional <= kEverything; ++additional) {
            EXPECT_TRUE(list("name", additional));
            EXPECT_EQ(entries_.size(), 8U);
            for (const auto& entry : entries_) {
                DIRENTRY_INFO info;
                EXPECT_EQ(listing_.FillFileInfo(("/photo/" + entry.name).c_str(), (real_ + "/" + entry.name).c_str(),
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
    const std::string path = real_ + "/report.tar.gz";
    ASSERT_TRUE(geteuid() != 0 || chown(path.c_str(), kAliceUid, kUsersGid) == 0);
    ASSERT_EQ(chmod(path.c_str(), 0640), 0);
    const timespec times[2] = {{1000, 0}, {0x1'0000'0005, 0}};
    ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), times, 0), 0);
    folder("disc.d");
    addMount(real_ + "/disc.d", "iso9660");
    const struct stat status = support::statusOf(path);
    ASSERT_EQ(listed("name", kEverything), (Names{"disc.d", "report.tar.gz"}));
    const auto& disc = entries_.front();
    EXPECT_TRUE(disc.isDirectory && disc.type.empty()) << "folders have no type";
    EXPECT_EQ(disc.mountPointType, "iso");
    const auto& info = entries_.back();
    EXPECT_FALSE(info.isDirectory);
    EXPECT_EQ(info.type + info.mountPointType, "GZ");
    EXPECT_EQ(std::tie(info.size, info.mode, info.atime, info.uid, info.shareAccessRight),
              std::make_tuple(5, 0100640U, 1000U, status.st_uid, 4U));
    EXPECT_EQ(info.aclPrivilege, GetACLPrivilege(path.c_str()));
    EXPECT_EQ(info.isAclMode, VEXOACLIsSupport(path.c_str(), -1, 2) > 0 ? 1 : 0);
    EXPECT_EQ(info.mtime, static_cast<uint32_t>(status.st_mtime));
    EXPECT_EQ(info.ctime, static_cast<uint32_t>(status.st_ctime));
    EXPECT_NE(info.crtime, 0U);
    EXPECT_EQ(info.owner + info.group, geteuid() == 0 ? "aliceusers" : "ownerowners");

    ASSERT_TRUE(list("name", 0));
    const auto& bare = entries_.back();
    EXPECT_EQ(bare.realPath + bare.type + bare.owner + bare.group + bare.mountPointType, "");
    EXPECT_EQ(bare.size + bare.mode + bare.mtime + bare.uid + bare.gid, 0);
    ASSERT_TRUE(list("size", 0));
    EXPECT_EQ(entries_.back().size, 5) << "the sort column is filled";
}

TEST_F(ListingTest, NothingIsAskedWithoutNeedOrTwice) {
    for (const char* name : {"a", "b", "c", "d"}) file(name);
    ASSERT_TRUE(list("name", ADDITIONAL_REAL_PATH));
    EXPECT_EQ(entries_.back().realPath, real_ + "/d");
    EXPECT_EQ(vexo::gate::calls("VLIBCFileLStatAt"), 0);
    ASSERT_TRUE(list("name", kEverything));
    for (const auto& [operation, calls] :
         Rows<const char*, int>{row("VEXOUserGetByUID", 1), row("VEXOGroupGetByGID", 1), row("VLIBCFileLStatAt", 4),
                                row("VEXOACLFolderOpen", 1), row("VEXOACLPermGet", 0)})
        EXPECT_EQ(vexo::gate::calls(operation), calls) << operation;
}

TEST_F(ListingTest, ColumnsAndPages) {
    makeMixedFolder();
    for (const auto& [key, order] : Rows<const char*, Names>{
             {nullptr, listed(nullptr)},
             {"name", {"Alpha.zip", "beta", "a", "B.jpg", "c.txt", "d.TXT"}},
             {"size", {"Alpha.zip", "beta", "B.jpg", "d.TXT", "c.txt", "a"}},
             {"mtime", {"Alpha.zip", "beta", "a", "B.jpg", "c.txt", "d.TXT"}},
             {"atime", {"beta", "Alpha.zip", "d.TXT", "c.txt", "B.jpg", "a"}},
             {"posix", {"beta", "Alpha.zip", "d.TXT", "c.txt", "a", "B.jpg"}},
             {"type", {"Alpha.zip", "beta", "a", "B.jpg", "c.txt", "d.TXT"}},
         }) {
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
        for (const char* name : {"d", "b"}) {
            entries_.emplace_back().name = name;
        }
        ASSERT_TRUE(listing_.OrvLibDirEntryListEnum("/photo", real_.c_str(), "name", 0, 1, 3, ascending,
                                                    DIR_ENTRY_TYPE_ALL, {}, entries_, &total_));
        EXPECT_EQ(namesOf(entries_), (ascending ? Names{"b", "c", "d"} : Names{"d", "c", "b"}));
        EXPECT_EQ(total_, 5U);
    }
}

class Accepting : public FileSearch::FindComp {
 public:
    explicit Accepting(std::string part) : part_(std::move(part)) {}
    bool operator()(const char* path, const _tag_VEXOSTAT_& status) override {
        asked.emplace_back(path);
        EXPECT_EQ(status.st_mode, 0U);
        EXPECT_EQ(status.st_size + status.st_modify, 0);
        return asked.back().find(part_) != std::string::npos;
    }
    Names asked;

 private:
    std::string part_;
};

TEST_F(ListingTest, AllCriteriaMustAcceptTheName) {
    for (const char* name : {"ax", "bx", "ay", "@tmp"}) file(name);
    Accepting first("a"), second("x");
    criteria_ = {&first, &second};
    EXPECT_EQ(listed("name", kEverything), Names{"ax"});
    std::sort(first.asked.begin(), first.asked.end());
    EXPECT_EQ(first.asked, (Names{"ax", "ay", "bx"})) << "hidden names are not asked about";
    EXPECT_EQ(second.asked.size(), 2U) << "the first refusal decides";
    EXPECT_EQ(vexo::gate::calls("VLIBCFileLStatAt"), 1);
    EXPECT_EQ(total_, 1U);
}

TEST_F(ListingTest, FailingStatusOfOneEntry) {
    for (const std::string name : {"/local", "/server"}) makeFolder(real_ + name + "/dir");
    addMount(real_ + "/server/dir", "nfs4");
    for (const auto& [systemCode, remote, result, code] :
         Rows<int, bool, int, int>{row(ENOENT, false, 1, 0), row(EIO, false, -1, 0), row(EHOSTDOWN, false, -1, 0),
                                   row(ENOENT, true, 1, 0), row(EIO, true, 1, 0), row(ENXIO, true, 1, 0),
                                   row(EHOSTDOWN, true, 1, 0), row(EACCES, true, -1, ORV_ERR_DENIED),
                                   row(EPERM, false, -1, ORV_ERR_DENIED), row(ESTALE, true, -1, ORV_ERR_GENERAL)}) {
        SCOPED_TRACE(std::string(strerror(systemCode)) + (remote ? ", remote" : ""));
        const std::string parent = real_ + (remote ? "/server" : "/local"), child = parent + "/dir";
        const bool fatal = result == -1, unreachable = remote && !fatal;
        for (int time = 0; fatal && time < 2; ++time) {
            announceLog("Failed to stat " + child + ". " + strerror(systemCode));
        }
        OrvLibSetErr(0);
        vexo::gate::fail("VLIBCFileLStat", VEXO_ERR_GENERAL, systemCode, 1);
        DIRENTRY_INFO info;
        EXPECT_EQ(listing_.FillFileInfo("/photo/dir", child.c_str(), "dir", DIR_ENTRY_TYPE_ALL, DT_UNKNOWN, 2, info),
                  result);
        EXPECT_EQ(OrvLibGetErr(), code);
        EXPECT_EQ(info.mountPointType, unreachable ? "remotefail" : "");
        EXPECT_EQ(info.isDirectory, unreachable);

        OrvLibSetErr(0);
        vexo::gate::fail("VLIBCFileLStatAt", VEXO_ERR_GENERAL, systemCode, 1);
        entries_.clear();
        EXPECT_EQ(listing_.OrvLibDirEntryListEnum("/photo", parent.c_str(), "name", kEverything, 0, 0, true,
                                                  DIR_ENTRY_TYPE_ALL, {}, entries_, &total_),
                  !fatal);
        EXPECT_EQ(OrvLibGetErr(), code);
        EXPECT_EQ(total_, unreachable ? 1U : 0U);
        ASSERT_EQ(entries_.size(), total_);
        if (!unreachable) continue;
        const auto& entry = entries_.front();
        EXPECT_TRUE(entry.isDirectory && entry.mode == 0 && entry.aclPrivilege == 0);
        EXPECT_EQ(entry.mountPointType + entry.realPath, "remotefail" + child);
    }
}

TEST_F(ListingTest, EntriesBeforeTheFailureStay) {
    for (const char* name : {"a", "b", "c"}) file(name);
    const auto order = listed(nullptr);
    vexo::gate::reset();
    vexo::gate::fail("VLIBCFileLStatAt", VEXO_ERR_DENIED, EACCES, 3);
    vexo::gate::fail("VEXOUserGetByUID", VEXO_ERR_USER_MISSING, ENOENT);
    vexo::gate::fail("VEXOACLFolderOpen", VEXO_ERR_GENERAL, EIO);
    announceLog("Failed to stat " + real_ + "/" + order[2]);
    EXPECT_FALSE(list("name", kEverything, 1, 1));
    EXPECT_EQ(OrvLibGetErr(), ORV_ERR_DENIED);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED) << "what failed, not what was tried after";
    EXPECT_EQ(namesOf(entries_), Names(order.begin(), order.begin() + 2)) << "in reading order, not paged";
    EXPECT_EQ(total_, 0U);
    vexo::gate::reset();
    const ReadingFault fault(real_, EIO, 2);
    announceLog("Failed to access " + real_);
    EXPECT_FALSE(list()) << "half a folder";
    EXPECT_EQ(OrvLibGetErr(), ORV_ERR_DIRECTORY);
}

TEST_F(ListingTest, PermissionsThatCannotBeAsked) {
    file("a");
    for (const int code : {VEXO_ERR_GENERAL, VEXO_ERR_DENIED, VEXO_ERR_NO_ACL}) {
        vexo::gate::reset();
        vexo::gate::fail("VEXOACLFolderPermGet", code);
        vexo::gate::fail("VEXOACLPermGet", code);
        if (code == VEXO_ERR_GENERAL) announceLog("Failed to get the ACL Privilege: file = " + real_ + "/a");
        ASSERT_TRUE(list("name", ADDITIONAL_PERM));
        EXPECT_EQ(entries_.front().aclPrivilege, 0x1FFFU);
    }
    vexo::gate::reset();
    vexo::gate::fail("VEXOACLFolderOpen", VEXO_ERR_GENERAL);
    vexo::gate::fail("VEXOACLIsSupport", VEXO_ERR_GENERAL);
    ASSERT_TRUE(list("name", ADDITIONAL_PERM));
    EXPECT_EQ(entries_.front().aclPrivilege, GetACLPrivilege((real_ + "/a").c_str()));
    EXPECT_EQ(entries_.front().isAclMode, 0);
}

TEST_F(ListingTest, FillFileInfoByTypeOfEntry) {
    file("f");
    folder("d");
    ASSERT_EQ(mkfifo((real_ + "/p").c_str(), 0666), 0);
    constexpr auto kAll = DIR_ENTRY_TYPE_ALL;
    constexpr auto kDirs = DIR_ENTRY_TYPE_DIR;
    constexpr auto kFiles = DIR_ENTRY_TYPE_FILE;
    for (const auto& [name, dType, filter, additional, result, statusCalls] :
         Rows<const char*, unsigned char, _tag_dir_entry_type_, int, int, int>{
             {"f", DT_REG, kAll, 1, 0, 0},
             {"f", DT_REG, kAll, 2, 0, 1},
             {"f", DT_REG, kDirs, 2, 1, 0},
             {"d", DT_DIR, kFiles, 1, 1, 0},
             {"d", DT_DIR, kDirs, 0, 0, 0},
             {"f", DT_LNK, kAll, 0, 1, 0},
             {"f", DT_UNKNOWN, kAll, 0, 0, 1},
             {"f", DT_UNKNOWN, kDirs, 0, 1, 1},
             {"d", DT_UNKNOWN, kFiles, 0, 1, 1},
             {"d", DT_UNKNOWN, kDirs, 0, 0, 1},
             {"p", DT_UNKNOWN, kAll, 0, 1, 1},
             // What readdir said may be out of date when the status is read.
             {"p", DT_REG, kAll, 2, 1, 1},
             {"d", DT_REG, kFiles, 2, 1, 1},
             {"d", DT_REG, kAll, 2, 0, 1}}) {
        vexo::gate::reset();
        DIRENTRY_INFO info;
        const std::string real = real_ + "/" + name;
        EXPECT_EQ(listing_.FillFileInfo("/x", real.c_str(), "shown", filter, dType, additional, info), result) << name;
        EXPECT_EQ(vexo::gate::calls("VLIBCFileLStat"), statusCalls) << name << int{dType};
        EXPECT_EQ(info.name, "shown");
        EXPECT_EQ(info.path, "/x");
        EXPECT_EQ(info.realPath, (additional & 1) != 0 ? real : "");
        EXPECT_TRUE(result != 0 || info.isDirectory == (*name == 'd'));
    }
    DIRENTRY_INFO info;
    EXPECT_EQ(listing_.FillFileInfo(nullptr, "/tmp", "x", DIR_ENTRY_TYPE_ALL, DT_DIR, 0, info), -1);
    EXPECT_EQ(OrvLibGetErr(), ORV_ERR_PARAMETER);
}

}  // namespace
