// Who may log in.
#include "vexo/login.h"

#include "support/testing.h"
#include "vexo/user.h"
#include "web/login_rules.h"

namespace {

TEST(LogInRules, TheLeastUidTheGroupsAndTheNames) {
    for (const auto& [text, least] : Rows<const char*, uid_t>{
             {"", 1000}, {"UID_MIN\t\t\t 500\n", 500}, {"#UID_MIN 1\nUID_MINIMUM 2\nUID_MIN x\n UID_MIN 3", 3}})
        EXPECT_EQ(vexo::parseUidMin(text), least) << text;
    for (const uid_t uid : {0U, 999U, 65534U, 0xFFFFFFFFU}) EXPECT_FALSE(vexo::isPersonsUid(uid, 1000)) << uid;
    EXPECT_FALSE(vexo::isPersonsUid(0, 0));
    for (const uid_t uid : {1000U, 65533U, 2000000000U}) EXPECT_TRUE(vexo::isPersonsUid(uid, 1000)) << uid;
    EXPECT_EQ(vexo::parseLogInGroups(" , domain users,,staff "), (std::vector<std::string>{"@domain users", "@staff"}));
    for (const char* name : {"alice", "DOM\\al ice", "a@b", "\xC3\xA9", "\xFF"}) EXPECT_TRUE(vexo::isLogInName(name));
    for (const std::string& name :
         {std::string(), std::string("."), std::string("a/b"), std::string("a\nb"), std::string("a\0b", 3),
          std::string("a:b"), std::string("-a"), std::string(256, 'a')})
        EXPECT_FALSE(vexo::isLogInName(name)) << name;
}

class LogInAllowed : public ApplianceTest {};

TEST_F(LogInAllowed, AsTheAccountTheGroupsAndTheShadowFileSay) {
    addUser("daemon", 500, kUsersGid);
    const auto asked = [](const char* user) { return VEXOLogInAllowed(user); };
    for (const auto& [user, reason] :
         Rows<const char*, int>{row("alice", 0), row("root", VEXO_LOGIN_WRONG), row("daemon", VEXO_LOGIN_WRONG),
                                row("nobody-here", VEXO_LOGIN_WRONG), row(nullptr, VEXO_LOGIN_WRONG)})
        EXPECT_EQ(asked(user), reason) << testing::PrintToString(user);
    writeRootFile("/etc/login.defs", "UID_MIN 500\n");
    EXPECT_EQ(asked("daemon"), 0);
    for (const auto& [field, reason] :
         Rows<const char*, int>{row("!:1:::::", 0), row("!*:1:::::", 0), row("*:1:::::", 0),
                                row("!!$6$x$y:1:::::", VEXO_LOGIN_LOCKED), row("$6$x$y:1:::::1", VEXO_LOGIN_EXPIRED)}) {
        writeRootFile("/etc/shadow", std::string("alice:") + field + ":\n");
        EXPECT_EQ(asked("alice"), reason) << field;
    }
    setSetting("log_in_groups", "administrators");
    EXPECT_EQ(asked("bob"), VEXO_LOGIN_WRONG);
    EXPECT_EQ(asked("carol"), 0);
    fs::remove(systemRoot() + "/etc/login.defs");
}

}  // namespace
