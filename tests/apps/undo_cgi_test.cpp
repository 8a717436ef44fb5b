// What an operation did, undone: item by item, and only what is still as it was left.
#include <sys/mount.h>

#include "apps/task_fixture.h"
#include "platform/private_mounts.h"
#include "support/gate.h"

namespace {

class UndoCgi : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        SKIP_WITHOUT_ROOT();
        openFolder(photo_ + "/#recycle");
        openFolder(video_);
        lay();
    }
    void lay() {
        writeFiles(photo_, {"/a/1", "/a/b/2", "/a/b/3", "/c"});
        for (const char* folder : {"/a", "/a/b"}) EXPECT_EQ(chmod((photo_ + folder).c_str(), 0750), 0);
    }
    // Performs what can be undone; its id.
    std::string act(const std::string& form) {
        done_ = perform("alice", form);
        return done_["taskid"].asString();
    }
    static Json::Value undo(const std::string& id) {
        return ended("alice", start("alice", "action=undo&taskid=" + id));
    }
    std::string undoFile(const std::string& id) {
        return systemRoot() + "/var/lib/vexo/undo/" + std::to_string(kAliceUid) + "/" + id;
    }
    [[nodiscard]] std::string all() const { return treeOf(photo_) + " | " + treeOf(video_); }
    Json::Value done_;
};

TEST_F(UndoCgi, EverythingIsAsItWasBefore) {
    const struct {
        const char *what, *first, *then;  // `first` is done before what is undone
        int items;
    } cases[] = {
        {"a deletion", "", "action=delete&path=/photo/a/b/2&path=/photo/c&path=/photo/a", 3},
        {"a move", "", "action=move&conflict=keep_both&target=/video&path=/photo/a&path=/photo/c", 2},
        {"a move that mixes folders", "", "action=move&conflict=skip&target=/video&path=/photo/a&path=/photo/c", 3},
        {"a restoring", "action=delete&path=/photo/a/b/2&path=/photo/a/b",
         "action=restore&path=/photo/%23recycle/a/b/2", 2},
        {"a copy", "", "action=copy&conflict=skip&target=/video&path=/photo/a&path=/photo/c", 5},
    };
    for (const auto& one : cases) {
        SCOPED_TRACE(one.what);
        for (const auto& root : {photo_ + "/#recycle", video_, photo_ + "/a"}) {
            for (const auto& entry : fs::directory_iterator(root)) fs::remove_all(entry.path());
        }
        lay();
        writeFiles(video_, {"/a/9"});
        if (*one.first != 0) {
            EXPECT_EQ(errors(perform("alice", one.first)), "");
        }
        // A folder that the restoring made has lost its mode.
        const bool modes = std::string(one.what) != "a restoring";
        const auto now = [&] { return modes ? all() : filesOf(photo_) + filesOf(video_); };
        const std::string before = now();
        const std::string id = act(one.then);
        EXPECT_EQ(done_["undo_count"].asInt(), one.items);
        EXPECT_EQ(done_["undo_left_out"].asInt(), 0);
        EXPECT_NE(now(), before);
        const Json::Value back = undo(id);
        EXPECT_EQ(errors(back), "");
        EXPECT_EQ(back["state"], "done");
        EXPECT_EQ(now(), before);
        EXPECT_EQ(code(ask("alice", "action=undo&taskid=" + id)), 408) << "not twice";
        EXPECT_TRUE(back["undo_count"].isNull()) << "nor back again";
    }
}

TEST_F(UndoCgi, ARenameIsUndoneByItsOwnId) {
    const CgiReply renamed = ask("alice", "action=rename&path=/photo/c&name=d");
    const std::string id = renamed.json["data"]["undo"].asString();
    EXPECT_EQ(code(ask("bob", "action=undo&taskid=" + id)), 408) << "another's";
    EXPECT_EQ(errors(undo(id)), "");
    EXPECT_EQ(readFile(photo_ + "/c"), "/c");
    EXPECT_FALSE(fs::exists(photo_ + "/d"));
    for (const std::string bad : {"../x", "Quorvane_rename_", "Quorvane_rename_0123456789abcdef"})
        EXPECT_EQ(code(ask("alice", "action=undo&taskid=" + bad)), 408) << bad;
    EXPECT_EQ(code(get(PROGRAM_OPERATION, "alice", "action=undo&taskid=" + id)), 400) << "not posted";
}

TEST_F(UndoCgi, WhatIsNotAsItWasLeftStaysAndTheRestGoesBack) {
    writeFiles(photo_, {"/taken", "/edited", "/other", "/gone", "/closed/f", "/good"});
    const Names paths = {"/photo/taken", "/photo/edited",   "/photo/other",
                         "/photo/gone",  "/photo/closed/f", "/photo/good"};
    const std::string id = act("action=delete" + about(paths)), bin = photo_ + "/#recycle";
    writeFiles(photo_, {"/taken"}, "somebody's");
    writeFile(bin + "/edited", "since", 0666);
    fs::rename(bin + "/other", bin + "/kept");
    writeFiles(bin, {"/other"});  // the same name and content, another file
    fs::remove(bin + "/gone");
    fs::remove(photo_ + "/closed");
    support::makeFolder(photo_ + "/closed", 0755);  // root's
    Json::Value back = undo(id);
    EXPECT_EQ(errors(back),
              "/photo/#recycle/closed/f 407\n/photo/#recycle/gone 408\n/photo/#recycle/other 2101\n"
              "/photo/#recycle/edited 2101\n/photo/taken 414\n");
    EXPECT_EQ(back["errors"][2]["key"], "undo_changed");
    EXPECT_EQ(back["items_done"], 1);
    EXPECT_EQ(readFile(photo_ + "/good") + readFile(photo_ + "/taken"), "/goodsomebody's");
    EXPECT_EQ(filesOf(bin), "closed/f=/closed/f edited=since kept=/other other=/other taken=/taken");

    fs::remove(photo_ + "/taken");
    fs::remove(photo_ + "/good");
    back = undo(id);
    EXPECT_EQ(readFile(photo_ + "/taken"), "/taken") << "what is in order by now goes back";
    EXPECT_EQ(errors(back).find("good"), std::string::npos) << "what was undone once is not looked at";
}

TEST_F(UndoCgi, OnlyUntouchedCopiesGo) {
    const std::string id = act("action=copy&target=/video&path=/photo/a&path=/photo/c");
    writeFile(video_ + "/a/b/2", "changed", 0666);
    writeFiles(video_, {"/a/new"});
    fs::remove(photo_ + "/c");
    EXPECT_EQ(errors(undo(id)), "/video/c 2102\n/video/a/b/2 2101\n");
    EXPECT_EQ(filesOf(video_), "a/b/2=changed a/new=/a/new c=/c");
    fs::remove(video_ + "/a/b/2");
    EXPECT_EQ(errors(undo(id)), "/video/c 2102\n/video/a 2103\n");
    EXPECT_EQ(filesOf(video_), "a/new=/a/new c=/c");
    openFolder(video_ + "/over");
    writeFiles(video_, {"/over/c"}, "before");
    writeFiles(photo_, {"/c"});
    act("action=copy&conflict=overwrite&target=/video/over&path=/photo/c");
    EXPECT_EQ(done_["undo_left_out"], 1) << "what was replaced does not come back";
    EXPECT_EQ(done_["undo_count"], 0);
}

TEST_F(UndoCgi, RightsAreThoseOfNow) {
    const std::string id = act("action=move&target=/video&path=/photo/c");
    addShare("photo", "read only = no\nvalid users = alice\nread list = alice\n");
    EXPECT_EQ(errors(undo(id)), "/photo/c 407\n");
    EXPECT_TRUE(fs::exists(video_ + "/c"));
}

TEST_F(UndoCgi, ARecordIsNotBelieved) {
    writeFiles(photo_, {"/secret"});
    const std::string id = act("action=delete&path=/photo/c");
    const std::string whole = readFile(undoFile(id));
    const auto write = [&](std::string text) { writeFile(undoFile(id), text, 0600); };
    for (const auto& [was, is] :
         {std::pair("/photo/c", "/photo/../../../etc/c"), std::pair("/photo/c", "/photo/@tmp/c"),
          std::pair("/photo/c", "/photo/a/../x/c"), std::pair("/photo/c", "/photo/.."), std::pair("m ", "m x"),
          std::pair("m ", "? "), std::pair("ORVUNDO2", "ORVUNDO1")}) {
        std::string text = whole;
        text.replace(text.rfind(was), strlen(was), is);
        write(text);
        const CgiReply reply = ask("alice", "action=undo&taskid=" + id);
        if (code(reply) == 0) {
            EXPECT_NE(errors(ended("alice", reply.json["data"]["taskid"].asString())), "") << is;
        }
        EXPECT_TRUE(fs::exists(photo_ + "/#recycle/c")) << is;
    }
    write(whole + whole.substr(9, whole.size() - 12));  // torn behind the first
    EXPECT_EQ(errors(undo(id)), "");
    EXPECT_TRUE(fs::exists(photo_ + "/c"));
}

TEST_F(UndoCgi, WhatIsBackAlreadyIsFoundSo) {
    const std::string id = act("action=move&target=/video&path=/photo/a&path=/photo/c");
    fs::rename(video_ + "/a", photo_ + "/a");  // as one that was killed leaves it
    EXPECT_EQ(errors(undo(id)), "");
    EXPECT_EQ(readFile(photo_ + "/c") + readFile(photo_ + "/a/1"), "/c/a/1");
    EXPECT_FALSE(fs::exists(undoFile(id)));
}

// An overlay that is mounted again is what a disk is after the machine has been started anew: the same files, and the
// same number of its file system, under another device number.
TEST_F(UndoCgi, TheDeviceMayHaveAnotherNumberByThen) {
    const std::string disk = addShare("other", "read only = no\n");
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        EXPECT_EQ(mount("none", disk.c_str(), "tmpfs", 0, "mode=0777"), 0);
        for (const char* name : {"/below", "/above", "/work", "/others"}) openFolder(disk + name);
        const std::string layers = "lowerdir=" + disk + "/below,upperdir=" + disk + "/above,workdir=" + disk + "/work";
        const auto deviceAfterMount = [&] {
            struct stat status {};
            const bool mounted = mount("none", video_.c_str(), "overlay", 0, layers.c_str()) == 0;
            return mounted && stat(video_.c_str(), &status) == 0 ? status.st_dev : 0;
        };
        const dev_t before = deviceAfterMount();
        if (before == 0) return support::kNoPrivateMounts;
        writeFiles(video_, {"/a/1", "/c"});
        const std::string moved = act("action=move&target=/video/a&path=/video/c");
        const std::string copied = act("action=copy&target=/video&path=/video/a/1");
        dev_t after = before;
        for (int others = 0; after == before && others < 1000; ++others) {
            EXPECT_EQ(umount(video_.c_str()), 0);
            EXPECT_EQ(mount("none", (disk + "/others").c_str(), "tmpfs", 0, nullptr), 0);  // takes a free number
            after = deviceAfterMount();
        }
        EXPECT_NE(after, before);
        EXPECT_EQ(errors(undo(moved)) + errors(undo(copied)), "");
        EXPECT_EQ(filesOf(video_), "a/1=/a/1 c=/c");
        return 0;
    }));
}

TEST_F(UndoCgi, AcrossFileSystemsAndWhileAtWork) {
    const std::string other = addShare("other", "read only = no\n");
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        EXPECT_EQ(mount("none", other.c_str(), "tmpfs", 0, "mode=0777"), 0);
        writeFiles(other, {"/a/1"}, "there before");
        const std::string before = all() + filesOf(other);
        support::Gate gate("VEXOFileCopy", systemRoot() + "/gate");
        std::string id =
            start("alice", "action=move&conflict=skip&target=/other&path=/photo/a&path=/photo/c", {gate.order()});
        EXPECT_TRUE(gate.holds());
        gate.next();
        EXPECT_TRUE(gate.holds());
        EXPECT_EQ(code(ask("alice", "action=undo&taskid=" + id)), 420) << "still at work";
        gate.open();
        done_ = ended("alice", id);
        EXPECT_EQ(filesOf(other), "a/1=there before a/b/2=/a/b/2 a/b/3=/a/b/3 c=/c");
        EXPECT_EQ(done_["undo_count"], 2) << "the folder b, which is new there, and c";
        EXPECT_EQ(errors(undo(id)), "");
        EXPECT_EQ(all() + filesOf(other), before);
        return 0;
    }));
}

}  // namespace
