// Shares of domain and directory users.
#include "support/testing.h"
#include "vexo/share.h"

namespace {

const struct Service {
    const char* user;
    int (*privilege)(const char*, const char*, const char*, int*);
    PVLIBCSZLIST (*shares)(const char*, const char*, int, int);
} kServices[] = {{"DOM\\dora", VexoCgiDomGetPrivilege, VexoCgiDomValidShareGen},
                 {"dan@example.com", VexoCgiLDAPGetPrivilege, VexoCgiLDAPValidShareGen}};

class DirectoryServiceTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addGroup("DOM\\staff", 20200, {"dan@example.com"});
        addUser("DOM\\dora", 20010, 20200);
        addUser("dan@example.com", 20011, kUsersGid);
        addShare("Zoo", "valid users = @\"dom\\staff\"\nread only = no\n");
        addShare("all", "");
        addShare("closed", "invalid users = @\"DOM\\staff\"\nread only = no\n");
        addShare("hidden", "browseable = no\nread only = no\n");
    }
    // The answer, its errno value and what was written over a 7.
    static std::string privilege(const Service& service, const char* share, const char* user) {
        int privilege = 7;
        errno = 0;
        const int result = service.privilege(share, user, "sid", &privilege);
        return std::to_string(result) + " " + std::to_string(errno) + " " + std::to_string(privilege);
    }
    static std::string shares(const Service& service, const char* user, int sort = 0, int writable = 0) {
        PVLIBCSZLIST list = service.shares("sid", user, sort, writable);
        std::string names = joined(list);
        VLIBCSzListFree(list);
        return names;
    }
};

TEST_F(DirectoryServiceTest, PrivilegesAndUsableSharesComeFromTheLists) {
    for (const Service& service : kServices) {
        for (const auto& [share, answer] : Rows<const char*, const char*>{
                 row("zoo", "0 0 2"), row("all", "0 0 1"), row("closed", "0 0 0"), row("hidden", "0 0 2")})
            EXPECT_EQ(privilege(service, share, service.user), answer) << share;
        for (const auto& [share, user, code] : Rows<const char*, const char*, int>{
                 {"none", service.user, VEXO_ERR_SHARE_MISSING}, {"all", "X\\y", VEXO_ERR_USER_MISSING}}) {
            EXPECT_EQ(privilege(service, share, user), "-1 0 7");
            EXPECT_EQ(VLIBCErrGet(), code);
        }
        EXPECT_EQ(shares(service, service.user), "Zoo|all|");
        EXPECT_EQ(shares(service, service.user, 1), "all|Zoo|");
        EXPECT_EQ(shares(service, service.user, 0, 1), "Zoo|");
        EXPECT_EQ(shares(service, "X\\y"), "null");
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING);
        for (const char* operation : {"DirectoryServer", "VLIBCSzListAlloc", "VLIBCSzListPush"}) {
            vexo::gate::fail(operation, VEXO_ERR_GENERAL, ENOMEM, 1);
            EXPECT_EQ(shares(service, service.user), "null") << operation;
        }
        vexo::gate::fail("DirectoryServer", VEXO_ERR_GENERAL, ETIMEDOUT, 1);
        EXPECT_EQ(privilege(service, "all", service.user), "-2 " + std::to_string(ETIMEDOUT) + " 7");
    }
}

// A lookup that fails is a server that cannot be reached, and never an answer.
TEST_F(DirectoryServiceTest, FailingLookups) {
    SKIP_WITHOUT_ROOT();
    chmod((systemRoot() + "/etc/group").c_str(), 0600);
    asUser(kBobUid, kUsersGid, [] {
        for (const Service& service : kServices) {
            EXPECT_EQ(privilege(service, "all", service.user), "-2 " + std::to_string(EACCES) + " 7");
            EXPECT_EQ(shares(service, service.user), "null");
        }
    });
}

}  // namespace
