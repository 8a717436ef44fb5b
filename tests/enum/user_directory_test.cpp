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
        EXPECT_EQ(names.GetUserNameByUID(kAliceUid) + names.GetGroupNameByGID(kUsersGid), "aliceusers");
        EXPECT_EQ(names.GetUserNameByUID(77) + names.GetGroupNameByGID(77), "");
    }
    EXPECT_EQ(vexo::gate::calls("VEXOUserGetByUID"), 3);
    EXPECT_EQ(vexo::gate::calls("VEXOGroupGetByGID"), 3);
    EXPECT_TRUE(names.UpdateUserInfoMap(kAliceUid, false) && names.UpdateGroupInfoMap(kUsersGid, false));
    EXPECT_EQ(vexo::gate::calls("VEXOUserGetByUID"), 4) << "an update asks again";
    EXPECT_FALSE(names.UpdateUserInfoMap(77, true) || names.UpdateGroupInfoMap(77, true));
}

TEST_F(UserDirectoryTest, EnumeratesOneSource) {
    addUser("DOM\\dave", 30001, 30100);
    addUser("erin@directory", 30002, 30100);
    addGroup("DOM\\staff", 30100, {});
    OrvEnum listing;
    const auto names = [&](AUTH_TYPE type) {
        std::string text;
        std::map<unsigned, _tag_USER_INFO_> users;
        std::map<unsigned, _tag_GROUP_INFO_> groups;
        EXPECT_TRUE(listing.EnumAllUsers(users, type) && listing.EnumAllGroups(groups, type));
        for (const auto& [uid, user] : users) text += std::to_string(uid) + user.name + " ";
        for (const auto& [gid, group] : groups) text += std::to_string(gid) + group.name + " ";
        return text;
    };
    EXPECT_EQ(names(AUTH_LOCAL), "0root 20001alice 20002bob 20003carol 0root 20100users 20101administrators ");
    EXPECT_EQ(names(AUTH_DOMAIN), "30001DOM\\dave 30100DOM\\staff ");
    EXPECT_EQ(names(AUTH_DIRECTORY), "30002erin@directory ");
    std::map<unsigned, _tag_USER_INFO_> users{{kAliceUid, {"old name", 5, 6}}, {99, {"kept", 0, 0}}};
    ASSERT_TRUE(listing.EnumAllUsers(users, AUTH_LOCAL));
    EXPECT_EQ(users[kAliceUid].name + users[99].name, "alicekept");
    EXPECT_TRUE(users[kAliceUid].reserved1 == 5 && users[kAliceUid].reserved2 == 6);

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
    vexo::gate::fail("VLIBCSzListAlloc", VEXO_ERR_GENERAL);
    EXPECT_FALSE(listing.EnumUserGroups(gids, "alice"));
}

TEST_F(UserDirectoryTest, GroupListThatHoldsNoNumber) {
    for (const auto& [text, good, gid] : Rows<const char*, bool, unsigned>{
             row(" 100", true, 100), row("4294967301", true, 5), row("100x", false, 0), row("", false, 0),
             row(" -5", false, 0), row("99999999999999999999", false, 0)}) {
        orvel::StringList list(VLIBCSzListAlloc(4));
        for (const char* item : {"7", text, "8"}) {
            auto* raw = list.release();
            VLIBCSzListPush(&raw, item);
            list.reset(raw);
        }
        std::list<unsigned> gids;
        EXPECT_EQ(orvel::appendGroupIds(list.get(), gids), good) << text;
        EXPECT_EQ(gids, good ? (std::list<unsigned>{7, gid, 8}) : std::list<unsigned>{7}) << text;
        const std::string log = "Get Error Formate from VEXOGroupInfoGetgroupList (" + std::string(text) + ")";
        EXPECT_EQ(takeLogText(), good ? "" : "orvelenum:# " + log);
    }
    EXPECT_EQ(OrvLibGetErr(), 0);
}

}  // namespace
