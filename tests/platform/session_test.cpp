// Sessions: who is let in, whose session counts, and what of the store is trusted.
#include "vexo/session.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <iterator>
#include <string>

#include "session_record.h"
#include "session_store.h"
#include "support/appliance.h"
#include "vexo/error.h"

namespace fs = std::filesystem;

namespace {

constexpr uid_t kNoId = 0xFFFFFFFF;

TEST(SessionFormat, RecordsComeBackAsTheyWere) {
    for (const std::string user : {"alice", "DOM\\al \"quoted\" ice", "a=b", "\xC3\xA9@ldap"}) {
        const auto text = vexo::buildSessionRecord({user, "192.0.2.7", 1700000000});
        ASSERT_TRUE(text) << user;
        const auto record = vexo::parseSessionRecord(*text);
        ASSERT_TRUE(record) << user;
        EXPECT_EQ(record->user, user);
        EXPECT_EQ(record->address, "192.0.2.7");
        EXPECT_EQ(record->time, 1700000000);
    }
    for (const char* user : {"", "a\nuser=\"root\"", "a\x7F"})
        EXPECT_FALSE(vexo::buildSessionRecord({user, "", 1})) << user;
    EXPECT_FALSE(vexo::buildSessionRecord({"a", "1\n2", 1}));
    for (const char* text : {"", "time=\"1\"\n", "user=\"\"\ntime=\"1\"\n", "user=\"a\"\n", "user=\"a\"\ntime=\"1x\"\n",
                             "user=\"a\"\ntime=\"99999999999999999999\"\n"}) {
        EXPECT_FALSE(vexo::parseSessionRecord(text)) << text;
    }
}

TEST(SessionFormat, IdentifiersAndLifetimes) {
    const std::string good(32, 'a');
    EXPECT_TRUE(vexo::isSessionId("0123456789abcdef0123456789abcdef"));
    for (const std::string& sid : {std::string(), good + "a", good.substr(1), "../" + good.substr(3),
                                   "A" + good.substr(1), "g" + good.substr(1)}) {
        EXPECT_FALSE(vexo::isSessionId(sid)) << sid;
    }
    EXPECT_TRUE(vexo::isSessionAlive(1000, 1000 + 900 + 60, 900));
    EXPECT_FALSE(vexo::isSessionAlive(1000, 1000 + 900 + 61, 900));
    EXPECT_TRUE(vexo::isSessionAlive(1000, 500, 0)) << "the clock was set back";
}

class Session : public support::ApplianceTest {
 protected:
    // What one request of `user` that shows `cookie` comes to.
    struct Reply {
        bool authorized = false;
        std::string user, sid, cookie;
    };
    static Reply request(const std::string& user, const std::string& sid = "", const std::string& https = "") {
        setenv("REMOTE_USER", user.c_str(), 1);
        setenv("REMOTE_ADDR", "192.0.2.7", 1);
        setenv("HTTP_COOKIE", ("x=1; id=" + sid + "; y=2").c_str(), 1);
        setenv("HTTPS", https.c_str(), 1);
        Reply reply;
        WebMan web;
        reply.authorized = web.IsAuthorized("app", 15, CGI_POSITION_DESKTOP);
        EXPECT_EQ(web.IsAuthorized("app", 15, CGI_POSITION_DESKTOP), reply.authorized) << "asked again";
        reply.user = web.GetLoginUserName();
        reply.sid = web.GetSessionId();
        reply.cookie = web.GetNewCookie();
        return reply;
    }
    void TearDown() override {
        for (const char* name : {"REMOTE_USER", "REMOTE_ADDR", "HTTP_COOKIE", "HTTPS"}) unsetenv(name);
        ApplianceTest::TearDown();
    }
    static std::string store() { return systemRoot() + "/run/vexo/sessions"; }
    static std::string fileOf(const std::string& sid) { return store() + "/" + sid; }
    static long stored() { return std::distance(fs::directory_iterator(store()), fs::directory_iterator()); }
    static mode_t modeOf(const std::string& path) {
        struct stat status {};
        EXPECT_EQ(lstat(path.c_str(), &status), 0) << path;
        return status.st_mode & 07777;
    }
    static time_t lastUse(const std::string& sid) {
        struct stat status {};
        EXPECT_EQ(lstat(fileOf(sid).c_str(), &status), 0);
        return status.st_mtime;
    }
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
    EXPECT_EQ(modeOf(store()), 0700U);
    EXPECT_EQ(modeOf(fileOf(first.sid)), 0600U);
    const auto record = vexo::parseSessionRecord(support::readFile(fileOf(first.sid)));
    ASSERT_TRUE(record);
    EXPECT_EQ(record->user, "alice");
    EXPECT_EQ(record->address, "192.0.2.7");
    EXPECT_NEAR(static_cast<double>(record->time), static_cast<double>(time(nullptr)), 5);

    const Reply second = request("alice", first.sid);
    EXPECT_TRUE(second.authorized);
    EXPECT_EQ(second.sid, first.sid);
    EXPECT_EQ(second.cookie, "");
    EXPECT_EQ(stored(), 1);
    EXPECT_TRUE(request("alice", "", "on").cookie.ends_with("; Secure"));
}

TEST_F(Session, OnlyAKnownUserThatTheServerLetInHasOne) {
    struct Case {
        const char* user;
        int code;
    };
    for (const auto& [user, code] : {Case{"", VEXO_ERR_DENIED}, Case{"nobody-here", VEXO_ERR_USER_MISSING}}) {
        const Reply reply = request(user);
        EXPECT_FALSE(reply.authorized);
        EXPECT_EQ(VLIBCErrGet(), code) << user;
        EXPECT_EQ(reply.user + reply.sid + reply.cookie, "");
    }
    EXPECT_FALSE(fs::exists(store()));
    EXPECT_EQ(vexo::createSession("a\nb", ""), "");
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
}

TEST_F(Session, AnotherUsersSessionIsNotHonoured) {
    const std::string alices = request("alice").sid;
    const Reply bobs = request("bob", alices);
    EXPECT_TRUE(bobs.authorized);
    EXPECT_EQ(bobs.user, "bob");
    EXPECT_NE(bobs.sid, alices);
    EXPECT_EQ(request("alice", alices).sid, alices) << "and it stays alice's";
}

TEST_F(Session, EndsAfterIdlenessAndNotesUsesOnceAMinute) {
    std::string sid = request("alice").sid;
    setLastUse(sid, 30);
    const time_t noted = lastUse(sid);
    EXPECT_EQ(request("alice", sid).sid, sid);
    EXPECT_EQ(lastUse(sid), noted);
    setLastUse(sid, 14 * 60);
    EXPECT_EQ(request("alice", sid).sid, sid) << "15 minutes where nothing is set";
    EXPECT_NEAR(static_cast<double>(lastUse(sid)), static_cast<double>(time(nullptr)), 5);
    setLastUse(sid, -3600);
    EXPECT_EQ(request("alice", sid).sid, sid);
    EXPECT_NEAR(static_cast<double>(lastUse(sid)), static_cast<double>(time(nullptr)), 5)
        << "a time to come is put right";
    setLastUse(sid, 17 * 60);
    EXPECT_NE(request("alice", sid).sid, sid);
    EXPECT_FALSE(fs::exists(fileOf(sid)));
    setSetting("session_timeout", "30");
    sid = request("alice").sid;
    setLastUse(sid, 20 * 60);
    EXPECT_EQ(request("alice", sid).sid, sid);
}

TEST_F(Session, AFileThatOthersCouldHaveMadeIsNoSession) {
    const std::string good = request("alice").sid;
    const std::string record = support::readFile(fileOf(good));
    const auto honoured = [&](char name, const auto& make) {
        const std::string sid(32, name);
        make(fileOf(sid));
        return request("alice", sid).sid == sid;
    };
    EXPECT_TRUE(honoured('0', [&](const auto& file) { support::writeFile(file, record, 0600); })) << "a sound one";
    EXPECT_FALSE(honoured('1', [&](const auto& file) { fs::create_symlink(fileOf(good), file); }));
    EXPECT_FALSE(honoured('2', [&](const auto& file) { support::makeFolder(file); }));
    EXPECT_FALSE(honoured('3', [&](const auto& file) { mkfifo(file.c_str(), 0600); }));
    EXPECT_FALSE(honoured('4', [&](const auto& file) { support::writeFile(file, record, 0622); }));
    EXPECT_FALSE(
        honoured('5', [&](const auto& file) { support::writeFile(file, record + std::string(5000, '#'), 0600); }));
    EXPECT_FALSE(honoured('6', [&](const auto& file) { support::writeFile(file, "user=\"alice", 0600); })) << "torn";
    if (geteuid() == 0) {
        EXPECT_FALSE(honoured('7', [&](const auto& file) {
            support::writeFile(file, record, 0600);
            EXPECT_EQ(chown(file.c_str(), support::kAliceUid, 0), 0);
        }));
    }
    EXPECT_FALSE(honoured('8', [&](const auto& file) { fs::create_hard_link(fileOf(good), file); }));
    support::writeFile(store() + "/../outside", record, 0600);
    EXPECT_NE(request("alice", "../outside").sid, "../outside");
}

TEST_F(Session, AStoreThatOthersCouldFillIsNotUsed) {
    const std::string sid = request("alice").sid;
    ASSERT_EQ(chmod(store().c_str(), 0777), 0);
    EXPECT_FALSE(request("alice", sid).authorized);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED);
    ASSERT_EQ(chmod(store().c_str(), 0700), 0);
    fs::rename(store(), store() + "2");
    fs::create_directory_symlink("sessions2", store());
    EXPECT_FALSE(request("alice", sid).authorized);
}

TEST_F(Session, IdsAreGivenForTheSessionsOwnUser) {
    const std::string sid = request("alice").sid;
    EXPECT_EQ(VexoCgiUIDGet(sid.c_str(), "alice"), uid_t{support::kAliceUid});
    EXPECT_EQ(VexoCgiGIDGet(sid.c_str(), "alice"), gid_t{support::kUsersGid});
    const std::string ghosts = vexo::createSession("ghost", "");
    struct Case {
        const char *sid, *user;
        int code;
    };
    const std::string unknown(32, '0');
    for (const auto& [id, user, code] :
         {Case{sid.c_str(), "bob", VEXO_ERR_DENIED}, Case{unknown.c_str(), "alice", VEXO_ERR_DENIED},
          Case{"", "alice", VEXO_ERR_DENIED}, Case{"../sessions", "alice", VEXO_ERR_DENIED},
          Case{ghosts.c_str(), "ghost", VEXO_ERR_USER_MISSING}, Case{nullptr, "alice", VEXO_ERR_PARAMETER},
          Case{sid.c_str(), nullptr, VEXO_ERR_PARAMETER}, Case{sid.c_str(), "", VEXO_ERR_PARAMETER}}) {
        SCOPED_TRACE(testing::PrintToString(id) + testing::PrintToString(user));
        VLIBCErrSetEx(0, "", 0);
        EXPECT_EQ(VexoCgiUIDGet(id, user), kNoId);
        EXPECT_EQ(VLIBCErrGet(), code);
        EXPECT_EQ(VexoCgiGIDGet(id, user), kNoId);
    }
}

TEST_F(Session, TheStoreIsReachedAfterTheSwitchAndOnlyWithTheSavedIdentity) {
    SKIP_WITHOUT_ROOT();
    const std::string sid = request("alice").sid;
    support::inChild([&] {
        EXPECT_EQ(setegid(support::kUsersGid), 0);
        EXPECT_EQ(seteuid(support::kAliceUid), 0);
        EXPECT_EQ(VexoCgiUIDGet(sid.c_str(), "alice"), uid_t{support::kAliceUid});
        EXPECT_EQ(geteuid(), uid_t{support::kAliceUid});
        EXPECT_EQ(VexoCgiUIDGet(std::string(32, '0').c_str(), "alice"), kNoId);
        EXPECT_EQ(geteuid(), uid_t{support::kAliceUid}) << "back after a failure too";
        EXPECT_EQ(getegid(), gid_t{support::kUsersGid});
        EXPECT_EQ(vexo::createSession("alice", "").size(), 32U);
        return 0;
    });
    EXPECT_EQ(stored(), 2);
    for (const auto& entry : fs::directory_iterator(store())) {
        struct stat status {};
        EXPECT_EQ(lstat(entry.path().c_str(), &status), 0);
        EXPECT_EQ(status.st_uid, 0U);
        EXPECT_EQ(status.st_gid, 0U);
    }
    support::asUser(support::kAliceUid, support::kUsersGid, [&] {
        EXPECT_EQ(VexoCgiUIDGet(sid.c_str(), "alice"), kNoId) << "root's store is closed to a mere user";
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED);
        return 0;
    });
}

TEST_F(Session, WithoutRootTheStoreIsTheUsersOwn) {
    SKIP_WITHOUT_ROOT();
    const mode_t before = modeOf(systemRoot());
    ASSERT_EQ(chmod(systemRoot().c_str(), 0777), 0);
    support::asUser(support::kAliceUid, support::kUsersGid, [] {
        const Reply reply = request("bob");
        EXPECT_TRUE(reply.authorized);
        EXPECT_EQ(request("bob", reply.sid).sid, reply.sid);
        EXPECT_EQ(modeOf(store()), 0700U);
        return 0;
    });
    ASSERT_EQ(chmod(systemRoot().c_str(), before), 0);
}

TEST_F(Session, TheSweepTakesWhatEndedAndNothingElse) {
    const std::string alive = request("alice").sid;
    const std::string ended = request("bob").sid;
    setLastUse(ended, 3600);
    support::writeFile(store() + "/notes", "");
    setLastUse("notes", 3600);
    vexo::sweepSessions();
    EXPECT_TRUE(fs::exists(fileOf(alive)));
    EXPECT_FALSE(fs::exists(fileOf(ended)));
    EXPECT_TRUE(fs::exists(fileOf("notes")));
}

}  // namespace
