// Shares of domain and directory users.
#include "support/testing.h"
#include "vexo/share.h"

namespace {

const struct Service {
    const char* user;
    int (*privilege)(const char*, const char*, const char*, int*);
    PVLIBCSZLIST (*shares)(const char*, const char*, int, int);
    const char *privilegeName, *sharesName;
} kServices[] = {
    {"DOM\\dora", VexoCgiDomGetPrivilege, VexoCgiDomValidShareGen, "VexoCgiDomGetPrivilege", "VexoCgiDomValidShareGen"},
    {"dan@example.com", VexoCgiLDAPGetPrivilege, VexoCgiLDAPValidShareGen, "VexoCgiLDAPGetPrivilege",
     "VexoCgiLDAPValidShareGen"},
};

std::string joined(PVLIBCSZLIST list) {
    if (list == nullptr) return "null";
    std::string out;
    for (int i = 0; i < list->nItem; ++i) out += std::string(VLIBCSzListGet(list, i)) + ' ';
    VLIBCSzListFree(list);
    return out;
}

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
};

TEST_F(DirectoryServiceTest, PrivilegesComeFromTheLists) {
    for (const Service& service : kServices) {
        const struct {
            const char *share, *user;
            int result, privilege, code;
        } cases[] = {{"zoo", service.user, 0, 2, 0},
                     {"all", service.user, 0, 1, 0},
                     {"closed", service.user, 0, 0, 0},
                     {"hidden", service.user, 0, 2, 0},
                     {"none", service.user, -1, 7, VEXO_ERR_SHARE_MISSING},
                     {"all", "X\\y", -1, 7, VEXO_ERR_USER_MISSING},
                     {"all", nullptr, -1, 7, VEXO_ERR_PARAMETER}};
        for (const auto& c : cases) {
            SCOPED_TRACE(&c - cases);
            int privilege = 7;
            VLIBCErrSetEx(0, "", 0);
            EXPECT_EQ(service.privilege(c.share, c.user, "sid", &privilege), c.result);
            EXPECT_EQ(privilege, c.privilege);
            EXPECT_EQ(VLIBCErrGet(), c.code);
        }
        int privilege = 7;
        vexo::gate::fail("DirectoryServer", VEXO_ERR_GENERAL, ETIMEDOUT, 1);
        EXPECT_EQ(service.privilege("all", service.user, "sid", &privilege), -2);
        EXPECT_EQ(errno, ETIMEDOUT);
        vexo::gate::fail(service.privilegeName, VEXO_ERR_GENERAL, 0, 1);
        EXPECT_EQ(service.privilege("all", service.user, "sid", &privilege), -1);
    }
}

TEST_F(DirectoryServiceTest, UsableShares) {
    for (const Service& service : kServices) {
        EXPECT_EQ(joined(service.shares("sid", service.user, 0, 0)), "Zoo all ");
        EXPECT_EQ(joined(service.shares("sid", service.user, 1, 0)), "all Zoo ");
        EXPECT_EQ(joined(service.shares(nullptr, service.user, 0, 1)), "Zoo ");
        EXPECT_EQ(joined(service.shares("sid", "X\\y", 0, 0)), "null");
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_USER_MISSING);
        EXPECT_EQ(joined(service.shares("sid", nullptr, 0, 0)), "null");
        for (const char* operation : {"DirectoryServer", service.sharesName, "VLIBCSzListAlloc", "VLIBCSzListPush"}) {
            vexo::gate::fail(operation, VEXO_ERR_GENERAL, ENOMEM, 1);
            EXPECT_EQ(joined(service.shares("sid", service.user, 0, 0)), "null") << operation;
        }
    }
    writeRootFile("/etc/vexo/shares.conf", "");
    EXPECT_EQ(joined(kServices[0].shares("sid", kServices[0].user, 0, 0)), "");
}

// A lookup that fails is a server that cannot be reached, and never an answer.
TEST_F(DirectoryServiceTest, FailingLookups) {
    SKIP_WITHOUT_ROOT();
    chmod((systemRoot() + "/etc/group").c_str(), 0600);
    asUser(kBobUid, kUsersGid, [] {
        for (const Service& service : kServices) {
            int privilege = 7;
            EXPECT_EQ(service.privilege("all", service.user, "sid", &privilege), -2);
            EXPECT_EQ(errno, EACCES);
            EXPECT_EQ(privilege, 7);
            EXPECT_EQ(service.shares("sid", service.user, 0, 0), nullptr);
        }
        return 0;
    });
}

}  // namespace
