#include <climits>

#include "enum/entry_order.h"
#include "orvel/listing.h"
#include "support/testing.h"

namespace {

using Info = DIRENTRY_INFO;

Info entry(const std::string& name, bool isDirectory = false, const std::function<void(Info&)>& change = {}) {
    Info info;
    info.name = name;
    info.isDirectory = isDirectory;
    if (change) change(info);
    return info;
}

TEST(EnumCompareTest, Order) {
    constexpr bool kFolder = true, kFile = false;
    const auto file = [](const char* name, auto Info::*field, auto value) {
        return entry(name, kFile, [&](Info& i) { i.*field = static_cast<std::decay_t<decltype(i.*field)>>(value); });
    };
    for (const auto& [key, first, second] : Rows<const char*, Info, Info>{
             {"name", entry("z", kFolder), entry("a")},
             {"nonsense", entry("z", kFolder), entry("a")},
             {"name", entry("a"), entry("B")},
             {"name", entry("a"), entry("ab")},
             {"name", entry("Äb"), entry("äc")},
             {"name", entry("\xF0\x9F\x98\x80"), entry("\xFF")},
             {"size", entry("z"), file("a", &Info::size, 1LL << 40)},
             {"size", entry("a", kFolder, [](Info& i) { i.size = 9; }), entry("b", kFolder)},
             {"mtime", entry("z"), file("a", &Info::mtime, UINT_MAX)},
             {"mtime", entry("a"), entry("b")},
             {"ctime", entry("z"), file("a", &Info::ctime, 2)},
             {"crtime", entry("z"), file("a", &Info::crtime, 2)},
             {"atime", entry("z"), file("a", &Info::atime, 2)},
             {"user", file("z", &Info::owner, "zoe"), file("a", &Info::uid, 1026)},
             {"group", entry("z"), file("a", &Info::gid, 4000000000U)},
             {"posix", file("z", &Info::mode, 0104644), file("a", &Info::mode, 0100755)},
             {"posix", file("a", &Info::mode, 0104644), file("b", &Info::mode, 0100644)},
             {"type", file("z", &Info::type, "J"), file("a", &Info::type, "JPG")},
             {"type", file("a", &Info::type, "jpg"), file("b", &Info::type, "JPG")},
         }) {
        EXPECT_TRUE(EnumCompare(key)(first, second)) << key << " " << first.name << " " << second.name;
        EXPECT_FALSE(EnumCompare(key)(second, first)) << key << " " << first.name << " " << second.name;
    }
    EXPECT_FALSE(EnumCompare("name")(entry("a"), entry("A")) || EnumCompare("name")(entry("A"), entry("a")));
    const Rows<const char*, int> rows = {{"size", 0x02},  {"mtime", 0x08}, {"crtime", 0x08}, {"ctime", 0x08},
                                         {"atime", 0x08}, {"user", 0x04},  {"group", 0x04},  {"posix", 0x10},
                                         {"type", 0x20},  {"name", 0},     {"x", 0},         {nullptr, 0}};
    for (const auto& [key, added] : rows) EXPECT_EQ(orvel::widened(0x100, key), 0x100 | added);
}

// Lists in which much is equal: few names, in both cases, of different lengths, with a common beginning and broken.
class RandomEntries {
 public:
    std::list<Info> make(size_t count, const std::string& beginning) {
        static const char* const names[] = {"a",         "A",         "ab",       "aB",      "",
                                            "b",         "\xC3\xA4",  "\xC3\x84", "\xFF",    "\xFF\xFE",
                                            "abcdefghi", "ABCDEFGHJ", "abcdefgh", "\xE2\x82"};
        static const char* const types[] = {"", "JPG", "jpg", "PNG", "J", "\xC3\x84"};
        std::list<Info> entries;
        for (size_t i = 0; i < count; ++i) {
            Info& info = entries.emplace_back(entry(beginning + names[below(std::size(names))], below(4) == 0));
            info.type = types[below(std::size(types))];
            info.size = static_cast<int64_t>(below(4)) - 1;
            info.mode = 0100640 + below(3) + (below(2) << 11);
            info.ctime = 0xFFFFFFFF - below(3);
            info.crtime = below(3) << 30;
            info.uid = below(3);
            info.path = std::to_string(i);  // tells entries apart
        }
        return entries;
    }
    const char* key() {
        static const char* const keys[] = {"name", "size", "ctime", "crtime", "user", "posix", "type"};
        return keys[below(std::size(keys))];
    }
    unsigned below(size_t limit) { return static_cast<unsigned>(random_() % limit); }

 private:
    std::mt19937 random_{7};
};

std::string paths(const std::list<Info>& entries) {
    std::string out;
    for (const auto& info : entries) out += info.path + ' ';
    return out;
}

TEST(EntryListSortTest, EqualsAStableSortWithEnumCompareAndMovesNoRecord) {
    RandomEntries random;
    OrvEnum listing;
    for (int round = 0; round < 300; ++round) {
        auto entries = random.make(random.below(60) + 1, round % 2 == 0 ? "" : "IMG_2024_");
        const char* key = random.key();
        auto expected = entries;
        expected.sort(EnumCompare(key));
        // A range equals that part of the whole.
        const size_t first = random.below(entries.size() + 1), last = first + random.below(entries.size() - first + 1);
        orvel::EntryOrder order(orvel::columnOf(key), entries.size());
        for (const auto& info : entries) order.add(orvel::figuresOf(info), info.name, info.type);
        auto wanted = std::next(expected.begin(), static_cast<ptrdiff_t>(first));
        for (const size_t position : order.take(first, last))
            ASSERT_EQ(std::to_string(position), (wanted++)->path) << "round " << round << ", key " << key;

        const Info* front = &entries.front();
        listing.EntryListSort(entries, key);
        ASSERT_EQ(paths(entries), paths(expected)) << "round " << round << ", key " << key;
        EXPECT_TRUE(std::any_of(entries.begin(), entries.end(), [&](const auto& e) { return &e == front; }));
    }
}

TEST(EntrySliceTest, OffsetAndLimit) {
    OrvEnum listing;
    for (const auto& [offset, limit, left] :
         Rows<unsigned long, unsigned long, std::string>{row(2UL, 0UL, "0 1 2 "), row(1UL, 1UL, "1 "),
                                                         row(1UL, ULONG_MAX, "1 2 "), row(ULONG_MAX, ULONG_MAX, "")}) {
        auto entries = RandomEntries().make(3, "");
        listing.OrvLibDirEntrySlice(entries, offset, limit);
        EXPECT_EQ(paths(entries), left);
    }
}

}  // namespace
