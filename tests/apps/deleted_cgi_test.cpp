// The recycle bins of all shares as one list, and what keeps them small.

#include "apps/task_fixture.h"

namespace {

class DeletedCgi : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        SKIP_WITHOUT_ROOT();
        for (const std::string& root : {photo_, video_}) openFolder(root + "/#recycle");
        writeFiles(photo_, {"/d/sub/1", "/d/2", "/a (#2).txt"}, "12345");
        writeFiles(video_, {"/film"}, "123");
    }
    static Json::Value list(const std::string& user, const std::string& more = "") {
        return get(PROGRAM_LIST, user, "action=deleted" + more).json["data"];
    }
    static std::string remove(const std::string& user, const std::vector<std::string>& paths) {
        return errors(perform(user, "action=delete" + about(paths)));
    }
    // "from name by" of each.
    static std::string shown(const Json::Value& data) {
        std::string all;
        for (const Json::Value& item : data["items"]) {
            all += item["deleted"]["from"].asString() + " " + item["name"].asString() + " ";
            all += item["deleted"]["recorded"].asBool() ? item["deleted"]["by"].asString() : "?";
            all += "\n";
        }
        return all;
    }
    // Makes the deletion of what lies at `path` in a bin as old.
    static void age(const std::string& path, long long seconds) {
        for (const auto& log : fs::directory_iterator(systemRoot() + "/var/lib/vexo/deleted")) {
            std::string text = readFile(log.path());
            const size_t at = text.rfind(std::string("\0", 1) + path + std::string("\0", 1));
            if (at == std::string::npos) continue;
            const size_t user = text.rfind('\0', at - 1), facts = text.rfind('\0', user - 1) + 1;
            const std::string then = std::to_string(time(nullptr) - seconds);
            text.replace(facts, text.find(' ', facts) - facts, then);
            writeFile(log.path(), text, 0600);
        }
    }
    static std::string swept() {
        const Json::Value report = support::jsonOf(support::orvelctl({"sweep", "--json"}).output);
        for (const Json::Value& part : report["swept"]) {
            if (part["name"] == "recycle bins") return part["removed"].asString() + part["error"].asString();
        }
        return "none";
    }
};

TEST_F(DeletedCgi, EachSeesWhatTheyMayInOneList) {
    EXPECT_EQ(remove("alice", {"/photo/d/2", "/photo/d", "/photo/a (#2).txt"}), "");
    EXPECT_EQ(remove("carol", {"/video/film"}), "");
    writeFile(photo_ + "/#recycle/samba/x.doc", "by its module", 0644);
    writeFile(photo_ + "/#recycle/closed/hidden", "root's own", 0600);
    ASSERT_EQ(chmod((photo_ + "/#recycle/closed").c_str(), 0700), 0);

    const Json::Value all = list("alice", "&sort_by=from");
    EXPECT_EQ(shown(all),
              "/photo a (#2).txt alice\n/photo d alice\n/photo/d 2 alice\n/photo/samba x.doc ?\n/video film carol\n");
    EXPECT_EQ(all["total"], 5);
    EXPECT_FALSE(all["cut"].asBool());
    const Json::Value& named = all["items"][0];
    EXPECT_EQ(named["path"], "/photo/#recycle/a (#2) (#1).txt");
    EXPECT_EQ(named["additional"]["size"], 5);
    EXPECT_NEAR(named["deleted"]["time"].asInt64(), time(nullptr), 60);
    EXPECT_TRUE(all["items"][1]["isdir"].asBool());
    EXPECT_EQ(shown(list("alice", "&sort_by=size&sort_direction=desc&filetype=file&limit=2&offset=1")),
              "/photo/d 2 alice\n/photo a (#2).txt alice\n");
    EXPECT_EQ(shown(list("alice", "&pattern=F*,x.*&sort_by=name")), "/video film carol\n/photo/samba x.doc ?\n");
    EXPECT_EQ(shown(list("alice", "&sort_by=deleter&sort_direction=desc&limit=1")), "/video film carol\n");
    age("film", 100);
    EXPECT_EQ(shown(list("alice", "&sort_direction=asc&limit=1")), "/video film carol\n");
    EXPECT_EQ(code(get(PROGRAM_LIST, "alice", "action=deleted&limit=10001")), 400);

    addShare("photo", "read only = no\nvalid users = bob\n");
    EXPECT_EQ(shown(list("alice")), "/video film carol\n") << "of a share that is closed nothing is shown or counted";
    addShare("photo", "read only = no\n");
    EXPECT_EQ(errors(perform("alice", "action=restore" + about({"/photo/#recycle/d (#2)", "/video/#recycle/film"}))),
              "");
    writeFile(photo_ + "/#recycle/d/2.new", "another", 0666);
    fs::rename(photo_ + "/#recycle/d/2.new", photo_ + "/#recycle/d/2");
    EXPECT_EQ(shown(list("alice", "&sort_by=from")), "/photo a (#2).txt alice\n/photo/d 2 ?\n/photo/samba x.doc ?\n")
        << "a record is of one file";
    EXPECT_FALSE(fs::exists(video_ + "/#recycle/film"));
}

TEST_F(DeletedCgi, BinsAreKeptToAnAgeAndASize) {
    writeFile(video_ + "/outside", "stays", 0644);
    writeFiles(video_, {"/old/x"});
    fs::create_symlink(video_ + "/outside", photo_ + "/link");
    give(photo_ + "/link");
    EXPECT_EQ(remove("alice", {"/photo/link", "/photo/d/sub", "/photo/d/2", "/video/film", "/video/old/x"}), "");
    const long long day = 24LL * 60 * 60;
    for (const char* path : {"link", "d/sub", "film", "old/x"}) age(path, 3 * day);
    EXPECT_EQ(swept(), "0") << "without a setting nothing goes";
    setSetting("recycle_days", "4");
    setSetting("recycle_days_photo", "2");
    EXPECT_EQ(swept(), "2");
    EXPECT_EQ(treeOf(photo_ + "/#recycle", [](const auto&) { return " "; }), "d  d/2 ");
    EXPECT_EQ(readFile(video_ + "/outside"), "stays");
    EXPECT_EQ(shown(list("alice", "&sort_by=from")), "/photo/d 2 alice\n/video film alice\n/video/old x alice\n");

    setSetting("recycle_days", "0");
    setSetting("recycle_mib_video", "1");
    writeFiles(video_, {"/big1", "/big2"}, std::string(600 * 1024, 'x'));
    EXPECT_EQ(remove("alice", {"/video/big1", "/video/big2"}), "");
    age("film", 2);
    age("big1", 1);
    EXPECT_EQ(swept(), "3") << "the oldest first, until the rest fits";
    EXPECT_EQ(filesOf(video_ + "/#recycle").substr(0, 5), "big2=");
    const std::string other = video_ + "/#recycle";
    fs::remove_all(other);
    fs::create_directory_symlink(photo_, other);
    setSetting("recycle_days", "1");
    EXPECT_EQ(swept(), "0");
    EXPECT_TRUE(fs::exists(photo_ + "/a (#2).txt")) << "a link is no bin";
}

}  // namespace
