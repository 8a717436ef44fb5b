#include "orvel/directory_walker.h"

#include <dirent.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/resource.h>

#include <stdexcept>

#include "enum/tree_walk.h"
#include "support/log_texts.h"
#include "support/system_faults.h"
#include "support/testing.h"

namespace {

using Lines = std::vector<std::string>;

enum class Order { kWalk, kTopDown, kFirstFolder, kFirstFolderOnly };
constexpr Order kOrders[] = {Order::kWalk, Order::kTopDown, Order::kFirstFolder, Order::kFirstFolderOnly};

// Writes down what it is called for, and may do something at an entry.
class Recorder : public OrvDirectoryWalkerCallBack {
 public:
    Recorder(Lines& lines, std::string mark) : lines_(lines), mark_(std::move(mark)) {}
    bool operator()(const std::string& displayPath, const std::string& context, const std::string& realPath,
                    const std::string& name, _tag_VEXOSTAT_& status, const std::string* extra) override {
        lines_.push_back(mark_ + displayPath);
        struct stat own {};
        const bool reachable = realPath.size() < 4096 && lstat(realPath.c_str(), &own) == 0;
        if (reachable) {
            EXPECT_EQ(status.st_inode, own.st_ino) << realPath;
            EXPECT_EQ(status.st_mode, own.st_mode) << realPath;
        }
        EXPECT_TRUE(displayPath.ends_with("/" + name) && realPath.ends_with(displayPath.substr(displayPath.find('/'))));
        EXPECT_EQ(context, "the context");
        EXPECT_EQ(extra, &kExtra);
        return !action || action(realPath, name);
    }

    static const std::string kExtra;
    std::function<bool(const std::string& realPath, const std::string& name)> action;

 private:
    Lines& lines_;
    std::string mark_;
};

const std::string Recorder::kExtra = "extra";

bool walk(Order order, _enum_ignore_err_ mode, const std::string& root, Recorder& before, Recorder* after = nullptr,
          int* abortFlag = nullptr, bool skipRecycle = false) {
    OrvDirectoryWalker walker(mode, abortFlag);
    const std::string context = "the context";
    switch (order) {
        case Order::kWalk:
            return walker.Walk("show", context, root, &before, after, &Recorder::kExtra, skipRecycle);
        case Order::kTopDown:
            return walker.Walk_TopDown("show", context, root, before, &Recorder::kExtra, skipRecycle);
        default:
            return walker.Walk_FirstFolder_First("show", context, root, before, &Recorder::kExtra, skipRecycle,
                                                 order == Order::kFirstFolderOnly);
    }
}

std::string below(std::string folder, const std::string& name) {
    return folder.append("/").append(name);
}

// What the orders mean, told by a plain recursion over readdir.
void expectLevel(Order order, const std::string& real, const std::string& display, Lines& lines) {
    std::vector<std::string> names;
    DIR* folder = opendir(real.c_str());
    ASSERT_NE(folder, nullptr) << real;
    while (const dirent* entry = readdir(folder)) names.emplace_back(entry->d_name);
    closedir(folder);
    std::erase_if(names, [](const auto& n) { return n == "." || n == ".." || n == "@tmp" || n == "@vexoea"; });
    Lines folders;
    for (const auto& name : names) {
        struct stat status {};
        ASSERT_EQ(lstat(below(real, name).c_str(), &status), 0);
        lines.push_back((order == Order::kWalk ? "+" : "") + below(display, name));
        if (S_ISDIR(status.st_mode) && order >= Order::kFirstFolder) folders.push_back(name);
        if (S_ISDIR(status.st_mode) && order < Order::kFirstFolder) {
            expectLevel(order, below(real, name), below(display, name), lines);
        }
        if (order == Order::kWalk) lines.push_back("-" + below(display, name));
    }
    if (order == Order::kFirstFolderOnly) return;
    for (const auto& name : folders) expectLevel(Order::kTopDown, below(real, name), below(display, name), lines);
}

class DirectoryWalkerTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        root_ = shareRoot("photo");
    }
    // Three levels, files and folders on each.
    void makeTree() {
        for (const char* folder : {"/a", "/a/deep", "/b", "/b/deep", "/empty"}) makeFolder(root_ + folder);
        for (const char* file : {"/f", "/a/f", "/a/deep/f", "/a/deep/g", "/b/deep/f", "/z"})
            writeFile(root_ + file, "x");
    }
    Lines expected(Order order) const {
        Lines lines;
        expectLevel(order, root_, "show", lines);
        return lines;
    }

    std::string root_;
    Lines lines_;
    Recorder before_{lines_, "+"}, after_{lines_, "-"}, only_{lines_, ""};
};

TEST_F(DirectoryWalkerTest, OrdersOnAHostileTree) {
    makeTree();
    const std::string longName(255, 'n');
    for (const std::string& name : {longName, std::string("line\nbreak"), std::string("\xFF\xFE\x80")}) {
        makeFolder(root_ + "/a/" + name);
        writeFile(below(below(root_ + "/a", name), name), "x");
    }
    for (const char* hidden : {"/@tmp", "/@vexoea", "/b/@tmp"}) writeFile(root_ + hidden + "/inside", "x");
    for (const char* bin : {"/#recycle", "/b/#recycle"}) writeFile(root_ + bin + "/thrown away", "x");
    ASSERT_EQ(symlink("..", (root_ + "/a/loop").c_str()), 0);
    ASSERT_EQ(symlink("/", (root_ + "/a/out").c_str()), 0);
    ASSERT_EQ(symlink("nowhere", (root_ + "/dangling").c_str()), 0);
    ASSERT_EQ(symlink("self", (root_ + "/b/self").c_str()), 0);
    ASSERT_EQ(mkfifo((root_ + "/b/pipe").c_str(), 0600), 0);

    for (const Order order : kOrders) {
        SCOPED_TRACE(static_cast<int>(order));
        lines_.clear();
        const bool both = order == Order::kWalk;
        EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, root_, both ? before_ : only_, &after_));
        EXPECT_EQ(lines_, expected(order));
        EXPECT_EQ(std::count(lines_.begin(), lines_.end(), (both ? "+" : "") + std::string("show/#recycle")), 1);

        lines_.clear();
        vexo::gate::reset();
        EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, root_, both ? before_ : only_, &after_, nullptr, true));
        Lines without = expected(order);
        std::erase_if(without, [](const auto& line) { return line.find("show/#recycle") != std::string::npos; });
        EXPECT_EQ(lines_, without) << "the bin of the share alone is left out";
        EXPECT_EQ(vexo::gate::calls("VEXOShareIsShareRecycle"), 7) << "asked for entries of the starting folder alone";
    }

    // Either callback may be missing.
    OrvDirectoryWalker walker(ENUM_IGNORE_NO_ERR, nullptr);
    lines_.clear();
    EXPECT_TRUE(walker.Walk("show", "the context", root_, nullptr, &after_, &Recorder::kExtra, false));
    Lines behind = expected(Order::kWalk);
    std::erase_if(behind, [](const auto& line) { return line[0] == '+'; });
    EXPECT_EQ(lines_, behind);
    EXPECT_TRUE(walker.Walk("", "", root_, nullptr, nullptr, nullptr, false));
}

TEST_F(DirectoryWalkerTest, StopsWhenACallbackSaysSo) {
    makeTree();
    for (const Order order : kOrders) {
        SCOPED_TRACE(static_cast<int>(order));
        Recorder& first = order == Order::kWalk ? before_ : only_;
        const Lines all = expected(order);
        for (size_t stop = 1; stop <= all.size(); ++stop) {
            lines_.clear();
            first.action = after_.action = [&](const auto&, const auto&) { return lines_.size() < stop; };
            EXPECT_FALSE(walk(order, ENUM_IGNORE_ALL_ERR, root_, first, &after_));
            EXPECT_EQ(lines_, Lines(all.begin(), all.begin() + static_cast<std::ptrdiff_t>(stop)));
        }
    }
    only_.action = [](const auto&, const auto&) -> bool { throw std::runtime_error("from a callback"); };
    EXPECT_FALSE(walk(Order::kTopDown, ENUM_IGNORE_ALL_ERR, root_, only_)) << "no exception crosses";
}

TEST_F(DirectoryWalkerTest, AbortFlagCancels) {
    makeTree();
    for (const Order order : kOrders) {
        SCOPED_TRACE(static_cast<int>(order));
        Recorder& first = order == Order::kWalk ? before_ : only_;
        Lines all = expected(order);
        std::erase_if(all, [](const auto& line) { return line[0] == '-'; });
        for (const int raised : {1, 2}) {
            for (size_t stop = 0; stop <= all.size(); ++stop) {
                lines_.clear();
                int flag = stop == 0 ? raised : 0;
                first.action = [&](const auto&, const auto&) {
                    if (lines_.size() == stop) flag = raised;
                    return true;
                };
                EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, root_, first, nullptr, &flag));
                const size_t seen = raised == 1 ? stop : all.size();
                EXPECT_EQ(lines_, Lines(all.begin(), all.begin() + static_cast<std::ptrdiff_t>(seen)));
            }
        }
    }
    // The folders that a cancelled walk is in are still closed by `after`.
    lines_.clear();
    int flag = 0;
    before_.action = [&](const std::string& path, const auto&) {
        flag = path.ends_with("/a/deep/f") || path.ends_with("/a/deep/g");
        return true;
    };
    EXPECT_TRUE(walk(Order::kWalk, ENUM_IGNORE_NO_ERR, root_, before_, &after_, &flag));
    ASSERT_GE(lines_.size(), 3U);
    EXPECT_EQ(Lines(lines_.end() - 2, lines_.end()), (Lines{"-show/a/deep", "-show/a"}));
}

TEST_F(DirectoryWalkerTest, LeavesTheProcessInTheLastFolderEntered) {
    makeFolder(root_ + "/a/deep");
    writeFile(root_ + "/z", "x");
    for (const Order order : {Order::kWalk, Order::kTopDown, Order::kFirstFolder, Order::kFirstFolderOnly}) {
        EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, root_, only_));
        char now[4096];
        ASSERT_NE(getcwd(now, sizeof now), nullptr);
        EXPECT_EQ(now, root_ + (order == Order::kFirstFolderOnly ? "" : "/a/deep"));
    }
}

class Failures : public DirectoryWalkerTest {
 protected:
    // What each error mode makes of a failure: passed over, with these entries reported, or logged as this behind
    // "orveldir:# ". `cause` runs ahead of each walk.
    void check(
        const std::string& start, bool isPermission, const std::string& log, const Lines& entries = {},
        const std::function<void()>& cause = [] {}) {
        for (const int mode : {0, 1, 2, 7}) {
            SCOPED_TRACE(log + " mode " + std::to_string(mode));
            const bool ignored = mode == 1 || (mode == 0 && isPermission);
            for (const Order order : {Order::kWalk, Order::kTopDown, Order::kFirstFolder}) {
                lines_.clear();
                vexo::gate::reset();
                cause();
                EXPECT_EQ(walk(order, static_cast<_enum_ignore_err_>(mode), root_ + start, only_), ignored);
                EXPECT_EQ(takeLogText(), ignored ? "" : "orveldir:# " + log);
                std::sort(lines_.begin(), lines_.end());
                EXPECT_TRUE(!ignored || lines_ == entries) << testing::PrintToString(lines_);
            }
            if (!ignored) continue;
            lines_.clear();
            cause();
            walk(Order::kWalk, static_cast<_enum_ignore_err_>(mode), root_ + start, before_, &after_);
            EXPECT_EQ(std::count_if(lines_.begin(), lines_.end(), [](const auto& line) { return line[0] == '-'; }),
                      static_cast<long>(entries.size()))
                << "what is called before is called behind";
        }
    }
};

TEST_F(Failures, OfTheStartingFolderAndOfAStatus) {
    writeFile(root_ + "/a/f", "x");
    writeFile(root_ + "/file", "x");
    const std::string longPath = "/" + std::string(5000, 'p');
    check("/no", false, "Failed to chdir " + root_ + "/no. [No such file or directory]");
    check("/file", false, "Failed to chdir " + root_ + "/file. [Not a directory]");
    check(longPath, false, "Failed to chdir " + root_ + longPath + ". [File name too long]");
    for (const int error : {EIO, EACCES, EPERM}) {
        check("/a", error != EIO, "VLIBCFileLStat: (" + root_ + "/a/f), " + strerror(error) + ", vexoerr=8100.", {},
              [&] { vexo::gate::fail("VLIBCFileLStatAt", 0x8100, error, 1); });
    }
}

TEST_F(Failures, OfReading) {
    makeFolder(root_ + "/a/sub");
    makeFolder(root_ + "/z");
    for (const int nth : {1, 2}) {  // at once, and behind what the first reading brought
        std::optional<ReadingFault> fault;
        Lines entries{"show/a", "show/a/sub", "show/z"};
        if (nth == 1) entries.erase(entries.begin() + 1);
        check("", false, "Failed to open " + root_ + "/a, error Input/output error", entries,
              [&] { fault.emplace(root_ + "/a", EIO, nth); });
    }
    ReadingFault gone(root_ + "/a", ENOENT);
    EXPECT_TRUE(walk(Order::kTopDown, ENUM_IGNORE_NO_ERR, root_, only_)) << "a folder removed meanwhile has no entries";
}

TEST_F(Failures, OfPermissionsAsAnUnprivilegedUser) {
    SKIP_WITHOUT_ROOT();
    const std::string closed = root_ + "/closed";
    writeFile(closed + "/f", "x");
    writeFile(root_ + "/open/f", "x");
    ASSERT_EQ(chown(closed.c_str(), kBobUid, kUsersGid), 0);
    for (const mode_t mode : {0000, 0400, 0300}) {
        chmod(closed.c_str(), mode);
        const std::string log = mode == 0300 ? "Failed to open " + closed + ", error Permission denied"
                                             : "Failed to chdir " + closed + ". [Permission denied]";
        const auto body = [&] {
            check("", true, log, {"show/closed", "show/open", "show/open/f"});
            check("/closed", true, log);
            return 0;
        };
        EXPECT_EQ(asUser(kBobUid, kUsersGid, body), 0);
    }
    chmod(closed.c_str(), 0700);
}

// A callback puts something else in the place of the folder that it was just called for.
TEST_F(DirectoryWalkerTest, FolderReplacedDuringTheWalk) {
    const std::string outside = addShare("outside", "");
    writeFile(outside + "/secret", "x");
    for (const bool byLink : {true, false}) {
        for (const auto mode : {ENUM_IGNORE_ALL_ERR, ENUM_IGNORE_NO_ERR}) {
            for (const Order order : {Order::kWalk, Order::kTopDown, Order::kFirstFolder}) {
                const std::string root = root_ + "/" + std::to_string(byLink) + std::to_string(mode) +
                                         std::to_string(static_cast<int>(order));
                writeFile(root + "/victim/f", "x");
                only_.action = [&](const std::string& path, const std::string& name) {
                    if (name != "victim") return true;
                    rename(path.c_str(), (path + ".moved").c_str());
                    if (byLink) return symlink(outside.c_str(), path.c_str()) == 0;
                    writeFile(path + "/secret", "x");
                    return true;
                };
                lines_.clear();
                EXPECT_EQ(walk(order, mode, root, only_), mode == ENUM_IGNORE_ALL_ERR);
                EXPECT_EQ(lines_, Lines{"show/victim"});
                const Lines log{"orveldir:# Failed to chdir " + root + "/victim. " +
                                (byLink ? "[Not a directory]" : "[Stale file handle]")};
                EXPECT_EQ(takeLogTexts(), mode == ENUM_IGNORE_ALL_ERR ? Lines{} : log);
            }
        }
    }
}

// A folder may turn into the root of a mount when it is first entered.
TEST_F(DirectoryWalkerTest, EntersAFolderMountedDuringTheWalk) {
    makeFolder(root_ + "/mount");
    const int result = inChild([&] {
        bool mounted = false;
        if (unshare(CLONE_NEWNS) != 0 || mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) return 1;
        only_.action = [&](const std::string& path, const std::string& name) {
            if (name != "mount") return true;
            mounted = mount("none", path.c_str(), "tmpfs", 0, nullptr) == 0;
            writeFile(path + "/inside", "x");
            return mounted;
        };
        const bool done = walk(Order::kTopDown, ENUM_IGNORE_NO_ERR, root_, only_);
        if (!mounted) return 1;
        EXPECT_TRUE(done);
        EXPECT_EQ(lines_, (Lines{"show/mount", "show/mount/inside"}));
        return 0;
    });
    if (result == 1) GTEST_SKIP() << "needs the right to mount";
}

// A chain of folders "d", a file "f" in each beside the next; in memory where there is a place for it, since a disk
// takes half a minute to remove it.
class DeepTree {
 public:
    explicit DeepTree(int depth)
        : base_(access("/dev/shm", W_OK) == 0 ? "/dev/shm/orveldeep-XXXXXX" : "/tmp/orveldeep-XXXXXX") {
        EXPECT_NE(mkdtemp(base_.data()), nullptr);
        makeFolder(root());
        makeFolder(elsewhere());
        EXPECT_EQ(chdir(root().c_str()), 0);
        for (int i = 0; i < depth; ++i) {
            close(open("f", O_CREAT | O_WRONLY | O_CLOEXEC, 0644));
            EXPECT_EQ(mkdir("d", 0755) + chdir("d"), 0);
        }
    }
    ~DeepTree() {
        EXPECT_EQ(chdir(root().c_str()), 0);
        int depth = 0;
        while (chdir("d") == 0) ++depth;
        for (; depth > 0 && chdir("..") == 0; --depth) {
            unlink("f");
            rmdir("d");
        }
        EXPECT_EQ(rmdir(root().c_str()) + rmdir(elsewhere().c_str()) + rmdir(base_.c_str()), 0);
    }
    DeepTree(const DeepTree&) = delete;
    DeepTree& operator=(const DeepTree&) = delete;
    [[nodiscard]] std::string root() const { return base_ + "/root"; }
    [[nodiscard]] std::string elsewhere() const { return base_ + "/elsewhere"; }

 private:
    std::string base_;
};

std::string levels(int count) {
    std::string path;
    for (int i = 0; i < count; ++i) path += "/d";
    return path;
}

TEST_F(DirectoryWalkerTest, FourThousandLevelsWithFewDescriptors) {
    constexpr int kDepth = 4000;
    const DeepTree tree(kDepth);
    for (const Order order : {Order::kWalk, Order::kFirstFolder}) {
        SCOPED_TRACE(static_cast<int>(order));
        const int result = inChild([&] {
            const rlimit few{256, 256}, smallStack{256 * 1024, 256 * 1024};
            EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &few) + setrlimit(RLIMIT_STACK, &smallStack), 0);
            int most = 0, calls = 0;
            only_.action = [&](const auto&, const auto&) {
                if (++calls % 100 == 0) most = std::max(most, openDescriptors());
                return true;
            };
            EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, tree.root(), only_, &after_));
            EXPECT_LT(most, 64);
            EXPECT_EQ(std::count_if(lines_.begin(), lines_.end(), [](const auto& l) { return l.ends_with("/f"); }),
                      order == Order::kWalk ? 2 * kDepth : kDepth);
            EXPECT_NE(std::find(lines_.begin(), lines_.end(), "show" + levels(kDepth)), lines_.end());
            return 0;
        });
        EXPECT_EQ(result, 0);
    }
}

// Folders of levels that the walk has closed meanwhile move elsewhere: what still lies in its place is found again, the
// rest counts as not readable.
TEST_F(DirectoryWalkerTest, FoldersMovedAboveADeepWalk) {
    constexpr int kDepth = 100;
    struct Case {
        bool alsoAbove;
        _enum_ignore_err_ mode;
    };
    for (const Case& c :
         {Case{false, ENUM_IGNORE_NO_ERR}, Case{true, ENUM_IGNORE_ALL_ERR}, Case{true, ENUM_IGNORE_NO_ERR}}) {
        const bool alsoAbove = c.alsoAbove;
        SCOPED_TRACE(std::to_string(alsoAbove) + std::to_string(c.mode));
        const DeepTree tree(kDepth);
        const std::string eleven = tree.root() + levels(11), five = tree.root() + levels(5);
        before_.action = [&](const std::string& path, const std::string&) {
            if (path != tree.root() + levels(kDepth)) return true;
            EXPECT_EQ(rename(eleven.c_str(), (tree.elsewhere() + "/eleven").c_str()), 0);
            return !alsoAbove || rename(five.c_str(), (tree.elsewhere() + "/five").c_str()) == 0;
        };
        lines_.clear();
        const bool done = walk(Order::kWalk, c.mode, tree.root(), before_, &after_);
        const auto files =
            std::count_if(lines_.begin(), lines_.end(), [](const auto& l) { return l[0] == '+' && l.ends_with("/f"); });
        // Lost are the files of levels 5 to 10, where the file system delivers them behind the folder.
        EXPECT_GE(files, alsoAbove && done ? kDepth - 6 : 0);
        EXPECT_EQ(done, c.mode == ENUM_IGNORE_ALL_ERR || files == kDepth);
        const Lines lost{"orveldir:# Failed to open " + tree.root() + levels(10) + ", error No such file or directory"};
        EXPECT_EQ(takeLogTexts(), done ? Lines{} : lost);
        EXPECT_EQ(std::count(lines_.begin(), lines_.end(), "-show/d"), done ? 1 : 0);
        if (alsoAbove) {
            EXPECT_EQ(rename((tree.elsewhere() + "/five").c_str(), five.c_str()), 0);
        } else {
            EXPECT_EQ(files, kDepth);
        }
        EXPECT_EQ(rename((tree.elsewhere() + "/eleven").c_str(), eleven.c_str()), 0);
    }
}

}  // namespace
