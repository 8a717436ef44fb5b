#include "orvel/share_path.h"

#include <climits>

#include "support/testing.h"

namespace {

using Texts = std::vector<std::string>;

struct Resolved {
    int result = -1;
    std::string real = "unset", share = "unset", volume = "unset", root = "unset";
};

Resolved resolve(const char* path, const std::string& user) {
    Resolved out;
    out.result = OrvFullPathGet(path, out.real, out.share, out.volume, out.root, user);
    return out;
}

class SharePathTest : public ApplianceTest {};

TEST_F(SharePathTest, Components) {
    for (const auto& [text, first, last, log] : Rows<std::string, const char*, const char*, const char*>{
             row("//a//b//", "a", "b", ""), row("a/b", "a", "b", ""), row("/\xff\xfe/..", "\xff\xfe", "..", ""),
             row("photo", nullptr, nullptr, "orveldir(#): bad path name=photo"),
             row("//", nullptr, nullptr, "orveldir(#) error path")}) {
        for (const int wanted : {1, 0}) {
            std::string path = text;
            const std::unique_ptr<char, decltype(&free)> found(OrvLibGetTokOfPath(path.data(), wanted), free);
            EXPECT_STREQ(found.get(), wanted != 0 ? first : last) << path;
            EXPECT_EQ(path, text) << "the argument stays";
            EXPECT_EQ(takeLogText(), log);
        }
    }
    std::string path = "/" + std::string(4093, 'a') + "bc";
    const std::unique_ptr<char, decltype(&free)> cut(OrvLibGetTokOfPath(path.data(), 1), free);
    EXPECT_EQ(std::string(cut.get()), std::string(4093, 'a')) << "4,094 bytes are split";
    EXPECT_EQ(OrvLibGetTokOfPath(nullptr, 1), nullptr);
    EXPECT_EQ(takeLogText(), "orveldir(#): bad parameter!");
    vexo::gate::fail("VLIBCSzListAlloc", 0x8100);
    EXPECT_EQ(OrvLibGetTokOfPath(path.data(), 1), nullptr);
    EXPECT_EQ(takeLogText(), "orveldir(#): VLIBCSzListAlloc() failed!");
    EXPECT_EQ(OrvLibGetErr(), 0);
}

TEST_F(SharePathTest, SharesResolve) {
    const std::string root = shareRoot("photo"), longRest = "/" + std::string(5000, 'x');
    for (const auto& [path, rest] : Rows<std::string, std::string>{
             row("/photo", ""), row("photo/a", "/a"), row("//photo//a/../b/./", "//a/../b/./"),
             row("/photo/\xff\n", "/\xff\n"), row("/photo" + longRest, longRest)}) {
        const Resolved out = resolve(path.c_str(), "alice");
        EXPECT_EQ(out.result, 1) << path;
        EXPECT_EQ(out.real, root + rest);
        EXPECT_EQ(out.share + out.root + out.volume, "photo" + root + "/tmp");
    }
    // The volume of a root is its first component, however many follow.
    setenv("REMOTE_USER", "bob", 1);
    for (const auto& [path, top, volume] :
         Rows<std::string, const char*, const char*>{{"/data", "/data", "/data"},
                                                     {"/srv/samba/team", "/srv/samba/team", "/srv"},
                                                     {"/home/%u", "/home/bob", "/home"}}) {  // of whoever asks
        addShare("team", "path = " + path + "\n");
        const Resolved out = resolve("/team/a/b", "alice");
        EXPECT_EQ(out.root, top);
        EXPECT_EQ(out.real + out.volume, std::string(top) + "/a/b" + volume);
    }
    std::string both = "/photo/x", real, volume, top;  // the path may lie in an output
    EXPECT_EQ(OrvFullPathGet(both.c_str(), real, both, volume, top, "alice"), 1);
    EXPECT_EQ(real + both, root + "/xphoto");
    EXPECT_EQ(resolve("/homes/alice/docs", "bob").real, shareRoot("homes") + "/alice/docs");
    EXPECT_NE(access((shareRoot("homes") + "/alice").c_str(), F_OK), 0) << "an ordinary share here";
}

TEST_F(SharePathTest, RefusedPaths) {
    // `share`: what the output holds afterwards.
    for (const auto& [path, user, code, share, log] :
         rowsOf<const char*, const char*, int, const char*, const char*>("core/refused_paths")) {
        const Resolved out = resolve(path, user);
        EXPECT_EQ(out.result, 0);
        EXPECT_EQ(OrvLibGetErr(), code) << log;
        EXPECT_EQ(out.share, share);
        EXPECT_EQ(out.real, "unset");
        EXPECT_EQ(takeLogText(), log);
    }
    vexo::gate::fail("VEXOShareGet", 0x8100);
    EXPECT_EQ(resolve("/photo", "alice").result, 0);
    EXPECT_EQ(OrvLibGetErr(), 401) << "a share that is there, but cannot be read";
    EXPECT_EQ(takeLogText(), "orveldir:# VEXOShareGet fail");
}

TEST_F(SharePathTest, HomeIsMadeOnFirstUse) {
    SKIP_WITHOUT_ROOT();
    const std::string home = shareRoot("homes") + "/alice";
    const Resolved out = resolve("/home/docs", "alice");
    EXPECT_EQ(out.real, home + "/docs");
    EXPECT_EQ(out.share + out.root + out.volume, "home" + home + "/tmp");
    EXPECT_TRUE(statusOf(home).st_uid == kAliceUid && (statusOf(home).st_mode & 07777) == 0755);

    // One that is there stays as it is; it is told by its canonical path.
    const std::string place = shareRoot("photo") + "/elsewhere";
    makeFolder(place, 0700);
    ASSERT_EQ(rmdir(home.c_str()) + symlink(place.c_str(), home.c_str()), 0);
    std::string path = "before";
    EXPECT_EQ(OrvUserHomeFullPathGet(path, "alice"), 1);
    EXPECT_EQ(path, place);
    EXPECT_EQ(statusOf(place).st_mode & 07777, 0700U);
}

TEST_F(SharePathTest, HomeThatCannotBeHad) {
    const std::string home = shareRoot("homes") + "/alice";
    std::string path = "before";
    writeFile(home, "a file stands in the way");
    EXPECT_CODE(OrvUserHomeFullPathGet(path, "alice"), 0, 408);
    const std::string start = "orveldir:# Fail to mkdir for home [" + home + "]. (stop at ";
    EXPECT_EQ(takeLogTexts(), Texts{start + "alice): Not a directory"});

    ASSERT_EQ(unlink(home.c_str()), 0);
    makeFolder(home);
    vexo::gate::fail("VEXOFSMkdirP", 0x8100, EROFS);
    EXPECT_EQ(OrvUserHomeFullPathGet(path, "alice"), 0);
    EXPECT_EQ(takeLogTexts(), Texts{start + "(null)): Read-only file system"});
    vexo::gate::reset();

    // The folder can be entered, but its canonical path is longer than a path can be.
    const std::string part = "/" + std::string(199, 'd'), place = shareRoot("photo");
    std::string half;
    for (int i = 0; i < 12; ++i) half += part;
    makeFolder(place + half);
    ASSERT_EQ(symlink((place + half).c_str(), (place + "/half").c_str()), 0);
    makeFolder(place + "/half" + half);
    ASSERT_EQ(rmdir(home.c_str()), 0);
    ASSERT_EQ(symlink((place + "/half" + half).c_str(), home.c_str()), 0);
    EXPECT_CODE(OrvUserHomeFullPathGet(path, "alice"), 0, 401);
    EXPECT_EQ(takeLogTexts(), (Texts{"orveldir:# readpath(" + home + ") fail (File name too long)",
                                     "orveldir:# Failed to get real path (" + home + ")"}));

    setSetting("userhome_enable", "no");
    EXPECT_CODE(OrvUserHomeFullPathGet(path, "alice"), 0, 408);
    EXPECT_EQ(takeLogText(), "orveldir:# 20001, User home isn't enalbed");
    EXPECT_EQ(path, "before");
}

TEST_F(SharePathTest, CanonicalPaths) {
    makeFolder(photo_ + "/a");
    writeFile(photo_ + "/file", "x");
    ASSERT_EQ(symlink("a", (photo_ + "/link").c_str()), 0);
    char resolved[PATH_MAX];
    EXPECT_EQ(OrvLibRealFullPathGet((photo_ + "//link/./../a").c_str(), resolved, 1), 1);
    EXPECT_EQ(std::string(resolved), photo_ + "/a");

    for (const auto& [path, failure, code] :
         Rows<std::string, int, int>{row(photo_ + "/none", ENOENT, 408), row(photo_ + "/file/x", ENOTDIR, 401),
                                     row("/" + std::string(5000, 'x'), ENAMETOOLONG, 401), row("", ENOENT, 408)}) {
        EXPECT_EQ(OrvLibRealFullPathGet(path.c_str(), resolved, 4095), 0);
        EXPECT_EQ(errno, failure);
        EXPECT_EQ(OrvLibGetErr(), code) << path;
        EXPECT_EQ(takeLogTexts(), Texts{"orveldir:# readpath(" + path + ") fail (" + strerror(failure) + ")"});
    }
    EXPECT_CODE(OrvLibRealFullPathGet(photo_.c_str(), resolved, 0), 0, 400);
    SKIP_WITHOUT_ROOT();
    ASSERT_EQ(chmod(photo_.c_str(), 0700), 0);
    asUser(kBobUid, kUsersGid, [&] {
        EXPECT_CODE(OrvLibRealFullPathGet((photo_ + "/a").c_str(), resolved, 4095), 0, 407);
        takeLog();
    });
}

TEST_F(SharePathTest, TranslationFillsAtMostOneByteLess) {
    const std::string full = shareRoot("photo") + "/2012/a.jpg";
    char path[] = "/photo/2012/a.jpg";
    for (const int size : {-1, 1, 2, 3, static_cast<int>(full.size()) + 1, static_cast<int>(full.size()) + 2, 4096}) {
        std::vector<char> out(5000, '#');
        EXPECT_EQ(OrvLibTransFullPath(path, out.data(), size), 0);
        const std::string whole(out.begin(), out.end());
        const std::string kept = size < 2 ? "" : full.substr(0, static_cast<size_t>(size) - 2) + '\0';
        EXPECT_EQ(whole.substr(0, kept.size() + 1), kept + '#') << size;
    }
    EXPECT_EQ(OrvLibGetErr(), 0);
}

TEST_F(SharePathTest, TranslationsThatFail) {
    char out[100] = "out", missing[] = "/nowhere/x", slashes[] = "//", home[] = "/home/a";
    for (const auto& [path, place, platform, log] : Rows<char*, char*, int, const char*>{
             row(nullptr, out, 0x0D00, "orveldir(#) bad parameter, oldpath=(null), new path=out"),
             row(missing, nullptr, 0x0D00, "orveldir(#) bad parameter, oldpath=/nowhere/x, new path=(null)"),
             row(slashes, out, 0x8100, "orveldir(#) error path\norveldir(#) OrvLibGetTokOfPath fail"),
             row(missing, out, 0x1400, ""), row(home, out, 0x1400, "")}) {
        VLIBCErrSetEx(0, "", 0);
        EXPECT_EQ(OrvLibTransFullPath(path, place, sizeof out), -1);
        EXPECT_EQ(VLIBCErrGet(), platform);
        EXPECT_EQ(takeLogText(), log);
        EXPECT_STREQ(out, "out");
    }
    EXPECT_EQ(OrvLibGetErr(), 0);
}

}  // namespace
