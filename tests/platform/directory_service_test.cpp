// Shares of domain and directory users.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>
#include <memory>
#include <string>
#include <vector>

#include "fault_gate.h"
#include "support/appliance.h"
#include "vexo/error.h"
#include "vexo/share.h"

namespace {

using support::kBobUid;
using support::kUsersGid;

using Privilege = int (*)(const char*, const char*, const char*, int*);
using Shares = PVLIBCSZLIST (*)(const char*, const char*, int, int);

struct Service {
    const char* user;
    Privilege privilege;
    Shares shares;
    const char *privilegeName, *sharesName;
};
const Service kServices[] = {
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

class DirectoryServiceTest : public support::ApplianceTest, public ::testing::WithParamInterface<Service> {
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

TEST_P(DirectoryServiceTest, PrivilegesComeFromTheLists) {
    struct Case {
        const char* share;
        int privilege;
    };
    for (const Case& c : {Case{"zoo", 2}, Case{"all", 1}, Case{"closed", 0}, Case{"hidden", 2}, Case{"photo", 0}}) {
        int privilege = -1;
        EXPECT_GE(GetParam().privilege(c.share, GetParam().user, "sid", &privilege), 0) << c.share;
        EXPECT_EQ(privilege, c.privilege) << c.share;
    }
}

TEST_P(DirectoryServiceTest, PrivilegeFailures) {
    const Service& service = GetParam();
    int privilege = 7;
    struct Case {
        const char *share, *user;
        int code;
    };
    for (const Case& c : {Case{"none", service.user, VEXO_ERR_SHARE_MISSING},
                          Case{"all", "X\\y", VEXO_ERR_USER_MISSING}, Case{"all", "", VEXO_ERR_USER_MISSING},
                          Case{nullptr, service.user, VEXO_ERR_PARAMETER}, Case{"all", nullptr, VEXO_ERR_PARAMETER}}) {
        EXPECT_EQ(service.privilege(c.share, c.user, nullptr, &privilege), -1);
        EXPECT_EQ(VLIBCErrGet(), c.code);
    }
    EXPECT_EQ(service.privilege("all", service.user, "sid", nullptr), -1);
    vexo::gate::fail("DirectoryServer", VEXO_ERR_GENERAL, ETIMEDOUT, 1);
    EXPECT_EQ(service.privilege("all", service.user, "sid", &privilege), -2);
    EXPECT_EQ(errno, ETIMEDOUT);
    vexo::gate::fail(service.privilegeName, VEXO_ERR_GENERAL, 0, 1);
    EXPECT_EQ(service.privilege("all", service.user, "sid", &privilege), -1);
    EXPECT_EQ(privilege, 7);
}

TEST_P(DirectoryServiceTest, UsableShares) {
    const Service& service = GetParam();
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
    writeRootFile("/etc/vexo/shares.conf", "");
    EXPECT_EQ(joined(service.shares("sid", service.user, 0, 0)), "");
}

// A lookup that fails is a server that cannot be reached, and never an answer.
TEST_P(DirectoryServiceTest, FailingLookups) {
    SKIP_WITHOUT_ROOT();
    chmod((systemRoot() + "/etc/group").c_str(), 0600);
    support::asUser(kBobUid, kUsersGid, [] {
        int privilege = 7;
        EXPECT_EQ(GetParam().privilege("all", GetParam().user, "sid", &privilege), -2);
        EXPECT_EQ(errno, EACCES);
        EXPECT_EQ(privilege, 7);
        EXPECT_EQ(GetParam().shares("sid", GetParam().user, 0, 0), nullptr);
        return 0;
    });
}

INSTANTIATE_TEST_SUITE_P(Services, DirectoryServiceTest, ::testing::ValuesIn(kServices), [](const auto& test) {
    return std::string(test.param.user[0] == 'D' ? "Domain" : "Directory");
});

}  // namespace
