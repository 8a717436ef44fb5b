// Copies and moves.
#include "apps/task_fixture.h"
#include "platform/private_mounts.h"

namespace {

TEST_F(TaskCgi, CopiesKeepWhatFilesAre) {
    makeFolder(photo_ + "/a/b", 0777);
    writeFile(photo_ + "/a/private", "secret", 0600);
    writeFile(photo_ + "/a/b/tool", "#!", 0755);
    writeFile(photo_ + "/a/b/\xFFraw\n", "bytes");
    writeFile(photo_ + "/a/@vexoea/x", "hidden");
    for (const char* name : {"/a/private", "/a/b/tool", "/a/b", "/a"}) give(photo_ + name);
    ASSERT_EQ(chmod((photo_ + "/a/b").c_str(), 0750), 0);
    fs::create_symlink("/etc/passwd", photo_ + "/a/link");
    const timespec old[] = {{1000000000, 0}, {1000000000, 5}};
    ASSERT_EQ(utimensat(AT_FDCWD, (photo_ + "/a/b").c_str(), old, 0), 0);
    writeFile(photo_ + "/a/holes", "x");
    ASSERT_EQ(truncate((photo_ + "/a/holes").c_str(), 8 << 20), 0);

    const Json::Value task =
        perform("alice", "action=copy" + about({"/photo/a", "/photo/none", "/nowhere/x"}, "/video"));
    EXPECT_EQ(task["state"], "done");
    EXPECT_EQ(errors(task), "/photo/none 408\n/nowhere/x 408\n");
    EXPECT_EQ(task["items_done"], 7);
    EXPECT_EQ(task["items_failed"], 2);
    EXPECT_EQ(task["items_total"], 9);
    EXPECT_EQ(task["bytes_done"], task["bytes_total"]);
    EXPECT_EQ(task["progress"], 1.0);
    EXPECT_FALSE(fs::exists(video_ + "/a/@vexoea"));
    fs::remove_all(photo_ + "/a/@vexoea");
    EXPECT_TRUE(treeOf(photo_ + "/a") == treeOf(video_ + "/a"));
    EXPECT_LT(statusOf(video_ + "/a/holes").st_blocks, 100) << "holes stay holes";
    EXPECT_EQ(statusOf(video_ + "/a/holes").st_uid, kAliceUid);
    EXPECT_EQ(statusOf(video_ + "/a/b").st_mtime, 1000000000);
}

TEST_F(TaskCgi, ConflictsAreSolvedAsAsked) {
    for (const char* action : {"copy", "move"}) {
        for (const auto& [policy, refused, tree, done, skipped] :
             rowsOf<std::string, std::string, std::string, int, int>("apps/conflicts")) {
            SCOPED_TRACE(std::string(action) + " " + policy);
            for (const std::string& root : {photo_, video_}) fs::remove_all(root), openFolder(root);
            writeFiles(photo_, {"/a.txt", "/d/x", "/d/y", "/m"}, "new");
            writeFiles(video_, {"/a.txt", "/d/x", "/m/f"}, "old");
            const Json::Value task = perform("alice", "action=" + std::string(action) + "&conflict=" + policy +
                                                          about({"/photo/a.txt", "/photo/d", "/photo/m"}, "/video"));
            EXPECT_EQ(errors(task), refused);
            EXPECT_EQ(task["state"], "done");
            EXPECT_EQ(filesOf(video_), tree);
            if (std::string(action) == "copy") {
                EXPECT_EQ(task["items_done"], done);
                EXPECT_EQ(task["items_skipped"], skipped);
                EXPECT_EQ(readFile(photo_ + "/d/x"), "new") << "the source stays";
            } else {
                const bool moved = policy == "overwrite" || policy == "keep_both";
                EXPECT_EQ(fs::exists(photo_ + "/a.txt"), !moved);
                EXPECT_EQ(fs::exists(photo_ + "/d"), !moved) << "with what stayed in it";
            }
        }
    }
}

// A link that climbs far is harmless deep in a share alone.
TEST_F(TaskCgi, ALinkThatWouldLeadOutStaysWhereItIs) {
    writeFile(photo_ + "/a/b/f", "x", 0666);
    for (const auto& [text, link] : std::map<std::string, std::string>{
             {"../f", "/a/b/c/near"}, {"../../../..", "/a/b/c/d/top"}, {"/etc", "/a/b/c/d/e/absolute"}}) {
        fs::create_directories(fs::path(photo_ + link).parent_path());
        fs::create_symlink(text, photo_ + link);
    }
    fs::create_directories(photo_ + "/a/b/c/deeper");
    for (const auto& entry : fs::recursive_directory_iterator(photo_)) give(entry.path());
    for (const char* action : {"copy", "move"}) {
        for (const auto& [path, target, passes] : rowsOf<std::string, std::string, bool>("apps/moved_links")) {
            const bool isCopy = *action == 'c';
            if (isCopy && !fs::exists(fs::symlink_status(photo_ + path.substr(6)))) continue;
            const auto task = perform("alice", std::string("action=") + action + about({path}, target));
            EXPECT_EQ(errors(task), passes ? "" : path + " 407\n") << action << path << target;
            if (isCopy && passes) fs::remove_all(photo_ + target.substr(6) + path.substr(path.rfind('/')));
        }
    }
}

TEST_F(TaskCgi, SourcesAndTargetsAreJudged) {
    addShare("fixed", "read only = no\nvexo:restriction = 2\n");
    addShare("locked", "read only = no\nvexo:restriction = 4\n");
    const std::string fat = addShare("usb", "read only = no\n");
    addMount(fat, "vfat");
    for (const char* share : {"fixed", "locked"}) writeFile(shareRoot(share) + "/f", "x", 0666);
    writeFile(photo_ + "/a/b/f", "1", 0666);
    give(photo_ + "/a");
    writeFiles(photo_, {"/case/Name", "/case/name", "/case/q?"});
    fs::create_symlink("/etc", photo_ + "/out");
    // Who asks for what, the code of the request, the errors of the task.
    for (const auto& [user, form, refusal, expected] :
         rowsOf<const char*, const char*, int, const char*>("apps/judged_transfers")) {
        SCOPED_TRACE(form);
        const CgiReply reply = ask(user, form);
        EXPECT_EQ(code(reply), refusal);
        if (refusal == 0) {
            EXPECT_EQ(errors(ended(user, reply.json["data"]["taskid"].asString())), expected);
        }
    }
    EXPECT_EQ(readFile(photo_ + "/a (2)/b/f"), "1");
    EXPECT_EQ(readFile(shareRoot("homes") + "/alice/a/b/f"), "1");
    for (const char* made : {"/case", "/case/name", "/out"})
        EXPECT_EQ(statusOf(shareRoot("homes") + "/carol" + made).st_uid, kCarolUid) << made << ": not root's";
    EXPECT_EQ(readFile(fat + "/case/Name"), "/case/Name");
    for (const char* form : {"action=copy&target=/video", "action=copy&path=/photo/a&target=/video&taskid=../x",
                             "action=copy&path_raw=%25zz&target=/video"})
        EXPECT_EQ(ask("alice", form).status, 400) << form;
}

TEST_F(TaskCgi, AFullDiskFailsItsItemAndTheRestGoesOn) {
    const std::string small = addShare("small", "read only = no\n");
    writeFile(photo_ + "/t/1", "one", 0666);
    writeFile(photo_ + "/t/2big", std::string(3 << 20, 'x'), 0666);
    writeFile(photo_ + "/t/3", "three", 0666);
    give(photo_ + "/t");
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        if (mount("none", small.c_str(), "tmpfs", 0, "size=1m,mode=0777") != 0) return kNoPrivateMounts;
        const Json::Value task = perform("alice", "action=copy" + about({"/photo/t"}, "/small"));
        EXPECT_EQ(errors(task), "/photo/t/2big 416\n");
        EXPECT_EQ(task["state"], "done");
        EXPECT_EQ(readFile(small + "/t/3"), "three");
        EXPECT_FALSE(fs::exists(small + "/t/2big"));
        EXPECT_FALSE(hasParts(small));
        const Json::Value zip = perform("alice", "action=compress" + about({"/video"}, "/small/t.zip"));
        EXPECT_EQ(errors(zip), "/video 400\n");
        return 0;
    }));
}

TEST_F(TaskCgi, MovesAreRenamesOrCopiesThatGo) {
    const std::string other = addShare("other", "read only = no\n");
    for (const char* file : {"/d/x", "/e/sub/y", "/stuck/z"}) writeFile(photo_ + file, file, 0666);
    writeFile(photo_ + "/e/@vexoea/meta", "", 0666);
    writeFile(photo_ + "/e/@tmp/f", "theirs", 0666);
    writeFile(photo_ + "/e/.vexo-part-x", "of a killed process", 0666);
    for (const char* folder : {"/d", "/e", "/e/sub", "/e/@vexoea", "/e/@tmp"}) give(photo_ + folder);
    const ino_t before = statusOf(photo_ + "/d/x").st_ino;
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        if (mount("none", other.c_str(), "tmpfs", 0, "mode=0777") != 0) return kNoPrivateMounts;
        Json::Value task = perform("alice", "action=move" + about({"/photo/d"}, "/video"));
        EXPECT_EQ(task["items_done"], 1);
        EXPECT_EQ(task["bytes_total"], 0);
        EXPECT_EQ(statusOf(video_ + "/d/x").st_ino, before);
        task = perform("alice", "action=move" + about({"/photo/e", "/photo/stuck/z"}, "/other"));
        EXPECT_EQ(errors(task), "/photo/stuck/z 407\n");
        EXPECT_EQ(task["items_done"], 3) << "what is never shown is not counted";
        EXPECT_EQ(task["items_total"], 4);
        EXPECT_EQ(readFile(other + "/e/sub/y") + readFile(other + "/e/@tmp/f"), "/e/sub/ytheirs");
        EXPECT_TRUE(fs::exists(other + "/e/@vexoea/meta"));
        EXPECT_FALSE(fs::exists(photo_ + "/e"));
        EXPECT_EQ(readFile(other + "/z") + readFile(photo_ + "/stuck/z"), "/stuck/z/stuck/z") << "lost nowhere";
        if (mount("none", (video_ + "/d").c_str(), "tmpfs", 0, "mode=0777") != 0) return kNoPrivateMounts;
        writeFile(video_ + "/d/theirs", "x", 0666);
        EXPECT_EQ(errors(perform("alice", "action=delete" + about({"/video/d"}))), "/video/d 421\n");
        EXPECT_EQ(readFile(video_ + "/d/theirs"), "x") << "mounted ones stay";
        return 0;
    }));
}

// A move to another file system whose copy does not come to the disk, or not to its end, leaves the source.
TEST_F(TaskCgi, NothingIsRemovedBeforeItsCopyIsOnTheDisk) {
    const std::string other = addShare("other", "read only = no\n");
    struct {
        Refusal refusal;
        bool single;  // what was chosen by itself stays, too
    } const cases[] = {{{SYS_fsync, EIO}, true},      {{SYS_syncfs, EIO}, false},     {{SYS_fsync, kKilled}, true},
                       {{SYS_syncfs, kKilled}, true}, {{SYS_unlinkat, EACCES}, true}, {{SYS_unlinkat, kKilled}, true},
                       {{SYS_ftruncate, EIO}, true}};
    for (const auto& [refusal, single] : cases) {
        SCOPED_TRACE(std::to_string(refusal.call) + " " + std::to_string(refusal.systemCode));
        writeFiles(photo_, {"/t/a", "/t/sub/b", "/t/sub/c", "/single"});
        EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&, wanted = refusal, stays = single] {
            if (mount("none", other.c_str(), "tmpfs", 0, "mode=0777") != 0) return kNoPrivateMounts;
            if (!refuseCalls({wanted})) return 97;
            const std::string id = start("alice", "action=move" + about({"/photo/t", "/photo/single"}, "/other"));
            const Json::Value task = ended("alice", id);
            EXPECT_TRUE(wanted.systemCode == kKilled || task["items_failed"].asInt() > 0) << errors(task);
            for (const char* file : {"/t/a", "/t/sub/b", "/t/sub/c"}) EXPECT_EQ(readFile(photo_ + file), file);
            EXPECT_TRUE(!stays || readFile(photo_ + "/single") == "/single");
            return 0;
        }));
    }
}

}  // namespace
