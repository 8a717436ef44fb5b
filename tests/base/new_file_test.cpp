// Names that appear whole or not at all, whatever the file system can do and whenever the process is killed.
#include "base/new_file.h"

#include <optional>

#include "support/testing.h"

namespace {

// What happens right before a name is given.
std::function<void()> beforeNaming;

void naming() {
    if (const auto event = std::exchange(beforeNaming, nullptr)) event();
}

}  // namespace

extern "C" int renameat(int fromFolder, const char* from, int toFolder, const char* to) noexcept {
    naming();
    return static_cast<int>(syscall(SYS_renameat, fromFolder, from, toFolder, to));
}

extern "C" int linkat(int fromFolder, const char* from, int toFolder, const char* to, int flags) noexcept {
    naming();
    return static_cast<int>(syscall(SYS_linkat, fromFolder, from, toFolder, to, flags));
}

namespace {

const Refusal kNoNameless{SYS_openat, EOPNOTSUPP, 2, O_TMPFILE & ~O_DIRECTORY};
const Refusal kNoExclusiveRename{SYS_renameat2, EINVAL, 4, 1};
const Refusal kNoLinks{SYS_linkat, EPERM};
const std::vector<Refusal> kWays[] = {
    {}, {kNoNameless}, {kNoNameless, kNoExclusiveRename}, {kNoNameless, kNoExclusiveRename, kNoLinks}};

// The tests' working directory is a share's root.
class NewFileTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        ASSERT_EQ(chdir(shareRoot("photo").c_str()), 0);
        folder_ = orvel::Descriptor(open(".", O_PATH | O_DIRECTORY | O_CLOEXEC));
    }
    void TearDown() override {
        folder_.reset();
        ApplianceTest::TearDown();
    }
    // "name=content" of each file, "name/" of each folder, "name>" of each link.
    static std::set<std::string> entries() {
        std::set<std::string> found;
        for (const auto& entry : fs::directory_iterator(".")) {
            const std::string name = entry.path().filename();
            found.insert(entry.is_symlink()     ? name + ">"
                         : entry.is_directory() ? name + "/"
                                                : name + "=" + readFile(name));
        }
        return found;
    }
    // Each way in a child of its own, in an empty folder.
    static void inEachWay(const std::function<void()>& body) {
        for (const auto& way : kWays) {
            SCOPED_TRACE(&way - kWays);
            EXPECT_EQ(inChild([&] { return refuseCalls(way) ? (body(), 0) : 97; }), 0);
            for (const auto& entry : fs::directory_iterator(".")) fs::remove_all(entry.path());
        }
    }
    bool store(const std::string& name, const std::string& content, bool replace) const {
        orvel::NewFile file(folder_.get());
        return file.create(name, 0600) && write(file.get(), content.data(), content.size()) > 0 &&
               file.publish(name, replace);
    }
    orvel::Descriptor folder_;
};

using Entries = std::set<std::string>;

TEST_F(NewFileTest, NothingOfOthersIsLost) {
    inEachWay([&] {
        const int folder = folder_.get();
        writeFile("./file", "mine");
        makeFolder("folder");
        fs::create_symlink("nowhere", "link");
        for (const std::string from : {"file", "folder", "link"}) {
            SCOPED_TRACE(from);
            // There from the start, and put there at the last moment as others do it who replace nothing either.
            for (const bool late : {false, true}) {
                bool theirs = false;
                const auto appear = [&] {
                    theirs = orvel::Descriptor(open("to", O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600)).get() >= 0;
                };
                if (late) beforeNaming = appear;
                if (!late) appear();
                const bool renamed = orvel::renameNew(folder, from, folder, "to");
                EXPECT_TRUE(renamed || errno == EEXIST) << errno;
                EXPECT_EQ(renamed, !theirs);
                beforeNaming = nullptr;
                EXPECT_TRUE(theirs ? unlink("to") == 0 : orvel::renameNew(folder, "to", folder, from));
            }
            EXPECT_TRUE(orvel::renameNew(folder, from, folder, "to"));
            EXPECT_FALSE(orvel::renameNew(folder, from, folder, "other"));
            EXPECT_EQ(errno, ENOENT);
            EXPECT_TRUE(orvel::renameNew(folder, "to", folder, from));
        }
        EXPECT_FALSE(orvel::renameNew(folder, "folder", folder, "folder/below"));
        EXPECT_EQ(errno, EINVAL);
        EXPECT_EQ(entries(), (Entries{"file=mine", "folder/", "link>"}));
    });
}

TEST_F(NewFileTest, FilesAndLinksTakeTheirPlaceWhole) {
    inEachWay([&] {
        const int folder = folder_.get();
        EXPECT_TRUE(store("a", "1", false));
        EXPECT_FALSE(store("a", "2", false));
        EXPECT_EQ(errno, EEXIST);
        EXPECT_EQ(entries(), Entries{"a=1"});
        EXPECT_TRUE(store("a", "3", true));
        EXPECT_EQ(entries(), Entries{"a=3"});
        EXPECT_TRUE(orvel::putLink(folder, "link", "a", false));
        EXPECT_FALSE(orvel::putLink(folder, "link", "b", false));
        EXPECT_TRUE(orvel::putLink(folder, "link", "b", true));
        EXPECT_EQ(fs::read_symlink("link"), "b");
        EXPECT_EQ(orvel::putHardLink(folder, "a", folder, "link", true),
                  orvel::putHardLink(folder, "a", folder, "b", false));
        EXPECT_EQ(mkdir("full", 0700), 0);
        EXPECT_FALSE(store("full", "4", true));
        EXPECT_EQ(errno, EISDIR);
        for (const std::string& entry : entries()) EXPECT_FALSE(orvel::isPartName(entry)) << entry;
        // Two at work on one name keep out of each other's way.
        orvel::NewFile first(folder), second(folder);
        EXPECT_TRUE(first.create("n", 0600) && second.create("n", 0600));
        EXPECT_EQ(write(second.get(), "2", 1), 1);
        EXPECT_TRUE(second.publish("n", true) && first.publish("n", true));
        EXPECT_EQ(readFile("n"), "");
        EXPECT_TRUE(orvel::syncName(folder, "n"));
    });
}

TEST_F(NewFileTest, OnlyTheExpectedFileIsReplaced) {
    const auto replaceByRename = [](const char* text) {
        writeFile("./other", text);
        EXPECT_EQ(rename("other", "a"), 0);
    };
    const std::function<void()> nothing = [] {};
    const std::function<void()> replaced = [&] { replaceByRename("of another"); };
    const std::function<void()> written = [] { writeFile("./a", "longer than before"); };
    const std::function<void()> removed = [] { unlink("a"); };
    // The two questions before the names are exchanged, and the two after that.
    for (const auto& [question, event, found] : Rows<int, std::function<void()>, std::string>{
             row(0, nothing, "new"), row(1, replaced, "of another"), row(2, replaced, "of another"),
             row(2, written, "longer than before"), row(2, removed, ""), row(4, nothing, "new")}) {
        SCOPED_TRACE(std::to_string(question) + found);
        writeFile("./a", "old");
        const struct stat known = statusOf("a");
        int asked = 0;
        std::optional<orvel::NewFile> file(folder_.get());
        ASSERT_TRUE(file->create("a", 0644) && write(file->get(), "new", 3) == 3);
        const bool stored =
            file->publishInPlaceOf("a", [&, question = question, event = event](const struct stat& now) {
                const bool same = now.st_ino == known.st_ino && now.st_size == known.st_size;
                if (++asked == question) event();
                return same;
            });
        EXPECT_EQ(stored ? 0 : errno, found == "new" ? 0 : ESTALE);
        file.reset();
        EXPECT_EQ(entries(), found.empty() ? Entries{} : Entries{"a=" + found});
        unlink("a");
    }
}

// What was taken out goes back, and gives way to whatever was put in the place of ours meanwhile.
TEST_F(NewFileTest, WhoComesLastStays) {
    for (const bool isRemoved : {false, true}) {
        writeFile("./a", "old");
        int asked = 0;
        orvel::NewFile file(folder_.get());
        ASSERT_TRUE(file.create("a", 0644) && write(file.get(), "new", 3) == 3);
        EXPECT_FALSE(file.publishInPlaceOf("a", [&](const struct stat&) {
            if (++asked < 3) return true;
            EXPECT_EQ(readFile("a"), "new");
            if (isRemoved) {
                EXPECT_EQ(unlink("a"), 0);
            } else {
                writeFile("./last", "the last");
                EXPECT_EQ(rename("last", "a"), 0);
            }
            return false;
        }));
        EXPECT_EQ(errno, ESTALE);
        EXPECT_EQ(entries(), isRemoved ? Entries{} : Entries{"a=the last"});
    }
}

TEST_F(NewFileTest, WhatAKilledProcessLeftIsHiddenAndGoesWithTheNextOne) {
    for (const bool nameless : {true, false}) {
        SCOPED_TRACE(nameless);
        writeFile("./a", "old");
        expectKilled([&] {
            if (!nameless) refuseCalls({kNoNameless});
            beforeNaming = [&] {
                beforeNaming = [] { raise(SIGKILL); };
                if (!nameless) naming();
            };
            store("a", "new", true);
        });
        Entries left = entries();
        EXPECT_EQ(left.erase("a=old"), 1U);
        ASSERT_EQ(left.size(), 1U);
        EXPECT_TRUE(orvel::isPartName(*left.begin())) << *left.begin();
        EXPECT_TRUE(store("a", "newer", true));
        EXPECT_EQ(entries(), Entries{"a=newer"});
    }
}

TEST_F(NewFileTest, AFolderOnItsWayGoesUnlessSomebodyIsAtWork) {
    const int folder = folder_.get();
    std::string left, first, second;
    EXPECT_TRUE(orvel::makeFolderPart(folder, "a", 0700, left));  // closed at once, as by the end of its process
    EXPECT_TRUE(orvel::isPartName(left)) << left;
    orvel::Descriptor atWork = orvel::makeFolderPart(folder, "a", 0700, first);
    EXPECT_EQ(first, left) << "in the place of what was left";
    EXPECT_TRUE(orvel::makeFolderPart(folder, "a", 0700, second));
    EXPECT_NE(second, first);
    EXPECT_FALSE(orvel::removeAbandonedPart(folder, first)) << "somebody is at work on it";
    EXPECT_TRUE(orvel::removeAbandonedPart(folder, second));
    writeFile("./" + first + "/inside", "of somebody");
    atWork.reset();
    EXPECT_FALSE(orvel::removeAbandonedPart(folder, first)) << "not empty";
    EXPECT_EQ(entries(), Entries{first + "/"});
}

}  // namespace
