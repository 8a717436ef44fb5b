// The error slot, lists and hashes, and the fault gate that the other tests rely on.
#include <gtest/gtest.h>

#include <cerrno>
#include <memory>
#include <string>
#include <vector>

#include "fault_gate.h"
#include "support/appliance.h"
#include "vexo/error.h"
#include "vexo/list.h"

namespace {

struct FreeList {
    void operator()(PVLIBCSZLIST list) const { VLIBCSzListFree(list); }
};
using OwnedList = std::unique_ptr<VLIBCSZLIST, FreeList>;

std::vector<std::string> textsOf(PVLIBCSZLIST list) {
    std::vector<std::string> out;
    out.reserve(static_cast<size_t>(list->nItem));
    for (int i = 0; i < list->nItem; ++i) out.emplace_back(VLIBCSzListGet(list, i));
    return out;
}

OwnedList listOf(const std::vector<std::string>& texts) {
    PVLIBCSZLIST list = VLIBCSzListAlloc(0);
    for (const auto& text : texts) VLIBCSzListPush(&list, text.c_str());
    return OwnedList(list);
}

class PlatformBasics : public support::ApplianceTest {};

TEST_F(PlatformBasics, ErrorSlotKeepsTheLastFailure) {
    VLIBCErrSetEx(VEXO_ERR_DENIED, "somewhere", 7);
    VLIBCErrSetEx(VEXO_ERR_MISSING, nullptr, 8);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_MISSING);
    EXPECT_STREQ(VLIBCErrorGetFile(), "");
    EXPECT_EQ(VLIBCErrorGetLine(), 8);
}

TEST_F(PlatformBasics, ListHoldsMoreThanItsCapacityAndRefusesNulls) {
    PVLIBCSZLIST list = VLIBCSzListAlloc(-5);
    for (int i = 1; i <= 3000; ++i) ASSERT_EQ(VLIBCSzListPush(&list, std::to_string(i).c_str()), i);
    EXPECT_STREQ(VLIBCSzListGet(list, 2999), "3000");
    EXPECT_EQ(VLIBCSzListGet(list, 3000), nullptr);
    EXPECT_EQ(VLIBCSzListGet(list, -1), nullptr);
    EXPECT_EQ(VLIBCSzListGet(nullptr, 0), nullptr);
    EXPECT_EQ(VLIBCSzListPush(&list, nullptr), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    EXPECT_EQ(list->nItem, 3000);
    VLIBCSzListFree(list);
    VLIBCSzListFree(nullptr);
    PVLIBCSZLIST none = nullptr;
    EXPECT_EQ(VLIBCSzListPush(&none, "a"), -1);
    VLIBCSzListSortItems(nullptr, 16);
}

TEST_F(PlatformBasics, SortIsAscendingWithoutCaseTiesByBytes) {
    const std::vector<std::string> shuffled = {"b", "\xC3\xA9t\xC3\xA9", "B", "a", "\xFFz",
                                               "",  "\xC3\x89T\xC3\x89", "A2"};
    const auto list = listOf(shuffled);
    VLIBCSzListSortItems(list.get(), 1);
    EXPECT_EQ(textsOf(list.get()), shuffled) << "other options leave the order";
    VLIBCSzListSortItems(list.get(), 16);
    const std::vector<std::string> expected = {"",     "a", "A2", "B", "b", "\xC3\x89T\xC3\x89", "\xC3\xA9t\xC3\xA9",
                                               "\xFFz"};
    EXPECT_EQ(textsOf(list.get()), expected);
}

TEST_F(PlatformBasics, StrTokAppendsTheNonEmptyPieces) {
    auto list = listOf({"first"});
    PVLIBCSZLIST out = list.get();
    char text[] = "//photo/;2012;;a b/";
    EXPECT_EQ(VLIBCStrTok(text, "/;", &out), 3);
    EXPECT_EQ(textsOf(out), (std::vector<std::string>{"first", "photo", "2012", "a b"}));
    char nothing[] = "//";
    EXPECT_EQ(VLIBCStrTok(nothing, "/", &out), 0);
    EXPECT_EQ(VLIBCStrTok(nullptr, "/", &out), -1);
    char again[] = "a/b";
    vexo::gate::fail("VLIBCSzListPush", VEXO_ERR_GENERAL, ENOMEM, 2);
    EXPECT_EQ(VLIBCStrTok(again, "/", &out), -1);
    EXPECT_EQ(errno, ENOMEM);
}

TEST_F(PlatformBasics, HashKeepsTheFirstValueAndTheOrder) {
    PVLIBCSZHASH hash = VLIBCSzHashAlloc(1);
    // Enough keys that both the store and its index grow under the short strings.
    for (int i = 0; i < 500; ++i) ASSERT_EQ(VLIBCSzHashSetValue(&hash, std::to_string(i).c_str(), "v"), 0);
    EXPECT_EQ(VLIBCSzHashSetValue(&hash, "0", "second"), 0);
    EXPECT_STREQ(VLIBCSzHashGetValue(hash, "0"), "v");
    EXPECT_EQ(VLIBCSzHashGetValue(hash, "500"), nullptr);
    EXPECT_EQ(VLIBCSzHashGetValue(nullptr, "0"), nullptr);
    EXPECT_EQ(VLIBCSzHashSetValue(&hash, "x", nullptr), -1);
    auto list = listOf({});
    PVLIBCSZLIST keys = list.get();
    EXPECT_EQ(VLIBCSzHashEnumKey(hash, &keys), 500);
    EXPECT_STREQ(VLIBCSzListGet(keys, 499), "499");
    EXPECT_EQ(VLIBCSzHashEnumKey(nullptr, &keys), -1);
    VLIBCSzHashFree(hash);
    VLIBCSzHashFree(nullptr);
}

TEST_F(PlatformBasics, GateFailsTheCallThatWasOrderedAndCounts) {
    vexo::gate::fail("VLIBCSzListAlloc", VEXO_ERR_NO_SPACE, ENOSPC, 2);
    const OwnedList first(VLIBCSzListAlloc(0));
    EXPECT_NE(first, nullptr);
    errno = 0;
    EXPECT_EQ(VLIBCSzListAlloc(0), nullptr);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
    EXPECT_EQ(errno, ENOSPC);
    const OwnedList third(VLIBCSzListAlloc(0));
    EXPECT_NE(third, nullptr) << "an order strikes once";
    EXPECT_EQ(vexo::gate::calls("VLIBCSzListAlloc"), 3);
    EXPECT_EQ(vexo::gate::calls("VLIBCSzHashAlloc"), 0);

    vexo::gate::reset();
    vexo::gate::fail("VLIBCSzListAlloc", VEXO_ERR_GENERAL);
    EXPECT_EQ(VLIBCSzListAlloc(0), nullptr);
    EXPECT_EQ(VLIBCSzListAlloc(0), nullptr) << "0 strikes at every call";

    vexo::gate::reset();
    vexo::gate::fail("*", VEXO_ERR_GENERAL, 0, 2);
    PVLIBCSZLIST list = VLIBCSzListAlloc(0);
    EXPECT_EQ(VLIBCSzListPush(&list, "a"), -1) << "the second call of any name";
    EXPECT_EQ(VLIBCSzListPush(&list, "a"), 1);
    EXPECT_EQ(vexo::gate::calls("*"), 3);
    VLIBCSzListFree(list);
}

}  // namespace
