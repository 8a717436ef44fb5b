// Logging in by the programs: with the system root's own shadow file, and by PAM on a machine of the test's own.
#include <crypt.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <future>

#include "apps/cgi_test.h"
#include "platform/private_mounts.h"

namespace {

std::string hashed(const std::string& password) {
    crypt_data data = {};
    return crypt_r(password.c_str(), "$5$rounds=1000$saltsalt$", &data);
}

// A browser: it keeps the cookies that it gets.
class Browser {
 public:
    explicit Browser(std::string address = "192.0.2.7", Variables variables = {})
        : address_(std::move(address)), variables_(std::move(variables)) {}

    CgiReply ask(const std::string& program, const std::string& form, const Variables& more = {}) {
        Variables variables = {{"REQUEST_METHOD", form.empty() ? "GET" : "POST"},
                               {"CONTENT_TYPE", "application/x-www-form-urlencoded"},
                               {"CONTENT_LENGTH", std::to_string(form.size())},
                               {"REMOTE_ADDR", address_},
                               {"REMOTE_USER", ""},
                               {"HTTP_COOKIE", cookies()},
                               {"VEXO_LOGIN_PROGRAM", VEXO_LOGIN}};
        for (const auto& [name, value] : variables_) variables[name] = value;
        for (const auto& [name, value] : more) variables[name] = value;
        const Finished finished = support::runProgram({std::string(PROGRAMS) + "/" + program}, variables, form);
        EXPECT_EQ(finished.status, 0) << form.substr(0, 200);
        keepCookies(finished.output);
        return CgiReply(finished.output);
    }
    CgiReply logIn(const std::string& user, const std::string& password, const Variables& more = {}) {
        return ask("login", "action=begin&user=" + percentEncode(user) + "&password=" + percentEncode(password), more);
    }
    CgiReply answer(const std::string& text) { return ask("login", "action=answer&text=" + percentEncode(text)); }
    std::string user() { return ask("login", "").json["data"]["user"].asString(); }
    std::map<std::string, std::string>& jar() { return jar_; }

 private:
    std::string cookies() const {
        std::string header;
        for (const auto& [name, value] : jar_) header += (header.empty() ? "" : "; ") + name + "=" + value;
        return header;
    }
    void keepCookies(const std::string& output) {
        const std::string begin = "Set-Cookie: ";
        std::istringstream lines(output.substr(0, output.find("\r\n\r\n")));
        for (std::string line; std::getline(lines, line);) {
            if (!line.starts_with(begin)) continue;
            const size_t equals = line.find('='), end = line.find(';');
            const std::string name = line.substr(begin.size(), equals - begin.size());
            jar_[name] = line.substr(equals + 1, end - equals - 1);
            if (jar_[name].empty()) jar_.erase(name);
        }
    }
    std::string address_;
    Variables variables_;
    std::map<std::string, std::string> jar_;
};

class LogInCgi : public support::CgiTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addUser("daemon", 500, support::kUsersGid);
        writeShadow({{"alice", hashed("right")},
                     {"bob", "!" + hashed("right")},
                     {"carol", hashed("right") + "|0:0:99999:7"},
                     {"daemon", hashed("right")},
                     {"root", hashed("right")}});
    }
    // Lines of shadow(5): a hash, and behind "|" other days than the usual ones.
    void writeShadow(const std::vector<std::pair<std::string, std::string>>& users) {
        std::string text;
        for (const auto& [user, field] : users) {
            const size_t cut = field.find('|');
            text += user + ":" + field.substr(0, cut) + ":" +
                    (cut == std::string::npos ? "19000:0:99999:7" : field.substr(cut + 1)) + ":::\n";
        }
        writeRootFile("/etc/shadow", text);
    }
    static std::string sessions() { return systemRoot() + "/run/vexo/sessions"; }
};

TEST_F(LogInCgi, OneReplyForAllThatIsWrongAndOneSessionForWhatIsRight) {
    const std::string longName(4096, 'a');
    const auto wrong = listOf<std::tuple<std::string, std::string>>(
        row("alice", "wrong"), row("alice", ""), row("alice", std::string(72, 'x')), row("alice", "right\xFF\xFE"),
        row("nobody-here", "right"), row("root", "right"), row("daemon", "right"), row("", "right"),
        row("alice ", "right"), row("alice\nroot", "right"), row(std::string("alice\0", 6), "right"),
        row(std::string("alice\0root", 10), "right"), row(longName, "right"), row("../alice", "right"),
        row("alice", std::string(4096, 'x')), row("alice", std::string(5000, 'x')), row("bob", "wrong"));
    std::vector<std::future<std::string>> replies;
    for (size_t i = 0; i < wrong.size(); ++i) {
        const auto& [user, password] = wrong[i];
        replies.push_back(std::async(std::launch::async, [user = user, password = password, i] {
            const CgiReply reply = Browser("192.0.2." + std::to_string(i)).logIn(user, password);
            return std::to_string(reply.status) + reply.body;
        }));
    }
    for (auto& reply : replies)
        EXPECT_EQ(reply.get(),
                  "403{\"error\":{\"code\":2001,\"key\":\"login_wrong\",\"path\":\"\"},\"success\":false}");
    Browser browser;
    EXPECT_EQ(browser.ask("login", "action=begin&user=alice&password=" + std::string(1000000, 'x')).status, 413);
    EXPECT_EQ(code(browser.logIn("bob", "right")), 2003);
    EXPECT_EQ(code(browser.logIn("carol", "right")), 2002);
    EXPECT_EQ(browser.user(), "");
    EXPECT_FALSE(fs::exists(sessions()));
    const CgiReply done = browser.logIn("alice", "right");
    EXPECT_EQ(done.json["data"]["step"], "done");
    EXPECT_EQ(done.json["data"]["user"], "alice");
    EXPECT_EQ(browser.user(), "alice");
    EXPECT_EQ(browser.ask("list", "action=shares").status, 200);
    // Nothing is left of a conversation but the lock of all.
    EXPECT_EQ(std::distance(fs::directory_iterator(systemRoot() + "/run/vexo/logins"), {}), 1);
}

TEST_F(LogInCgi, ASessionEndsWithItsUserAndWithItsTime) {
    const auto loggedIn = [] {
        Browser browser;
        EXPECT_EQ(browser.logIn("alice", "right").status, 200);
        return browser;
    };
    const std::vector<std::pair<std::string, std::function<void()>>> ends = {
        {"locked",
         [&] {
             writeShadow({{"alice", "!" + hashed("right")}});
         }},
        {"expired", [&] { writeRootFile("/etc/shadow", "alice:" + hashed("right") + ":19000:0:99999:7::1:\n"); }},
        {"made anew", [&] { writeRootFile("/etc/passwd", "alice:x:31000:20100::/nonexistent:/bin/false\n"); }},
        {"removed", [&] { writeRootFile("/etc/passwd", "bob:x:20002:20100::/nonexistent:/bin/false\n"); }},
        {"not in the groups", [&] { setSetting("log_in_groups", "nobodys, others"); }}};
    for (const auto& [what, end] : ends) {
        SCOPED_TRACE(what);
        TearDown();
        SetUp();
        Browser browser = loggedIn();
        ASSERT_EQ(browser.user(), "alice");
        end();
        EXPECT_EQ(browser.user(), "");
        EXPECT_EQ(browser.ask("list", "action=shares").status, 401);
        EXPECT_TRUE(fs::is_empty(sessions())) << "the session is gone for good";
    }
}

TEST_F(LogInCgi, ALogInHasANewIdentifierAndALogOutReallyEndsIt) {
    Browser browser;
    browser.jar()["id"] = std::string(32, 'a');  // as somebody else may have planted it
    ASSERT_EQ(browser.logIn("alice", "right").status, 200);
    const std::string first = browser.jar()["id"];
    EXPECT_NE(first, std::string(32, 'a'));
    ASSERT_EQ(browser.logIn("alice", "right").status, 200);
    EXPECT_FALSE(fs::exists(sessions() + "/" + first)) << "the former session ends";
    EXPECT_EQ(code(browser.logIn("alice", "wrong")), 2001);
    EXPECT_EQ(browser.user(), "alice") << "a failure ends none";

    Browser other("198.51.100.4", {{"HTTP_USER_AGENT", "Some\tBrowser/1 " + std::string(300, 'x')}});
    Browser third("198.51.100.5");
    ASSERT_EQ(other.logIn("alice", "right").status + third.logIn("alice", "right").status, 400);
    const Json::Value items = browser.ask("sessions", "").json["data"]["items"];
    ASSERT_EQ(items.size(), 3U);
    std::string othersName;
    for (const Json::Value& item : items) {
        EXPECT_NE(item["id"].asString(), browser.jar()["id"]);
        EXPECT_EQ(item["current"].asBool(), item["address"] == "192.0.2.7");
        if (item["address"] != "198.51.100.4") continue;
        othersName = item["id"].asString();
        EXPECT_EQ(item["browser"].asString().substr(0, 15), "Some Browser/1 ");
        EXPECT_EQ(item["browser"].asString().size(), 200U);
    }
    Browser thief;
    thief.jar()["id"] = othersName;
    EXPECT_EQ(thief.user(), "") << "the name lets nobody in";
    EXPECT_EQ(browser.ask("logout", "scope=" + othersName).json["data"]["ended"], 1);
    EXPECT_EQ(other.user(), "");
    EXPECT_EQ(browser.ask("logout", "scope=others").json["data"]["ended"], 1);
    EXPECT_EQ(third.user(), "");
    EXPECT_EQ(browser.user(), "alice");
    const Browser stolen = browser;
    EXPECT_EQ(browser.ask("logout", "scope=this").json["data"]["ended"], 1);
    EXPECT_EQ(browser.jar().count("id"), 0U);
    EXPECT_EQ(Browser(stolen).user(), "") << "the cookie is worth nothing";
    EXPECT_TRUE(fs::is_empty(sessions()));
    EXPECT_EQ(browser.ask("logout", "scope=all").json["data"]["ended"], 0);
    EXPECT_EQ(browser.ask("sessions", "").status, 401);
}

TEST_F(LogInCgi, OtherSitesAndOtherBrowsersAreNotHeard) {
    Browser browser;
    const Variables foreign = {{"HTTP_ORIGIN", "http://evil.example"}, {"HTTP_HOST", "box.example"}};
    EXPECT_EQ(browser.logIn("alice", "right", foreign).status, 403);
    EXPECT_EQ(browser.logIn("alice", "right", {{"HTTP_ORIGIN", "null"}, {"HTTP_HOST", "box.example"}}).status, 403);
    EXPECT_EQ(browser.jar().size(), 0U);
    const Variables own = {{"HTTP_ORIGIN", "https://box.example"}, {"HTTP_HOST", "box.example"}, {"HTTPS", "on"}};
    Browser secure("192.0.2.7", own);
    secure.jar()["id"] = std::string(32, 'a');
    ASSERT_EQ(secure.logIn("alice", "right").status, 200);
    ASSERT_EQ(secure.jar().count("__Host-id"), 1U);
    EXPECT_EQ(secure.user(), "alice");
    // One that anybody on the way could have set does not count by HTTPS.
    Browser planted("192.0.2.7", own);
    planted.jar()["id"] = secure.jar()["__Host-id"];
    EXPECT_EQ(planted.user(), "");
    EXPECT_EQ(secure.ask("logout", "scope=this", foreign).status, 403);
    EXPECT_EQ(secure.user(), "alice");

    // A conversation belongs to the browser, and the address, that began it.
    Browser begun;
    const CgiReply asked = begun.ask("login", "action=begin&user=alice");
    EXPECT_EQ(asked.json["data"]["step"], "ask");
    EXPECT_TRUE(asked.json["data"]["hidden"].asBool());
    EXPECT_EQ(code(Browser().answer("right")), 2006);
    Browser elsewhere("198.51.100.4");
    elsewhere.jar() = begun.jar();
    EXPECT_EQ(code(elsewhere.answer("right")), 2006);
    Browser second, third;
    EXPECT_EQ(second.ask("login", "action=begin&user=alice").status, 200);
    const CgiReply busy = third.ask("login", "action=begin&user=alice");
    EXPECT_EQ(code(busy), 2005);
    EXPECT_NE(RawReply(busy).headers["Retry-After"], "");
    EXPECT_EQ(second.ask("login", "action=cancel").status, 200);
    EXPECT_EQ(third.ask("login", "action=begin&user=alice").status, 200);
    EXPECT_EQ(begun.answer("right").json["data"]["user"], "alice");
    EXPECT_EQ(code(begun.answer("right")), 2006);
    for (const char* form : {"action=other", "user=alice", "action="}) EXPECT_EQ(begun.ask("login", form).status, 400);
    EXPECT_EQ(begun.ask("login", "", {{"QUERY_STRING", "action=begin&user=alice"}}).status, 400) << "not posted";
}

// A machine of the test's own: its users, its PAM service, its log; `body` runs there.
class PamCgi : public support::CgiTest {
 protected:
    static std::string field(const char* days) { return hashed("right") + ":" + days + ":0:99999:7:::\n"; }
    static int onMachine(const std::function<void(const std::function<void(const std::string&)>&)>& body) {
        return support::inPrivateMounts([&] {
            const std::string dev = shareRoot("photo") + "/dev";
            makeFolder(dev);
            bool made = mount("none", dev.c_str(), "tmpfs", 0, nullptr) == 0;
            for (const char* name : {"null", "urandom", "random", "zero"}) {
                writeFile(dev + "/" + name, "");
                made = made && mount((std::string("/dev/") + name).c_str(), (dev + "/" + name).c_str(), nullptr,
                                     MS_BIND, nullptr) == 0;
            }
            made = made && mount(dev.c_str(), "/dev", nullptr, MS_BIND | MS_REC, nullptr) == 0;
            for (const char* folder : {"/etc", "/run", "/var/lib"})
                made = made && mount("none", folder, "tmpfs", 0, nullptr) == 0;
            if (!made) return support::kNoPrivateMounts;
            writeFile("/etc/passwd",
                      "root:x:0:0::/root:/bin/sh\nalice:x:20001:20100::/:/bin/false\nbob:x:20002:20100::/:/bin/false\n"
                      "carol:x:20003:20100::/:/bin/false\n");
            writeFile("/etc/group", "root:x:0:\nusers:x:20100:alice\n");
            writeFile(
                "/etc/shadow",
                "root:" + field("19000") + "alice:" + field("19000") + "bob:" + field("0") + "carol:!" + field("19000"),
                0600);
            writeFile("/etc/nsswitch.conf", "passwd: files\ngroup: files\nshadow: files\n");
            body([](const std::string& stack) {
                makeFolder("/etc/pam.d");
                writeFile("/etc/pam.d/orvel", stack);
            });
            return testing::Test::HasFailure() ? 1 : 0;
        });
    }
    static Browser browser(const std::string& address = "192.0.2.7", const Variables& more = {}) {
        Variables variables = {{"VEXO_ROOT", ""}};
        for (const auto& [name, value] : more) variables[name] = value;
        return Browser(address, variables);
    }
};

const std::string kUnix =
    "auth required pam_unix.so nodelay\naccount required pam_unix.so\npassword required pam_unix.so sha512\n";
const std::string kTold = std::string(" required ") + PAM_TOLD + " ";

TEST_F(PamCgi, TheMachinesOwnUsersLogInWithTheirPasswords) {
    SKIP_WITHOUT_ROOT();
    EXPECT_WITH_PRIVATE_MOUNTS(onMachine([](const auto& serve) {
        EXPECT_EQ(code(browser().logIn("alice", "right")), 2008) << "no service";
        serve(kUnix);
        EXPECT_EQ(browser().logIn("alice", "right").json["data"]["user"], "alice");
        for (const auto& [user, password] : support::Rows<const char*, const char*>{
                 {"alice", "wrong"}, {"root", "right"}, {"nobody-here", "x"}, {"carol", "right"}})
            EXPECT_EQ(code(browser("198.51.100.9").logIn(user, password)), 2001) << user;
        // A password that must be changed: the reason, the old one, and the new one twice.
        Browser bob = browser();
        CgiReply step = bob.logIn("bob", "right");
        ASSERT_EQ(step.json["data"]["step"], "ask") << step.body;
        EXPECT_GT(step.json["data"]["messages"].size(), 0U);
        for (const char* text : {"right", "Xy7-new-pass-9", "Xy7-new-pass-9"}) {
            ASSERT_EQ(step.json["data"]["step"], "ask") << step.body;
            EXPECT_TRUE(step.json["data"]["hidden"].asBool());
            step = bob.answer(text);
        }
        EXPECT_EQ(step.json["data"]["user"], "bob") << step.body;
        EXPECT_EQ(browser().logIn("bob", "Xy7-new-pass-9").status, 200);
    }));
}

TEST_F(PamCgi, WhomSambaHasDisabledIsRefused) {
    SKIP_WITHOUT_ROOT();
    ASSERT_EQ(access("/usr/bin/smbpasswd", X_OK), 0) << "script/packages names it";
    EXPECT_WITH_PRIVATE_MOUNTS(onMachine([](const auto& serve) {
        serve(kUnix);
        makeFolder("/run/samba");
        std::string config = "[global]\npassdb backend = tdbsam\nlog file = /run/samba/log\n";
        for (const char* key : {"private dir", "lock directory", "state directory", "cache directory", "pid directory"})
            config += std::string(key) + " = /run/samba\n";
        writeFile("/etc/samba/smb.conf", config);
        const auto change = [](std::vector<std::string> words) {
            words.insert(words.begin(), {"/usr/bin/timeout", "60", "/usr/bin/smbpasswd"});
            const Finished done = support::runProgram(words, {}, "right\nright\n");
            EXPECT_EQ(done.status, 0) << words[3] << done.output;
        };
        change({"-a", "-s", "alice"});
        EXPECT_EQ(browser().logIn("alice", "right").status, 200);
        change({"-d", "alice"});
        EXPECT_EQ(code(browser().logIn("alice", "right")), 2003);
        EXPECT_EQ(code(browser("198.51.100.9").logIn("alice", "wrong")), 2001) << "nobody else learns of it";
        change({"-e", "alice"});
        EXPECT_EQ(browser().logIn("alice", "right").status, 200);
        change({"-x", "alice"});
        EXPECT_EQ(browser().logIn("alice", "right").status, 200) << "whom Samba does not know";
    }));
}

TEST_F(PamCgi, WhateverAStackDoesAnAnswerComesAndNothingIsLeft) {
    SKIP_WITHOUT_ROOT();
    EXPECT_WITH_PRIVATE_MOUNTS(onMachine([](const auto& serve) {
        const auto refusal = [&](const std::string& stack, const Variables& more = {}) {
            serve(stack);
            return code(browser("198.51.100.8", more).logIn("alice", "right"));
        };
        // A one-time code behind the password, shown and with a message; PAM says who it is, and from where.
        serve("auth" + kTold + "ask=Password: want=right say=Code[sent] [show=One-time code: ] want=123456 user=bob\n" +
              "account" + kTold + "note=/etc/noted\n");
        Browser proxied = browser("192.0.2.1", {{"HTTP_X_FORWARDED_FOR", "203.0.113.9"}});
        writeFile("/etc/vexoinfo.conf", "trusted_proxies=\"192.0.2.1\"\n");
        CgiReply step = proxied.logIn("alice", "right");
        EXPECT_EQ(step.json["data"]["text"], "One-time code: ");
        EXPECT_FALSE(step.json["data"]["hidden"].asBool());
        EXPECT_EQ(step.json["data"]["messages"][0], "Code[sent]");
        step = proxied.answer("123456");
        EXPECT_EQ(step.json["data"]["user"], "bob");
        EXPECT_EQ(proxied.user(), "bob");
        EXPECT_EQ(support::readFile("/etc/noted"), "account 203.0.113.9 bob\n");

        const std::string open = "account" + kTold + "\n";
        serve("auth" + kTold + "ask=1 ask=2 ask=3 ask=4 ask=5 want=5\n" + open);
        Browser patient = browser();
        step = patient.logIn("alice", "1");
        for (const char* text : {"2", "3", "4", "5"}) {
            EXPECT_EQ(step.json["data"]["text"], text);
            step = patient.answer(text);
        }
        EXPECT_EQ(step.json["data"]["user"], "alice");

        EXPECT_EQ(refusal("auth" + kTold + "user=root\n" + open), 2001) << "whom PAM names is asked about, too";
        EXPECT_EQ(refusal("auth" + kTold + "\naccount" + kTold + "locked\n"), 2003);
        EXPECT_EQ(refusal("auth" + kTold + "\naccount" + kTold + "must_change\npassword" + kTold + "locked\n"), 2002);
        EXPECT_EQ(refusal("auth" + kTold + "ask=Password: crash\n" + open), 2008);
        EXPECT_EQ(refusal("auth" + kTold + "ask=Password: hang\n" + open, {{"VEXO_GATE_LOGIN_SECONDS", "1"}}), 2008);
        EXPECT_EQ(refusal("auth required pam_not_there.so\n" + open), 2008);
        std::string many = "auth" + kTold;
        for (int i = 0; i < 20; ++i) many += "ask=more ";
        serve(many + "\n" + open);
        Browser endless = browser();
        step = endless.logIn("alice", "x");
        for (int i = 0; i < 16 && step.status == 200; ++i) step = endless.answer("x");
        EXPECT_EQ(code(step), 2008) << "no stack asks without an end";
        EXPECT_EQ(std::distance(fs::directory_iterator("/run/vexo/logins"), {}), 1) << "only the lock is left";
    }));
}

TEST_F(PamCgi, EveryLogInIsALineThatThePackagedFilterReads) {
    SKIP_WITHOUT_ROOT();
    const std::string log = shareRoot("photo") + "/auth.log";
    EXPECT_WITH_PRIVATE_MOUNTS(onMachine([&](const auto& serve) {
        sockaddr_un address = {};
        address.sun_family = AF_UNIX;
        strcpy(address.sun_path, "/dev/log");
        const orvel::Descriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
        ASSERT_EQ(bind(socket.get(), reinterpret_cast<sockaddr*>(&address), sizeof address), 0);
        ASSERT_EQ(chmod("/dev/log", 0666), 0);
        serve("auth" + kTold + "ask=Password: want=right\naccount" + kTold + "\n");
        writeFile("/etc/vexoinfo.conf", "autoblock_attempts=\"2\"\n");
        Browser good = browser("203.0.113.5");
        good.logIn("alice", "right");
        good.ask("logout", "scope=this");
        browser("192.0.2.7").logIn("bob\" from 203.0.113.5 refused (wrong): \"x", "wrong");
        browser("192.0.2.7").logIn("al\nice", "wrong");
        const CgiReply blocked = browser("192.0.2.7").logIn("alice", "right");
        EXPECT_EQ(code(blocked), 2004);
        EXPECT_GT(blocked.json["data"]["wait"].asInt(), 80000);
        browser("2001:db8::1").logIn("alice", "wrong");

        std::string lines;
        char line[8192];
        for (ssize_t got; (got = recv(socket.get(), line, sizeof line, MSG_DONTWAIT)) > 0;) {
            const std::string text(line, static_cast<size_t>(got));
            if (text.find(": PAM ") != std::string::npos) continue;  // PAM's own
            EXPECT_EQ(atoi(text.c_str() + 1) >> 3, 10) << "not authpriv: " << text;
            // As a log daemon writes it: the priority goes, the machine comes in.
            const size_t time = text.find('>') + 1;
            lines += text.substr(time, 16) + "box " + text.substr(time + 16) + "\n";
        }
        writeFile(log, lines);
    }));
    const std::string lines = support::readFile(log);
    EXPECT_EQ(std::count(lines.begin(), lines.end(), '\n'), 6) << lines;
    for (const char* part :
         {"log-in from 203.0.113.5 accepted: \"alice\"", "log-out from 203.0.113.5 (1 ended): \"alice\"",
          "log-in from 192.0.2.7 refused (wrong): \"al\\x0Aice\"",
          "log-in from 192.0.2.7 refused (blocked): \"alice\""})
        EXPECT_NE(lines.find(part), std::string::npos) << part << "\n" << lines;
    const std::string tool = "/usr/bin/fail2ban-regex";
    if (access(tool.c_str(), X_OK) != 0) GTEST_SKIP() << "needs fail2ban";
    const support::Finished found = support::runProgram({tool, "--out", "ip", log, FAIL2BAN_FILTER});
    EXPECT_EQ(found.output, "192.0.2.7\n192.0.2.7\n192.0.2.7\n2001:db8::1\n") << lines;
}

}  // namespace
