// Listings that stay, through the programs: their pages, what is done to rows of them, and what is refused.
#include <sys/file.h>
#include <sys/time.h>

#include "apps/task_fixture.h"
#include "kept_store.h"
#include "support/gate.h"

namespace {

class KeptCgi : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        openFolder(photo_ + "/many");
        writeFiles(photo_ + "/many", {"/file 1", "/file 2", "/file 10", "/sub/inner"});
    }
    static Json::Value list(const std::string& user, const std::string& query) {
        return get(PROGRAM_LIST, user, query).json;
    }
    static std::string keep(const std::string& path = "/photo/many", const std::string& more = "&natural=en") {
        const Json::Value reply = list("alice", "action=folder&keep=1&limit=1&path=" + percentEncode(path) + more);
        EXPECT_NE(reply["data"]["listing"].asString(), "") << reply;
        return reply["data"]["listing"].asString();
    }
    static Json::Value page(const std::string& id) { return list("alice", "action=page&listing=" + id)["data"]; }
    static std::string rows(const std::string& id, const std::string& ranges) {
        return "&listing=" + id + "&ranges=" + ranges;
    }
    std::string storeOf() const { return systemRoot() + "/var/lib/vexo/listings/" + std::to_string(kAliceUid); }
    std::string fileOf(const std::string& id) const { return storeOf() + "/" + id; }
    // It was shown last so long ago.
    void rest(const std::string& id, time_t seconds) const {
        const timeval times[2] = {{time(nullptr) - seconds, 0}, {time(nullptr) - seconds, 0}};
        EXPECT_EQ(utimes(fileOf(id).c_str(), times), 0);
    }
};

TEST_F(KeptCgi, PagesAreOfTheOrderThatWasShown) {
    const std::string id = keep();
    EXPECT_EQ(each(page(id)["items"], "name"), (Names{"sub", "file 1", "file 2", "file 10"}));
    EXPECT_EQ(page(id)["changed"], false);
    const Names down = {"sub", "file 10", "file 2", "file 1"};
    EXPECT_EQ(each(page(keep("/photo/many", "&natural=en&folders_first=1&sort_direction=desc"))["items"], "name"),
              down);
    fs::rename(photo_ + "/many/file 2", photo_ + "/many/a first one");
    const Json::Value after = list("alice", "action=page&additional=size&offset=1&limit=2&listing=" + id)["data"];
    EXPECT_EQ(each(after["items"], "name"), (Names{"file 1", "file 2"}));
    EXPECT_EQ(after["changed"], true);
    EXPECT_EQ(after["total"], 4);
    EXPECT_FALSE(after["items"][0].isMember("gone"));
    EXPECT_EQ(after["items"][0]["additional"]["size"].asInt(), 7);
    EXPECT_EQ(after["items"][1]["gone"], true);
}

TEST_F(KeptCgi, WhoShowsAFolderHearsOfEachChange) {
    const std::string many = photo_ + "/many", asked = "action=changes&listing=" + keep();
    Json::Value data;
    const auto changes = [&] {
        data =
            list("alice", asked + "&limit=2&offset=1&additional=size,perm&state=" + data["state"].asString())["data"];
        EXPECT_EQ(data["changed"], false);
        return data.isMember("items") ? each(data["items"], "name") : Names();
    };
    const Names rows = {"file 1", "file 2"};
    // What was changed a moment ago has no state yet.
    const auto settled = [&] { return !data["state"].asString().empty() || (changes(), false); };
    EXPECT_EQ(changes(), rows);
    EXPECT_TRUE(support::waitUntil("a state", settled));
    EXPECT_EQ(changes(), Names()) << "nothing was changed";
    writeFile(many + "/file 10", "out of sight", 0666);
    EXPECT_EQ(changes(), Names());
    writeFile(many + "/file 2", "longer than before", 0666);
    EXPECT_EQ(changes(), rows);
    EXPECT_EQ(data["items"][1]["additional"]["size"].asInt(), 18);
    EXPECT_TRUE(support::waitUntil("a state", settled));
    EXPECT_EQ(chmod((many + "/file 1").c_str(), 0600), 0);
    EXPECT_EQ(changes(), rows);
    EXPECT_EQ(data["items"][0]["additional"]["perm"]["posix"].asInt(), 600);
    fs::rename(many + "/file 10", many + "/another");
    EXPECT_EQ(list("alice", asked + "&limit=2&state=" + data["state"].asString())["data"]["changed"], true);
    for (const char* limit : {"0", "101"})
        EXPECT_EQ(get(PROGRAM_LIST, "alice", asked + "&limit=" + limit).status, 400) << limit;
    fs::remove_all(many);
    EXPECT_EQ(list("alice", asked + "&limit=2")["error"]["code"], 408);
}

TEST_F(KeptCgi, RowsAreFoundByNameByBeginningAndInAnotherOrder) {
    const std::string id = keep();
    for (const auto& [query, row] : Rows<const char*, int>{
             {"prefix=FILE", 1}, {"prefix=file+1&from=2", 3}, {"prefix=file+2&from=3", 2}, {"prefix=x", -1}})
        EXPECT_EQ(list("alice", "action=find&listing=" + id + "&" + query)["data"]["row"], row) << query;
    const Json::Value found = list("alice", "action=rows&listing=" + id + "&names_raw=file%252010%0Anone")["data"];
    EXPECT_EQ(found["rows"][0], 3);
    EXPECT_EQ(found["rows"][1], -1);
    fs::remove(photo_ + "/many/file 2");
    writeFiles(photo_ + "/many", {"/a new one"});
    const std::string other = keep("/photo/many", "&natural=en&sort_direction=desc");
    const Json::Value carried = list("alice", "action=carry&into=" + other + rows(id, "1-3"))["data"];
    EXPECT_EQ(carried["ranges"], "0-1");  // file 10, file 1
    EXPECT_EQ(carried["left"], 1);
    EXPECT_EQ(carried["names"][0], "file 2");
}

TEST_F(KeptCgi, WhatWasChosenIsDoneAndNothingElse) {
    const std::string id = keep();
    fs::rename(photo_ + "/many/file 1", photo_ + "/many/renamed");
    fs::remove(photo_ + "/many/file 2");
    fs::create_symlink("renamed", photo_ + "/many/file 2");  // a link is not the file that was shown
    const Json::Value task = perform("alice", "action=delete&except=0" + rows(id, "0-3"));
    EXPECT_EQ(errors(task), "/photo/many/file 1 408\n/photo/many/file 2 408\n");
    EXPECT_EQ(task["items_done"], 1);
    EXPECT_EQ(task["new_count"], 1);
    EXPECT_EQ(task["new"][0]["path"], "/photo/many/renamed");
    EXPECT_EQ(namesIn(photo_ + "/many"), (Names{"file 2", "renamed", "sub"}));
    const Json::Value copied = perform("alice", "action=copy&target=/video" + rows(id, "0"));
    EXPECT_EQ(copied["state"], "done");
    EXPECT_EQ(filesOf(video_), "sub/inner=/sub/inner");
    const std::string there = keep("/video");
    const CgiReply present = ask("alice", "action=present&path=/photo/many" + rows(there, "0"));
    EXPECT_EQ(each(present.json["data"]["items"], "name"), (Names{"sub"}));
    EXPECT_EQ(perform("alice", "action=measure" + rows(there, "0"))["bytes_total"], 10);
}

TEST_F(KeptCgi, WhatIsWrongIsRefusedAndNothingIsTouched) {
    const std::string before = treeOf(photo_);
    const std::string id = keep();
    const auto refused = [&](const std::string& form, const std::string& user = "alice") {
        const CgiReply reply = ask(user, "action=delete" + form);
        const Json::Value& data = reply.json["data"];
        return std::to_string(code(reply)) + " " + data["listing"].asString() + data["parameter"].asString();
    };
    for (const auto& [form, answer] : Rows<std::string, std::string>{
             row(rows(id, "0-4"), "400 ranges"), row(rows(id, "2-1"), "400 ranges"),
             row(rows(id, "0-2,2-3"), "400 ranges"), row(rows(id, ""), "400 ranges"),
             row(rows(id, "0-1") + "&except=2", "400 except"), row(rows(id, "0-1") + "&except=0-1", "400 except"),
             row(rows(id, "0") + "&path=/photo/many", "400 "), row(rows("../" + id, "0"), "408 gone"),
             row(rows(std::string(32, '0'), "0"), "408 gone")})
        EXPECT_EQ(refused(form), answer) << form;
    EXPECT_EQ(refused(rows(id, "0"), "carol"), "408 gone") << "another user's";
    rest(id, 3605);
    EXPECT_EQ(refused(rows(id, "0")), "408 gone") << "it expired";

    const std::string altered = keep();
    std::string bytes = readFile(fileOf(altered));
    bytes.back() = static_cast<char>(bytes.back() ^ 1);
    writeFile(fileOf(altered), bytes, 0600);
    EXPECT_EQ(refused(rows(altered, "0")), "401 damaged");
    EXPECT_FALSE(fs::exists(fileOf(altered)));

    EXPECT_EQ(treeOf(photo_), before);
    const std::string folder = photo_ + "/many", aside = photo_ + "/aside";
    const std::string moved = keep();
    fs::rename(folder, aside);
    EXPECT_EQ(refused(rows(moved, "0")), "408 ") << "there is none";
    writeFiles(photo_, {"/other/file 1"});
    for (const std::string what : {"a link", "a link to another folder", "another folder", "a file"}) {
        if (what == "a link") fs::create_symlink("/photo", folder);
        if (what == "a link to another folder") fs::create_symlink("other", folder);
        if (what == "another folder") writeFiles(folder, {"/sub/other", "/file 1"});
        if (what == "a file") writeFile(folder, "", 0666);
        const std::string now = treeOf(photo_);
        EXPECT_NE(ask("alice", "action=delete" + rows(moved, "0-3")).json["success"], true) << what;
        EXPECT_TRUE(!what.ends_with("another folder") ||
                    list("alice", "action=page&listing=" + moved)["data"]["listing"] == "replaced")
            << what;
        EXPECT_EQ(treeOf(photo_), now) << what;
        fs::remove_all(folder);
    }
}

TEST_F(KeptCgi, EightStayTheOneAtRestLongestGoes) {
    Names ids;
    for (int i = 0; i < 8; ++i) {
        ids.push_back(keep());
        rest(ids.back(), 100 - i);
    }
    EXPECT_EQ(list("alice", "action=renew&listing=" + ids[0] + "," + std::string(32, 'a'))["data"]["listings"].size(),
              1U);
    keep();
    EXPECT_TRUE(fs::exists(fileOf(ids[0]))) << "it was shown again";
    EXPECT_FALSE(fs::exists(fileOf(ids[1])));
    EXPECT_EQ(namesIn(storeOf()).size(), 8U);
    // One is too large beside what others hold.
    std::vector<int> held;
    for (const std::string& name : namesIn(storeOf())) {
        held.push_back(open(fileOf(name).c_str(), O_RDONLY | O_CLOEXEC));
        EXPECT_EQ(flock(held.back(), LOCK_SH), 0);
    }
    const Json::Value reply = list("alice", "action=folder&keep=1&path=/photo/many")["data"];
    EXPECT_EQ(reply["not_kept"], "full");
    EXPECT_EQ(reply["items"].size(), 4U) << "it is listed all the same";
    for (const int fd : held) close(fd);
    EXPECT_EQ(truncate(fileOf(ids[7]).c_str(), 64LL << 20), 0);
    keep();
    EXPECT_FALSE(fs::exists(fileOf(ids[7]))) << "more than 64 MiB";
}

TEST_F(KeptCgi, ATaskHoldsWhatItWorksOn) {
    const std::string id = keep();
    const std::string idle = keep();
    Gate gate("VEXOFileCopy", systemRoot() + "/gate");
    const std::string task = start("alice", "action=copy&target=/video" + rows(id, "0-3"), {gate.order()});
    ASSERT_TRUE(gate.holds());
    for (const std::string& one : {id, idle}) rest(one, 3605);
    const orvel::cgi::OwnSweep sweep = orvel::cgi::sweepKeptListings();
    EXPECT_EQ(sweep.removed, 1);
    EXPECT_EQ(sweep.error, 0);
    EXPECT_TRUE(fs::exists(fileOf(id)));
    EXPECT_FALSE(fs::exists(fileOf(idle)));
    gate.open();
    EXPECT_EQ(ended("alice", task)["state"], "done");
    EXPECT_EQ(namesIn(video_), (Names{"file 1", "file 10", "file 2", "sub"}));
    // Its process holds it to its own end, which comes a moment after that of the work.
    EXPECT_TRUE(
        support::waitUntil("the listing's removal", [] { return orvel::cgi::sweepKeptListings().removed == 1; }));
}

}  // namespace
