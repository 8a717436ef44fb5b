// Where tasks lie and how their folders come into being.
#include "orvel/search_task.h"

#include <sys/resource.h>

#include "support/testing.h"

using namespace FileSearch;

namespace {

constexpr mode_t kForEverybody = S_IFDIR | 0777;

class SearchTaskTest : public ApplianceTest {
 protected:
    static mode_t modeOf(const std::string& path) { return statusOf(path).st_mode; }
    const std::string volume_ = shareRoot("photo"), searches_ = volume_ + "/@tmp/orvel/PXSearch";
};

TEST_F(SearchTaskTest, NamesThatLeadElsewhereNameNothing) {
    const std::string longName(256, 'n'), longVolume = "/" + std::string(4000, 'v');
    auto rows = rowsOf<const char*, const char*, const char*, const char*>("search/task_names");
    rows.emplace_back(longVolume.c_str(), "bob", longName.c_str(), "");
    for (const auto& [volume, owner, id, path] : rows) {
        EXPECT_EQ(OrvSearchDBTask::getDBTaskFilePath(volume, owner, id), path);
        EXPECT_FALSE(OrvSearchDBTask::checkDBTaskExists(volume, owner, id)) << path;
    }
    // They are not made, found or removed either: what lies there belongs to somebody else.
    writeFile(searches_ + "/eve/1", "eve's");
    makeFolder(searches_ + "/bob");
    OrvSearchDBTaskMgr bob("bob");
    for (const char* id : {"../eve/1", "..", "", "/etc/passwd"}) {
        EXPECT_EQ(bob.createDBTask(volume_.c_str(), id), nullptr);
        EXPECT_EQ(bob.getDBTask(volume_.c_str(), id), nullptr);
        EXPECT_FALSE(OrvSearchDBTask(volume_.c_str(), "bob", id).remove());
        EXPECT_FALSE(OrvSearchDBTask(volume_.c_str(), "../PXSearch/eve", id).remove());
    }
    EXPECT_EQ(readFile(searches_ + "/eve/1"), "eve's");
    EXPECT_TRUE(fs::is_empty(searches_ + "/bob"));
}

TEST_F(SearchTaskTest, LifeOfATask) {
    inChild([&] {
        const char* volume = volume_.c_str();
        OrvSearchDBTaskMgr tasks("bob");
        EXPECT_EQ(tasks.getDBTask(volume, "UNKNOWN"), nullptr);
        EXPECT_FALSE(fs::exists(volume_ + "/@tmp")) << "asking makes nothing";
        umask(077);
        const time_t before = time(nullptr);
        const std::unique_ptr<OrvSearchDBTask> task(tasks.createDBTask(volume, nullptr));
        const std::string id = task->getDBTaskId();
        EXPECT_EQ(task->getDBTaskFilePath(), tasks.getDBTaskDir(volume) + "/" + id);
        EXPECT_EQ(id.find_first_not_of("0123456789ABCDEF"), std::string::npos) << id;
        const time_t made = std::stol(id.substr(0, 8), nullptr, 16);
        EXPECT_TRUE(before <= made && made <= time(nullptr)) << id;
        EXPECT_EQ(modeOf(searches_), kForEverybody);
        EXPECT_EQ(modeOf(searches_ + "/bob"), kForEverybody);
        EXPECT_FALSE(tasks.hasDBTask(volume, id.c_str())) << "the file is made by the search";
        writeFile(task->getDBTaskFilePath(), "");
        EXPECT_TRUE(std::unique_ptr<OrvSearchDBTask>(tasks.getDBTask(volume, id.c_str())));
        EXPECT_FALSE(OrvSearchDBTaskMgr("eve").hasDBTask(volume, id.c_str()));
        EXPECT_TRUE(task->remove());
        EXPECT_FALSE(task->remove());

        chmod((searches_ + "/bob").c_str(), 0755);
        const std::unique_ptr<OrvSearchDBTask> given(tasks.createDBTask(volume, "GIVEN"));
        EXPECT_STREQ(given->getDBTaskId(), "GIVEN");
        EXPECT_EQ(modeOf(searches_ + "/bob"), mode_t{S_IFDIR | 0755}) << "what is there keeps its mode";

        std::set<std::string> ids;
        const rlimit none{0, 0};
        for (int i = 0; i < 200; ++i) ids.insert(OrvSearchDBTask::getUniqueID(volume, "bob"));
        setrlimit(RLIMIT_NOFILE, &none);  // no random device can be opened
        for (int i = 0; i < 200; ++i) ids.insert(OrvSearchDBTask::getUniqueID(volume, "bob"));
        EXPECT_EQ(ids.size(), 400U);
    });
}

TEST_F(SearchTaskTest, FoldersAreMadeAsRootAndTheIdentityComesBack) {
    SKIP_WITHOUT_ROOT();
    chmod(volume_.c_str(), 0755);
    const auto makeAsBob = [&](const std::vector<std::string>& log, const std::function<void()>& before) {
        inChild([&] {
            EXPECT_EQ(seteuid(kBobUid), 0);
            before();
            OrvSearchDBTask::createDBTaskDir(volume_.c_str(), "bob", "1");
            EXPECT_EQ(geteuid(), kBobUid);
            auto texts = takeLogTexts();
            std::erase_if(texts, [](const std::string& line) { return !line.starts_with("orvelsearch"); });
            EXPECT_EQ(texts, log);
            EXPECT_TRUE(log.size() < 3 || VLIBCErrGet() == VEXO_ERR_TMP_NO_SPACE);
            return 0;
        });
    };
    const std::string failed = "orvelsearch:# Fail to create folder " + searches_;
    makeAsBob(
        {"orvelsearch(#): failed to create tmp folder " + volume_ + "/@tmp/orvel, errno=No space left on device(28)",
         failed, failed + "/bob"},
        [] {
            EXPECT_TRUE(refuseCalls({{SYS_mkdir, ENOSPC}, {SYS_mkdirat, ENOSPC}}));
        });
    makeAsBob({failed, failed + "/bob"}, [] { vexo::gate::fail("VLIBCExec", VEXO_ERR_GENERAL, EIO); });
    makeAsBob({}, [] {});
    EXPECT_EQ(statusOf(searches_ + "/bob").st_uid, 0U);
    EXPECT_EQ(modeOf(searches_ + "/bob"), kForEverybody);

    fs::remove_all(searches_);
    expectKilled([&] {
        umask(022);
        if (refuseCalls({{SYS_fchmod, kKilled}})) OrvSearchDBTask::createDBTaskDir(volume_.c_str(), "bob", "1");
    });
    EXPECT_EQ(modeOf(searches_), kForEverybody) << "nobody opens a folder that is there";

    // A user's link where root would make folders: nothing is made, nothing is opened up behind it.
    const std::string elsewhere = volume_ + "/private";
    for (const std::string& link : {searches_, volume_ + "/@tmp/orvel"}) {
        makeFolder(elsewhere, 0700);
        fs::remove_all(link);
        fs::create_symlink(elsewhere, link);
        ASSERT_EQ(lchown(link.c_str(), kBobUid, kUsersGid), 0);
        makeAsBob({"orvelsearch:# " + link + " is a user's link, nothing is made below it"}, [] {});
        EXPECT_TRUE(fs::is_empty(elsewhere));
        EXPECT_EQ(modeOf(elsewhere), mode_t{S_IFDIR | 0700});
    }
}

}  // namespace
