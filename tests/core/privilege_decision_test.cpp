#include "core/privilege_decision.h"

#include "core/user_kind.h"
#include "orvel/privilege.h"
#include "support/testing.h"

namespace {

TEST(PrivilegeDecision, RequestedPermissions) {
    for (const auto& [requested, bit] :
         Rows<int, unsigned>{row(ORV_ACCESS_READ, 0x4), row(ORV_ACCESS_WRITE, 0x2), row(ORV_ACCESS_EXECUTE, 0x1),
                             row(ORV_ACCESS_DELETE, 0x200), row(ORV_ACCESS_APPEND, 0x8)}) {
        EXPECT_TRUE(orvel::aclGrants(bit, requested)) << requested;
        EXPECT_FALSE(orvel::aclGrants(0x1FFF & ~bit, requested)) << requested;
        EXPECT_FALSE(orvel::aclGrants(bit, 31)) << requested;
    }
    EXPECT_TRUE(orvel::aclGrants(0x20F, 31));
    EXPECT_TRUE(orvel::aclGrants(0, 32)) << "a bit that asks for nothing";
}

TEST(PermissionText, LettersAndDigits) {
    for (const auto& [mode, text, digits] : Rows<unsigned, const char*, int>{
             row(0755U, "rwxr-xr-x", 755), row(0U, "---------", 0), row(0104640U, "rw-r-----", 640),
             row(0421U, "r---w---x", 421), row(~0U, "rwxrwxrwx", 777)}) {
        EXPECT_EQ(GetPrivilegeStr(mode), text);
        EXPECT_EQ(GetPrivilege(mode), digits) << text;
        EXPECT_EQ(GetPrivilege(text), digits) << text;
    }
    EXPECT_EQ(GetPrivilege("rwx"), 700);
    EXPECT_EQ(GetPrivilege("wxrsssRWX-and more"), 0);
    EXPECT_EQ(GetPrivilege(static_cast<const char*>(nullptr)), 0);
}

}  // namespace
