#include "orvel/privilege.h"
#include "support/fault_sweep.h"
#include "support/testing.h"

namespace {

class ShareListTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addShare("Zoo", "write list = alice\nvalid users = alice, bob\n");
        addShare("attic", "valid users = alice, bob\n");
        addShare("barn", "write list = alice\nvalid users = alice\nbrowseable = no\n");
        addShare("cave", "invalid users = alice\nwrite list = alice, bob\nvalid users = bob\n");
        addShare("dune", "write list = fay@corp\nvalid users = fay@corp\n");
    }
    static std::string names(PVLIBCSZLIST list) {
        std::string out = joined(list);
        VLIBCSzListFree(list);
        return out;
    }
};

TEST_F(ShareListTest, OnlyTheListsDecide) {
    for (const auto& [user, sort, writable, expected] :
         rowsOf<const char*, int, int, const char*>("core/share_lists")) {
        OrvLibSetErr(7);
        EXPECT_EQ(names(OrvLibValidShareGen(user, sort, writable)), expected) << user << sort << writable;
        EXPECT_EQ(OrvLibGetErr(), 0);
    }
}

TEST_F(ShareListTest, Failures) {
    EXPECT_CODE(OrvLibValidShareGen(nullptr, 0, 0), nullptr, 401);
    EXPECT_EQ(takeLogText(), "orveldir(#) bad parameter");
    for (const auto& [operation, log] :
         Rows<const char*, const char*>{{"VLIBCSzListAlloc", "orveldir(#) malloc fail"},
                                        {"VEXOShareDBOpen", "orveldir:# VEXOShareDBOpenFile Error[8100]\n"}}) {
        OrvLibSetErr(0);
        vexo::gate::reset();
        vexo::gate::fail(operation, VEXO_ERR_GENERAL, 0, 1);
        EXPECT_EQ(OrvLibValidShareGen("alice", 1, 0), nullptr) << operation;
        EXPECT_EQ(OrvLibGetErr(), 401);
        EXPECT_EQ(takeLogText(), log);
    }
}

// Whatever fails, no list that lacks something passes for the whole one.
TEST_F(ShareListTest, EnumerationUnderEveryFault) {
    const std::string whole = "photo|homes|Zoo|attic|";
    int pushes = 0;
    for (const char* call : {"*", "VLIBCSzListPush"}) {
        const int faults = sweepFaults(
            VEXO_ERR_GENERAL,
            [&](int nth) {
                OrvLibSetErr(7);
                const PVLIBCSZLIST list = OrvLibValidShareGen("alice", 0, 0);
                EXPECT_EQ(OrvLibGetErr(), list == nullptr ? 401 : 0);
                if (list == nullptr && *call == 'V') ++pushes;
                const std::string got = names(list);
                EXPECT_TRUE(got == whole || (nth != 0 && got == "null")) << got;
            },
            call);
        EXPECT_GE(faults, 4);
        EXPECT_EQ(pushes, *call == 'V' ? faults : 0) << "whatever cannot be added ends it";
    }
}

}  // namespace
