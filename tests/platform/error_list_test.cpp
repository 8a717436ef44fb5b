// Lists and hashes, and the fault gate that the other tests rely on.
#include "support/testing.h"

namespace {

class PlatformBasics : public ApplianceTest {};

TEST_F(PlatformBasics, Lists) {
    PVLIBCSZLIST list = VLIBCSzListAlloc(-5);
    // Cut at each of the separators. Ascending without case, ties by bytes; other options leave the order.
    char text[] = "/b/;\xC3\xA9t\xC3\xA9/B//a b/\xFFz/\xC3\x89T\xC3\x89;A2", nothing[] = "//", again[] = "a/b";
    EXPECT_EQ(VLIBCStrTok(text, "/;", &list), 7);
    VLIBCSzListSortItems(list, 1);
    EXPECT_EQ(joined(list), "b|\xC3\xA9t\xC3\xA9|B|a b|\xFFz|\xC3\x89T\xC3\x89|A2|");
    VLIBCSzListSortItems(list, 16);
    EXPECT_EQ(joined(list), "a b|A2|B|b|\xC3\x89T\xC3\x89|\xC3\xA9t\xC3\xA9|\xFFz|");
    EXPECT_EQ(VLIBCStrTok(nothing, "/", &list), 0);
    vexo::gate::fail("VLIBCSzListPush", VEXO_ERR_GENERAL, ENOMEM, 2);
    EXPECT_EQ(VLIBCStrTok(again, "/", &list), -1);
    EXPECT_EQ(errno, ENOMEM);
    for (const int outside : {8, -1}) EXPECT_EQ(VLIBCSzListGet(list, outside), nullptr);
    VLIBCSzListFree(list);
}

TEST_F(PlatformBasics, HashKeepsTheFirstValueAndTheOrder) {
    PVLIBCSZHASH hash = VLIBCSzHashAlloc(1);
    // Enough keys that both the store and its index grow under the short strings.
    for (int i = 0; i < 500; ++i) ASSERT_EQ(VLIBCSzHashSetValue(&hash, std::to_string(i).c_str(), "v"), 0);
    EXPECT_EQ(VLIBCSzHashSetValue(&hash, "0", "second"), 0);
    EXPECT_STREQ(VLIBCSzHashGetValue(hash, "0"), "v");
    EXPECT_EQ(VLIBCSzHashGetValue(hash, "500"), nullptr);
    PVLIBCSZLIST keys = VLIBCSzListAlloc(0);
    EXPECT_EQ(VLIBCSzHashEnumKey(hash, &keys), 500);
    EXPECT_STREQ(VLIBCSzListGet(keys, 499), "499");
    VLIBCSzListFree(keys);
    VLIBCSzHashFree(hash);
}

}  // namespace
