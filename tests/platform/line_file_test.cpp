// Record files: finding lines, adding them, what others may have put in their place.
#include "vexo/line_file.h"

#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <string>

#include "fault_gate.h"
#include "platform/private_mounts.h"
#include "support/appliance.h"
#include "vexo/critical_section.h"
#include "vexo/error.h"

namespace {

using support::readFile;
using support::writeFile;

constexpr const char* kFile = "/tmp/foldersharing.current.users";
constexpr const char* kLock = "/tmp/foldersharing.current.users.lock";

class LineFile : public support::ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        support::makeFolder(systemRoot() + "/tmp", 01777);
    }
    std::string file_ = systemRoot() + kFile;
};

TEST_F(LineFile, AKeyIsAWholeFieldOfALine) {
    using namespace std::string_literals;
    writeFile(file_, "10.0.0.1,alice,AB,1\nnul\0,CD\n\n,,AB2\r\n10.0.0.2,bob,AB\r\nlast;EF"s, 0600);
    struct Case {
        const char *key, *separators;
        int size, expected;
        const char* line;
    };
    const Case cases[] = {
        {"AB", ",", 64, 1, "10.0.0.1,alice,AB,1"},
        {"AB2", ",", 64, 1, ",,AB2"},
        {"bob", ",", 64, 1, "10.0.0.2,bob,AB"},
        {"bob", ",", 5, 1, "10.0"},
        {"A", ",", 64, 0, ""},
        {"EF", ",;", 64, 1, "last;EF"},
        {"last;EF", "", 64, 1, "last;EF"},
        {"CD", ",", 64, 0, ""},
        {"10.0.0.1,alice,AB", ",", 64, 0, ""},
        {"", ",", 64, -1, "?"},
        {"AB", nullptr, 64, -1, "?"},
        {"AB", ",", 0, -1, "?"},
    };
    for (const auto& [key, separators, size, expected, text] : cases) {
        char line[64] = "?";
        EXPECT_EQ(VLIBCFileGetLine(kFile, key, line, size, separators), expected) << key;
        EXPECT_STREQ(line, text) << key;
    }
    char line[8];
    EXPECT_EQ(VLIBCFileGetLine("/tmp/none", "AB", line, sizeof line, ","), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
}

TEST_F(LineFile, AddedLinesAreWholeOrNotThere) {
    const mode_t mask = umask(0);
    EXPECT_EQ(VLIBCFileAddLine(kFile, "12345678", 8), 0);
    umask(mask);
    struct stat status {};
    ASSERT_EQ(stat(file_.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777, 0600U);
    for (const char* refused : {"123456789", "a\nb", "a\r"}) {
        EXPECT_EQ(VLIBCFileAddLine(kFile, refused, 8), -1) << refused;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    }
    EXPECT_EQ(VLIBCFileAddLine("/none/x", "a", 8), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    writeFile(file_, "torn", 0600);
    EXPECT_EQ(VLIBCFileAddLine(kFile, "a", 8), 0);
    EXPECT_EQ(readFile(file_), "torn\na\n");

    EXPECT_EQ(VLIBCSysRename(kFile, "/tmp/renamed"), 0);
    EXPECT_EQ(readFile(systemRoot() + "/tmp/renamed"), "torn\na\n");
    EXPECT_EQ(VLIBCSysRename(kFile, "/tmp/renamed"), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
}

TEST_F(LineFile, WhatAFullDiskCutShortIsTakenBack) {
    SKIP_WITHOUT_ROOT();
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        if (mount("none", (systemRoot() + "/tmp").c_str(), "tmpfs", 0, "size=16k") != 0) return 1;
        writeFile(file_, std::string(4000, 'x') + "\n", 0600);
        writeFile(systemRoot() + "/tmp/filler", std::string(1 << 16, 'x'));
        const std::string before = readFile(file_);
        EXPECT_EQ(VLIBCFileAddLine(kFile, std::string(500, 'y').c_str(), 512), -1) << "its second page has no room";
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
        EXPECT_EQ(errno, ENOSPC);
        EXPECT_TRUE(readFile(file_) == before);
        return 0;
    }));
}

// The three names that a visitor's session uses in a folder where anybody may come first.
TEST_F(LineFile, PlantedFilesAreRefusedAtOnce) {
    const std::string other = systemRoot() + "/etc/shadow";
    writeFile(other, "secret,key\n", 0600);
    const auto expectRefused = [&](const char* what) {
        char line[32];
        EXPECT_EQ(VLIBCFileGetLine(kFile, "key", line, sizeof line, ","), -1) << what;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED) << what;
        EXPECT_EQ(VLIBCFileAddLine(kFile, "line", 512), -1) << what;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED) << what;
        EXPECT_EQ(VexoCgiBeginCriticalSection(kFile, 30000), -1) << what;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED) << what;
        std::filesystem::remove(file_);
    };
    std::filesystem::create_symlink(other, file_);
    expectRefused("a link");
    std::filesystem::create_symlink(systemRoot() + "/etc/none", file_);
    expectRefused("a link to nothing");
    std::filesystem::create_hard_link(other, file_);
    expectRefused("a second name");
    ASSERT_EQ(mkfifo(file_.c_str(), 0600), 0);
    expectRefused("a pipe");
    support::makeFolder(file_, 0700);
    expectRefused("a folder");
    writeFile(file_, "secret,key\n", 0666);
    expectRefused("anybody's to write");
    if (geteuid() == 0) {
        writeFile(file_, "secret,key\n", 0600);
        ASSERT_EQ(chown(file_.c_str(), support::kBobUid, support::kUsersGid), 0);
        expectRefused("a foreign file");
    }
    EXPECT_EQ(readFile(other), "secret,key\n");
    EXPECT_FALSE(std::filesystem::exists(systemRoot() + "/etc/none"));
}

TEST_F(LineFile, WhoActsForAUserWritesAsRoot) {
    SKIP_WITHOUT_ROOT();
    support::inChild([&] {
        if (setegid(support::kUsersGid) != 0 || seteuid(support::kAliceUid) != 0) return 1;
        EXPECT_EQ(VLIBCFileAddLine(kFile, "a,b", 512), 0);
        char line[8];
        EXPECT_EQ(VLIBCFileGetLine(kFile, "b", line, sizeof line, ","), 1);
        VexoCgiEndCriticalSection(VexoCgiBeginCriticalSection(kLock, 0));
        EXPECT_EQ(VLIBCSysRename(kFile, "/etc/taken"), -1) << "a rename is the caller's own";
        EXPECT_EQ(geteuid(), support::kAliceUid);
        for (const char* name : {kFile, kLock}) {
            struct stat status {};
            EXPECT_EQ(stat((systemRoot() + name).c_str(), &status), 0) << name;
            EXPECT_EQ(status.st_uid, 0U) << name;
            EXPECT_EQ(status.st_mode & 0777, 0600U) << name;
        }
        return 0;
    });
}

}  // namespace
