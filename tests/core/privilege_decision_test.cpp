#include "core/privilege_decision.h"

#include "core/user_kind.h"
#include "orvel/privilege.h"
#include "support/testing.h"

namespace {

using orvel::UploadVerdict;

TEST(PrivilegeDecision, NoAccessBeatsReadWriteBeatsReadOnly) {
    for (unsigned lists = 0; lists < 8; ++lists) {
        const bool no = (lists & 1) != 0, write = (lists & 2) != 0, read = (lists & 4) != 0;
        const int expected = no ? 0 : write ? 2 : read ? 1 : 0;
        EXPECT_EQ(orvel::privilegeOf(orvel::ruleOf({no, write, read})), expected) << lists;
    }
    EXPECT_EQ(orvel::ruleOf({true, true, true}), PrivilegeRule::kNoAccess);
    EXPECT_EQ(orvel::ruleOf({false, false, false}), PrivilegeRule::kNoList);
    for (const auto& [answer, privilege] : Rows<int, int>{row(1, 1), row(2, 2), row(3, 0), row(-1, 0)})
        EXPECT_EQ(orvel::privilegeFromService(answer), privilege) << answer;
}

TEST(PrivilegeDecision, WhatAMaskForbids) {
    for (unsigned mask = 0; mask < 8; ++mask) {
        const bool one = (mask & 1) != 0, two = (mask & 2) != 0, four = (mask & 4) != 0;
        for (const int privilege : {0, 1, 2}) {
            EXPECT_EQ(orvel::mayList(privilege, mask), privilege != 0 && !one);
            EXPECT_EQ(orvel::mayDownload(privilege, mask), privilege != 0 && !one && !four);
            const UploadVerdict expected = privilege != 2 ? UploadVerdict::kRefused
                                           : one || two   ? UploadVerdict::kGranted
                                                          : UploadVerdict::kAskTarget;
            EXPECT_EQ(orvel::judgeUpload(privilege, mask), expected) << privilege << " " << mask;
        }
    }
}

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
