// The program list, run as a web server runs it.
#include "apps/cgi_test.h"

namespace {

class ListCgi : public CgiTest {
 protected:
    static CgiReply ask(const std::string& user, const std::string& query, const Variables& more = {}) {
        return get(PROGRAM_LIST, user, query, more);
    }
    static CgiReply folder(const std::string& user, const std::string& path, const std::string& more = "") {
        return ask(user, "action=folder&path=" + percentEncode(path) + more);
    }
    static Names names(const CgiReply& reply) { return each(reply.json["data"]["items"], "name"); }
};

TEST_F(ListCgi, OnlyWhoIsLoggedInAndMayUseTheApplicationIsServed) {
    const CgiReply nobody = ask("", "action=shares");
    EXPECT_EQ(nobody.status, 401);
    EXPECT_FALSE(nobody.json["success"].asBool());
    EXPECT_EQ(ask("mallory", "action=shares").status, 401);

    writeRootFile("/etc/vexo/applications", "VEXO.QDS.App.Quorvane3.Instance: alice\n");
    EXPECT_EQ(ask("alice", "action=shares").status, 200);
    const CgiReply shutOut = ask("bob", "action=shares");
    EXPECT_EQ(shutOut.status, 403);
    EXPECT_EQ(shutOut.json["error"]["key"], "error:error_privilege_not_enough");
}

TEST_F(ListCgi, RepliesCarryTheirHeadersAndTheNewSessionOnce) {
    const CgiReply first = ask("alice", "action=shares");
    EXPECT_EQ(first.headers.at("Content-Type"), "application/json; charset=UTF-8");
    EXPECT_EQ(first.headers.at("X-Content-Type-Options"), "nosniff");
    EXPECT_EQ(first.headers.at("Cache-Control"), "no-store");
    ASSERT_EQ(first.headers.count("Set-Cookie"), 1U);
    const std::string cookie = first.headers.at("Set-Cookie");
    const CgiReply second = ask("alice", "action=shares", {{"HTTP_COOKIE", cookie.substr(0, cookie.find(';'))}});
    EXPECT_EQ(second.headers.count("Set-Cookie"), 0U);
    EXPECT_TRUE(second.json["success"].asBool());
}

TEST_F(ListCgi, EachUserSeesTheOwnShares) {
    addShare("music", "read only = no\nvalid users = alice\n");
    for (const char* user : {"alice", "bob"}) makeFolder(shareRoot("homes") + "/" + user);
    EXPECT_EQ(names(ask("alice", "action=shares")), (Names{"home", "photo", "homes", "music"})) << "home first";
    EXPECT_EQ(names(ask("bob", "action=shares&sort_by=name&sort_direction=desc")), (Names{"photo", "homes", "home"}));
}

TEST_F(ListCgi, WhatAPageNeedsBesideComesInTheSameReply) {
    const auto dataOf = [](const char* program, const std::string& query) {
        return CgiReply(runCgi(program, "bob", "GET", query)).json["data"];
    };
    const std::string choice = "action=set&values=" + percentEncode(R"({"mode":"tiles"})");
    ASSERT_EQ(CgiReply(runCgi(PROGRAM_PREFERENCES, "bob", "POST", "", choice,
                              {{"CONTENT_TYPE", "application/x-www-form-urlencoded"}}))
                  .json["data"]["values"]["mode"],
              "tiles");
    const Json::Value tasks = dataOf(PROGRAM_OPERATION, "action=status"), uploads = dataOf(PROGRAM_TUS, "");
    const Json::Value own = dataOf(PROGRAM_PREFERENCES, "action=get"), access = dataOf(PROGRAM_WHY, "path=/photo");
    makeFolder(shareRoot("photo") + "/a/b");
    Json::Value above;
    for (const char* path : {"/photo", "/photo/a"}) {
        Json::Value one = dataOf(PROGRAM_OPERATION, std::string("action=subfolders&path=") + path);
        ASSERT_EQ(one["items"].size(), 1U) << path;
        one["path"] = path;
        above["folders"].append(one);
    }
    const Json::Value links = dataOf(PROGRAM_LINK, "action=list&folder=/photo");
    ASSERT_TRUE(links["items"].isArray() && tasks["tasks"].isArray() && uploads["items"].isArray() &&
                own.isMember("values"));
    ASSERT_EQ(access["rule"], "read_only");
    for (const auto& [query, expected] : Rows<const char*, std::map<std::string, Json::Value>>{
             {"action=shares&with=uploads,tasks,preferences,tasks,other,access",
              {{"tasks", tasks}, {"uploads", uploads}, {"preferences", own}}},
             {"action=folder&path=/photo&with=access", {{"access", access}}},
             {"action=folder&path=/photo&with=access,,links&keep=1", {{"access", access}, {"links", links}}},
             {"action=folder&path=/photo/a/b&with=above", {{"above", above}}},
             {"action=folder&path=/photo&with=", {}},
         }) {
        const Json::Value with = ask("bob", query).json["data"]["with"];
        EXPECT_EQ(with.size(), expected.size()) << query << with;
        for (const auto& [name, data] : expected) EXPECT_EQ(with[name], data) << query;
    }
}

TEST_F(ListCgi, RefusalsSayWhy) {
    addShare("music", "read only = no\nvalid users = alice\ninvalid users = bob\n");
    addShare("sealed", "read only = no\nvalid users = bob\nvexo:restriction = 1\n");
    writeFile(photo_ + "/file.txt", "x", 0644);
    addMount(photo_ + "/dead", "nfs");
    for (const auto& [path, code] : Rows<std::string, int>{
             row("/sealed", 407), row("/", 407), row("/photo/missing", 408), row("/photo/file.txt/below", 408),
             row("photo", 401), row("", 400), row("/photo/" + std::string(5000, 'x'), 402), row("/photo/../photo", 407),
             row("/photo/dead", 410)}) {
        const CgiReply reply = folder("bob", path);
        EXPECT_EQ(reply.status, code == 400 ? 400 : 200) << path;
        EXPECT_FALSE(reply.json["success"].asBool()) << path;
        EXPECT_EQ(reply.json["error"]["code"], code) << path;
        EXPECT_EQ(reply.json["error"]["key"], OrvParseErrorToKTRString(code, "")) << path;
        EXPECT_EQ(reply.json["error"]["path"], path);
    }
    EXPECT_FALSE(ask("alice", "action=folder&path=/photo%00/x").json["success"].asBool());
}

TEST_F(ListCgi, ParametersAreTakenStrictly) {
    for (const char* query :
         {"", "action=burn", "action=folder&path=/photo&offset=-1", "action=folder&path_raw=/a%2500",
          "action=folder&path_raw=/photo%25zz", "action=folder&path_raw=/photo%25"}) {
        const CgiReply reply = ask("alice", query);
        EXPECT_EQ(reply.status, 400) << query;
        EXPECT_EQ(reply.json["error"]["code"], 400) << query;
    }
    std::string patterns = "a";
    for (int i = 1; i < 100; ++i) patterns += ",a";
    for (const auto& [pattern, code] : Rows<std::string, int>{
             {patterns, 0}, {patterns + ",a", 400}, {std::string(491, 'a'), 400}, {"a,,", 0}, {" ", 400}})
        EXPECT_EQ(folder("alice", "/photo", "&pattern=" + pattern).json["error"]["code"].asInt(), code);
}

TEST_F(ListCgi, APageIsSortedCountedAndFiltered) {
    makeFolder(photo_ + "/b-folder");
    makeFolder(photo_ + "/a-folder");
    for (const char* name : {"one.jpg", "three.jpg", "seven.png"})
        writeFile(photo_ + "/" + name, std::string(std::string(name).size(), 'x'));
    writeFile(photo_ + "/ten.jpg", std::string(10, 'x'));
    for (const auto& [parameters, expected, total] : rowsOf<const char*, Names, int>("apps/pages")) {
        const CgiReply reply = folder("alice", "/photo/", parameters);
        EXPECT_EQ(names(reply), expected) << parameters;
        EXPECT_EQ(reply.json["data"]["total"], total) << parameters;
    }
    const CgiReply plain = folder("alice", "/photo", "&limit=1&offset=2");
    EXPECT_EQ(plain.json["data"]["offset"], 2);
    EXPECT_EQ(plain.json["data"]["items"][0].getMemberNames(), (Names{"isdir", "name", "path"}));
    const CgiReply full =
        folder("alice", "/photo",
               "&limit=1&offset=2&additional=real_path,size,owner,time,perm,type,mount_point_type,new,icon");
    const Json::Value item = full.json["data"]["items"][0]["additional"];
    EXPECT_EQ(item.getMemberNames(), (Names{"mount_point_type", "owner", "perm", "real_path", "size", "time", "type"}));
    EXPECT_EQ(item["real_path"], photo_ + "/one.jpg");
    EXPECT_EQ(full.json["data"]["items"][0]["icon"], "jpg.png") << "as the page has them";
    EXPECT_EQ(item["size"], 7.0);
}

TEST_F(ListCgi, NamesOfAnyBytesTravelAndComeBack) {
    makeFolder(photo_ + "/\xE9t\xE9", 0777);
    const std::string markup = "<b>\"\\\n\x7F\u202E.txt";
    writeFile(photo_ + "/\xE9t\xE9/dedans\xFF.txt", "x");
    writeFile(photo_ + "/\xE9t\xE9/" + markup, "x");

    const CgiReply outer = folder("alice", "/photo", "&additional=real_path,size,type");
    const Json::Value item = outer.json["data"]["items"][0];
    EXPECT_EQ(item["name"], "\uFFFDt\uFFFD");
    EXPECT_EQ(item["name_raw"], "%E9t%E9");
    EXPECT_EQ(item["path_raw"], "/photo/%E9t%E9");

    const CgiReply inner = ask("alice", "action=folder&path_raw=" + percentEncode(item["path_raw"].asString()));
    Names raw = each(inner.json["data"]["items"], "name_raw");
    for (std::string& name : raw) name = orvel::cgi::percentDecode(name).value_or("?");
    std::sort(raw.begin(), raw.end());
    EXPECT_EQ(raw, (Names{markup, "dedans\xFF.txt"}));

    const CgiReply missing = ask("alice", "action=folder&path=/photo/%FF");
    EXPECT_EQ(missing.json["error"]["path"], "/photo/\uFFFD");
    EXPECT_EQ(missing.json["error"]["path_raw"], "/photo/%FF");
}

TEST_F(ListCgi, NothingLeadsOutOfAShare) {
    makeFolder(photo_ + "/folder/deep");
    writeFile(photo_ + "/folder/inside.txt", "x");
    const std::string outside = addShare("other", "");
    writeFile(outside + "/secret.txt", "x");
    fs::create_symlink("folder", photo_ + "/inside");
    fs::create_symlink("../folder/../inside", photo_ + "/folder/around");
    fs::create_symlink(outside, photo_ + "/absolute");
    fs::create_symlink("../" + fs::path(outside).filename().string(), photo_ + "/relative");
    fs::create_symlink("/proc/self/root", photo_ + "/magic");
    for (const char* path : {"/photo/absolute", "/photo/relative", "/photo/magic/tmp", "/photo/folder/../../other",
                             "/photo/folder/around/../../..", "/home/../bob"})
        EXPECT_EQ(folder("alice", path).json["error"]["code"], 407) << path;
    for (const char* path : {"/photo/inside", "/photo/folder/around", "/photo/folder/deep/..", "//photo//./folder"}) {
        const CgiReply reply = folder("alice", path, "&filetype=file&additional=real_path");
        EXPECT_EQ(names(reply), Names{"inside.txt"}) << path;
        EXPECT_EQ(reply.json["data"]["items"][0]["additional"]["real_path"], photo_ + "/folder/inside.txt") << path;
    }

    setSetting("link_policy_photo", "none");
    EXPECT_EQ(folder("alice", "/photo/inside").json["error"]["code"], 407);
    EXPECT_EQ(folder("alice", "/PHOTO/inside").json["error"]["code"], 407);
    EXPECT_TRUE(folder("alice", "/photo/folder").json["success"].asBool());
}

TEST_F(ListCgi, TheKernelJudgesAsTheUser) {
    SKIP_WITHOUT_ROOT();
    makeFolder(photo_ + "/private", 0700);
    ASSERT_EQ(chown((photo_ + "/private").c_str(), kAliceUid, kUsersGid), 0);
    addShare("photo", "read only = no\nvalid users = alice, bob, carol\n");
    EXPECT_TRUE(folder("alice", "/photo/private").json["success"].asBool());
    EXPECT_EQ(folder("bob", "/photo/private").json["error"]["code"], 407);
    EXPECT_TRUE(folder("carol", "/photo/private").json["success"].asBool()) << "an administrator";
    // Root's own groups must not help, nor his permissions below a folder that can be entered.
    makeFolder(photo_ + "/root's", 0750);
    EXPECT_EQ(folder("alice", "/photo/root's").json["error"]["code"], 407);
}

}  // namespace
