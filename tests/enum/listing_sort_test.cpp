#include <algorithm>
#include <functional>
#include <random>

#include "enum/entry_order.h"
#include "enum/page.h"
#include "orvel/listing.h"
#include "support/appliance.h"

namespace {

DIRENTRY_INFO file(const std::string& name) {
    DIRENTRY_INFO info;
    info.name = name;
    return info;
}

DIRENTRY_INFO folder(const std::string& name) {
    DIRENTRY_INFO info = file(name);
    info.isDirectory = true;
    return info;
}

DIRENTRY_INFO with(DIRENTRY_INFO info, const std::function<void(DIRENTRY_INFO&)>& change) {
    change(info);
    return info;
}

TEST(EnumCompareTest, Order) {
    using Info = DIRENTRY_INFO;
    struct Case {
        const char* key;
        Info first, second;
        bool equal = false;
    };
    const Case cases[] = {
        {"name", folder("z"), file("a")},
        {"nonsense", folder("z"), file("a")},
        {"name", file("a"), file("B")},
        {"name", file("a"), file("A"), true},
        {"name", file("a"), file("ab")},
        {"name", file("Äb"), file("äc")},
        {"name", file("zz"), file("ä")},
        {"name", file("\xF0\x9F\x98\x80"), file("\xFF")},
        {"size", with(file("z"), [](Info& i) { i.size = 1; }), with(file("a"), [](Info& i) { i.size = 1LL << 40; })},
        {"size", with(folder("a"), [](Info& i) { i.size = 9; }), with(folder("b"), [](Info& i) { i.size = 1; })},
        {"size", with(folder("z"), [](Info& i) { i.size = 9; }), with(file("a"), [](Info& i) { i.size = 1; })},
        {"mtime", with(file("z"), [](Info& i) { i.mtime = 1; }),
         with(file("a"), [](Info& i) { i.mtime = 0xFFFFFFFF; })},
        {"ctime", with(file("z"), [](Info& i) { i.ctime = 1; }), with(file("a"), [](Info& i) { i.ctime = 2; })},
        {"crtime", with(file("z"), [](Info& i) { i.crtime = 1; }), with(file("a"), [](Info& i) { i.crtime = 2; })},
        {"atime", with(folder("z"), [](Info& i) { i.atime = 1; }), with(folder("a"), [](Info& i) { i.atime = 2; })},
        {"user",
         with(file("z"),
              [](Info& i) {
                  i.uid = 1000;
                  i.owner = "zoe";
              }),
         with(file("a"),
              [](Info& i) {
                  i.uid = 1026;
                  i.owner = "adam";
              })},
        {"group", with(file("z"), [](Info& i) { i.gid = 1; }), with(file("a"), [](Info& i) { i.gid = 4000000000U; })},
        {"posix", with(file("z"), [](Info& i) { i.mode = 0104644; }),
         with(file("a"), [](Info& i) { i.mode = 0100755; })},
        {"posix", with(file("a"), [](Info& i) { i.mode = 0104644; }),
         with(file("b"), [](Info& i) { i.mode = 0100644; })},
        {"type", with(file("z"), [](Info& i) { i.type = "JPG"; }), with(file("a"), [](Info& i) { i.type = "PNG"; })},
        {"type", with(file("z"), [](Info& i) { i.type = "J"; }), with(file("a"), [](Info& i) { i.type = "JPG"; })},
        {"type", with(file("a"), [](Info& i) { i.type = "jpg"; }), with(file("b"), [](Info& i) { i.type = "JPG"; })},
        {"mtime", file("a"), file("b")},
    };
    for (const auto& [key, first, second, equal] : cases) {
        const EnumCompare before(key);
        EXPECT_EQ(before(first, second), !equal) << key << " " << first.name << " " << second.name;
        EXPECT_FALSE(before(second, first)) << key << " " << first.name << " " << second.name;
    }
}

// Lists in which much is equal: few names, in both cases, of different lengths, with a common beginning and broken.
class RandomEntries {
 public:
    explicit RandomEntries(unsigned seed) : random_(seed) {}

    std::list<DIRENTRY_INFO> make(size_t count, const std::string& beginning) {
        static const char* const names[] = {"a",         "A",         "ab",       "aB",      "",
                                            "b",         "\xC3\xA4",  "\xC3\x84", "\xFF",    "\xFF\xFE",
                                            "abcdefghi", "ABCDEFGHJ", "abcdefgh", "\xE2\x82"};
        static const char* const types[] = {"", "JPG", "jpg", "PNG", "J", "\xC3\x84"};
        std::list<DIRENTRY_INFO> entries;
        for (size_t i = 0; i < count; ++i) {
            DIRENTRY_INFO info = file(beginning + names[below(std::size(names))]);
            info.isDirectory = below(4) == 0;
            info.type = types[below(std::size(types))];
            info.size = static_cast<int64_t>(below(4)) - 1;
            info.mode = 0100640 + below(3) + (below(2) << 11);
            info.mtime = below(3);
            info.ctime = 0xFFFFFFFF - below(3);
            info.crtime = below(3) << 30;
            info.atime = below(3);
            info.uid = below(3);
            info.gid = below(3);
            info.path = std::to_string(i);  // tells entries apart
            entries.push_back(std::move(info));
        }
        return entries;
    }
    unsigned below(size_t limit) { return static_cast<unsigned>(random_() % limit); }

 private:
    std::mt19937 random_;
};

constexpr const char* kKeys[] = {"name", "size",  "mtime", "ctime", "crtime", "atime",
                                 "user", "group", "posix", "type",  "?"};

std::vector<std::string> paths(const std::list<DIRENTRY_INFO>& entries) {
    std::vector<std::string> out;
    for (const auto& entry : entries) out.push_back(entry.path);
    return out;
}

TEST(EntryListSortTest, EqualsAStableSortWithEnumCompareAndMovesNoRecord) {
    RandomEntries random(7);
    OrvEnum listing;
    for (int round = 0; round < 300; ++round) {
        const auto entries = random.make(random.below(60), round % 2 == 0 ? "" : "IMG_2024_");
        const char* key = kKeys[random.below(std::size(kKeys))];
        auto expected = entries;
        expected.sort(EnumCompare(key));
        auto sorted = entries;
        const DIRENTRY_INFO* first = sorted.empty() ? nullptr : &sorted.front();
        listing.EntryListSort(sorted, key);
        ASSERT_EQ(paths(sorted), paths(expected)) << "round " << round << ", key " << key;
        EXPECT_TRUE(first == nullptr ||
                    std::any_of(sorted.begin(), sorted.end(), [&](const auto& e) { return &e == first; }));
    }
}

TEST(EntryOrderTest, ARangeEqualsThatPartOfTheWhole) {
    RandomEntries random(11);
    for (int round = 0; round < 300; ++round) {
        const auto entries = random.make(random.below(200), "x");
        const auto column = orvel::columnOf(kKeys[random.below(std::size(kKeys))]);
        orvel::EntryOrder whole(column, entries.size());
        orvel::EntryOrder part(column, entries.size());
        for (const auto& entry : entries) {
            whole.add(orvel::figuresOf(entry), entry.name, entry.type);
            part.add(orvel::figuresOf(entry), entry.name, entry.type);
        }
        const size_t first = random.below(entries.size() + 1);
        const size_t last = first + random.below(entries.size() - first + 1);
        auto expected = whole.take(0, entries.size());
        expected = {expected.begin() + static_cast<ptrdiff_t>(first), expected.begin() + static_cast<ptrdiff_t>(last)};
        ASSERT_EQ(part.take(first, last), expected) << "round " << round;
    }
}

TEST(EntryOrderTest, ColumnsWidenTheProperties) {
    struct Case {
        const char* key;
        int added;
    };
    for (const auto& [key, added] :
         {Case{"size", 0x02}, Case{"mtime", 0x08}, Case{"crtime", 0x08}, Case{"ctime", 0x08}, Case{"atime", 0x08},
          Case{"user", 0x04}, Case{"group", 0x04}, Case{"posix", 0x10}, Case{"type", 0x20}, Case{"name", 0},
          Case{"Size", 0}, Case{"", 0}, Case{nullptr, 0}}) {
        EXPECT_EQ(orvel::widened(0x41, key), 0x41 | added) << (key == nullptr ? "null" : key);
    }
}

TEST(SliceTest, Page) {
    struct Case {
        unsigned long offset, limit;
        std::vector<std::string> left;
    };
    constexpr unsigned long kHuge = ~0UL;
    const Case cases[] = {
        {0, 0, {"a", "b", "c"}}, {2, 0, {"a", "b", "c"}},     {0, 2, {"a", "b"}},
        {1, 1, {"b"}},           {1, 5, {"b", "c"}},          {3, 1, {}},
        {kHuge, 1, {}},          {0, kHuge, {"a", "b", "c"}}, {2, kHuge, {"c"}},
        {0, 3, {"a", "b", "c"}}, {kHuge, kHuge, {}},
    };
    OrvEnum listing;
    for (const auto& [offset, limit, left] : cases) {
        std::list<DIRENTRY_INFO> entries;
        for (const char* name : {"a", "b", "c"}) entries.push_back(with(file(name), [&](auto& i) { i.path = name; }));
        listing.OrvLibDirEntrySlice(entries, offset, limit);
        EXPECT_EQ(paths(entries), left) << offset << " " << limit;
        // The page computed beforehand is the same, from either end.
        for (const bool ascending : {true, false}) {
            const auto range = orvel::pageOf(3, {nullptr, ascending, offset, limit});
            EXPECT_EQ(range.last - range.first, left.size());
            if (left.empty()) continue;
            EXPECT_EQ(range.first, static_cast<size_t>(ascending ? left.front()[0] - 'a' : 'c' - left.back()[0]));
        }
    }
    std::list<DIRENTRY_INFO> none;
    listing.OrvLibDirEntrySlice(none, 1, 1);
    EXPECT_TRUE(none.empty());
}

}  // namespace
