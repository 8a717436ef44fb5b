#include <sys/statfs.h>

#include "orvel/listing.h"
#include "support/testing.h"

namespace {

using Names = std::vector<std::string>;

constexpr int kShareProperties = 0x1FF;

class ShareListingTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addShare("video", "read only = no\nvalid users = alice, bob\ninvalid users = bob\n");
        addShare("docs", "valid users = alice, bob\n");
        addShare("secret", "read only = no\nvalid users = alice\nbrowseable = no\n");
    }

    bool list(const char* user, int additional = 0, const char* sortBy = nullptr, bool ascending = true,
              unsigned long offset = 0, unsigned long limit = 0, bool writableOnly = false) {
        entries_.clear();
        return listing_.OrvLibShareEntryListEnum(user, "session", writableOnly, sortBy, additional, offset, limit,
                                                 ascending, entries_, &total_);
    }
    Names names() {
        Names out;
        for (const auto& entry : entries_) out.push_back(entry.name);
        return out;
    }
    DIRENTRY_INFO entry(const std::string& name) {
        for (const auto& entry : entries_)
            if (entry.name == name) return entry;
        ADD_FAILURE() << name;
        return {};
    }

    OrvEnum listing_;
    std::list<DIRENTRY_INFO> entries_;
    unsigned long total_ = 99;
};

TEST_F(ShareListingTest, SharesThatTheUserMayUseBehindTheHome) {
    const std::string home = shareRoot("homes") + "/alice";
    makeFolder(home);
    ASSERT_TRUE(list("alice", kShareProperties));
    EXPECT_EQ(names(), (Names{"home", "photo", "homes", "video", "docs"})) << "as defined, no hidden ones";
    const auto& first = entries_.front();
    EXPECT_EQ(first.path + first.realPath, "/home" + home);
    EXPECT_TRUE(first.isDirectory && first.totalSpace != 0);
    EXPECT_EQ(std::tie(first.shareAccessRight, first.mode), std::make_tuple(2U, 0040755U));
    ASSERT_TRUE(list("alice", 0, nullptr, true, 0, 0, true));
    EXPECT_EQ(names(), (Names{"home", "photo", "homes", "video"}));
    EXPECT_EQ(entries_.front().shareAccessRight, 4U) << "not asked for";
    ASSERT_TRUE(list("bob"));
    EXPECT_EQ(names(), (Names{"photo", "homes", "docs"})) << "a user without a home";
    ASSERT_TRUE(list("nobody-here"));
    EXPECT_TRUE(entries_.empty() && total_ == 0);

    vexo::gate::fail("VLIBCFileLStat", VEXO_ERR_DENIED, EACCES, 1);
    announceLog("Failed to stat " + home);
    ASSERT_TRUE(list("alice", kShareProperties));
    EXPECT_EQ(entries_.front().name, "home") << "shown whatever its status said";
    EXPECT_TRUE(entries_.front().shareAccessRight == 2 && entries_.front().totalSpace != 0);
}

TEST_F(ShareListingTest, Properties) {
    addShare("docs", "valid users = alice\nvexo:ftp = 3\nvexo:acl = yes\nvexo:synced = yes\n");
    setDefaultSetting("support_s2s", "yes");
    addMount(shareRoot("docs"), "ext4", "ro");
    ASSERT_TRUE(list("alice", kShareProperties));
    const auto docs = entry("docs");
    EXPECT_EQ(docs.path + docs.realPath, "/docs" + shareRoot("docs"));
    EXPECT_TRUE(docs.isDirectory && docs.aclEnabled && docs.syncedShare && docs.readOnly);
    EXPECT_EQ(docs.shareAccessRight, 1U);
    EXPECT_EQ(docs.ftpPrivilege, 3U);
    EXPECT_EQ(docs.mode, 0040777U);
    struct statfs volume;
    ASSERT_EQ(statfs(shareRoot("docs").c_str(), &volume), 0);
    EXPECT_EQ(docs.totalSpace, volume.f_blocks * static_cast<uint64_t>(volume.f_bsize));
    EXPECT_LE(docs.freeSpace, docs.totalSpace);
    EXPECT_EQ(entry("photo").shareAccessRight, 2U);
    EXPECT_FALSE(entry("photo").syncedShare || entry("photo").readOnly);

    ASSERT_TRUE(list("alice", 0));
    EXPECT_EQ(entry("docs").shareAccessRight, 4U);
    EXPECT_EQ(entry("docs").totalSpace, 0U);
    setDefaultSetting("support_s2s", "no");
    ASSERT_TRUE(list("alice", ADDITIONAL_SYNC_SHARE));
    EXPECT_FALSE(entry("docs").syncedShare) << "only where the model supports it";
}

TEST_F(ShareListingTest, OrderAndPage) {
    for (const auto& [sortBy, ascending, offset, limit, page] :
         rowsOf<const char*, bool, unsigned long, unsigned long, Names>("enum/share_pages")) {
        ASSERT_TRUE(list("alice", 0, sortBy, ascending, offset, limit));
        EXPECT_EQ(names(), page);
        EXPECT_EQ(total_, 4U);
    }
    ASSERT_TRUE(list("alice", 0, "mtime"));
    EXPECT_NE(entries_.front().mtime, 0U) << "the sort column is filled";
}

TEST_F(ShareListingTest, SharesOfDomainAndDirectoryUsers) {
    addUser("DOM\\dave", 30001, kUsersGid);
    addUser("erin@directory", 30002, kUsersGid);
    addShare("domain", "valid users = DOM\\dave\n");
    addShare("directory", "valid users = erin@directory\n");
    ASSERT_TRUE(list("DOM\\dave"));
    EXPECT_EQ(names(), Names{"domain"});
    ASSERT_TRUE(list("erin@directory"));
    EXPECT_EQ(names(), Names{"directory"});
    EXPECT_EQ(vexo::gate::calls("VexoCgiDomValidShareGen"), 1);
    EXPECT_EQ(vexo::gate::calls("VexoCgiLDAPValidShareGen"), 1);
    list("DOM\\dave@directory");
    EXPECT_EQ(vexo::gate::calls("VexoCgiDomValidShareGen"), 2) << "with both signs a domain user";
    takeLog();
}

TEST_F(ShareListingTest, SharesCannotBeEnumerated) {
    for (const auto& [user, operation] :
         Rows<const char*, const char*>{{"DOM\\x", "VexoCgiDomValidShareGen"}, {"x@y", "VexoCgiLDAPValidShareGen"}}) {
        vexo::gate::fail(operation, VEXO_ERR_GENERAL);
        announceLog("Failed to enum valid shares");
        EXPECT_FALSE(list(user));
        EXPECT_EQ(OrvLibGetErr(), ORV_ERR_GENERAL) << operation;
    }
    announceLog("Failed to get user ((null))");
    EXPECT_FALSE(listing_.OrvLibShareEntryListEnum(nullptr, nullptr, false, nullptr, 0, 0, 0, true, entries_, nullptr));
    EXPECT_EQ(OrvLibGetErr(), ORV_ERR_USER);
    EXPECT_FALSE(listing_.OrvLibShareEntryListEnum("alice", nullptr, false, nullptr, 0, 0, 0, true, entries_, nullptr));
    EXPECT_EQ(OrvLibGetErr(), ORV_ERR_PARAMETER);
}

TEST_F(ShareListingTest, FoldersThatAreNotThere) {
    ASSERT_EQ(rmdir(shareRoot("docs").c_str()), 0);
    ASSERT_TRUE(list("alice", ADDITIONAL_REAL_PATH));
    EXPECT_EQ(names().size(), 4U) << "nothing is looked at";
    addMount(shareRoot("photo"), "nfs", "ro");
    vexo::gate::fail("VLIBCFileLStat", VEXO_ERR_GENERAL, EHOSTDOWN, 1);
    ASSERT_TRUE(list("alice", kShareProperties));
    EXPECT_EQ(names(), (Names{"photo", "homes", "video"}));
    const auto photo = entry("photo");  // of a server that does not answer
    EXPECT_EQ(photo.mountPointType, "remotefail");
    EXPECT_TRUE(photo.totalSpace == 0 && !photo.readOnly && photo.shareAccessRight == 2);
    makeFolder(shareRoot("docs"));
}

}  // namespace
