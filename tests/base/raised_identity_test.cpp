// Root for a moment: there and back, and never half.
#include "base/raised_identity.h"

#include "base/random.h"
#include "support/testing.h"

namespace {

// Switches to alice; `kept` is the uid that stays behind as the saved one.
bool becomeAlice(uid_t kept) {
    return setresgid(kUsersGid, kUsersGid, 0) == 0 && setresuid(kAliceUid, kAliceUid, kept) == 0;
}

TEST(RaisedIdentity, GoesThereAndBack) {
    SKIP_WITHOUT_ROOT();
    inChild([] {
        EXPECT_TRUE(becomeAlice(0));
        {
            errno = EBUSY;
            const orvel::RaisedIdentity raised;
            EXPECT_TRUE(geteuid() == 0 && getegid() == 0);
            const orvel::RaisedIdentity inner;
            EXPECT_EQ(geteuid(), 0U);
        }
        EXPECT_EQ(errno, EBUSY);
        EXPECT_TRUE(geteuid() == kAliceUid && getegid() == kUsersGid);
        EXPECT_EQ(setresuid(kAliceUid, kAliceUid, kAliceUid), 0);
        const orvel::RaisedIdentity raised;
        EXPECT_EQ(geteuid(), uid_t{kAliceUid}) << "without a uid 0 that was kept there is nothing to raise to";
    });
}

TEST(RaisedIdentityDeathTest, NothingIsDoneHalfRaised) {
    SKIP_WITHOUT_ROOT();
    const auto raiseWithout = [](long call) {
        if (!becomeAlice(0) || !refuseCalls({{call, EPERM}})) return;
        const orvel::RaisedIdentity raised;
        _exit(geteuid() == 0 ? 1 : 0);
    };
    EXPECT_EXIT(raiseWithout(SYS_setresgid), testing::KilledBySignal(SIGABRT), "");
    EXPECT_EXIT(raiseWithout(SYS_setresuid), testing::ExitedWithCode(0), "") << "not raised at all";
}

TEST(Draw, GivesNothingRatherThanWhatCanBeGuessed) {
    EXPECT_EQ(orvel::draw<16>().size(), 32U);
    inChild([] {
        EXPECT_TRUE(refuseCalls({{SYS_getrandom, ENOSYS}}));
        EXPECT_EQ(orvel::draw<16>(), "");
        EXPECT_EQ(errno, ENOSYS);
    });
}

}  // namespace
