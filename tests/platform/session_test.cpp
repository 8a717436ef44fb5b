// Sessions: who is let in, whose session counts, and what of the store is trusted.
#include "vexo/session.h"

#include "platform/trust.h"
#include "web/session_record.h"
#include "web/session_store.h"

namespace {

vexo::SessionRecord recordOf(const std::string& user) {
    return {user, "", 1, false, 0, "", ""};
}

TEST(SessionFormat, WhatIsWrittenIsReadAndNothingElse) {
    for (const std::string user : {"alice", "DOM\\al \"quoted\" ice", "a=b", "\xC3\xA9@ldap"}) {
        const auto record = vexo::parseSessionRecord(
            vexo::buildSessionRecord({user, "192.0.2.7", 1700000000, true, 20001, "n", "B\n\"1\""}).value_or(""));
        ASSERT_TRUE(record) << user;
        EXPECT_EQ(record->user + record->address + std::to_string(record->time), user + "192.0.2.71700000000");
        EXPECT_TRUE(record->loggedIn && record->uid == 20001);
        EXPECT_EQ(record->name + record->browser, "nB \"1\"");
    }
    for (const char* user : {"", "a\nuser=\"root\"", "a\x7F"}) EXPECT_FALSE(vexo::buildSessionRecord(recordOf(user)));
    EXPECT_FALSE(vexo::buildSessionRecord({"a", "1\n2", 1, false, 0, "", ""}));
    EXPECT_TRUE(vexo::parseSessionRecord("version=\"2\"\nuser=\"a\"\ntime=\"1\"\n"));
    for (const char* text :
         {"", "time=\"1\"\n", "user=\"\"\ntime=\"1\"\n", "user=\"a\"\n", "user=\"a\"\ntime=\"1x\"\n",
          "user=\"a\"\ntime=\"99999999999999999999\"\n", "user=\"a\"\ntime=\"1\"\nby=\"log-in\"\nuid=\"\"\n"})
        EXPECT_FALSE(vexo::parseSessionRecord(std::string("version=\"2\"\n") + text)) << text;
    EXPECT_FALSE(vexo::parseSessionRecord("user=\"a\"\ntime=\"1\"\n")) << "of a former version";
    const std::string good = "0123456789abcdef0123456789abcdef";
    EXPECT_TRUE(vexo::isSessionId(good));
    for (const char* bad : {"", "A", "g", "aa", "/"}) EXPECT_FALSE(vexo::isSessionId(bad + good.substr(1))) << bad;
    EXPECT_TRUE(vexo::isSessionAlive(1000, 1000, 1000 + 900 + 60, {900, 2000}));
    EXPECT_FALSE(vexo::isSessionAlive(1000, 1000, 1000 + 900 + 61, {900, 2000}));
    EXPECT_TRUE(vexo::isSessionAlive(3000, 1000, 3000, {900, 2000}));
    EXPECT_FALSE(vexo::isSessionAlive(3001, 1000, 3001, {900, 2000}));
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
    static std::string store() { return systemRoot() + "/run/vexo/sessions"; }
    static std::string fileOf(const std::string& sid) { return store() + "/" + sid; }
    static bool isNoted(const std::string& sid) {
        return std::abs(statusOf(fileOf(sid)).st_mtime - time(nullptr)) < 20;
    }
    static void setLastUse(const std::string& sid, long secondsAgo) {
        const timespec times[] = {{0, UTIME_OMIT}, {time(nullptr) - secondsAgo, 0}};
        ASSERT_EQ(utimensat(AT_FDCWD, fileOf(sid).c_str(), times, 0), 0);
    }
};

TEST_F(Session, ALogInMakesOneSessionAndTheCookieKeepsIt) {
    for (const auto& [user, code] :
         Rows<const char*, int>{{"", VEXO_ERR_DENIED}, {"nobody-here", VEXO_ERR_USER_MISSING}}) {
        const Reply refused = request(user);
        EXPECT_EQ(VLIBCErrGet(), code) << user;
        EXPECT_FALSE(refused.authorized);
        EXPECT_EQ(refused.user + refused.sid + refused.cookie, "");
    }
    EXPECT_FALSE(fs::exists(store()));
    VLIBCErrSetEx(0, "", 0);
    const Reply first = request("alice");
    ASSERT_TRUE(first.authorized);
    EXPECT_EQ(VLIBCErrGet(), 0) << "success leaves the slot alone";
    EXPECT_EQ(first.cookie, "id=" + first.sid + "; Path=/; HttpOnly; SameSite=Strict");
    EXPECT_EQ(statusOf(store()).st_mode & 07777, 0700U);
    EXPECT_EQ(statusOf(fileOf(first.sid)).st_mode & 07777, 0600U);
    const auto record = vexo::parseSessionRecord(readFile(fileOf(first.sid)));
    ASSERT_TRUE(record);
    EXPECT_EQ(record->user + record->address, "alice192.0.2.7");

    const Reply second = request("alice", first.sid);
    EXPECT_EQ(second.sid + second.cookie, first.sid);
    const Reply bobs = request("bob", first.sid);
    EXPECT_EQ(bobs.user, "bob");
    EXPECT_NE(bobs.sid, first.sid);
    EXPECT_TRUE(isKept("alice", first.sid)) << "and it stays alice's";
    EXPECT_EQ(std::distance(fs::directory_iterator(store()), {}), 2);
    EXPECT_TRUE(request("alice", "", "on").cookie.ends_with("; Secure"));
}

TEST_F(Session, EndsAfterIdlenessAndNotesUsesOnceAMinute) {
    std::string sid = request("alice").sid;
    const auto keptAfter = [&](long seconds) {
        setLastUse(sid, seconds);
        return isKept("alice", sid);
    };
    EXPECT_TRUE(keptAfter(30));
    EXPECT_FALSE(isNoted(sid));
    setenv("HTTP_ORVEL_IDLE", "1", 1);
    EXPECT_TRUE(keptAfter(14 * 60L));
    EXPECT_FALSE(isNoted(sid)) << "nobody is at the page";
    unsetenv("HTTP_ORVEL_IDLE");
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
    const std::string sid(32, 'a');
    plantEach(
        fileOf(sid), [&] { EXPECT_FALSE(isKept("alice", sid)); }, record);
    for (const std::string& text : {record, record + std::string(5000, '#'), record.substr(0, 9)}) {
        writeFile(fileOf(sid), text, 0600);
        EXPECT_EQ(isKept("alice", sid), text == record) << text;
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

TEST_F(Session, AWebServersWordCountsWhereTheSettingSaysSo) {
    const std::string sid = request("alice").sid;
    setSetting("trusted_log_in", "no");
    EXPECT_FALSE(request("alice").authorized);
    EXPECT_FALSE(request("alice", sid).authorized) << "nor does a session that such a word made";
    EXPECT_TRUE(fs::exists(fileOf(sid)));
    vexo::SessionRecord record = recordOf("alice");
    record.loggedIn = true;
    record.uid = kAliceUid;
    const std::string own = vexo::createSession(record);
    EXPECT_EQ(request("", own).user, "alice");
    EXPECT_EQ(request("bob", own).user, "alice");
    // A user has 32 at most.
    setLastUse(own, 100);
    for (int i = 0; i < 31; ++i) vexo::createSession(record);
    EXPECT_TRUE(fs::exists(fileOf(own)));
    vexo::createSession(record);
    EXPECT_FALSE(fs::exists(fileOf(own)));
    EXPECT_EQ(vexo::sessionsOf("alice").size(), 32U);
    setSetting("session_lifetime", "1");
    writeFile(fileOf(own),
              "version=\"2\"\nuser=\"alice\"\ntime=\"" + std::to_string(time(nullptr) - 61) +
                  "\"\nby=\"log-in\"\nuid=\"20001\"\n",
              0600);
    EXPECT_FALSE(request("", own).authorized) << "its time is over";
}

TEST_F(Session, IdsAreGivenForTheSessionsOwnUser) {
    const std::string sid = request("alice").sid;
    const std::string ghosts = vexo::createSession(recordOf("ghost"));
    const std::string unknown(32, '0');
    constexpr uid_t kNoId = 0xFFFFFFFF;
    for (const auto& [id, user, uid, code] : Rows<const char*, const char*, uid_t, int>{
             row(sid.c_str(), "alice", kAliceUid, 0), row(sid.c_str(), "bob", kNoId, VEXO_ERR_DENIED),
             row(unknown.c_str(), "alice", kNoId, VEXO_ERR_DENIED),
             row(ghosts.c_str(), "ghost", kNoId, VEXO_ERR_USER_MISSING),
             row(nullptr, "alice", kNoId, VEXO_ERR_PARAMETER), row(sid.c_str(), "", kNoId, VEXO_ERR_PARAMETER)}) {
        SCOPED_TRACE(testing::PrintToString(id) + user);
        VLIBCErrSetEx(0, "", 0);
        EXPECT_EQ(VexoCgiUIDGet(id, user), uid);
        EXPECT_EQ(VLIBCErrGet(), code);
        EXPECT_EQ(VexoCgiGIDGet(id, user), uid == kAliceUid ? gid_t{kUsersGid} : uid);
    }
}

TEST_F(Session, TheStoreIsReachedAfterTheSwitchAndOnlyWithTheSavedIdentity) {
    SKIP_WITHOUT_ROOT();
    const std::string sid = request("alice").sid;
    actingForAlice([&] {
        EXPECT_EQ(VexoCgiUIDGet(sid.c_str(), "alice"), uid_t{kAliceUid});
        EXPECT_EQ(VexoCgiUIDGet(std::string(32, '0').c_str(), "alice"), 0xFFFFFFFF);
        EXPECT_EQ(vexo::createSession(recordOf("alice")).size(), 32U);
    });
    for (const auto& entry : fs::directory_iterator(store()))
        EXPECT_EQ(statusOf(entry.path()).st_uid + statusOf(entry.path()).st_gid, 0U);
    asUser(kAliceUid, kUsersGid, [&] {
        EXPECT_EQ(VexoCgiUIDGet(sid.c_str(), "alice"), 0xFFFFFFFF) << "root's store is closed to a mere user";
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED);
    });
    // Without root the store is the user's own.
    fs::remove_all(systemRoot() + "/run");
    ASSERT_EQ(chmod(systemRoot().c_str(), 0777), 0);
    EXPECT_EQ(asUser(kAliceUid, kUsersGid, [] { return isKept("bob", request("bob").sid) ? 0 : 1; }), 0);
    EXPECT_EQ(statusOf(store()).st_uid, uid_t{kAliceUid});
    ASSERT_EQ(chmod(systemRoot().c_str(), 0755), 0);
}

}  // namespace
