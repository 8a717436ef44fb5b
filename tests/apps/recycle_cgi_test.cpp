// What is deleted, put back, and emptied.
#include "apps/task_fixture.h"

namespace {

TEST_F(TaskCgi, WhatIsDeletedCanBePutBack) {
    setSetting("pexlanderxferlog", "yes");
    const std::string bin = photo_ + "/#recycle";
    const auto fill = [&](const std::string& content) {
        writeFiles(photo_, {"/a/b/f.txt", "/a/b/f (#2).txt", "/a/g"}, content);
        ASSERT_EQ(chmod((photo_ + "/a/b").c_str(), 0700), 0);
    };
    const auto remove = [](const std::vector<std::string>& paths, const std::string& more = "") {
        return errors(perform("alice", "action=delete" + more + about(paths)));
    };
    fill("1");
    EXPECT_EQ(remove({"/photo/a/b/f.txt"}), "");
    EXPECT_FALSE(fs::exists(photo_ + "/a/b/f.txt")) << "no bin: for good";
    openFolder(bin);
    fill("1");
    EXPECT_EQ(remove({"/photo/a/b/f.txt", "/photo/a/b/f (#2).txt"}), "");
    fill("2");
    EXPECT_EQ(remove({"/photo/a/b/f.txt", "/photo/a/none"}), "/photo/a/none 408\n");
    EXPECT_EQ(readFile(bin + "/a/b/f.txt") + readFile(bin + "/a/b/f (#2).txt"), "12");
    EXPECT_EQ(readFile(bin + "/a/b/f (#2) (#1).txt"), "1");
    expectOwned(bin + "/a/b", kAliceUid, 0700);  // no more open than it was
    EXPECT_EQ(remove({"/photo/a"}), "");
    EXPECT_EQ(readFile(bin + "/a (#2)/g"), "2");

    const auto restore = [](const std::vector<std::string>& paths, const std::string& more = "") {
        return errors(perform("alice", "action=restore" + more + about(paths)));
    };
    EXPECT_EQ(restore({"/photo/#recycle/a (#2)"}), "");
    EXPECT_EQ(restore({"/photo/#recycle/a/b/f.txt", "/photo/a/g", "/photo/#recycle"}),
              "/photo/a/g 400\n/photo/#recycle 400\n");
    EXPECT_EQ(readFile(photo_ + "/a/b/f.txt"), "1");
    EXPECT_EQ(restore({"/photo/#recycle/a/b/f (#2).txt"}), "/photo/#recycle/a/b/f (#2).txt 414\n");
    EXPECT_EQ(restore({"/photo/#recycle/a/b/f (#2).txt"}, "&conflict=keep_both"), "");
    EXPECT_EQ(readFile(photo_ + "/a/b/f (2).txt"), "2");
    EXPECT_EQ(restore({"/photo/#recycle/a/b/f (#2) (#1).txt"}, "&conflict=overwrite"), "");
    EXPECT_EQ(readFile(photo_ + "/a/b/f (#2).txt"), "1");
    EXPECT_TRUE(fs::is_empty(bin)) << "folders go with the last that was in them";

    EXPECT_EQ(remove({"/photo/a/b/f.txt", "/photo/a/g"}), "");
    EXPECT_EQ(remove({"/photo/#recycle/a/g"}), "") << "what is in the bin goes for good";
    EXPECT_EQ(remove({"/photo/#recycle"}), "/photo/#recycle 407\n");
    EXPECT_EQ(remove({"/photo/a"}, "&permanent=true"), "");
    EXPECT_FALSE(fs::exists(photo_ + "/a") || fs::exists(bin + "/a/g"));
    ASSERT_EQ(chmod(bin.c_str(), 0700), 0);
    writeFile(photo_ + "/kept", "x", 0666);
    EXPECT_EQ(remove({"/photo/kept"}), "/photo/kept 407\n") << "a bin that is closed is a bin";
    EXPECT_EQ(readFile(photo_ + "/kept"), "x");
    ASSERT_EQ(chmod(bin.c_str(), 0777), 0);
    writeFile(photo_ + "/fixed/f", "x", 0666);
    EXPECT_EQ(remove({"/photo/fixed/f"}), "/photo/fixed/f 407\n");
    EXPECT_FALSE(fs::exists(bin + "/fixed")) << "what failed leaves no folder in the bin";
    writeFile(bin + "/@tmp (#2)", "x", 0666);
    EXPECT_EQ(restore({"/photo/#recycle/@tmp (#2)"}), "/photo/#recycle/@tmp (#2) 418\n");
    fs::remove(bin + "/@tmp (#2)");
    writeFile(bin + "/root's/f", "x");
    EXPECT_EQ(code(ask("bob", "action=empty&path=/photo")), 407);
    const Json::Value emptied = perform("alice", "action=empty&path=/photo");
    EXPECT_EQ(errors(emptied), "/photo/#recycle/root's/f 407\n");
    EXPECT_EQ(emptied["items_skipped"], 1) << "the folder that stays with it";
    EXPECT_FALSE(fs::exists(bin + "/a"));
    EXPECT_EQ(code(ask("alice", "action=empty&path=/video")), 408) << "no bin";
    const std::string log = transferLog();
    EXPECT_EQ(std::count(log.begin(), log.end(), '\n'), 14) << log;
    EXPECT_NE(log.find(R"("action":"delete","size":0,"path":"/photo/a/b/f.txt","flag":false)"), std::string::npos);
    EXPECT_NE(log.find(R"("action":"delete","size":0,"path":"/photo/a","flag":true)"), std::string::npos);
}

}  // namespace
