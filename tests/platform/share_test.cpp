// Shares on a running appliance: records, rights from the lists, files that change, homes.
#include "vexo/share.h"

#include "support/testing.h"

namespace {

constexpr const char* kDefinitions = "/etc/vexo/shares.conf";

// The root of a share, or "" with the platform error when there is none.
std::string rootOf(const char* name) {
    PVEXOSHARE share = nullptr;
    const int result = VEXOShareGet(name, &share);
    EXPECT_EQ(result == 0, share != nullptr);
    std::string root = share == nullptr ? "" : share->szPath;
    VEXOShareFree(share);
    return root;
}

std::string allNames() {
    const PVEXOSHAREDB db = VEXOShareDBOpen();
    if (db == nullptr) return "no database";
    std::string names;
    PVEXOSHARE share = nullptr;
    while (VEXOShareDBCursorGet(db, &share) == 0) names += std::string(share->szName) + '|';
    VEXOShareFree(share);
    VEXOShareDBClose(db);
    return names;
}

class ShareTest : public ApplianceTest {
 protected:
    void define(const std::string& text) { writeRootFile(kDefinitions, text); }
};

std::string textOf(const char* name) {
    PVEXOSHARE share = nullptr;
    if (VEXOShareGet(name, &share) != 0) return "none";
    std::string text = std::string(share->szName) + " no " + joined(share->naList) + " rw " + joined(share->rwList) +
                       " ro " + joined(share->roList);
    for (const auto number : {static_cast<int>(share->fStatus), static_cast<int>(share->mask), share->ftp, share->acl,
                              share->synced, share->index})
        text += ' ' + std::to_string(number);
    VEXOShareFree(share);
    return text;
}

TEST_F(ShareTest, RecordsAreFoundWithoutCase) {
    addShare("Music",
             "valid users = alice, @users\ninvalid users = bob\nwrite list = \"DOM\\carl x\"\nbrowseable = no\n"
             "vexo:restriction = 0x5\nVexo : Encrypted = yes\nvexo:ftp = 2\nvexo:acl = 1\nvexo:synced = true\n");
    addShare("plain", "vexo:index = on\n");
    EXPECT_EQ(textOf("mUSIC"),
              "Music no bob| rw DOM\\carl x\x1F"
              "alice|DOM\\carl x\x1F@users| ro alice|@users| 3 5 2 1 1 0");
    EXPECT_EQ(textOf("plain"), "plain no  rw  ro *| 0 0 0 0 0 1");
    EXPECT_EQ(rootOf("music"), shareRoot("Music"));
    SDK::Share* loaded = SDK::Share::LoadShare("mUSIC");
    ASSERT_NE(loaded, nullptr);
    EXPECT_TRUE(loaded->GetStatus() == 3 && loaded->GetFTPPrivilege() == 2 && loaded->GetACLEnable());
    SDK::Share::Release(loaded);
    EXPECT_EQ(VEXOS2SIsSyncedShare("music"), 1);
    for (const char* name : {"plain", "none"}) EXPECT_EQ(VEXOS2SIsSyncedShare(name), 0);
}

TEST_F(ShareTest, FailuresSayWhy) {
    for (const char* name : {"none", "", "photo/x"}) {
        EXPECT_EQ(rootOf(name), "");
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_SHARE_MISSING) << name;
        EXPECT_EQ(SDK::Share::LoadShare(name), nullptr);
    }
    // Every list of a record that can fail to be made, fails once.
    for (int nth = 1; nth <= 5; ++nth) {
        const char* operation = nth <= 3 ? "VLIBCSzListAlloc" : "VLIBCSzListPush";
        vexo::gate::fail(operation, VEXO_ERR_GENERAL, ENOMEM, nth <= 3 ? nth : nth - 3);
        EXPECT_EQ(rootOf("photo"), "") << nth;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    }
    fs::remove(systemRoot() + kDefinitions);
    EXPECT_EQ(rootOf("photo"), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    EXPECT_EQ(errno, ENOENT);
    EXPECT_EQ(allNames(), "no database");
    EXPECT_LT(VEXOShareIsShareRecycle("/v/photo/#recycle"), 0);
}

TEST_F(ShareTest, MalformedSectionsDoNotHideTheOthers) {
    define(
        "[a]\npath = /v//a/\n[no path]\nread only = no\n[deep]\npath = /v/../deep\n[a/b]\npath = /v/b\n"
        "[mask]\npath = /v/m\nvexo:restriction = 0x\n[off]\navailable = no\n[z\x07]\n[z\nx\n"
        "[global]\nnonsense\n[b]\npath = /v/b\n");
    announceLog("share [no path] is left out: no path");
    announceLog("share [deep] is left out: the path \"/v/../deep\" is not that of a folder below \"/\"");
    announceLog("share [a/b] is left out: no name for a share");
    announceLog("share [mask] is left out: \"0x\" is no number or too large");
    announceLog("share [z\\x07] is left out: no name for a share");
    announceLog("share definitions: line 15: a section without a name");
    announceLog("share definitions: line 18: neither a section nor an option");
    EXPECT_EQ(allNames(), "a|b|");
    EXPECT_EQ(rootOf("a"), "/v/a") << "and said once";
}

// No access beats read-write beats read-only.
TEST_F(ShareTest, RightsFromLists) {
    addUser("erin", 20030, kUsersGid);
    addGroup("Editors", 20130, {"erin"});
    // More pairs of entries than are written out.
    std::string longLists = "valid users = bob @Editors\nwrite list = bob";
    for (int i = 0; i < 2100; ++i) longLists += " nobody" + std::to_string(i);
    auto rows = rowsOf<std::string, int, int, int>("platform/share_rights");
    rows.emplace_back(longLists + "\n", 0, 2, 1);
    for (const auto& [options, alice, bob, erin] : rows) {
        addShare("music", options);
        SDK::Share* share = SDK::Share::LoadShare("music");
        ASSERT_NE(share, nullptr);
        for (const auto& [user, right] :
             Rows<const char*, int>{row("alice", alice), row("bob", bob), row("erin", erin), row("", 0)})
            EXPECT_EQ(share->GetAccessRight(user), right) << options << user;
        SDK::Share::Release(share);
    }
}

// The files are read once, and again when one of them, an included one too, is another.
TEST_F(ShareTest, ChangesAreSeen) {
    writeRootFile("/etc/vexo/more.conf", "[b]\npath = /v/b\n");
    define("[a]\npath = /v/a\n[global]\ninclude = /etc/vexo/more.conf\n");
    EXPECT_EQ(allNames(), "a|b|");
    writeFile(systemRoot() + "/etc/vexo/more.conf", "[d]\npath = /v/d\n");
    EXPECT_EQ(allNames(), "a|d|") << "same inode and size, within one tick of the clock";
    define("[e]\npath = /v/e\n[global]\ninclude = later.conf\n");
    fs::last_write_time(systemRoot() + kDefinitions, fs::file_time_type::clock::now() - std::chrono::hours(1));
    announceLog("share definitions: line 4: the included file cannot be read");
    EXPECT_EQ(allNames(), "e|");
    EXPECT_EQ(allNames(), "e|");
    writeRootFile("/etc/vexo/later.conf", "[f]\npath = /v/f\n");
    EXPECT_EQ(allNames(), "e|f|") << "a relative name lies beside the definitions";
    // A cursor keeps what it began, and reuses its record.
    const PVEXOSHAREDB db = VEXOShareDBOpen();
    PVEXOSHARE share = nullptr;
    ASSERT_EQ(VEXOShareDBCursorGet(db, &share), 0);
    const PVEXOSHARE first = share;
    writeRootFile("/etc/other.conf", "[g]\npath = /v/g\n");
    setSetting("share_definitions", "/etc/other.conf");
    EXPECT_EQ(allNames(), "g|");
    ASSERT_EQ(VEXOShareDBCursorGet(db, &share), 0);
    EXPECT_EQ(share, first);
    EXPECT_STREQ(share->szName, "f");
    VEXOShareFree(share);
    VEXOShareDBClose(db);
    fs::remove(systemRoot() + "/etc/vexoinfo.conf");
    makeFolder(systemRoot() + "/etc/vexoinfo.conf");
    EXPECT_EQ(VEXOShareDBOpen(), nullptr) << "the shares of another file must not stand in for these";
}

TEST_F(ShareTest, RootsWithVariablesFollowTheUser) {
    addUser("DOM\\dora", 20031, kUsersGid);
    addUser("..", 20032, kUsersGid);
    define("[own]\npath = /v/%U\n[all]\npath = /v/%S.%g.%u\n[dom]\npath = /%D/%U\n");
    for (const auto& [user, own, all, dom, names] :
         rowsOf<const char*, const char*, const char*, const char*, const char*>("platform/roots_of_users")) {
        setenv("REMOTE_USER", user, 1);
        EXPECT_EQ(rootOf("own"), own) << user;
        EXPECT_EQ(rootOf("all"), all) << user;
        EXPECT_EQ(rootOf("dom"), dom) << user;
        EXPECT_EQ(allNames(), names) << user;
        EXPECT_EQ(VEXOShareIsShareRecycle("/v/alice/#recycle"), std::string(user) == "alice");
    }
    unsetenv("REMOTE_USER");
    EXPECT_EQ(rootOf("own"), geteuid() == 0 ? "/v/root" : "") << "without a request, the effective user";
    define("[photo]\npath = /v/photo\n");
    EXPECT_EQ(VEXOShareIsShareRecycle("/v/photo/#recycle"), 1);
    for (const char* path : {"/v/photo/#recycle/", "/v/photo/x/#recycle", "/v/photo/#Recycle"})
        EXPECT_EQ(VEXOShareIsShareRecycle(path), 0) << path;
}

TEST_F(ShareTest, Homes) {
    const std::string home = shareRoot("homes") + "/alice";
    char path[4096];
    const auto ask = [&](const char* user, size_t size = sizeof path) {
        return VEXOServiceHomePathGet(user, path, static_cast<int>(size)) == 0 ? 0 : VLIBCErrGet();
    };
    EXPECT_EQ(ask("alice"), VEXO_ERR_MISSING);
    EXPECT_FALSE(fs::exists(home)) << "asking makes nothing";
    writeFile(home, "");
    EXPECT_EQ(ask("alice"), VEXO_ERR_MISSING);
    fs::remove(home);
    makeFolder(home);
    EXPECT_EQ(ask("alice"), 0);
    EXPECT_EQ(path, home);
    EXPECT_EQ(ask("alice", home.size()), VEXO_ERR_GENERAL) << "never cut";
    EXPECT_STREQ(path, "");
    for (const char* user : {"nobody known", "..", "", "alice/../bob"}) EXPECT_EQ(ask(user), VEXO_ERR_USER_MISSING);
    for (const char* value : {"YES", "yes", "no", ""}) {
        setSetting("userhome_enable", value);
        EXPECT_EQ(VEXOServiceUserHomeIsEnabled(AUTH_DOMAIN, 0) == 1, strlen(value) == 3) << value;
        EXPECT_EQ(ask("alice") == 0, strlen(value) == 3);
    }
    setSetting("userhome_enable", "yes");
    define("[photo]\npath = /v/photo\n");
    EXPECT_EQ(VEXOServiceUserHomeIsEnabled(AUTH_LOCAL, kAliceUid), 0) << "without the share";
}

// [homes] without a path, or with one of each user's own: there is no share, but everybody whom it admits has a home.
TEST_F(ShareTest, HomesThatAreInNoShare) {
    const auto homeOf = [](const char* name) {
        PVEXOUSER user = nullptr;
        if (VEXOUserGet(name, &user) < 0) return std::string("nobody");
        const std::string home = user->szHome;
        EXPECT_EQ(VEXOServiceUserHomeIsEnabled(AUTH_LOCAL, user->uid) == 1, !home.empty()) << name;
        VEXOUserFree(user);
        return home;
    };
    writeRootFile("/etc/passwd", "alice:x:20001:20100::" + photo_ +
                                     "/al:\nbob:x:20002:20100::/nonexistent:\n"
                                     "carol:x:20003:20100::/:\ndave:x:20004:20100::" +
                                     photo_ + "/d:\n");
    for (const auto& [options, alice, dave] : rowsOf<const char*, std::string, std::string>("platform/homes")) {
        define(std::string("[homes]\n") + options);
        const auto full = [&](const std::string& end) { return end.empty() ? end : photo_ + end; };
        EXPECT_EQ(homeOf("alice"), full(alice)) << options;
        EXPECT_EQ(homeOf("dave"), full(dave)) << options;
        EXPECT_EQ(homeOf("bob"), "") << "no home in the account";
        EXPECT_EQ(rootOf("homes") + allNames(), "");
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_SHARE_MISSING);
    }
    define("[homes]\nread only = no\npath = " + photo_ + "/%S\n");
    EXPECT_EQ(homeOf("carol"), photo_ + "/carol");
    define("[homes]\nbrowseable = no\n");
    announceLog("share [homes] is closed: line 1: read only = yes (not stated): a user's home is always to read");
    EXPECT_EQ(homeOf("alice"), "") << "what is read only there is not open here";
}

// Options that keep somebody out and are not honoured, those that are not known among them, close a share, and nothing
// else does.
TEST_F(ShareTest, WhatClosesAShare) {
    const auto stateOf = [&](const std::string& options, const std::string& global) {
        define("[global]\n" + global + "[s]\npath = /srv/samba/team\n" + options);
        const std::string root = rootOf("s");
        std::string closing;
        for (const auto& line : takeLog()) closing += line.text;
        const size_t begin = closing.find("is closed: ");
        EXPECT_EQ(root.empty(), begin != std::string::npos) << options << closing;
        return begin == std::string::npos ? "" : closing.substr(begin + 11, closing.find(" = ", begin) - begin - 11);
    };
    for (const auto& [global, options, closing] :
         rowsOf<std::string, std::string, std::string>("platform/closed_shares"))
        EXPECT_EQ(stateOf(options, global), closing) << global << options;
    define(
        "[t]\npath = /srv/t\nforce user = x\n[s]\ncopy = t\npath = /srv/s\n[u]\ncopy = t\nforce user =\npath = "
        "/srv/u\n");
    EXPECT_EQ(allNames(), "u|") << "a copy is closed as what it copies";
    takeLog();
    define(
        "[printers]\npath = /var/spool\n[print$]\npath = /var/lib\n[p]\nprintable = yes\npath = /var/x\n[b]\npath = "
        "/v/b\n");
    EXPECT_EQ(allNames(), "b|") << "printers are meant to be no shares, and said nowhere";
}

// Whatever a request meets while the file is written, nobody sees more than the whole file gives.
TEST_F(ShareTest, HalfWrittenDefinitions) {
    define("[a]\npath = /v/a\n[b]\npath = /v/b\nvalid users = al");
    announceLog("share [b] is left out: line 5: the file ends within a line");
    EXPECT_EQ(allNames(), "a|");
    timespec old[2] = {{1000000000, 0}, {1000000000, 0}};
    ASSERT_EQ(utimensat(AT_FDCWD, (systemRoot() + kDefinitions).c_str(), old, 0), 0);
    EXPECT_EQ(allNames(), "a|b|") << "a last line without its end that nobody goes on with";
    define("");
    EXPECT_EQ(allNames(), "");
    define(std::string((1 << 20) + 1, '#'));
    EXPECT_EQ(allNames(), "no database");
    EXPECT_EQ(errno, EFBIG);
    std::string many;
    for (int i = 0; many.size() < (1 << 20) - 40; ++i)
        many += "[" + std::to_string(i) + "]\npath = /v/" + std::to_string(i) + "\n";
    define(many);
    announceLog("more than 10000 sections");
    const std::string names = allNames();
    EXPECT_EQ(std::count(names.begin(), names.end(), '|'), 10000);
}

// Shares of users come, change and go with their files and folders, and never let administrators act as root in them.
TEST_F(ShareTest, UsersDefineSharesOfTheirOwn) {
    SKIP_WITHOUT_ROOT();
    const std::string folder = systemRoot() + "/users", file = folder + "/pub", target = shareRoot("photo") + "/pub";
    const auto share = [&](const char* entries) {
        writeFile(file, "#VERSION 2\npath=" + target + "\ncomment=\nusershare_acl=" + entries + "\nguest_ok=n\n");
        EXPECT_EQ(chown(file.c_str(), 20001, 20100), 0);
    };
    const auto rights = [](const char* user) {
        SDK::Share* loaded = SDK::Share::LoadShare("pub");
        const int right = loaded == nullptr ? -1 : loaded->GetAccessRight(user);
        SDK::Share::Release(loaded);
        return right;
    };
    makeFolder(folder);
    EXPECT_EQ(chmod(folder.c_str(), 01770), 0);
    makeFolder(target);
    EXPECT_EQ(chown(target.c_str(), 20001, 20100), 0);
    share("S-1-1-0:F");
    define("[photo]\npath = " + shareRoot("photo") + "\n");
    EXPECT_EQ(rights("bob"), -1) << "no folder is stated, and this is not Samba's own file";
    define("[global]\nusershare path = /users\n");
    for (const auto& [user, right] : Rows<const char*, int>{{"alice", 2}, {"bob", 2}, {"carol", 0}})
        EXPECT_EQ(rights(user), right) << user << "; carol is an administrator";
    share("S-1-1-0:R");
    EXPECT_EQ(rights("bob"), 1);
    ASSERT_EQ(setegid(20100) + seteuid(20002), 0);
    EXPECT_EQ(rights("bob"), 1) << "in a process that works as a user";
    ASSERT_EQ(seteuid(0) + setegid(0), 0);
    const std::vector<std::pair<const char*, std::function<int(bool)>>> breaks = {
        {"a path of others", [&](bool bad) { return chown(target.c_str(), bad ? 20002 : 20001, 20100); }},
        {"a file for all", [&](bool bad) { return chmod(file.c_str(), bad ? 0646 : 0644); }},
        {"a folder without the sticky bit", [&](bool bad) { return chmod(folder.c_str(), bad ? 0770 : 01770); }},
        {"a folder for all", [&](bool bad) { return chmod(folder.c_str(), bad ? 01777 : 01770); }},
        {"a folder of others", [&](bool bad) { return chown(folder.c_str(), bad ? 20001 : 0, 0); }},
        {"a path that is gone", [&](bool bad) {
             return bad ? rmdir(target.c_str()) : mkdir(target.c_str(), 0755) + chown(target.c_str(), 20001, 20100);
         }}};
    for (const auto& [what, change] : breaks) {
        EXPECT_EQ(change(true), 0);
        EXPECT_EQ(rights("bob"), -1) << what;
        EXPECT_EQ(change(false), 0);
        EXPECT_EQ(rights("bob"), 1) << what;
    }
    define("[global]\nusershare path = /users\nusershare max shares = 0\n");
    EXPECT_EQ(rights("bob"), -1);
    takeLog();
}

}  // namespace
