// Where tasks lie and how their folders come into being.
#include "orvel/search_task.h"

#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <filesystem>
#include <memory>
#include <set>
#include <string>

#include "fault_gate.h"
#include "platform/refuse_calls.h"
#include "support/appliance.h"
#include "support/log_texts.h"
#include "vexo/error.h"

using namespace FileSearch;
namespace fs = std::filesystem;

namespace {

class SearchTaskTest : public support::ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        volume_ = shareRoot("photo");
    }
    [[nodiscard]] std::string below(const std::string& path) const { return volume_ + "/@tmp/orvel" + path; }
    [[nodiscard]] static mode_t modeOf(const std::string& path) {
        struct stat status {};
        return lstat(path.c_str(), &status) == 0 ? status.st_mode : 0;
    }

    std::string volume_;
};

TEST_F(SearchTaskTest, NamesThatLeadElsewhereNameNothing) {
    const std::string longName(256, 'n'), longVolume = "/" + std::string(4000, 'v');
    struct Case {
        const char *volume, *owner, *id;
        const char* path;
    };
    const Case cases[] = {
        {"/v", "bob", "5A1F", "/v/@tmp/orvel/PXSearch/bob/5A1F"},
        {"/v", "DOM\\bob", "a b", "/v/@tmp/orvel/PXSearch/DOM\\bob/a b"},
        {"/v", "...", ".x", "/v/@tmp/orvel/PXSearch/.../.x"},
        {"/v", "bob", "", ""},
        {"/v", "bob", ".", ""},
        {"/v", "bob", "..", ""},
        {"/v", "bob", "../eve/1", ""},
        {"/v", "bob", nullptr, ""},
        {"/v", "", "1", ""},
        {"/v", "..", "1", ""},
        {"/v", "a/b", "1", ""},
        {"/v", nullptr, "1", ""},
        {"", "bob", "1", ""},
        {"-p", "bob", "1", ""},
        {nullptr, "bob", "1", ""},
        {longVolume.c_str(), "bob", longName.c_str(), ""},
    };
    for (const auto& test : cases) {
        EXPECT_EQ(OrvSearchDBTask::getDBTaskFilePath(test.volume, test.owner, test.id), test.path);
        EXPECT_FALSE(OrvSearchDBTask::checkDBTaskExists(test.volume, test.owner, test.id)) << test.path;
    }

    // They are not made, found or removed either: what lies there belongs to somebody else.
    support::writeFile(below("/PXSearch/eve/1"), "eve's");
    support::makeFolder(below("/PXSearch/bob"));
    OrvSearchDBTaskMgr bob("bob");
    for (const char* id : {"../eve/1", "..", "", "/etc/passwd"}) {
        SCOPED_TRACE(id);
        EXPECT_EQ(bob.createDBTask(volume_.c_str(), id), nullptr);
        EXPECT_EQ(bob.getDBTask(volume_.c_str(), id), nullptr);
        EXPECT_FALSE(OrvSearchDBTask(volume_.c_str(), "bob", id).remove());
        EXPECT_FALSE(OrvSearchDBTask(volume_.c_str(), "../search", id).remove());
    }
    EXPECT_EQ(support::readFile(below("/PXSearch/eve/1")), "eve's");
    EXPECT_TRUE(fs::is_empty(below("/PXSearch/bob")));
    EXPECT_EQ(std::distance(fs::directory_iterator(below("/PXSearch")), fs::directory_iterator{}), 2);
}

TEST_F(SearchTaskTest, LifeOfATask) {
    support::inChild([&] {
        OrvSearchDBTaskMgr tasks("bob");
        EXPECT_EQ(tasks.getDBTask(volume_.c_str(), "UNKNOWN"), nullptr);
        EXPECT_FALSE(fs::exists(below(""))) << "asking makes nothing";

        umask(077);
        const auto before = static_cast<unsigned long>(time(nullptr));
        const std::unique_ptr<OrvSearchDBTask> task(tasks.createDBTask(volume_.c_str(), nullptr));
        const std::string id = task->getDBTaskId();
        EXPECT_EQ(task->getDBTaskFilePath(), tasks.getDBTaskDir(volume_.c_str()) + "/" + id);
        EXPECT_EQ(id.find_first_not_of("0123456789ABCDEF"), std::string::npos) << id;
        EXPECT_LE(std::stoul(id.substr(0, 8), nullptr, 16) - before, 2U) << id;
        EXPECT_EQ(modeOf(below("/PXSearch")), mode_t{S_IFDIR | 0777});
        EXPECT_EQ(modeOf(below("/PXSearch/bob")), mode_t{S_IFDIR | 0777});
        EXPECT_FALSE(tasks.hasDBTask(volume_.c_str(), id.c_str())) << "the file is made by the search";

        support::writeFile(task->getDBTaskFilePath(), "");
        EXPECT_TRUE(tasks.hasDBTask(volume_.c_str(), id.c_str()));
        EXPECT_TRUE(std::unique_ptr<OrvSearchDBTask>(tasks.getDBTask(volume_.c_str(), id.c_str())));
        EXPECT_FALSE(OrvSearchDBTaskMgr("eve").hasDBTask(volume_.c_str(), id.c_str()));
        EXPECT_TRUE(task->remove());
        EXPECT_FALSE(task->remove());

        // Folders that are there keep their mode.
        chmod(below("/PXSearch/bob").c_str(), 0755);
        const std::unique_ptr<OrvSearchDBTask> given(tasks.createDBTask(volume_.c_str(), "GIVEN"));
        EXPECT_STREQ(given->getDBTaskId(), "GIVEN");
        EXPECT_EQ(modeOf(below("/PXSearch/bob")), mode_t{S_IFDIR | 0755});
        return 0;
    });
}

TEST_F(SearchTaskTest, IdsDifferWithoutARandomDevice) {
    support::inChild([&] {
        std::set<std::string> ids;
        const rlimit none{0, 0};
        for (int i = 0; i < 200; ++i) ids.insert(OrvSearchDBTask::getUniqueID("/volume1", "bob"));
        setrlimit(RLIMIT_NOFILE, &none);  // no file can be opened
        for (int i = 0; i < 200; ++i) ids.insert(OrvSearchDBTask::getUniqueID("/volume1", "bob"));
        EXPECT_EQ(ids.size(), 400U);
        return 0;
    });
}

TEST_F(SearchTaskTest, FoldersAreMadeAsRootAndTheIdentityComesBack) {
    SKIP_WITHOUT_ROOT();
    const auto asBob = [&](const std::function<void()>& body) {
        support::inChild([&] {
            if (seteuid(support::kBobUid) != 0) return 1;
            body();
            EXPECT_EQ(geteuid(), support::kBobUid);
            return 0;
        });
    };
    const auto create = [&] { OrvSearchDBTask::createDBTaskDir(volume_.c_str(), "bob", "1"); };
    chmod(volume_.c_str(), 0755);

    asBob([&] {
        EXPECT_TRUE(support::refuseCalls({{SYS_mkdir, ENOSPC}, {SYS_mkdirat, ENOSPC}}));
        create();
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_TMP_NO_SPACE);
        const auto log = support::takeLogTexts();
        ASSERT_EQ(log.size(), 4U);
        EXPECT_EQ(log[1], "orvelsearch(#): failed to create tmp folder " + volume_ +
                              "/@tmp/orvel, errno=No space left on device(28)");
        EXPECT_EQ(log[2], "orvelsearch:# Fail to create folder " + below("/PXSearch"));
    });
    asBob([&] {
        vexo::gate::fail("VLIBCExec", VEXO_ERR_GENERAL, EIO);
        create();
        EXPECT_EQ(support::takeLog().size(), 2U);
    });
    asBob(create);
    struct stat status {};
    ASSERT_EQ(stat(below("/PXSearch/bob").c_str(), &status), 0);
    EXPECT_EQ(status.st_uid, 0U);
    EXPECT_EQ(status.st_mode, mode_t{S_IFDIR | 0777});

    // A user's link where root would make folders: nothing is made, nothing is opened up behind it.
    const std::string elsewhere = shareRoot("photo") + "/private";
    for (const char* place : {"/orvel", "/orvel/PXSearch"}) {
        SCOPED_TRACE(place);
        const std::string link = volume_ + "/@tmp" + place;
        support::makeFolder(elsewhere, 0700);
        fs::remove_all(link);
        ASSERT_EQ(symlink(elsewhere.c_str(), link.c_str()), 0);
        ASSERT_EQ(lchown(link.c_str(), support::kBobUid, support::kUsersGid), 0);
        asBob([&] {
            create();
            const auto log = support::takeLogTexts();
            ASSERT_EQ(log.size(), 1U);
            EXPECT_EQ(log[0], "orvelsearch:# " + link + " is a user's link, nothing is made below it");
        });
        EXPECT_TRUE(fs::is_empty(elsewhere));
        EXPECT_EQ(modeOf(elsewhere), mode_t{S_IFDIR | 0700});
        fs::remove(link);
        support::makeFolder(volume_ + "/@tmp/orvel", 0777);
    }
}

}  // namespace
