#include "orvel/share_path.h"
#include "support/testing.h"

namespace {

class HomePathTest : public ApplianceTest {};

TEST_F(HomePathTest, LocalUsers) {
    for (const auto& [path, user, home] : rowsOf<const char*, const char*, bool>("core/own_homes"))
        EXPECT_EQ(IsDirUserHome(path, user), home) << path << " for " << (user != nullptr ? user : "null");
    EXPECT_EQ(vexo::gate::calls("*"), 0) << "the platform is not asked about local users";
    EXPECT_EQ(OrvLibGetErr(), 0);
}

// Where a domain user's home lies is known to the platform alone. The service is off, so nothing is made.
TEST_F(HomePathTest, DomainAndDirectoryUsersByTheirHomeFolder) {
    setSetting("userhome_enable", "no");
    addUser("CORP\\eve", 20010, kUsersGid);
    addUser("eve@corp", 20011, kUsersGid);
    writeRootFile("/etc/vexo/shares.conf", "[homes]\npath = /orvel-no-such-volume/homes\nread only = no\n");
    const Rows<const char*, const char*, bool> rows = rowsOf<const char*, const char*, bool>("core/home_folders");
    for (const auto& [path, user, home] : rows)
        EXPECT_EQ(IsDirUserHome(path, user), home) << path << " for " << (user != nullptr ? user : "null");
    EXPECT_EQ(vexo::gate::calls("VEXOFSMkdirP"), 0);
    setSetting("userhome_enable", "yes");
    vexo::gate::fail("VEXOFSMkdirP", 0x8100);
    EXPECT_FALSE(IsDirUserHome("/homes/@CORP/eve", "CORP\\eve")) << "a home that cannot be made is not one";
    EXPECT_EQ(vexo::gate::calls("VEXOFSMkdirP"), 1) << "asking makes it";
    EXPECT_EQ(OrvLibGetErr(), 0);
}

}  // namespace
