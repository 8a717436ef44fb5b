// The program share as a web server runs it: who is let in, whose password is judged when. The time of guesses stands
// where a test puts it.
#include "apps/cgi_test.h"
#include "public_link.h"
#include "support/race.h"
#include "vexo/guess.h"

namespace {

using orvel::cgi::Link;
using orvel::cgi::LinkStore;

constexpr const char* kPassword = "pass word";

class ShareCgi : public CgiTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        SKIP_WITHOUT_ROOT();
        makeFolder(systemRoot() + "/tmp", 01777);
        makeFolder(shareRoot("photo") + "/shared/inner", 0777);
        writeFile(shareRoot("photo") + "/shared/inner/two.txt", "two");
        setSetting("trusted_proxies", "127.0.0.1, 10.0.0.1");
        free_ = addLink("alice", kAliceUid, "");
        guarded_ = addLink("alice", kAliceUid, kPassword);
    }
    static std::string addLink(const std::string& owner, uid_t uid, const std::string& password,
                               const std::string& path = "/photo/shared") {
        Link link;
        link.owner = owner;
        link.uid = uid;
        link.path = path;
        if (!password.empty()) link.passwordHash = orvel::cgi::hashPassword(password);
        LinkStore store;
        EXPECT_TRUE(store.add(link)) << store.error();
        return link.id;
    }
    std::string ask(const std::string& link, const std::string& query, const std::string& method = "GET",
                    const std::string& form = "") {
        const Variables more = {{"HTTP_X_FORWARDED_FOR", visitor_},
                                {"HTTP_COOKIE", cookies_},
                                {"HTTP_FOLDER_SHARING", link},
                                {"CONTENT_TYPE", form.empty() ? "" : "application/x-www-form-urlencoded"},
                                {"VEXO_GATE_MILLISECONDS", std::to_string(now_)}};
        return runCgi(PROGRAM_SHARE, "", method, query, form, more);
    }
    int status(const std::string& link, const std::string& action) {
        return CgiReply(ask(link, "action=" + action)).status;
    }
    CgiReply enter(const std::string& password, const std::string& turn = "") {
        const std::string form = "action=login&password=" + percentEncode(password) + "&turn=" + turn;
        last_ = ask(guarded_, "", "POST", form);
        return CgiReply(last_);
    }
    // The cookies that the last log-in set, as the visitor sends them.
    [[nodiscard]] std::string given() const {
        std::string cookies;
        std::istringstream lines(last_);
        for (std::string line; std::getline(lines, line);) {
            if (line.starts_with("Set-Cookie: ")) cookies += line.substr(12, line.find(';') - 11) + " ";
        }
        return cookies;
    }
    [[nodiscard]] std::string records() const { return systemRoot() + "/tmp/foldersharing.current.users"; }

    std::string free_, guarded_, cookies_, visitor_ = "192.0.2.1", last_;
    long long now_ = 1000000;
};

TEST_F(ShareCgi, NothingIsRecordedOfVisitorsWhoNeedNoPassword) {
    cookies_ = free_ + "=made-up; " + free_ + "-seal=made-up";
    for (const char* method : {"GET", "HEAD"}) EXPECT_EQ(RawReply(ask(free_, "", method)).status, 200);
    EXPECT_TRUE(CgiReply(ask(free_, "action=state")).json["data"]["logged_in"].asBool());
    EXPECT_EQ(status(free_, "list"), 200);
    const std::string reply = ask(free_, "action=login", "POST");
    EXPECT_EQ(CgiReply(reply).status, 200);
    EXPECT_EQ(reply.find("Set-Cookie"), std::string::npos);
    EXPECT_EQ(RawReply(ask(guarded_, "", "HEAD")).status, 200);
    EXPECT_FALSE(fs::exists(records()));
    EXPECT_FALSE(fs::exists(systemRoot() + "/run/vexo/guesses"));
}

TEST_F(ShareCgi, PasswordsAreJudgedInTurn) {
    EXPECT_EQ(enter("wrong").status, 403);
    visitor_ = "192.0.2.99, 192.0.2.1";  // what the visitor wrote, then what the proxy saw
    const CgiReply again = enter(kPassword);
    EXPECT_EQ(again.status, 429);
    EXPECT_EQ(again.headers.at("Retry-After"), "2");
    EXPECT_EQ(again.json["error"]["code"], ORV_ERR_BUSY);
    EXPECT_EQ(again.json["data"]["wait"], 2000);
    EXPECT_EQ(again.json["data"]["turn"], "") << "its own pace, not a place in the order";
    visitor_ = "192.0.2.2";
    const CgiReply turn = enter(kPassword);
    EXPECT_EQ(turn.status, 429);
    EXPECT_EQ(turn.headers.at("Retry-After"), "1");
    EXPECT_EQ(turn.json["data"]["wait"], 200);
    EXPECT_EQ(status(free_, "list"), 200) << "other links are not concerned";
    now_ += 200;
    EXPECT_EQ(enter(kPassword).status, 429) << "somebody else at this address";
    EXPECT_EQ(enter(kPassword, turn.json["data"]["turn"].asString()).status, 200);
    EXPECT_EQ(status(guarded_, "list"), 401);
    cookies_ = given();
    EXPECT_EQ(status(guarded_, "list"), 200);
    EXPECT_EQ(enter("anything").status, 200) << "is in";
    visitor_ = "192.0.2.3";
    EXPECT_EQ(status(guarded_, "list"), 401) << "a session belongs to its address";
    EXPECT_EQ(enter(kPassword).status, 200) << "but whoever has known the password passes by the order";
}

TEST_F(ShareCgi, ACookieThatNoLogInGaveIsAFailedGuess) {
    EXPECT_EQ(enter(kPassword).status, 200);
    const std::string whole = given();
    const size_t seal = whole.find(guarded_ + "-seal=") + guarded_.size() + 6;
    cookies_ = whole;
    EXPECT_EQ(status(guarded_, "list"), 200);
    cookies_ = whole.substr(0, whole.find(' '));
    EXPECT_EQ(status(guarded_, "list"), 401) << "the session's identifier alone, which could be guessed";
    cookies_ = whole;
    cookies_[seal] = cookies_[seal] == '0' ? '1' : '0';
    const CgiReply refused(ask(guarded_, "action=list"));
    EXPECT_EQ(refused.status, 401);
    EXPECT_TRUE(refused.headers.at("Set-Cookie").starts_with(guarded_ + "-seal=; ")) << "it goes, or would count again";
    cookies_ = "";
    EXPECT_EQ(enter(kPassword).json["data"]["wait"], 2000);
    writeFile(systemRoot() + "/run/vexo/guesses", "", 0622);
    cookies_ = whole;
    EXPECT_EQ(status(guarded_, "list"), 500) << "neither in nor out";
    EXPECT_EQ(enter(kPassword).status, 500);
}

TEST_F(ShareCgi, RecordsOfAnySizeAreSweptAndShutNobodyOut) {
    std::string stale;
    while (stale.size() < (17U << 20))
        stale += "10.0.0.5,alice,stale" + std::to_string(stale.size()) + ",1,0,1,0,link\n";
    writeFile(records(), stale, 0600);
    EXPECT_EQ(enter(kPassword).status, 200);
    EXPECT_LT(fs::file_size(records()), 200U);
    writeFile(records(), readFile(records()) + stale, 0600);
    cookies_ = given();
    EXPECT_EQ(status(guarded_, "list"), 200);
    EXPECT_LT(fs::file_size(records()), 200U);
}

TEST_F(ShareCgi, LinksOfOwnersWhoCannotShowThemAreMissing) {
    const std::string longName(64, 'n');
    addUser(longName, 20064, kUsersGid);
    guarded_ = addLink(longName, 20064, kPassword);
    EXPECT_EQ(enter(kPassword).status, 200);
    cookies_ = given();
    EXPECT_EQ(status(guarded_, "list"), 200) << "the library keeps 63 bytes of a name";
    const std::string applications = "/etc/vexo/applications";
    writeRootFile(applications, "VEXO.QDS.App.Quorvane3.Instance: bob\n");
    EXPECT_EQ(status(free_, "state"), 404) << "its owner may no longer use the file manager";
    fs::remove(systemRoot() + applications);
    makeFolder(systemRoot() + applications);
    EXPECT_EQ(status(free_, "state"), 500) << "could not be determined";
    fs::remove(systemRoot() + applications);
    EXPECT_EQ(status(free_, "state"), 200);
}

TEST_F(ShareCgi, WhatWasDeletedIsNotShown) {
    for (const char* folder : {"/#recycle", "/shared/#recycle"}) {
        makeFolder(shareRoot("photo") + folder, 0777);
        writeFile(shareRoot("photo") + folder + "/gone.txt", "deleted");
    }
    const std::string whole = addLink("alice", kAliceUid, "", "/photo");
    const std::string listing = ask(whole, "action=list");
    EXPECT_EQ(listing.find("recycle"), std::string::npos) << listing;
    EXPECT_NE(listing.find("\"total\":1,"), std::string::npos) << listing;
    for (const auto& [link, query, packed] : Rows<std::string, const char*, int>{
             row(whole, "", 1), row(whole, "&path=/%23recycle", 0), row(whole, "&path=/%23recycle/gone.txt", 0),
             row(whole, "&path=/shared/%23recycle", 1),  // a folder that is only called so
             row(addLink("alice", kAliceUid, "", "/photo/#recycle"), "", 0)}) {
        const std::string reply = ask(link, std::string("action=download") + query);
        EXPECT_EQ(RawReply(reply).status, packed != 0 ? 200 : 404) << query;
        int members = 0;  // each stands twice, the second time in the zip's own list
        for (size_t at = 0; (at = reply.find("gone.txt", at)) != std::string::npos; ++at) ++members;
        EXPECT_EQ(packed != 0 ? members : 0, 2 * packed) << query;
    }
}

TEST_F(ShareCgi, APathNamedAgainAndAgainIsPackedOnce) {
    std::string query = "action=download&path=inner/two.txt";
    for (const char* spelling : {"inner", "inner", "/inner", "inner/", "./inner", "inner/."})
        query += std::string("&path=") + spelling;
    const std::string zip = RawReply(ask(free_, query)).body;
    size_t packed = 0;
    for (size_t at = zip.find("PK\3\4"); at != std::string::npos; at = zip.find("PK\3\4", at + 1)) ++packed;
    EXPECT_EQ(packed, 3U) << "the file, the folder and the file in it";
    for (int i = 0; i < 500; ++i) query += "&path=inner";
    EXPECT_EQ(CgiReply(ask(free_, query)).status, 400);
}

TEST_F(ShareCgi, WhatCannotBePublished) {
    ASSERT_EQ(mkfifo((shareRoot("photo") + "/pipe").c_str(), 0666), 0);
    for (const auto& [path, dates, expected] : Rows<const char*, const char*, int>{
             row("/photo/pipe", "", ORV_ERR_DENIED),
             row("/photo/shared", "&available=5&expires=9223372036854775807", ORV_ERR_PARAMETER),
             row("/photo/shared", "&expires=9223372036854775808", ORV_ERR_PARAMETER),
             row("/photo/shared", "&available=9223372036854775808&expires=5", ORV_ERR_PARAMETER),
             row("/photo/shared", "&available=5&expires=9223372036854689407", 0)}) {
        const std::string form = std::string("action=create&path=") + path + dates;
        EXPECT_EQ(code(post(PROGRAM_LINK, "alice", form)), expected) << form;
    }
}

TEST_F(ShareCgi, DownloadsAreCountedAndLimited) {
    const auto made = [](const char* terms) {
        return post(PROGRAM_LINK, "alice", std::string("action=create&path=/photo/shared") + terms)
            .json["data"]["id"]
            .asString();
    };
    const auto shown = [](const std::string& id) {
        const Json::Value items = get(PROGRAM_LINK, "alice", "action=list").json["data"]["items"];
        for (const Json::Value& link : items)
            if (link["id"] == id) return link;
        return Json::Value();
    };
    const auto take = [this](const std::string& link, const std::string& more, const Variables& headers = {}) {
        Variables all = {{"HTTP_X_FORWARDED_FOR", visitor_}, {"HTTP_FOLDER_SHARING", link}};
        all.insert(headers.begin(), headers.end());
        return RawReply(runCgi(PROGRAM_SHARE, "", "GET", "action=download" + more, "", all)).status;
    };
    const std::string file = "&path=inner/two.txt";
    const std::string open = made("");
    EXPECT_EQ(take(open, file + "&look=1"), 200);
    EXPECT_EQ(shown(open)["used"], 0) << "the page shows it";
    EXPECT_EQ(take(open, file), 200);
    EXPECT_EQ(take(open, file, {{"HTTP_RANGE", "bytes=1-"}}), 206);
    EXPECT_EQ(take(open, file, {{"HTTP_IF_NONE_MATCH", "*"}}), 304);
    EXPECT_EQ(take(open, "&path=missing"), 404);
    EXPECT_EQ(shown(open)["used"], 1);
    EXPECT_GT(shown(open)["last_use"].asInt64(), 0);

    const std::string three = made("&downloads=3&note=for%20Ann");
    EXPECT_EQ(shown(three)["note"], "for Ann");
    EXPECT_EQ(countAtOnce(12, [&] { return take(three, file) == 200; }), 3) << "many at once";
    EXPECT_EQ(shown(three)["used"], 3);
    EXPECT_EQ(take(three, ""), 410) << "a zip";
    EXPECT_EQ(take(three, file, {{"HTTP_RANGE", "bytes=1-"}}), 206) << "the rest of what was begun";
    visitor_ = "192.0.2.7";
    EXPECT_EQ(take(three, file, {{"HTTP_RANGE", "bytes=1-"}}), 410) << "somebody else has begun nothing";
    const RawReply page(ask(three, ""));
    EXPECT_EQ(page.status, 410);
    EXPECT_NE(page.body.find("used up"), std::string::npos) << page.body;
    EXPECT_EQ(CgiReply(ask(three, "action=state")).json["data"]["downloads_left"], 0);

    const std::string one = made("&downloads=1");
    EXPECT_EQ(countAtOnce(6,
                          [&] {
                              return take(one, file, {{"HTTP_RANGE", "bytes=0-0"}}) == 206;
                          }),
              6)
        << "one, in parts";
    EXPECT_EQ(take(one, file + "&look=1"), 410) << "whoever sees it has it";
    EXPECT_EQ(post(PROGRAM_LINK, "alice", "action=change&downloads=2&id=" + one).status, 200);
    EXPECT_EQ(take(one, file), 200);
    EXPECT_EQ(post(PROGRAM_LINK, "alice", "action=revoke&id=" + one).status, 200);
    EXPECT_EQ(take(one, file), 404);
}

TEST_F(ShareCgi, ALinkIsChangedInPlace) {
    EXPECT_EQ(enter(kPassword).status, 200);
    cookies_ = given();
    EXPECT_EQ(status(guarded_, "list"), 200);
    const std::string change = "action=change&id=" + guarded_;
    const std::string tooLong(401, 'n');
    for (const auto& [user, terms, expected] : Rows<const char*, std::string, int>{
             row("bob", "&password=mine", ORV_ERR_MISSING), row("alice", "&available=5", ORV_ERR_PARAMETER),
             row("alice", "&expires=x", ORV_ERR_PARAMETER), row("alice", "&note=" + tooLong, ORV_ERR_PARAMETER),
             row("alice", "&note=%0A", ORV_ERR_PARAMETER), row("alice", "&downloads=1000001", ORV_ERR_PARAMETER),
             row("alice", "&password=" + std::string(512, 'p'), ORV_ERR_PARAMETER)}) {
        EXPECT_EQ(code(post(PROGRAM_LINK, user, change + terms)), expected) << terms;
    }
    EXPECT_EQ(code(get(PROGRAM_LINK, "alice", change)), ORV_ERR_PARAMETER) << "not posted";
    EXPECT_EQ(status(guarded_, "list"), 200) << "nothing changed";
    const CgiReply changed = post(PROGRAM_LINK, "alice", change + "&note=n&expires=4102444799");
    EXPECT_TRUE(changed.json["data"]["has_password"].asBool()) << "not named, not changed";
    EXPECT_EQ(changed.json["data"]["expires"], Json::Int64(4102444799));
    EXPECT_EQ(status(guarded_, "list"), 200) << "and nobody is logged out";
    post(PROGRAM_LINK, "alice", change + "&password=other");
    EXPECT_EQ(status(guarded_, "list"), 401) << "the old password's log-ins are over";
    post(PROGRAM_LINK, "alice", change + "&password=");
    EXPECT_EQ(status(guarded_, "list"), 200) << "open to all";
    post(PROGRAM_LINK, "alice", change + "&expires=172799");
    EXPECT_EQ(status(guarded_, "list"), 404) << "its time is over";

    const std::string inner = addLink("alice", kAliceUid, "", "/photo/shared/inner");
    const auto named = [](const std::string& query) {
        return each(get(PROGRAM_LINK, "alice", "action=list" + query).json["data"]["items"], "id");
    };
    EXPECT_EQ(named("&path=/photo/shared"), (Names{free_, guarded_}));
    EXPECT_EQ(named("&folder=/photo/shared"), Names{inner});
    EXPECT_EQ(named("&folder_raw=/photo"), (Names{free_, guarded_}));
    EXPECT_EQ(get(PROGRAM_LINK, "alice", "action=list&folder=/").json["data"]["total"], 3);
}

TEST_F(ShareCgi, AToolWithARelativeRoot) {
    const std::string before = fs::current_path(), root = systemRoot();
    fs::current_path(fs::path(root).parent_path());
    const Finished found = orvelctl({"--root", fs::path(root).filename(), "link", "list"});
    fs::current_path(before);
    EXPECT_NE(found.output.find(free_), std::string::npos) << found.output;
}

}  // namespace
