#include "orvel/user_directory.h"

#include "core/owned.h"
#include "enum/group_ids.h"
#include "orvel/listing.h"
#include "support/testing.h"

namespace {

class UserDirectoryTest : public ApplianceTest {};

TEST_F(UserDirectoryTest, KnownIdsAreAskedForOnceUnknownOnesEachTime) {
    OrvelUserEnum names;
    for (int round = 0; round < 2; ++round) {
        EXPECT_EQ(names.GetUserNameByUID(kAliceUid), "alice");
        EXPECT_EQ(names.GetGroupNameByGID(kUsersGid), "users");
    }
    EXPECT_EQ(vexo::gate::calls("VEXOUserGetByUID"), 1);
    EXPECT_EQ(vexo::gate::calls("VEXOGroupGetByGID"), 1);
    for (int round = 0; round < 2; ++round) {
        EXPECT_EQ(names.GetUserNameByUID(77), "");
        EXPECT_EQ(names.GetGroupNameByGID(77), "");
    }
    EXPECT_EQ(vexo::gate::calls("VEXOUserGetByUID"), 3);
    EXPECT_EQ(vexo::gate::calls("VEXOGroupGetByGID"), 3);
}

TEST_F(UserDirectoryTest, UpdateAsksAgain) {
    OrvelUserEnum names;
    EXPECT_TRUE(names.UpdateUserInfoMap(kAliceUid, true));
    EXPECT_TRUE(names.UpdateUserInfoMap(kAliceUid, false));
    EXPECT_EQ(vexo::gate::calls("VEXOUserGetByUID"), 2);
    EXPECT_EQ(names.GetUserNameByUID(kAliceUid), "alice");
    EXPECT_EQ(vexo::gate::calls("VEXOUserGetByUID"), 2);
    EXPECT_FALSE(names.UpdateUserInfoMap(77, true));
    EXPECT_FALSE(names.UpdateGroupInfoMap(77, true));
}

TEST_F(UserDirectoryTest, EnumeratesOneSource) {
    addUser("DOM\\dave", 30001, 30100);
    addUser("erin@directory", 30002, 30100);
    addGroup("DOM\\staff", 30100, {});
    OrvEnum listing;
    std::map<unsigned, _tag_USER_INFO_> users;
    users[kAliceUid] = {"old name", 5, 6};
    users[99] = {"kept", 0, 0};
    ASSERT_TRUE(listing.EnumAllUsers(users, AUTH_LOCAL));
    EXPECT_EQ(users[kAliceUid].name, "alice");
    EXPECT_EQ(users[kAliceUid].reserved1, 5U);
    EXPECT_EQ(users[kAliceUid].reserved2, 6U);
    EXPECT_EQ(users[kBobUid].name, "bob");
    EXPECT_EQ(users[99].name, "kept");
    EXPECT_FALSE(users.contains(30001) || users.contains(30002));

    std::map<unsigned, _tag_USER_INFO_> domain, directory;
    ASSERT_TRUE(listing.EnumAllUsers(domain, AUTH_DOMAIN));
    ASSERT_TRUE(listing.EnumAllUsers(directory, AUTH_DIRECTORY));
    EXPECT_EQ(domain.size(), 1U);
    EXPECT_EQ(domain[30001].name, "DOM\\dave");
    EXPECT_EQ(directory.size(), 1U);
    EXPECT_EQ(directory[30002].name, "erin@directory");

    std::map<unsigned, _tag_GROUP_INFO_> groups;
    ASSERT_TRUE(listing.EnumAllGroups(groups, AUTH_LOCAL));
    EXPECT_EQ(groups[kUsersGid].name, "users");
    EXPECT_FALSE(groups.contains(30100));
    groups.clear();
    ASSERT_TRUE(listing.EnumAllGroups(groups, AUTH_DOMAIN));
    EXPECT_EQ(groups[30100].name, "DOM\\staff");
}

TEST_F(UserDirectoryTest, SourceThatCannotBeOpened) {
    OrvEnum listing;
    std::map<unsigned, _tag_USER_INFO_> users;
    std::map<unsigned, _tag_GROUP_INFO_> groups;
    vexo::gate::fail("VEXOUserDBOpen", VEXO_ERR_GENERAL);
    vexo::gate::fail("VEXOGroupDBOpen", VEXO_ERR_GENERAL);
    announceLog("Failed to open user db");
    announceLog("Failed to open group db");
    EXPECT_FALSE(listing.EnumAllUsers(users, AUTH_LOCAL));
    EXPECT_FALSE(listing.EnumAllGroups(groups, AUTH_LOCAL));
    EXPECT_EQ(OrvLibGetErr(), 0);
}

TEST_F(UserDirectoryTest, GroupsOfAUser) {
    addGroup("photographers", 20200, {"bob", "alice"});
    OrvEnum listing;
    std::list<unsigned> gids{1};
    EXPECT_TRUE(listing.EnumUserGroups(gids, "alice"));
    EXPECT_EQ(gids, (std::list<unsigned>{1, kUsersGid, 20200}));
    EXPECT_TRUE(listing.EnumUserGroups(gids, "nobody-here"));
    EXPECT_EQ(gids.size(), 3U);
}

TEST_F(UserDirectoryTest, GroupListThatHoldsNoNumber) {
    for (const auto& [text, good, gid] : Rows<const char*, bool, unsigned>{{"100", true, 100},
                                                                           {" 100", true, 100},
                                                                           {"4294967295", true, 0xFFFFFFFF},
                                                                           {"4294967301", true, 5},
                                                                           {"100x", false, 0},
                                                                           {"100 ", false, 0},
                                                                           {"", false, 0},
                                                                           {"-5", false, 0},
                                                                           {" -5", false, 0},
                                                                           {"99999999999999999999", false, 0},
                                                                           {"\n", false, 0}}) {
        orvel::StringList list(VLIBCSzListAlloc(4));
        for (const char* item : {"7", text, "8"}) {
            auto* raw = list.release();
            VLIBCSzListPush(&raw, item);
            list.reset(raw);
        }
        std::list<unsigned> gids;
        EXPECT_EQ(orvel::appendGroupIds(list.get(), gids), good) << text;
        EXPECT_EQ(gids, good ? (std::list<unsigned>{7, gid, 8}) : std::list<unsigned>{7}) << text;
        const auto log = takeLog();
        ASSERT_EQ(log.size(), good ? 0U : 1U) << text;
        if (good) continue;
        EXPECT_NE(log[0].text.find("Get Error Formate from VEXOGroupInfoGetgroupList ("), std::string::npos);
    }
    EXPECT_EQ(OrvLibGetErr(), 0);
}

TEST_F(UserDirectoryTest, NoMemoryForTheGroupList) {
    OrvEnum listing;
    std::list<unsigned> gids;
    vexo::gate::fail("VLIBCSzListAlloc", VEXO_ERR_GENERAL);
    EXPECT_FALSE(listing.EnumUserGroups(gids, "alice"));
}

}  // namespace
