// Permissions: what is there, who may what, and changes that stay where they were asked for.
#include <acl/libacl.h>
#include <sys/acl.h>

#include "apps/task_fixture.h"
#include "support/gate.h"

namespace {

class PermissionCgi : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        SKIP_WITHOUT_ROOT();
        lay();
    }
    void lay() {
        fs::remove_all(photo_ + "/t");
        writeFiles(photo_, {"/t/f", "/t/in/g", "/t/run"});
        writeFiles(outside(), {"/victim"});
        for (const auto& [path, mode] :
             {std::pair("/t", 0750), {"/t/in", 0750}, {"/t/run", 0750}, {"/t/f", 0640}, {"/t/in/g", 0640}}) {
            EXPECT_EQ(chmod((photo_ + path).c_str(), static_cast<mode_t>(mode)), 0);
        }
        fs::create_symlink(outside() + "/victim", photo_ + "/t/link");
        fs::create_directory_symlink(outside(), photo_ + "/t/way");
    }
    static std::string outside() { return systemRoot() + "/outside"; }
    static std::string listOf(const std::string& path, acl_type_t type = ACL_TYPE_ACCESS) {
        const acl_t list = acl_get_file(path.c_str(), type);
        char* text = acl_to_any_text(list, nullptr, ',', TEXT_ABBREVIATE | TEXT_NUMERIC_IDS);
        std::string shown = text == nullptr ? "?" : text;
        acl_free(text);
        acl_free(list);
        return shown;
    }
    static void setList(const std::string& path, const char* text, acl_type_t type = ACL_TYPE_ACCESS) {
        const acl_t list = acl_from_text(text);
        EXPECT_EQ(acl_set_file(path.c_str(), type, list), 0) << path;
        acl_free(list);
    }
    // Everything in the share and outside, with owners and lists.
    [[nodiscard]] std::string all() const {
        const auto shown = [](const fs::directory_entry& entry) {
            const struct stat status = statusOf(entry.path());
            const std::string owner = " " + std::to_string(status.st_uid) + ":" + std::to_string(status.st_gid) + " ";
            if (entry.is_symlink()) return owner;
            return owner + listOf(entry.path()) +
                   (entry.is_directory() ? "/" + listOf(entry.path(), ACL_TYPE_DEFAULT) : "");
        };
        return treeOf(photo_, shown) + " | " + treeOf(outside(), shown);
    }
    static std::string permit(const std::string& how) { return "action=permit&path=/photo/t" + how; }
    static std::string encoded(const std::string& name, const std::string& text) {
        return "&" + name + "=" + percentEncode(text);
    }
};

TEST_F(PermissionCgi, ChangesReachWhatTheyShallAndAreUndone) {
    for (const auto& [what, form, entries, defaults, folder, handsDown, file, program, below] :
         rowsOf<const char*, const char*, const char*, const char*, std::string, std::string, std::string, std::string,
                std::string>("apps/permissions_changed")) {
        SCOPED_TRACE(what);
        lay();
        const std::string before = all();
        const Json::Value task =
            perform("alice", permit(form) + encoded("entries", entries) + encoded("defaults", defaults));
        EXPECT_EQ(errors(task), "");
        EXPECT_EQ(task["items_done"].asInt() + task["items_skipped"].asInt(), task["items_total"].asInt());
        EXPECT_EQ(listOf(photo_ + "/t"), folder);
        EXPECT_EQ(listOf(photo_ + "/t", ACL_TYPE_DEFAULT), handsDown);
        EXPECT_EQ(listOf(photo_ + "/t/f"), file);
        EXPECT_EQ(listOf(photo_ + "/t/run"), program);
        EXPECT_EQ(listOf(photo_ + "/t/in/g"), below);
        EXPECT_EQ(listOf(outside() + "/victim"), "u::rw-,g::rw-,o::rw-") << "behind a link";
        EXPECT_EQ(errors(ended("alice", start("alice", "action=undo&taskid=" + task["taskid"].asString()))), "");
        EXPECT_EQ(all(), before);
    }
}

TEST_F(PermissionCgi, AMaskWithholdsWhatItWithheldBefore) {
    const std::string file = photo_ + "/t/f";
    const char* masked = "u::rw-,u:20002:rwx,u:20003:r--,g::rw-,m::r--,o::---";
    for (const auto& [form, entries, then] : rowsOf<std::string, std::string, std::string>("apps/permission_masks")) {
        SCOPED_TRACE(form + entries);
        setList(file, masked);
        const Json::Value task = perform("alice", "action=permit&path=/photo/t/f" + form + encoded("entries", entries));
        EXPECT_EQ(errors(task), "");
        EXPECT_EQ(listOf(file), then);
    }
}

TEST_F(PermissionCgi, WhatIsWrongOrForbiddenChangesNothing) {
    writeFile(photo_ + "/t/bobs", "", 0644);
    give(photo_ + "/t/bobs", kBobUid);
    EXPECT_EQ(chown((photo_ + "/t/in").c_str(), kAliceUid, kAdminGid), 0);
    EXPECT_EQ(chown((photo_ + "/t/run").c_str(), kAliceUid, kAdminGid), 0);
    EXPECT_EQ(chmod((photo_ + "/t/in").c_str(), 02750), 0);
    const std::string before = all();
    for (const auto& [user, form, refusal, failures, warning] :
         rowsOf<std::string, std::string, int, std::string, std::string>("apps/permissions_refused")) {
        SCOPED_TRACE(user + form);
        const CgiReply reply = ask(user, "action=permit" + form);
        EXPECT_EQ(code(reply), refusal);
        std::string warnings;
        for (const Json::Value& word : reply.json["data"]["warnings"]) {
            warnings += (warnings.empty() ? "" : " ") + word.asString();
        }
        EXPECT_EQ(warnings, warning);
        if (refusal == 0) {
            EXPECT_EQ(errors(ended(user, reply.json["data"]["taskid"].asString())), failures);
        }
        EXPECT_EQ(all(), before);
    }
    EXPECT_EQ(code(get(PROGRAM_OPERATION, "alice", permit("&mode=o%2Br").c_str())), 400) << "not posted";
    EXPECT_EQ(errors(perform("carol", "action=permit&path=/photo/t/f&owner=bob&group=administrators&confirm=true")),
              "");
    EXPECT_EQ(statusOf(photo_ + "/t/f").st_uid, kBobUid);
    EXPECT_EQ(statusOf(photo_ + "/t/f").st_gid, kAdminGid);
}

TEST_F(PermissionCgi, BelowItGoesOnByItselfAndNamesWhatItCouldNotChange) {
    writeFiles(photo_, {"/t/in/theirs", "/t/in/z", "/t/in/closed/x"});
    give(photo_ + "/t/in/theirs", kBobUid);
    EXPECT_EQ(chmod((photo_ + "/t/in/closed").c_str(), 0), 0);
    const Json::Value task = perform("alice", permit("&below=true&mode=o=w"));
    EXPECT_EQ(errors(task), "/photo/t/in/closed 407\n/photo/t/in/theirs 407\n");
    EXPECT_EQ(listOf(photo_ + "/t/in/z"), "u::rw-,g::rw-,o::-w-");
    EXPECT_EQ(listOf(photo_ + "/t/in/g"), "u::rw-,g::r--,o::-w-");
    // What was changed by others since is not undone.
    EXPECT_EQ(chmod((photo_ + "/t/f").c_str(), 0600), 0);
    writeFile(photo_ + "/t/in/g", "another content", 0644);
    const Json::Value back = ended("alice", start("alice", "action=undo&taskid=" + task["taskid"].asString()));
    EXPECT_EQ(errors(back), "/photo/t/in/g 2101\n/photo/t/f 2101\n");
    EXPECT_EQ(listOf(photo_ + "/t/in"), "u::rwx,g::r-x,o::---");
    EXPECT_EQ(listOf(photo_ + "/t/f"), "u::rw-,g::---,o::---");
}

TEST_F(PermissionCgi, AnUndoRecordIsNotBelieved) {
    writeFiles(photo_, {"/other"});
    const std::string id = perform("alice", "action=permit&path=/photo/t/f&mode=o%2Br")["taskid"].asString();
    const std::string file = systemRoot() + "/var/lib/vexo/undo/" + std::to_string(kAliceUid) + "/" + id;
    const std::string whole = readFile(file), before = all();
    for (const auto& [was, is] : {std::pair("o=0", "o=9"),
                                  {"o=0", "o=0,o=0,q"},
                                  {"o=0", "U=7"},
                                  {"20001 ", "-1 "},
                                  {"20001 ", "99999999999 "},
                                  {"\n", " "},
                                  {"/photo/t/f", "/photo/other"},
                                  {"/photo/t/f", "/photo/t/link"},
                                  {"/photo/t/f", "/photo/t/way/victim"}}) {
        SCOPED_TRACE(is);
        std::string text = whole;
        text.replace(text.find(was), strlen(was), is);
        writeFile(file, text, 0600);
        EXPECT_NE(errors(ended("alice", start("alice", "action=undo&taskid=" + id))), "");
        EXPECT_EQ(all(), before);
    }
}

// Held after each item, when its row in the results on screen is about to be brought up to date.
TEST_F(PermissionCgi, AFolderSwappedForALinkLeadsNowhereAndResultsFollow) {
    const std::string found =
        post(PROGRAM_SEARCH, "alice", "action=start&path=/photo&name=*").json["data"]["taskid"].asString();
    searched("alice", found);
    const std::string before = listOf(outside() + "/victim"), above = listOf(outside());
    support::Gate gate("FILEIDXDBUpdate", systemRoot() + "/gate");
    const std::string id = start("alice", permit("&below=true&mode=g%2Bw,o=rX&taskid=" + found), {gate.order()});
    ASSERT_TRUE(gate.holds());  // the folder t
    gate.next();
    ASSERT_TRUE(gate.holds());  // t/f; the names in t are known by now
    fs::rename(photo_ + "/t/run", photo_ + "/moved");
    fs::create_symlink(outside() + "/victim", photo_ + "/t/run");
    gate.next();
    ASSERT_TRUE(gate.holds());  // t/in, which is open
    fs::rename(photo_ + "/t/in", photo_ + "/aside");
    fs::create_directory_symlink(outside(), photo_ + "/t/in");
    writeFiles(outside(), {"/g"});
    gate.open();
    const Json::Value task = ended("alice", id);
    EXPECT_EQ(errors(task), "");
    EXPECT_EQ(task["state"], "done");
    EXPECT_EQ(listOf(outside() + "/victim"), before);
    EXPECT_EQ(listOf(outside()), above);
    EXPECT_EQ(listOf(outside() + "/g"), "u::rw-,g::rw-,o::rw-");
    EXPECT_EQ(listOf(photo_ + "/moved"), "u::rwx,g::r-x,o::---");
    std::map<std::string, int> modes;
    const Json::Value rows = get(PROGRAM_SEARCH, "alice", "action=list&additional=perm&taskid=" + found).json["data"];
    for (const Json::Value& row : rows["items"]) {
        modes[row["path"].asString()] = row["additional"]["perm"]["posix"].asInt();
    }
    EXPECT_EQ(modes["/photo/t"], 775);
    EXPECT_EQ(modes["/photo/t/f"], 664);
}

TEST_F(PermissionCgi, ACancelledOneStopsAndWhatItDidIsUndone) {
    const std::string found =
        post(PROGRAM_SEARCH, "alice", "action=start&path=/photo&name=*").json["data"]["taskid"].asString();
    searched("alice", found);
    const std::string before = all();
    support::Gate gate("FILEIDXDBUpdate", systemRoot() + "/gate");
    const std::string id = start("alice", permit("&below=true&mode=o%2Br&taskid=" + found), {gate.order()});
    ASSERT_TRUE(gate.holds());
    EXPECT_EQ(code(ask("alice", "action=cancel&taskid=" + id)), 0);
    gate.open();
    const Json::Value task = ended("alice", id);
    EXPECT_EQ(task["state"], "cancelled");
    EXPECT_EQ(listOf(photo_ + "/t/run"), "u::rwx,g::r-x,o::---");
    EXPECT_EQ(errors(ended("alice", start("alice", "action=undo&taskid=" + id))), "");
    EXPECT_EQ(all(), before);
}

TEST_F(PermissionCgi, ManyAreShownByWhatTheyHaveInCommon) {
    setList(photo_ + "/t/f", "u::rw-,u:20002:rw-,g::rw-,m::r--,o::---");
    setList(photo_ + "/t/in", "u::rwx,g:20100:r-x,g::r-x,m::r-x,o::r-x", ACL_TYPE_DEFAULT);
    writeFile(photo_ + "/t/secret", "", 0600);
    give(photo_ + "/t/secret", kBobUid);
    const auto shown = [](const char* user, const Names& paths) {
        return get(PROGRAM_OPERATION, user, "action=permissions" + about(paths)).json["data"];
    };
    Json::Value data = shown("alice", {"/photo/t/f", "/photo/t/in", "/photo/t/link", "/photo/t/secret"});
    EXPECT_EQ(data["items"].asString() + data["folders"].asString() + data["links"].asString() +
                  data["failed"].asString() + data["owned"].asString(),
              "21112");
    EXPECT_EQ(data["owner"]["name"], "alice");
    EXPECT_EQ(data["group"]["id"].asUInt(), kUsersGid);
    std::string text;
    for (const char* list : {"entries", "defaults"}) {
        for (const Json::Value& entry : data[list]) {
            text += entry["kind"].asString() + ":" + entry["name"].asString() + " " + entry["all"].asString() + "/" +
                    entry["any"].asString() + "x" + entry["items"].asString() + " ";
        }
    }
    EXPECT_EQ(text,
              "user: 6/7x2 user:bob 4/4x1 group: 4/5x2 mask: 4/4x1 other: 0/0x2 "
              "user: 7/7x1 group: 5/5x1 group:users 5/5x1 mask: 5/5x1 other: 5/5x1 ");
    EXPECT_EQ(each(data["groups"], "name"), Names{"users"});
    EXPECT_FALSE(data["administrator"].asBool());
    EXPECT_TRUE(shown("carol", {"/photo/t/secret"})["administrator"].asBool());
    const CgiReply refused = get(PROGRAM_OPERATION, "alice", "action=permissions&path=/photo/t/secret");
    EXPECT_EQ(code(refused), 407);
    EXPECT_TRUE(refused.json["data"].isNull()) << refused.body;
}

TEST_F(PermissionCgi, WhoMayWhatAndWhy) {
    setList(photo_ + "/t/f", "u::rw-,u:20002:rw-,g::rw-,g:20101:rwx,m::r--,o::---");
    writeFile(photo_ + "/t/secret", "", 0600);
    give(photo_ + "/t/secret", kBobUid);
    EXPECT_EQ(chmod((photo_ + "/t/in").c_str(), 0700), 0);
    const auto joined = [](const Json::Value& list) {
        std::string text;
        for (const Json::Value& one : list) {
            text += one.asString() + " ";
        }
        return text;
    };
    for (const auto& [asking, path, whom, refusal, answer] :
         rowsOf<std::string, std::string, std::string, int, std::string>("apps/rights")) {
        SCOPED_TRACE(asking + " " + path + " " + whom);
        const CgiReply reply = get(PROGRAM_OPERATION, asking, "action=access&path=" + path + "&" + whom);
        EXPECT_EQ(code(reply), refusal);
        if (refusal != 0) continue;
        const Json::Value& data = reply.json["data"];
        std::string closed = joined(data["closed"]);
        if (!closed.empty()) closed.pop_back();
        EXPECT_EQ(joined(data["rights"]) + "| " + data["by"].asString() + " | " + joined(data["masked"]) + "| " +
                      closed + (data.isMember("share") ? " | " + data["share"]["rule"].asString() : ""),
                  answer);
    }
}

}  // namespace
