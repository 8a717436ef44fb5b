// Archives that are extracted and made.
#include "apps/pack.h"

namespace {

TEST_F(TaskCgi, HostileArchivesReachNothingOutside) {
    const auto file = [](const char* name, const char* text) { return Packed{name, AE_IFREG, text}; };
    const auto link = [](const char* name, const char* text) { return Packed{name, AE_IFLNK, text}; };
    const auto further = [](const char* name, const char* text) { return Packed{name, AE_IFREG, text, true}; };
    const auto other = [](const char* name, unsigned type) { return Packed{name, type, ""}; };
    const auto members = listOf<Packed>(
        file("good/a", "1"), file("/abs", "x"), file("../up", "x"), file("good/../../up", "x"),
        link("good/out", "/etc"), link("good/up", "../../x"), link("good/in", "../good/a"), link("door", "good"),
        file("door/through", "x"), file("planted/x", "x"), file("good/a", "2"), further("good/hard", "good/a"),
        further("good/stolen", "../../../etc/passwd"), further("good/stolen2", "planted/passwd"),
        other("device", AE_IFCHR), other("pipe", AE_IFIFO), file("good/\xFFraw", "3"), file("@vexoea/x", "x"),
        file("@tmp/x", "x"), file("a:b", "x"), other("./", AE_IFDIR), other("folder/", AE_IFDIR), file("last", "4"));
    pack(video_ + "/h.tar.gz", "pax", "gzip", members);
    for (const char* folder : {"/t", "/t/@tmp"}) openFolder(photo_ + folder);
    fs::create_symlink("/etc", photo_ + "/t/planted");
    const Json::Value task =
        perform("alice", "action=extract&conflict=keep_both" + about({"/video/h.tar.gz"}, "/photo/t"));
    EXPECT_EQ(errors(task),
              "/photo/t//abs 1006\n/photo/t/../up 1006\n/photo/t/good/../../up 1006\n/photo/t/good/out 407\n"
              "/photo/t/good/up 407\n/photo/t/door/through 407\n/photo/t/planted/x 407\n/photo/t/good/stolen 1006\n"
              "/photo/t/good/stolen2 407\n/photo/t/device 407\n/photo/t/pipe 407\n/photo/t/@vexoea/x 418\n"
              "/photo/t/@tmp/x 418\n"
              "/photo/t/a:b 418\n");
    EXPECT_EQ(task["state"], "done");
    EXPECT_EQ(readFile(photo_ + "/t/good/a") + readFile(photo_ + "/t/good/a (2)"), "12");
    EXPECT_EQ(readFile(photo_ + "/t/good/hard"), "1");
    EXPECT_EQ(readFile(photo_ + "/t/good/\xFFraw") + readFile(photo_ + "/t/last"), "34") << "names are bytes";
    EXPECT_EQ(fs::read_symlink(photo_ + "/t/good/in"), "../good/a");
    EXPECT_FALSE(fs::exists(photo_ + "/up") || fs::exists(photo_ + "/t/abs") || fs::exists("/etc/x"));
    expectOwned(photo_ + "/t/last", kAliceUid, 0755);  // no set-id bit, nothing that others could write
    EXPECT_EQ(statusOf(photo_ + "/t/last").st_mtime, 1000000000);
}

TEST_F(TaskCgi, FurtherNamesAreOfWhatWasUnpacked) {
    pack(video_ + "/h.tar", "ustar", nullptr,
         {{"a", AE_IFREG, "new"},
          {"a", AE_IFREG, "a", true},
          {"b", AE_IFREG, "a", true},
          {"c", AE_IFREG, "a", true},
          {"d", AE_IFREG, "mine", true}});
    struct {
        const char *policy, *errors, *tree;
    } const cases[] = {{"error", "/photo/t/a 414\n/photo/t/a 408\n/photo/t/b 408\n/photo/t/c 408\n/photo/t/d 408\n",
                        "a=old b=old mine=mine"},
                       {"skip", "/photo/t/c 408\n/photo/t/d 408\n", "a=old b=old mine=mine"},
                       {"overwrite", "/photo/t/d 408\n", "a=new b=new c=new mine=mine"},
                       {"keep_both", "/photo/t/d 408\n", "a (2)=new a (3)=new a=old b (2)=new b=old c=new mine=mine"}};
    for (const auto& [policy, refused, tree] : cases) {
        SCOPED_TRACE(policy);
        fs::remove_all(photo_ + "/t");
        writeFiles(photo_, {"/t/a", "/t/b"}, "old");
        writeFiles(photo_, {"/t/mine"}, "mine");
        const Json::Value task =
            perform("alice", "action=extract&conflict=" + std::string(policy) + about({"/video/h.tar"}, "/photo/t"));
        EXPECT_EQ(errors(task), refused);
        EXPECT_EQ(filesOf(photo_ + "/t"), tree);
    }
}

TEST_F(TaskCgi, ArchivesAreBoundedAndMayBeBroken) {
    setSetting("extract_max_ratio", "20");
    setSetting("extract_max_members", "20");
    openFolder(video_ + "/t");
    const std::string zeros(70 << 20, '\0');
    pack(video_ + "/bomb.zip", "zip", nullptr,
         {{"small", AE_IFREG, "1"}, {"zeros", AE_IFREG, zeros}, {"more", AE_IFREG, "1"}});
    pack(video_ + "/bomb.tar.zst", "ustar", "zstd", {{"small2", AE_IFREG, "1"}, {"zeros", AE_IFREG, zeros}});
    pack(video_ + "/good.zip", "zip", nullptr, {{"\xFFz", AE_IFREG, "5"}, {"\xC3\xA9", AE_IFREG, "6"}});
    pack(video_ + "/torn.tar.xz", "ustar", "xz",
         {{"whole", AE_IFREG, "1"}, {"half", AE_IFREG, std::string(1 << 20, 'h')}});
    const std::string random = readFile(PROGRAM_OPERATION).substr(0, 300000);
    pack(video_ + "/cut.zip", "zip", nullptr, {{"first", AE_IFREG, "1"}, {"cut", AE_IFREG, random}});
    for (const char* name : {"/torn.tar.xz", "/cut.zip"})
        ASSERT_EQ(truncate((video_ + name).c_str(), static_cast<off_t>(fs::file_size(video_ + name) * 3 / 4)), 0);
    pack(video_ + "/secret.zip", "zip", nullptr, {{"hidden", AE_IFREG, "1"}, {"too", AE_IFREG, "2"}}, "p\xC3\xA9 +&");
    writeFile(video_ + "/none.zip", "no archive at all");
    writeFile(video_ + "/empty.zip", "");
    const auto extract = [](const std::string& name) {
        return errors(perform("alice", "action=extract" + about({"/video/" + name}, "/video/t")));
    };
    EXPECT_EQ(extract("bomb.zip"), "/video/t/zeros 1007\n/video/bomb.zip 1007\n");
    EXPECT_EQ(extract("bomb.tar.zst"), "/video/t/zeros 1007\n/video/bomb.tar.zst 1007\n");
    std::string deep = "deep";
    while (deep.size() < 60) deep += "/d";
    pack(video_ + "/deep.tar", "ustar", nullptr, {{(deep + "/x").c_str(), AE_IFREG, "1"}});
    EXPECT_EQ(extract("deep.tar"), "/video/t/" + deep + "/x 1007\n/video/deep.tar 1007\n");
    EXPECT_EQ(extract("good.zip"), "");
    const Rows<const char*, std::string, std::string> passwords = {
        {"none", "", "/video/secret.zip 1403\n"},
        {"a wrong one", "&password=wrong", "/video/secret.zip 1403\n"},
        {"the right one", "&password=p%C3%A9%20%2B%26", ""},
    };
    for (const auto& [what, password, wanted] : passwords) {
        EXPECT_FALSE(fs::exists(video_ + "/t/hidden") || fs::exists(video_ + "/t/too")) << what;
        const std::string asked = "action=extract" + password + about({"/video/secret.zip"}, "/video/t");
        EXPECT_EQ(errors(perform("alice", asked)), wanted) << what;
    }
    EXPECT_EQ(readFile(video_ + "/t/hidden") + readFile(video_ + "/t/too"), "12");
    const std::string endless = "action=extract&password=" + std::string(1025, 'x');
    EXPECT_EQ(code(ask("alice", endless + about({"/video/secret.zip"}, "/video/t"))), 400);
    EXPECT_EQ(extract("none.zip"), "/video/none.zip 1401\n");
    EXPECT_EQ(extract("empty.zip"), "/video/empty.zip 1401\n");
    EXPECT_NE(extract("torn.tar.xz").find("/video/torn.tar.xz 1402"), std::string::npos);
    EXPECT_NE(extract("cut.zip"), "");
    for (const char* name : {"/zeros", "/more", "/half", "/cut"})
        EXPECT_FALSE(fs::exists(video_ + "/t" + name)) << name;
    EXPECT_EQ(readFile(video_ + "/t/\xC2\xA0z") + readFile(video_ + "/t/\xC3\xA9") + readFile(video_ + "/t/small"),
              "561");
    EXPECT_FALSE(hasParts(video_));
}

TEST_F(TaskCgi, WhatWasCompressedComesBackTheSame) {
    writeFiles(photo_, {"/c/a", "/c/d/\xC3\xA9", "/c/d/b"});
    ASSERT_EQ(chmod((photo_ + "/c/a").c_str(), 0640) + chmod((photo_ + "/c/d/b").c_str(), 0600), 0);
    ASSERT_EQ(chmod((photo_ + "/c/d/\xC3\xA9").c_str(), 0755), 0);
    makeFolder(photo_ + "/c/closed", 0700);
    const Json::Value task =
        perform("alice", "action=compress" + about({"/photo/c", "/photo/c/a", "/photo/c/d"}, "/video/c.zip"));
    EXPECT_EQ(errors(task), "/photo/c/closed 407\n");
    EXPECT_EQ(task["state"], "failed") << "whoever reads that it is done removes what was packed";
    EXPECT_EQ(code(ask("alice", "action=compress" + about({"/photo/c"}, "/video/c.zip"))), 414);
    EXPECT_EQ(errors(perform("alice", "action=extract" + about({"/video/c.zip"}, "/video"))), "");
    EXPECT_NE(readFile(video_ + "/_not_included.txt").find("c/closed: Permission denied\n"), std::string::npos);
    for (const char* unpacked : {"/c", "/a", "/d", "/_not_included.txt"}) fs::remove_all(video_ + unpacked);
    EXPECT_EQ(perform("alice", "action=compress" + about({"/photo/none"}, "/video/none.zip"))["state"], "failed");
    EXPECT_FALSE(fs::exists(video_ + "/none.zip")) << "nothing is packed";
    fs::remove(photo_ + "/c/closed");
    EXPECT_EQ(errors(perform("alice", "action=compress&conflict=keep_both" + about({"/photo/c"}, "/video/c.zip"))), "");
    EXPECT_EQ(errors(perform("alice", "action=extract" + about({"/video/c (2).zip"}, "/video"))), "");
    EXPECT_EQ(treeOf(photo_ + "/c"), treeOf(video_ + "/c"));
    EXPECT_FALSE(hasParts(video_));
}

}  // namespace
