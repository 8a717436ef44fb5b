#include "orvel/directory_walker.h"

#include <dirent.h>
#include <sys/resource.h>

#include <stdexcept>

#include "support/system_faults.h"
#include "support/testing.h"

namespace {

using orvel::Descriptor;
using Lines = std::vector<std::string>;

enum class Order { kWalk, kTopDown, kFirstFolder, kFirstFolderOnly };
constexpr Order kOrders[] = {Order::kWalk, Order::kTopDown, Order::kFirstFolder, Order::kFirstFolderOnly};
constexpr Order kDeepOrders[] = {Order::kWalk, Order::kTopDown, Order::kFirstFolder};

// Writes down what it is called for, and may do something at an entry.
class Recorder : public OrvDirectoryWalkerCallBack {
 public:
    Recorder(Lines& lines, std::string mark) : lines_(lines), mark_(std::move(mark)) {}
    bool operator()(const std::string& displayPath, const std::string& context, const std::string& realPath,
                    const std::string& name, _tag_VEXOSTAT_& status, const std::string* extra) override {
        lines_.push_back(mark_ + displayPath);
        struct stat own {};
        if (mark_.empty() && realPath.size() < 4096 && lstat(realPath.c_str(), &own) == 0) {
            EXPECT_EQ(status.st_inode, own.st_ino) << realPath;
            EXPECT_EQ(status.st_mode, own.st_mode) << realPath;
            EXPECT_NE(status.st_create, 0) << realPath;
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

std::string below(std::string folder, const std::string& name) {
    return folder.append("/").append(name);
}

bool isClosing(const std::string& line) {
    return line[0] == '-';
}

// What the orders mean, told by a plain recursion over readdir; "-" marks what is called behind an entry.
void expectLevel(Order order, const std::string& real, const std::string& display, Lines& lines) {
    Lines names, folders;
    DIR* folder = opendir(real.c_str());
    ASSERT_NE(folder, nullptr) << real;
    while (const dirent* entry = readdir(folder)) names.emplace_back(entry->d_name);
    closedir(folder);
    std::erase_if(names, [](const auto& n) { return n == "." || n == ".." || n == "@tmp" || n == "@vexoea"; });
    for (const auto& name : names) {
        const bool isFolder = S_ISDIR(statusOf(below(real, name)).st_mode);
        lines.push_back(below(display, name));
        if (isFolder && order >= Order::kFirstFolder) folders.push_back(name);
        if (isFolder && order < Order::kFirstFolder) expectLevel(order, below(real, name), below(display, name), lines);
        if (order == Order::kWalk) lines.push_back("-" + below(display, name));
    }
    if (order == Order::kFirstFolderOnly) return;
    for (const auto& name : folders) expectLevel(Order::kTopDown, below(real, name), below(display, name), lines);
}

class DirectoryWalkerTest : public ApplianceTest {
 protected:
    // Three levels, files and folders on each.
    void makeTree() {
        for (const char* folder : {"/a", "/a/deep", "/b", "/b/deep", "/empty"}) makeFolder(photo_ + folder);
        for (const char* file : {"/f", "/a/f", "/a/deep/f", "/a/deep/g", "/b/deep/f", "/z"})
            writeFile(photo_ + file, "x");
    }
    // The walk alone calls something behind an entry.
    bool walk(Order order, int errors, const std::string& root, int* abortFlag = nullptr, bool skipRecycle = false) {
        OrvDirectoryWalker walker(static_cast<_enum_ignore_err_>(errors), abortFlag);
        const std::string* extra = &Recorder::kExtra;
        lines_.clear();
        switch (order) {
            case Order::kWalk:
                return walker.Walk("show", "the context", root, &before_, &after_, extra, skipRecycle);
            case Order::kTopDown:
                return walker.Walk_TopDown("show", "the context", root, before_, extra, skipRecycle);
            default:
                return walker.Walk_FirstFolder_First("show", "the context", root, before_, extra, skipRecycle,
                                                     order == Order::kFirstFolderOnly);
        }
    }
    Lines expected(Order order) const {
        Lines lines;
        expectLevel(order, photo_, "show", lines);
        return lines;
    }

    Lines lines_;
    Recorder before_{lines_, ""}, after_{lines_, "-"};
};

TEST_F(DirectoryWalkerTest, OrdersOnAHostileTree) {
    makeTree();
    for (const std::string& name : {std::string(255, 'n'), std::string("line\nbreak"), std::string("\xFF\xFE\x80")})
        writeFile(below(below(photo_ + "/a", name), name), "x");
    for (const char* hidden : {"/@tmp", "/@vexoea", "/b/@tmp"}) writeFile(photo_ + hidden + "/inside", "x");
    for (const char* bin : {"/#recycle", "/b/#recycle"}) writeFile(photo_ + bin + "/thrown away", "x");
    for (const auto& [target, link] :
         Rows<const char*, const char*>{{"..", "/a/loop"}, {"/", "/a/out"}, {"nowhere", "/dangling"}})
        ASSERT_EQ(symlink(target, (photo_ + link).c_str()), 0);
    ASSERT_EQ(mkfifo((photo_ + "/b/pipe").c_str(), 0600), 0);

    for (const Order order : kOrders) {
        SCOPED_TRACE(static_cast<int>(order));
        for (const bool skipRecycle : {false, true}) {
            vexo::gate::reset();
            EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, photo_, nullptr, skipRecycle));
            Lines all = expected(order);
            const auto inBin = [](const auto& line) { return line.find("show/#recycle") != std::string::npos; };
            if (skipRecycle) std::erase_if(all, inBin);
            EXPECT_EQ(lines_, all) << "the bin of the share alone is left out";
            EXPECT_EQ(vexo::gate::calls("VEXOShareIsShareRecycle"), skipRecycle ? 7 : 0)
                << "asked for entries of the starting folder alone";
        }
    }
    lines_.clear();
    OrvDirectoryWalker walker(ENUM_IGNORE_NO_ERR, nullptr);
    EXPECT_TRUE(walker.Walk("show", "the context", photo_, nullptr, &after_, &Recorder::kExtra, false));
    EXPECT_TRUE(!lines_.empty() && std::all_of(lines_.begin(), lines_.end(), isClosing)) << "either may be missing";
}

TEST_F(DirectoryWalkerTest, StopsWhenACallbackSaysSo) {
    makeTree();
    for (const Order order : kOrders) {
        const Lines all = expected(order);
        for (size_t stop = 1; stop <= all.size(); ++stop) {
            before_.action = after_.action = [&](const auto&, const auto&) { return lines_.size() < stop; };
            EXPECT_FALSE(walk(order, ENUM_IGNORE_ALL_ERR, photo_));
            EXPECT_EQ(lines_, Lines(all.begin(), all.begin() + static_cast<std::ptrdiff_t>(stop)));
        }
    }
    before_.action = [](const auto&, const auto&) -> bool { throw std::runtime_error("from a callback"); };
    EXPECT_FALSE(walk(Order::kTopDown, ENUM_IGNORE_ALL_ERR, photo_)) << "no exception crosses";
}

TEST_F(DirectoryWalkerTest, AbortFlagCancels) {
    makeTree();
    for (const Order order : kOrders) {
        Lines all = expected(order);
        std::erase_if(all, isClosing);
        for (const int raised : {1, 2}) {  // 1 alone cancels
            for (size_t stop = 0; stop <= all.size(); ++stop) {
                size_t seen = 0;
                int flag = stop == 0 ? raised : 0;
                before_.action = [&](const auto&, const auto&) {
                    if (++seen == stop) flag = raised;
                    return true;
                };
                EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, photo_, &flag));
                EXPECT_EQ(std::erase_if(lines_, isClosing), order == Order::kWalk ? seen : 0)
                    << "the folders that a cancelled walk is in are closed";
                EXPECT_EQ(lines_.size(), raised == 1 ? stop : all.size());
                EXPECT_TRUE(std::equal(lines_.begin(), lines_.end(), all.begin()));
            }
        }
    }
}

TEST_F(DirectoryWalkerTest, CancelledOnceIsCancelledForGood) {
    makeTree();
    int flag = 0;
    std::string chosen;  // the first folder, behind which more comes in any order
    before_.action = [&](const std::string& path, const std::string& name) {
        if (chosen.empty() && fs::is_directory(path)) chosen = name, flag = 1;
        return true;
    };
    after_.action = [&](const auto&, const auto&) { return flag = 0, true; };
    EXPECT_TRUE(walk(Order::kWalk, ENUM_IGNORE_NO_ERR, photo_, &flag));
    EXPECT_EQ(lines_.back(), "-show/" + chosen) << "nothing below it, nothing behind it";
}

TEST_F(DirectoryWalkerTest, LeavesTheProcessInTheLastFolderEntered) {
    writeFile(photo_ + "/z", "x");
    makeFolder(photo_ + "/a/deep");
    for (const Order order : kOrders) {
        EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, photo_));
        EXPECT_EQ(fs::current_path(), photo_ + (order == Order::kFirstFolderOnly ? "" : "/a/deep"));
    }
}

class Failures : public DirectoryWalkerTest {
 protected:
    // What each error mode makes of a failure: passed over, with these entries reported, or logged as this behind
    // "orveldir:# ". `cause` runs ahead of each walk.
    void check(
        const std::string& start, bool isPermission, const std::string& log, const Lines& entries = {},
        const std::function<void()>& cause = [] {}) {
        for (const int errors : {0, 1, 2, 7}) {
            const bool ignored = errors == 1 || (errors == 0 && isPermission);
            for (const Order order : kDeepOrders) {
                SCOPED_TRACE(log + " mode " + std::to_string(errors) + std::to_string(static_cast<int>(order)));
                vexo::gate::reset();
                cause();
                EXPECT_EQ(walk(order, errors, photo_ + start), ignored);
                EXPECT_EQ(takeLogText(), ignored ? "" : "orveldir:# " + log);
                if (!ignored) continue;
                EXPECT_EQ(std::erase_if(lines_, isClosing), order == Order::kWalk ? entries.size() : 0);
                std::sort(lines_.begin(), lines_.end());
                EXPECT_EQ(lines_, entries);
            }
        }
    }
};

TEST_F(Failures, OfTheStartingFolderAndOfAStatus) {
    writeFile(photo_ + "/a/f", "x");
    writeFile(photo_ + "/file", "x");
    const std::string longPath = "/" + std::string(5000, 'p');
    check("/no", false, "Failed to chdir " + photo_ + "/no. [No such file or directory]");
    check("/file", false, "Failed to chdir " + photo_ + "/file. [Not a directory]");
    check(longPath, false, "Failed to chdir " + photo_ + longPath + ". [File name too long]");
    for (const int error : {EIO, EACCES, EPERM})
        check("/a", error != EIO, "VLIBCFileLStat: (" + photo_ + "/a/f), " + strerror(error) + ", vexoerr=8100.", {},
              [&] { vexo::gate::fail("VLIBCFileLStatAt", 0x8100, error, 1); });
}

// Opening is what fails then, at the start as below.
TEST_F(Failures, OfAProcessWithoutDescriptors) {
    writeFile(photo_ + "/a/b/f", "x");
    inChild([&] {
        const int lowest = dup(0);
        close(lowest);
        for (const auto& [more, failing] : Rows<int, const char*>{{0, ""}, {2, "/a/b"}}) {
            const rlimit few{static_cast<rlim_t>(lowest + more), 1024};
            EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &few), 0);
            EXPECT_FALSE(walk(Order::kTopDown, ENUM_IGNORE_NO_ERR, photo_));
            const rlimit many{1024, 1024};
            EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &many), 0);
            EXPECT_EQ(takeLogText(), "orveldir:# Failed to open " + photo_ + failing + ", error Too many open files");
        }
    });
}

TEST_F(Failures, OfReading) {
    makeFolder(photo_ + "/a/sub");
    makeFolder(photo_ + "/z");
    for (const int nth : {1, 2}) {  // at once, and behind what the first reading brought
        std::optional<ReadingFault> fault;
        Lines entries{"show/a", "show/a/sub", "show/z"};
        if (nth == 1) entries.erase(entries.begin() + 1);
        check("", false, "Failed to open " + photo_ + "/a, error Input/output error", entries,
              [&] { fault.emplace(photo_ + "/a", EIO, nth); });
    }
    ReadingFault gone(photo_ + "/a", ENOENT);
    EXPECT_TRUE(walk(Order::kTopDown, ENUM_IGNORE_NO_ERR, photo_)) << "a folder removed meanwhile has no entries";
}

TEST_F(Failures, OfPermissionsAsAnUnprivilegedUser) {
    SKIP_WITHOUT_ROOT();
    const std::string closed = photo_ + "/closed";
    writeFile(closed + "/f", "x");
    writeFile(photo_ + "/open/f", "x");
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

// A callback puts something else in the place of the folder that it was just called for. A link is not followed; which
// folder it is must not matter, since some file systems number a folder anew each time that it is looked up.
TEST_F(DirectoryWalkerTest, FolderReplacedDuringTheWalk) {
    const std::string outside = addShare("outside", ""), victim = photo_ + "/victim";
    writeFile(outside + "/secret", "x");
    for (const bool byLink : {true, false}) {
        before_.action = [&](const std::string& path, const std::string& name) {
            if (name != "victim") return true;
            fs::rename(path, outside + "/moved");
            if (byLink) return symlink(outside.c_str(), path.c_str()) == 0;
            writeFile(path + "/new", "x");
            return true;
        };
        for (const Order order : kDeepOrders) {
            for (const int errors : {ENUM_IGNORE_ALL_ERR, ENUM_IGNORE_NO_ERR}) {
                writeFile(victim + "/f", "x");
                EXPECT_EQ(walk(order, errors, photo_), !byLink || errors == ENUM_IGNORE_ALL_ERR);
                std::erase_if(lines_, isClosing);
                EXPECT_EQ(lines_, byLink ? Lines{"show/victim"} : (Lines{"show/victim", "show/victim/new"}));
                fs::remove_all(victim);
                fs::remove_all(outside + "/moved");
            }
            EXPECT_EQ(takeLogText(), byLink ? "orveldir:# Failed to chdir " + victim + ". [Not a directory]" : "");
        }
    }
}

// What the caller holds open is walked, wherever it lies by now, and called by where it was found.
TEST_F(DirectoryWalkerTest, AnOpenFolder) {
    makeTree();
    addMount(photo_, "ext4");
    writeFile(photo_ + "/#recycle/thrown away", "x");
    for (const Order order : kOrders) {
        const Descriptor opened(open(photo_.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
        Lines all = expected(order), paths;
        std::erase_if(all, [](const auto& line) { return line.find("show/#recycle") != std::string::npos; });
        before_.action = [&](const std::string& path, const std::string&) { return paths.push_back(path), true; };
        EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, opened.path(), nullptr, true));
        EXPECT_EQ(lines_, all) << "the share's bin is known by its real path";
        for (const std::string& path : paths) EXPECT_TRUE(path.starts_with(photo_ + "/")) << path;

        const Descriptor inner(open((photo_ + "/a").c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
        fs::rename(photo_ + "/a", photo_ + "/moved");
        fs::create_symlink("b", photo_ + "/a");
        paths.clear();
        EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, inner.path()));
        EXPECT_TRUE(!paths.empty() && paths.front().starts_with(photo_ + "/moved/"));
        fs::remove(photo_ + "/a");
        fs::rename(photo_ + "/moved", photo_ + "/a");
    }
}

std::string levels(int count) {
    std::string path;
    for (int i = 0; i < count; ++i) path += "/d";
    return path;
}

// In memory where there is a place for it: a disk takes half a minute to remove a deep tree, and memory delivers the
// newest entry first.
std::string folderInMemory() {
    std::string base = access("/dev/shm", W_OK) == 0 ? "/dev/shm/orveldeep-XXXXXX" : "/tmp/orveldeep-XXXXXX";
    EXPECT_NE(mkdtemp(base.data()), nullptr);
    return base;
}

TEST_F(DirectoryWalkerTest, FourThousandLevelsWithFewDescriptors) {
    constexpr int kDepth = 4000;
    const std::string base = folderInMemory();
    ASSERT_EQ(chdir(base.c_str()), 0);
    for (int i = 0; i < kDepth; ++i) {
        close(open("f", O_CREAT | O_WRONLY | O_CLOEXEC, 0644));
        EXPECT_EQ(mkdir("d", 0755) + chdir("d"), 0);
    }
    for (const Order order : {Order::kWalk, Order::kFirstFolder})
        inChild([&] {
            const rlimit few{256, 256}, smallStack{256 * 1024, 256 * 1024};
            EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &few) + setrlimit(RLIMIT_STACK, &smallStack), 0);
            int most = 0, calls = 0;
            before_.action = [&](const auto&, const auto&) {
                if (++calls % 100 == 0) most = std::max(most, openDescriptors());
                return true;
            };
            EXPECT_TRUE(walk(order, ENUM_IGNORE_NO_ERR, base));
            EXPECT_LT(most, 64);
            EXPECT_EQ(calls, 2 * kDepth);
            EXPECT_NE(std::find(lines_.begin(), lines_.end(), "show" + levels(kDepth)), lines_.end());
            return 0;
        });
    EXPECT_EQ(chdir(base.c_str()), 0);
    int depth = 0;
    while (chdir("d") == 0) ++depth;
    for (; depth > 0 && chdir("..") == 0; --depth) {
        unlink("f");
        rmdir("d");
    }
    EXPECT_EQ(rmdir(base.c_str()), 0);
}

// Folders of levels that the walk has closed meanwhile move elsewhere: what still lies in its place is found again, the
// rest counts as not readable.
TEST_F(DirectoryWalkerTest, FoldersMovedAboveADeepWalk) {
    constexpr int kDepth = 100;
    for (const auto& [alsoAbove, errors] :
         Rows<bool, int>{row(false, 2), row(true, int{ENUM_IGNORE_ALL_ERR}), row(true, 2)}) {
        const std::string base = folderInMemory(), root = base + "/root", elsewhere = base + "/elsewhere";
        makeFolder(elsewhere);
        for (int i = 0; i < kDepth; ++i) writeFile(root + levels(i) + "/f", "");
        makeFolder(root + levels(kDepth));
        before_.action = [&, above = alsoAbove](const std::string& path, const std::string&) {
            if (path != root + levels(kDepth)) return true;
            fs::rename(root + levels(11), elsewhere + "/eleven");
            if (above) fs::rename(root + levels(5), elsewhere + "/five");
            return true;
        };
        const bool done = walk(Order::kWalk, errors, root);
        const auto files = std::count_if(lines_.begin(), lines_.end(),
                                         [](const auto& line) { return !isClosing(line) && line.ends_with("/f"); });
        // Lost are the files of levels 5 to 10, where the file system delivers them behind the folder.
        EXPECT_GE(files, !alsoAbove ? kDepth : done ? kDepth - 6 : 0);
        EXPECT_EQ(done, errors == ENUM_IGNORE_ALL_ERR || files == kDepth);
        EXPECT_EQ(takeLogText(),
                  done ? "" : "orveldir:# Failed to open " + root + levels(10) + ", error No such file or directory");
        EXPECT_EQ(std::count(lines_.begin(), lines_.end(), "-show/d"), done ? 1 : 0);
        fs::remove_all(base);
    }
}

}  // namespace
