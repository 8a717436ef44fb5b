#include "orvel/sharing_settings.h"

#include "support/testing.h"

using OrvelSharing::SharingManager;

namespace {

class SharingSettingsTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        makeFolder(systemRoot() + "/usr/vexo/etc");
    }
    static std::string file() { return systemRoot() + SharingManager::STR_VEXO_SHARING; }
    SharingManager manager;
};

TEST_F(SharingSettingsTest, ChoicesOfUsers) {
    const std::string foreign = "# by hand\r\n20003=\"yes\"\nno setting";
    EXPECT_FALSE(manager.hasPrivilege("alice")) << "without a file";
    EXPECT_TRUE(manager.getPrivileges().empty());
    const mode_t usual = umask(077);
    EXPECT_TRUE(manager.setPrivileges({{"alice", "true"}}));
    umask(usual);
    EXPECT_EQ(fs::status(file()).permissions(), fs::perms(0644));
    EXPECT_EQ(readFile(file()), "20001=\"true\"\n");

    writeFile(file(), foreign);
    announceLog("orvelsharing:");
    EXPECT_FALSE(manager.setPrivileges({{"", "true"}, {"alice", "true"}, {"bob", "no"}, {"nobody-here", "true"}}));
    EXPECT_EQ(readFile(file()), foreign + "\n20001=\"true\"\n");
    EXPECT_TRUE(manager.hasPrivilege("alice"));
    EXPECT_FALSE(manager.hasPrivilege("carol"));
    EXPECT_TRUE(manager.setPrivileges({{"alice", "false"}, {"bob", "true"}}));
    EXPECT_EQ(readFile(file()), foreign + "\n20002=\"true\"\n");
    EXPECT_TRUE(manager.removePrivilege("20002"));
    EXPECT_TRUE(manager.removePrivilege("20002"));
    EXPECT_EQ(readFile(file()), foreign + "\n");

    for (const char* choice : {"true", "false", "true"}) {
        ASSERT_EQ(chmod(file().c_str(), 0664), 0) << "its group may write it";
        EXPECT_TRUE(manager.setPrivileges({{"bob", choice}}));
        EXPECT_EQ(manager.hasPrivilege("bob"), *choice == 't');
    }
    ASSERT_EQ(chmod(file().c_str(), 0664), 0);
    EXPECT_TRUE(manager.removePrivilege("20002"));
    EXPECT_FALSE(manager.hasPrivilege("bob"));

    writeFile(file(), "7=\"true\"\n007=\"false\"\n8=\"false\"\n8=\"true\"\nx=\"true\"\n4294967297=\"true\"\n");
    EXPECT_EQ(manager.getPrivileges(), (std::map<unsigned, bool>{{7, true}, {8, false}, {0, true}, {1, true}}));
    writeFile(file(), "20001=\"truest\"\n");
    EXPECT_FALSE(manager.hasPrivilege("alice"));
    announceLog("Failed to get GID for user=no\\x0Aone");
    EXPECT_FALSE(manager.hasPrivilege("no\none"));
}

TEST_F(SharingSettingsTest, Failures) {
    writeFile(file(), "20001=\"true\"\n");
    const auto set = [&] { return manager.setPrivileges({{"bob", "true"}}); };
    const auto remove = [&] { return manager.setPrivileges({{"bob", "no"}}); };
    const auto isEmpty = [&] { return !manager.getPrivileges().empty(); };
    for (const auto& [operation, log, run] : Rows<const char*, const char*, std::function<bool()>>{
             {"VLIBCFileSetKeyValue", "ApplyData: Failed to set bob", set},
             {"VLIBCFileRemoveKey", nullptr, remove},
             {"VEXOUserGetUGID", "Failed to get GID for user=bob", set},
             {"VLIBCFileGetKeyValue", "VLIBCFileGetKeyValue failed", [&] { return manager.hasPrivilege("alice"); }},
             {"VLIBCSzHashAlloc", ")Failed to VLIBCSzHashAlloc, reason=Cannot allocate memory", isEmpty},
             {"VLIBCSzListAlloc", "VLIBCSzListAlloc() failed!! vexoerr=[0x8100]", isEmpty},
             {"VLIBCFileGetKeys",
              "VLIBCFileGetKeys() failed!! szFile=[/usr/vexo/etc/vexosharing.conf], vexoerr=[0x8100]", isEmpty},
             {"VLIBCSzHashEnumKey", ")VLIBCSzHashEnumKey failed, reason=Cannot allocate memory", isEmpty},
         }) {
        vexo::gate::reset();
        vexo::gate::fail(operation, VEXO_ERR_GENERAL, ENOMEM, 1);
        if (log != nullptr) announceLog(log);
        EXPECT_FALSE(run()) << operation;
    }
    EXPECT_EQ(readFile(file()), "20001=\"true\"\n");
    vexo::gate::reset();
    EXPECT_EQ(inChild([&] {
                  alarm(20);
                  return refuseCalls({{SYS_newfstatat, EIO}}) && !set() ? 0 : 1;
              }),
              0)
        << "whose lock is held cannot be determined";
    fs::remove(file());
    fs::create_symlink("/etc/passwd", file());
    for (int i = 0; i < 2; ++i) announceLog("Failed to fdLock");
    EXPECT_FALSE(set());
    EXPECT_FALSE(manager.removePrivilege("20001"));
}

TEST_F(SharingSettingsTest, WhoMayShare) {
    addUser("gone", 20009, kUsersGid);
    writeRootFile("/etc/shadow", "gone:x:1:0:9:7::7:\n");
    for (const auto& [setting, user, choices, may, log] :
         rowsOf<const char*, const char*, const char*, int, const char*>("sharing/who_may_share")) {
        if (setting != nullptr) setSetting("PX_SHARING_SETTING", setting);
        writeFile(file() + ".new", choices);
        fs::rename(file() + ".new", file());
        if (log != nullptr) announceLog(log);
        EXPECT_EQ(OrvLibUserPrivForSharing(user), may) << (setting == nullptr ? "" : setting) << " " << choices;
        writeRootFile("/etc/vexoinfo.conf", "");
    }
    writeRootFile("/etc/vexo/applications", "VEXO.QDS.App.Quorvane3.Instance: bob\n");
    EXPECT_EQ(OrvLibUserPrivForSharing("alice"), 0);
    EXPECT_EQ(OrvLibUserPrivForSharing("bob"), 1);

    fs::remove(systemRoot() + "/etc/vexo/applications");
    fs::remove(systemRoot() + "/etc/vexoinfo.conf");
    announceLog("VLIBCFileGetKeyValue failed");
    EXPECT_EQ(OrvLibUserPrivForSharing("alice"), 0) << "a setting that cannot be read";
    EXPECT_EQ(OrvLibUserPrivForSharing("carol"), 1) << "does not concern an administrator";
    announceLog("VEXOUserGet failed");
    vexo::gate::fail("VEXOUserGet", VEXO_ERR_GENERAL, EIO, 1);
    EXPECT_EQ(OrvLibUserPrivForSharing("carol"), 0);
}

}  // namespace
