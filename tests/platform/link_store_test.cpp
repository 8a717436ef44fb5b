// The link database: whole before it has its name, trusted or not used.
#include "vexo/link_store.h"

#include "platform/trust.h"
#include "support/sqlite.h"
#include "vexo/link_seat.h"

namespace {

using VEXO::LinkTaking;

class LinkStoreTest : public ApplianceTest {
 protected:
    // Adds a link with a store of its own; its identifier, "" on failure.
    static std::string add(const std::string& path) {
        VEXO::Link link{"", "alice", kAliceUid, path, "hash", 0, 7, 0};
        VEXO::LinkStore store;
        return store.add(link) ? link.id : "";
    }
    // The paths of all links, each with a bar behind it; "failed" when they could not be read.
    static std::string paths() {
        std::vector<VEXO::Link> links;
        VEXO::LinkStore store;
        std::string text;
        if (!store.list("", links)) return "failed";
        for (const VEXO::Link& link : links) text += link.path + "|";
        return text;
    }
    std::string file_ = systemRoot() + VEXO::kLinkDatabase;
};

TEST_F(LinkStoreTest, RowsAreAddedFoundAndRemoved) {
    EXPECT_EQ(paths(), "") << "before any link";
    const std::string id = add("/photo/a'b"), other = add("/photo");
    EXPECT_EQ(id.size(), 32U);
    std::optional<VEXO::Link> link;
    VEXO::LinkStore store;
    ASSERT_TRUE(store.find(id, link) && link);
    EXPECT_TRUE(link->owner == "alice" && link->uid == kAliceUid && link->passwordHash == "hash" && link->expires == 7);
    EXPECT_TRUE(store.find("' OR 1", link) && !link);
    bool removed = true;
    EXPECT_TRUE(store.remove(id, "bob", removed) && !removed);
    EXPECT_TRUE(store.remove(id, "alice", removed) && removed);
    EXPECT_TRUE(store.remove(other, "", removed) && removed);
    EXPECT_EQ(paths(), "");
    EXPECT_EQ(statusOf(file_).st_mode & 07777, 0600U);
}

TEST_F(LinkStoreTest, AFirstLinkThatFailsLeavesNothingBroken) {
    // Whatever the making of the file asks of the kernel is refused in turn.
    for (const auto& [name, call] : Rows<const char*, long>{
             row("write", long{SYS_pwrite64}), row("sync", long{SYS_fdatasync}), row("name", long{SYS_rename})}) {
        SCOPED_TRACE(name);
        EXPECT_EQ(inChild([call = call] { return !refuseCalls({{call, EIO}}) || add("/photo") == "" ? 0 : 1; }), 0);
        EXPECT_EQ(paths(), "");
        EXPECT_FALSE(fs::exists(file_));
    }
    // What a killed process left behind is not taken for anything.
    for (const char* rest : {".new", ".new-journal"}) writeFile(file_ + rest, "half", 0600);
    EXPECT_NE(add("/photo"), "");
    EXPECT_EQ(paths(), "/photo|");
    EXPECT_FALSE(fs::exists(file_ + ".new") || fs::exists(file_ + ".new-journal"));
}

TEST_F(LinkStoreTest, ADatabaseOfLinksAloneIsAddedTo) {
    const std::string id = add("/photo");
    sql(file_, "DROP TABLE linkMore; DROP TABLE linkTaken; PRAGMA user_version = 0");
    LinkTaking taking = LinkTaking::kGone;
    EXPECT_EQ(countAtOnce(4, [&] { return VEXO::LinkStore().take(id, "a", "b", false, taking); }), 4);
    std::optional<VEXO::Link> link;
    EXPECT_TRUE(VEXO::LinkStore().find(id, link) && link && link->used == 4);
    sql(file_, "PRAGMA user_version = 99");
    EXPECT_EQ(paths(), "failed") << "of a newer version";
}

TEST_F(LinkStoreTest, SeatsAreBoundedAndFreeAtTheEndOfTheirHolder) {
    using VEXO::LinkSeat;
    LinkSeat::Others others;
    std::vector<std::unique_ptr<LinkSeat>> seats;
    const auto take = [&](const std::string& link, const std::string& address) {
        auto seat = std::make_unique<LinkSeat>();
        if (seat->take(link, address, 10, others) != LinkSeat::Taking::kTaken) return false;
        seats.push_back(std::move(seat));
        return true;
    };
    for (int i = 0; i < VEXO::kSeatsOfAddress; ++i) EXPECT_TRUE(take("a", "1"));
    EXPECT_FALSE(take("a", "1"));
    EXPECT_FALSE(take("b", "1")) << "of an address, whatever the link";
    for (int i = VEXO::kSeatsOfAddress; i < VEXO::kSeatsOfLink; ++i) EXPECT_TRUE(take("a", "2"));
    EXPECT_TRUE(others.files == VEXO::kSeatsOfLink - 1 && others.bytes == 10 * others.files);
    EXPECT_FALSE(take("a", "3"));
    EXPECT_TRUE(take("b", "3"));
    EXPECT_EQ(others.files, 0);
    seats.erase(seats.begin());
    expectKilled([&] {
        if (take("a", "3")) raise(SIGKILL);
    });
    EXPECT_TRUE(take("a", "3")) << "the killed one's";
    EXPECT_FALSE(take("a", "4"));
    for (int link = 0; static_cast<int>(seats.size()) < VEXO::kSeats; ++link) {
        const std::string name = "other " + std::to_string(link);
        ASSERT_TRUE(take(name, name));
    }
    EXPECT_FALSE(take("z", "z")) << "all that there are";
    seats.clear();
    EXPECT_TRUE(take("z", "z"));
    writeFile(systemRoot() + "/run/vexo/sending", "", 0622);
    EXPECT_EQ(LinkSeat().take("a", "1", 1, others), LinkSeat::Taking::kFailed) << "others may write it";
}

TEST_F(LinkStoreTest, ManyMakeItAtOnce) {
    EXPECT_EQ(countAtOnce(8, [] { return !add("/photo").empty(); }), 8);
    EXPECT_EQ(paths().size(), 8 * sizeof "/photo");
}

TEST_F(LinkStoreTest, BelowASymbolicLinkAndNeverPlanted) {
    const std::string folder = fs::path(file_).parent_path(), elsewhere = systemRoot() + "/elsewhere";
    makeFolder(elsewhere);
    makeFolder(fs::path(folder).parent_path());
    fs::remove_all(folder);
    fs::create_directory_symlink(elsewhere, folder);
    EXPECT_NE(add("/photo"), "");
    EXPECT_EQ(paths(), "/photo|");
    plantEach(file_, [] {
        EXPECT_EQ(paths(), "failed");
        EXPECT_EQ(add("/photo"), "");
    });
    fs::remove(folder);
}

}  // namespace
