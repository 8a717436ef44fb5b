// Sessions: who is let in, whose session counts, and what of the store is trusted.
#include "vexo/session.h"

#include "session_record.h"
#include "session_store.h"
#include "support/testing.h"

namespace {

TEST(SessionFormat, WhatIsWrittenIsReadAndNothingElse) {
    for (const std::string user : {"alice", "DOM\\al \"quoted\" ice", "a=b", "\xC3\xA9@ldap"}) {
        const auto record =
            vexo::parseSessionRecord(vexo::buildSessionRecord({user, "192.0.2.7", 1700000000}).value_or(""));
        ASSERT_TRUE(record) << user;
        EXPECT_EQ(record->user + record->address + std::to_string(record->time), user + "192.0.2.71700000000");
    }
    for (const char* user : {"", "a\nuser=\"root\"", "a\x7F"}) EXPECT_FALSE(vexo::buildSessionRecord({user, "", 1}));
    EXPECT_FALSE(vexo::buildSessionRecord({"a", "1\n2", 1}));
    for (const char* text : {"", "time=\"1\"\n", "user=\"\"\ntime=\"1\"\n", "user=\"a\"\n", "user=\"a\"\ntime=\"1x\"\n",
                             "user=\"a\"\ntime=\"99999999999999999999\"\n"}) {
        EXPECT_FALSE(vexo::parseSessionRecord(text)) << text;
    }
    const std::string good = "0123456789abcdef0123456789abcdef";
    EXPECT_TRUE(vexo::isSessionId(good));
    for (const char* bad : {"", "A", "g", "aa", "/"}) EXPECT_FALSE(vexo::isSessionId(bad + good.substr(1))) << bad;
    EXPECT_TRUE(vexo::isSessionAlive(1000, 1000 + 900 + 60, 900));
    EXPECT_FALSE(vexo::isSessionAlive(1000, 1000 + 900 + 61, 900));
}

class Session : public ApplianceTest {
 protected:
    // What one request of `user` that shows `sid` comes to.
    struct Reply {
        bool authorized = false;
        std::string user, sid, cookie;
    };
    static Reply request(const std::string& user, const std::string& sid = "", const std::string& https = "") {
        setenv("REMOTE_USER", user.c_str(), 1);
        setenv("REMOTE_ADDR", "192.0.2.7", 1);
        setenv("HTTP_COOKIE", ("x=1; id=" + sid + "; y=2").c_str(), 1);
        setenv("HTTPS", https.c_str(), 1);
        WebMan web;
        const bool authorized = web.IsAuthorized("app", 15, CGI_POSITION_DESKTOP);
        EXPECT_EQ(web.IsAuthorized("app", 15, CGI_POSITION_DESKTOP), authorized) << "asked again";
        return {authorized, web.GetLoginUserName(), web.GetSessionId(), web.GetNewCookie()};
    }
    static bool isKept(const std::string& user, const std::string& sid) { return request(user, sid).sid == sid; }
    void TearDown() override {
        for (const char* name : {"REMOTE_USER", "REMOTE_ADDR", "HTTP_COOKIE", "HTTPS"}) unsetenv(name);
        ApplianceTest::TearDown();
    }
    static std::string store() { return systemRoot() + "/run/vexo/sessions"; }
    static std::string fileOf(const std::string& sid) { return store() + "/" + sid; }
    static bool isNoted(const std::string& sid) { return std::abs(statusOf(fileOf(sid)).st_mtime - time(nullptr)) < 5; }
    static void setLastUse(const std::string& sid, long secondsAgo) {
        const timespec times[] = {{0, UTIME_OMIT}, {time(nullptr) - secondsAgo, 0}};
        ASSERT_EQ(utimensat(AT_FDCWD, fileOf(sid).c_str(), times, 0), 0);
    }
};

TEST_F(Session, ALogInMakesOneSessionAndTheCookieKeepsIt) {
    VLIBCErrSetEx(0, "", 0);
    const Reply first = request("alice");
    ASSERT_TRUE(first.authorized);
    EXPECT_EQ(VLIBCErrGet(), 0) << "success leaves the slot alone";
    EXPECT_EQ(first.user, "alice");
    EXPECT_TRUE(vexo::isSessionId(first.sid)) << first.sid;
    EXPECT_EQ(first.cookie, "id=" + first.sid + "; Path=/; HttpOnly; SameSite=Strict");
    EXPECT_EQ(statusOf(store()).st_mode & 07777, 0700U);
    EXPECT_EQ(statusOf(fileOf(first.sid)).st_mode & 07777, 0600U);
    const auto record = vexo::parseSessionRecord(readFile(fileOf(first.sid)));
    ASSERT_TRUE(record);
    EXPECT_EQ(record->user + record->address, "alice192.0.2.7");
    EXPECT_LT(std::abs(record->time - time(nullptr)), 5);

    const Reply second = request("alice", first.sid);
    EXPECT_TRUE(second.authorized);
    EXPECT_EQ(second.sid + second.cookie, first.sid);
    const Reply bobs = request("bob", first.sid);
    EXPECT_EQ(bobs.user, "bob");
    EXPECT_NE(bobs.sid, first.sid);
    EXPECT_TRUE(isKept("alice", first.sid)) << "and it stays alice's";
    EXPECT_EQ(std::distance(fs::directory_iterator(store()), fs::directory_iterator()), 2);
    EXPECT_TRUE(request("alice", "", "on").cookie.ends_with("; Secure"));
}

TEST_F(Session, OnlyAKnownUserThatTheServerLetInHasOne) {
    for (const auto& [user, code] :
         Rows<const char*, int>{{"", VEXO_ERR_DENIED}, {"nobody-here", VEXO_ERR_USER_MISSING}}) {
        const Reply reply = request(user);
        EXPECT_FALSE(reply.authorized);
        EXPECT_EQ(VLIBCErrGet(), code) << user;
        EXPECT_EQ(reply.user + reply.sid + reply.cookie, "");
    }
    EXPECT_FALSE(fs::exists(store()));
    EXPECT_EQ(vexo::createSession("a\nb", ""), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
}

TEST_F(Session, EndsAfterIdlenessAndNotesUsesOnceAMinute) {
    std::string sid = request("alice").sid;
    const auto keptAfter = [&](long seconds) {
        setLastUse(sid, seconds);
        return isKept("alice", sid);
    };
    EXPECT_TRUE(keptAfter(30));
    EXPECT_FALSE(isNoted(sid));
    EXPECT_TRUE(keptAfter(14 * 60L)) << "15 minutes where nothing is set";
    EXPECT_TRUE(isNoted(sid));
    EXPECT_TRUE(keptAfter(-3600));
    EXPECT_TRUE(isNoted(sid)) << "a time to come is put right";
    EXPECT_FALSE(keptAfter(17 * 60L));
    EXPECT_FALSE(fs::exists(fileOf(sid)));
    setSetting("session_timeout", "30");
    sid = request("alice").sid;
    EXPECT_TRUE(keptAfter(20 * 60L));
    // A sweep takes what has ended and nothing else.
    const std::string ended = request("bob").sid;
    writeFile(fileOf("notes"), "");
    for (const std::string& name : {ended, std::string("notes")}) setLastUse(name, 3600);
    vexo::sweepSessions();
    EXPECT_TRUE(fs::exists(fileOf(sid)) && !fs::exists(fileOf(ended)) && fs::exists(fileOf("notes")));
}

TEST_F(Session, WhatOthersCouldHaveMadeIsNoSession) {
    const std::string good = request("alice").sid;
    const std::string record = readFile(fileOf(good));
    const auto write = [](const std::string& text, mode_t mode) {
        return [=](const std::string& file) { writeFile(file, text, mode); };
    };
    const struct {
        const char* what;
        std::function<void(const std::string&)> make;
    } cases[] = {{"sound", write(record, 0600)},
                 {"link", [&](const std::string& file) { fs::create_symlink(fileOf(good), file); }},
                 {"second name", [&](const std::string& file) { fs::create_hard_link(fileOf(good), file); }},
                 {"folder", [](const std::string& file) { makeFolder(file); }},
                 {"pipe", [](const std::string& file) { mkfifo(file.c_str(), 0600); }},
                 {"writable", write(record, 0622)},
                 {"huge", write(record + std::string(5000, '#'), 0600)},
                 {"torn", write("user=\"alice", 0600)},
                 {"another's", [&](const std::string& file) {
                      writeFile(file, record, 0600);
                      if (chown(file.c_str(), kAliceUid, 0) != 0) fs::remove(file);
                  }}};
    for (const auto& c : cases) {
        const std::string sid(32, static_cast<char>('0' + (&c - cases)));
        c.make(fileOf(sid));
        EXPECT_EQ(isKept("alice", sid), &c == cases) << c.what;
        fs::remove(fileOf(sid));
    }
    writeFile(store() + "/../outside", record, 0600);
    EXPECT_FALSE(isKept("alice", "../outside"));
    // A store that others could fill is not used at all.
    ASSERT_EQ(chmod(store().c_str(), 0777), 0);
    EXPECT_FALSE(request("alice", good).authorized);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED);
    ASSERT_EQ(chmod(store().c_str(), 0700), 0);
    fs::rename(store(), store() + "2");
    fs::create_directory_symlink("sessions2", store());
    EXPECT_FALSE(request("alice", good).authorized);
}

TEST_F(Session, IdsAreGivenForTheSessionsOwnUser) {
    const std::string sid = request("alice").sid;
    const std::string ghosts = vexo::createSession("ghost", "");
    const std::string unknown(32, '0');
    const struct {
        const char *sid, *user;
        uid_t uid;
        int code;
    } cases[] = {{sid.c_str(), "alice", kAliceUid, 0},
                 {sid.c_str(), "bob", 0xFFFFFFFF, VEXO_ERR_DENIED},
                 {unknown.c_str(), "alice", 0xFFFFFFFF, VEXO_ERR_DENIED},
                 {"../sessions", "alice", 0xFFFFFFFF, VEXO_ERR_DENIED},
                 {ghosts.c_str(), "ghost", 0xFFFFFFFF, VEXO_ERR_USER_MISSING},
                 {nullptr, "alice", 0xFFFFFFFF, VEXO_ERR_PARAMETER},
                 {sid.c_str(), "", 0xFFFFFFFF, VEXO_ERR_PARAMETER}};
    for (const auto& c : cases) {
        SCOPED_TRACE(&c - cases);
        VLIBCErrSetEx(0, "", 0);
        EXPECT_EQ(VexoCgiUIDGet(c.sid, c.user), c.uid);
        EXPECT_EQ(VLIBCErrGet(), c.code);
        EXPECT_EQ(VexoCgiGIDGet(c.sid, c.user), c.uid == kAliceUid ? gid_t{kUsersGid} : c.uid);
    }
}

TEST_F(Session, TheStoreIsReachedAfterTheSwitchAndOnlyWithTheSavedIdentity) {
    SKIP_WITHOUT_ROOT();
    const std::string sid = request("alice").sid;
    inChild([&] {
        EXPECT_EQ(setegid(kUsersGid), 0);
        EXPECT_EQ(seteuid(kAliceUid), 0);
        EXPECT_EQ(VexoCgiUIDGet(sid.c_str(), "alice"), uid_t{kAliceUid});
        EXPECT_EQ(VexoCgiUIDGet(std::string(32, '0').c_str(), "alice"), 0xFFFFFFFF);
        EXPECT_EQ(geteuid(), uid_t{kAliceUid}) << "back after a failure too";
        EXPECT_EQ(getegid(), gid_t{kUsersGid});
        EXPECT_EQ(vexo::createSession("alice", "").size(), 32U);
        return 0;
    });
    for (const auto& entry : fs::directory_iterator(store())) {
        EXPECT_TRUE(statusOf(entry.path()).st_uid == 0 && statusOf(entry.path()).st_gid == 0);
    }
    asUser(kAliceUid, kUsersGid, [&] {
        EXPECT_EQ(VexoCgiUIDGet(sid.c_str(), "alice"), 0xFFFFFFFF) << "root's store is closed to a mere user";
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED);
        return 0;
    });
    // Without root the store is the user's own.
    fs::remove_all(systemRoot() + "/run");
    ASSERT_EQ(chmod(systemRoot().c_str(), 0777), 0);
    EXPECT_EQ(asUser(kAliceUid, kUsersGid, [] { return isKept("bob", request("bob").sid) ? 0 : 1; }), 0);
    EXPECT_EQ(statusOf(store()).st_uid, uid_t{kAliceUid});
    ASSERT_EQ(chmod(systemRoot().c_str(), 0755), 0);
}

}  // namespace
