// Earlier versions out of snapshots: which there are, who sees them, and how they come back.
#include <sys/acl.h>
#include <sys/mount.h>
#include <utime.h>

#include <ctime>

#include "apps/task_fixture.h"
#include "platform/private_mounts.h"
#include "snapshots.h"

namespace {

const std::string kFirst = "@GMT-2026.11.01-12.00.00", kSecond = "@GMT-2026.11.02-12.00.00";
constexpr time_t kSecondTime = 1793620800;

class VersionsCgi : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        if (IsSkipped()) return;
        openFolder(photo_ + "/a");
        put("", "/a/f.txt", "new!", 3000);
    }
    // A file of the share, or of a snapshot of it.
    void put(const std::string& snapshot, const std::string& path, const std::string& text, time_t time) const {
        const std::string file = (snapshot.empty() ? photo_ : photo_ + "/.snapshots/" + snapshot) + path;
        writeFile(file, text, 0666);
        const utimbuf times = {time, time};
        EXPECT_EQ(utime(file.c_str(), &times), 0) << file;
    }
    static CgiReply versions(const std::string& path, const std::string& user = "alice") {
        return get(PROGRAM_LIST, user, "action=versions&path=" + percentEncode(path));
    }
    // "SNAPSHOT SIZE xSAME" of each.
    static Names rows(const std::string& path) {
        Names all;
        const CgiReply reply = versions(path);
        for (const Json::Value& row : reply.json["data"]["items"]) {
            all.push_back(row["snapshot"].asString() + " " + row["size"].asString() + " x" + row["same"].asString() +
                          (row["current"].asBool() ? " now" : ""));
        }
        return all;
    }
    static std::string of(const std::string& path, const std::string& snapshot) {
        return "path_raw=" + percentEncode(percentEncode(path)) +
               "&snapshot_raw=" + percentEncode(percentEncode(snapshot));
    }
    static RawReply fetch(const std::string& path, const std::string& snapshot, const Variables& more = {}) {
        return RawReply(runCgi(PROGRAM_DOWNLOAD, "alice", "GET", of(path, snapshot), "", more));
    }
    static int refusal(const std::string& path, const std::string& snapshot, const std::string& user = "alice") {
        return code(get(PROGRAM_DOWNLOAD, user, of(path, snapshot)));
    }
    static Names folder(const std::string& path, const std::string& snapshot) {
        return each(get(PROGRAM_LIST, "alice", "action=folder&" + of(path, snapshot)).json["data"]["items"], "name");
    }
    static Json::Value recover(const std::string& path, const std::string& snapshot, const std::string& how) {
        return perform("alice", "action=recover&" + of(path, snapshot) + how);
    }
    void undo(const std::string& taskid) { EXPECT_EQ(errors(perform("alice", "action=undo&taskid=" + taskid)), ""); }
};

TEST_F(VersionsCgi, AreListedSentAndRestored) {
    put(kFirst, "/a/f.txt", "old", 1000);
    put("@GMT-2026.11.01-13.00.00", "/a/f.txt", "old", 1000);
    put(kSecond, "/a/f.txt", "older?", 2000);
    put("@GMT-2026.11.03-12.00.00", "/a/f.txt", "new!", 3000);
    put("not a date", "/a/f.txt", "x", 1);
    EXPECT_EQ(rows("/photo/a/f.txt"),
              (Names{"@GMT-2026.11.03-12.00.00 4 x1 now", kSecond + " 6 x1", "@GMT-2026.11.01-13.00.00 3 x2"}));
    const Json::Value row = versions("/photo/a/f.txt").json["data"]["items"][1];
    EXPECT_EQ(row["time"].asInt64(), kSecondTime);
    EXPECT_EQ(row["dated"], "name");

    const RawReply part = fetch("/photo/a/f.txt", kFirst, {{"HTTP_RANGE", "bytes=1-"}});
    EXPECT_EQ(part.status, 206);
    EXPECT_EQ(part.body, "ld");
    EXPECT_NE(part.headers.at("Content-Disposition").find("f (2026-11-0"), std::string::npos);

    EXPECT_EQ(errors(recover("/photo/a/f.txt", kFirst, "&beside=true")), "");
    const Names beside = namesIn(photo_ + "/a");
    ASSERT_EQ(beside.size(), 2U);
    EXPECT_TRUE(beside[0].starts_with("f (2026-11-0") && beside[0].ends_with(").txt")) << beside[0];
    EXPECT_EQ(readFile(photo_ + "/a/" + beside[0]) + readFile(photo_ + "/a/f.txt"), "oldnew!");
    EXPECT_EQ(errors(recover("/photo/a/f.txt", kFirst, "")), "/photo/a/f.txt 414\n");

    openFolder(photo_ + "/#recycle");
    const std::string id = start("alice", "action=recover&" + of("/photo/a/f.txt", kFirst) + "&conflict=overwrite");
    EXPECT_EQ(errors(ended("alice", id)), "");
    EXPECT_EQ(readFile(photo_ + "/a/f.txt") + readFile(photo_ + "/#recycle/a/f.txt"), "oldnew!");
    undo(id);
    EXPECT_EQ(readFile(photo_ + "/a/f.txt"), "new!");
    EXPECT_TRUE(fs::is_empty(photo_ + "/#recycle"));
}

TEST_F(VersionsCgi, OfAFolderShowWhatIsGoneAndKeepWhatIsShut) {
    openFolder(photo_ + "/a/shut");
    put("", "/a/own", "1", 1);
    put("", "/a/shut/in", "1", 1);
    for (const char* path : {"/a/f.txt", "/a/own", "/a/shut/in", "/a/gone/deep", "/a/\xff\n"})
        put(kFirst, path, "old", 5);
    ASSERT_EQ(chmod((photo_ + "/a/own").c_str(), 0600), 0);
    ASSERT_EQ(chmod((photo_ + "/a/shut").c_str(), 0700), 0);
    EXPECT_EQ(folder("/photo/a", kFirst).size(), 5U);
    EXPECT_EQ(folder("/photo/a/gone", kFirst), Names{"deep"});
    EXPECT_EQ(fetch("/photo/a/\xff\n", kFirst).body, "old");
    EXPECT_EQ(fetch("/photo/a/gone/deep", kFirst).body, "old") << "the folder above is there";
    EXPECT_EQ(versions("/photo/a/gone/deep").json["data"]["present"]["exists"], false);

    EXPECT_EQ(errors(recover("/photo/a", kFirst, "&conflict=overwrite")), "/photo/a/own 407\n/photo/a/shut 407\n");
    EXPECT_EQ(readFile(photo_ + "/a/gone/deep") + readFile(photo_ + "/a/f.txt") + readFile(photo_ + "/a/own"),
              "oldold1");
    ASSERT_EQ(chmod(photo_.c_str(), 0777), 0);
    EXPECT_EQ(errors(recover("/photo/a", kFirst, "&beside=true")), "/photo/a/own 407\n/photo/a/shut 407\n");
    for (const std::string& name : namesIn(photo_)) {
        EXPECT_FALSE(fs::exists(photo_ + "/" + name + "/own") && name != "a") << name;
    }
}

// What is hidden, shut or forged shows in no version.
TEST_F(VersionsCgi, AreShownToWhomTheFileIs) {
    const std::string snapshot = photo_ + "/.snapshots/" + kFirst;
    const std::string target = photo_ + "/a/f.txt", elsewhere = video_ + "/secret";
    writeFile(elsewhere, "secret");
    const auto grantNothing = [&] {
        const acl_t acl = acl_from_text("u::rw,u:20001:---,g::r,m::rwx,o::r");
        EXPECT_EQ(acl_set_file(target.c_str(), ACL_TYPE_ACCESS, acl), 0);
        acl_free(acl);
    };
    const struct {
        const char* what;
        std::function<void()> change;
        std::string path = "/photo/a/f.txt";
        std::string name = kFirst;
        std::string user = "alice";
        int code = 408;
    } cases[] = {
        {.what = "mode", .change = [&] { chmod(target.c_str(), 0600); }, .code = 407},
        {.what = "access list", .change = grantNothing, .code = 407},
        {.what = "folder", .change = [&] { chmod((photo_ + "/a").c_str(), 0700); }, .code = 407},
        {.what = "deleted from a folder that is shut",
         .change = [&] { fs::remove(target), chmod((photo_ + "/a").c_str(), 0711); },
         .code = 407},
        {.what = "share", .change = [] {}, .user = "carol", .code = 407},
        {.what = "then", .change = [&] { chmod((snapshot + "/a/f.txt").c_str(), 0600); }, .code = 407},
        {.what = "a snapshot that is a link",
         .change = [&] { fs::rename(snapshot, photo_ + "/.snapshots/s"), fs::create_symlink("s", snapshot); }},
        {.what = "snapshots behind a link",
         .change =
             [&] {
                 fs::rename(photo_ + "/.snapshots", photo_ + "/a/s");
                 fs::create_symlink("a/s", photo_ + "/.snapshots");
             }},
        {.what = "a folder in it that is a link",
         .change = [&] { fs::rename(snapshot + "/a", snapshot + "/b"), fs::create_symlink("b", snapshot + "/a"); }},
        {.what = "a folder in it that leads out",
         .change = [&] { fs::remove_all(snapshot + "/a"), fs::create_symlink(video_, snapshot + "/a"); },
         .path = "/photo/a/secret"},
        {.what = "a file that is a link",
         .change =
             [&] {
                 fs::rename(snapshot + "/a/f.txt", snapshot + "/a/g");
                 fs::create_symlink("g", snapshot + "/a/f.txt");
             }},
        {.what = "out of it", .change = [] {}, .path = "/photo/a/../../video/secret", .code = 407},
        {.what = "a name that leads out", .change = [] {}, .name = "..", .code = 408},
        {.what = "a path for a name", .change = [] {}, .name = kFirst + "/a", .code = 400},
        {.what = "another share", .change = [] {}, .path = "/video/a/f.txt"},
        {.what = "a snapshot that has gone", .change = [&] { fs::remove_all(snapshot); }},
        {.what = "a name that is never shown",
         .change = [&] { fs::remove(photo_ + "/a/@tmp"), put(kFirst, "/a/@tmp", "x", 1); },
         .path = "/photo/a/@tmp"},
    };
    for (const auto& hostile : cases) {
        SCOPED_TRACE(hostile.what);
        for (const char* name : {"/a", "/.snapshots"}) fs::remove_all(photo_ + name);
        addShare("photo", hostile.user == "carol" ? "read only = no\ninvalid users = carol\n" : "read only = no\n");
        openFolder(photo_ + "/a");
        put("", "/a/f.txt", "new!", 3000);
        put(kFirst, "/a/f.txt", "old", 5);
        hostile.change();
        EXPECT_EQ(refusal(hostile.path, hostile.name, hostile.user), hostile.code);
        const CgiReply listed = versions(hostile.path, hostile.user);
        EXPECT_EQ(listed.json["data"]["items"].size(),
                  0U + (hostile.name != kFirst || std::string_view(hostile.what) == "then" ? 1 : 0))
            << listed.body;
    }
}

TEST_F(VersionsCgi, AreNeverWrittenTo) {
    put(kFirst, "/a/f.txt", "old", 5);
    const std::string place = "/photo/.snapshots/" + kFirst + "/a", file = place + "/f.txt";
    for (fs::path at = photo_ + "/.snapshots/" + kFirst + "/a"; at != photo_; at = at.parent_path())
        chmod(at.c_str(), 0777);
    EXPECT_EQ(code(ask("alice", "action=mkdir&path=" + percentEncode(place + "/d"))), 411);
    EXPECT_EQ(code(ask("alice", "action=rename&name=g&path=" + percentEncode(file))), 411);
    EXPECT_EQ(errors(perform("alice", "action=delete" + about({file}))), file + " 411\n");
    EXPECT_EQ(errors(perform("alice", "action=copy" + about({"/photo/a/f.txt"}, place) + "&conflict=overwrite")),
              "/photo/a/f.txt 411\n");
    EXPECT_EQ(errors(perform("alice", "action=copy" + about({file}, "/video"))), "") << "but read";
    EXPECT_EQ(readFile(photo_ + "/.snapshots/" + kFirst + "/a/f.txt"), "old");
}

TEST_F(VersionsCgi, AreFoundWhereTheShareSays) {
    const std::string base = fs::path(photo_).parent_path(), name = fs::path(photo_).filename();
    const std::string away = base + "/.away";
    writeFile(away + "/d1 2026_11_01/" + name + "/a/f.txt", "old");
    writeFile(away + "/flat 2026_11_01/a/f.txt", "flat");
    writeFile(photo_ + "/a/.snap/in 2026_11_01/f.txt", "inner");
    const struct {
        std::string options, snapshot, text;
    } cases[] = {
        {"shadow:snapdir = " + away + "\nshadow:basedir = " + base + "\nshadow:format = d1 %Y_%m_%d\n", "d1 2026_11_01",
         "old"},
        {"shadow:snapdir = " + away + "\nshadow:basedir = " + photo_ + "\nshadow:format = flat %Y_%m_%d\n",
         "flat 2026_11_01", "flat"},
        {"shadow:snapdir = " + away + "\nshadow:snapsharepath = " + name + "\nshadow:format = d1 %Y_%m_%d\n",
         "d1 2026_11_01", "old"},
        {"shadow:snapdir = .snap\nshadow:snapdirseverywhere = yes\nshadow:format = in %Y_%m_%d\n", "in 2026_11_01",
         "inner"},
        {"shadow:snapdir =\n", "", ""},
        {"shadow:snapdir = " + away + "\nshadow:format = d1 %Y_%m_%d\nshadow:snapprefix = d\n", "", ""},
    };
    put(kFirst, "/a/f.txt", "usual", 5);
    for (const auto& stated : cases) {
        SCOPED_TRACE(stated.options);
        addShare("photo", "read only = no\nveto files = /hidden/\n" + stated.options);
        const Json::Value items = versions("/photo/a/f.txt").json["data"]["items"];
        EXPECT_EQ(each(items, "snapshot"), stated.snapshot.empty() ? Names{} : Names{stated.snapshot});
        if (stated.snapshot.empty()) continue;
        EXPECT_EQ(fetch("/photo/a/f.txt", stated.snapshot).body, stated.text);
    }
    addShare("photo", "read only = no\nveto files = /hidden/\n" + cases[0].options);
    writeFile(away + "/d1 2026_11_01/" + name + "/a/hidden", "x");
    EXPECT_EQ(folder("/photo/a", "d1 2026_11_01"), Names{"f.txt"}) << "what the share vetoes";
    EXPECT_EQ(refusal("/photo/a/hidden", "d1 2026_11_01"), 408);
}

TEST_F(VersionsCgi, OfAThousandSnapshotsAreOneWhereNothingChanged) {
    for (int i = 1990; i < 2990; ++i) put("daily-" + std::to_string(i) + "-01-01_00-00", "/a/f.txt", "old", 5);
    EXPECT_EQ(rows("/photo/a/f.txt"), Names{"daily-2989-01-01_00-00 3 x1000"});
}

TEST(SnapshotDate, IsReadFromNames) {
    const struct {
        const char* name;
        const char* text;  // of the time, UTC
    } cases[] = {{"@GMT-2026.11.01-12.00.00", "2026-11-01 12:00:00"},
                 {"auto_UTC_20261101", "2026-11-01 00:00:00"},
                 {"zfs-auto-snap_hourly-2026-11-01-1217 UTC", "2026-11-01 12:17:00"},
                 {"UTC 2026-11-01T12:17:09", "2026-11-01 12:17:09"},
                 {"GMT-2026-02-30", ""},
                 {"GMT-2026-13-01", ""},
                 {"GMT-12026-11-01", ""},
                 {"nothing", ""}};
    for (const auto& [name, text] : cases) {
        const auto time = orvel::cgi::dateInName(name);
        char shown[32] = "";
        if (time) strftime(shown, sizeof shown, "%F %T", gmtime(&*time));
        EXPECT_STREQ(shown, text) << name;
    }
    EXPECT_EQ(orvel::cgi::dateByFormat(kSecond, "@GMT-%Y.%m.%d-%H.%M.%S", false), kSecondTime);
    EXPECT_EQ(orvel::cgi::dateByFormat(kSecond + "x", "@GMT-%Y.%m.%d-%H.%M.%S", false), std::nullopt);
}

bool run(const std::string& command) {
    return std::system((command + " >/dev/null 2>&1").c_str()) == 0;  // NOLINT(concurrency-mt-unsafe)
}

// Real snapshots: read-only ones with any name, dated by the file system, and snapper's.
TEST_F(VersionsCgi, OfBtrfsAreFound) {
    constexpr int kNoBtrfs = 95;
    const std::string image = systemRoot() + "/btrfs.img";
    if (!run("command -v mkfs.btrfs && command -v btrfs")) GTEST_SKIP() << "SKIPPED: there is no btrfs-progs";
    const int result = support::inPrivateMounts([&] {
        fs::remove_all(photo_ + "/a");
        if (!run("truncate -s 200M " + image + " && mkfs.btrfs -q " + image + " && mount -o loop " + image + " " +
                 photo_))
            return kNoBtrfs;
        const std::string album = photo_ + "/album", snaps = album + "/.snapshots";
        if (!run("btrfs subvolume create " + album + " && mkdir -p " + snaps + "/7 && chmod 777 " + photo_ + " " +
                 album))
            return 1;
        openFolder(album);
        writeFile(album + "/f", "one", 0666);
        EXPECT_TRUE(run("btrfs subvolume snapshot -r " + album + " " + snaps + "/before"));
        writeFile(album + "/f", "second", 0666);
        EXPECT_TRUE(run("btrfs subvolume snapshot -r " + album + " " + snaps + "/7/snapshot"));
        writeFile(snaps + "/7/info.xml", "<snapshot><date>2026-11-01 12:00:00</date></snapshot>");
        fs::remove(album + "/f");
        const Json::Value items = versions("/photo/album/f").json["data"]["items"];
        EXPECT_EQ(each(items, "dated"),
                  (items[0]["snapshot"] == "7" ? Names{"record", "filesystem"} : Names{"filesystem", "record"}));
        EXPECT_EQ(each(items, "size").size(), 2U);
        EXPECT_EQ(fetch("/photo/album/f", "before").body, "one");
        EXPECT_EQ(fetch("/photo/album/f", "7").body, "second");
        EXPECT_EQ(errors(recover("/photo/album/f", "before", "")), "");
        EXPECT_EQ(readFile(album + "/f"), "one");
        EXPECT_EQ(code(ask("alice", "action=mkdir&path=/photo/album/.snapshots/before/d")), 411);
        return HasFailure() ? 1 : 0;
    });
    if (result == kNoBtrfs) GTEST_SKIP() << "SKIPPED: no btrfs can be mounted here";
    EXPECT_WITH_PRIVATE_MOUNTS(result);
}

}  // namespace
