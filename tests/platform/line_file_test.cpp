// Record files: finding lines, adding them, what others may have put in their place.
#include "vexo/line_file.h"

#include "platform/private_mounts.h"
#include "platform/trust.h"
#include "vexo/critical_section.h"

namespace {

constexpr const char* kFile = "/tmp/foldersharing.current.users";
constexpr const char* kLock = "/tmp/foldersharing.current.users.lock";

class LineFile : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        makeFolder(systemRoot() + "/tmp", 01777);
    }
    std::string file_ = systemRoot() + kFile;
};

TEST_F(LineFile, AKeyIsAWholeFieldOfALine) {
    using namespace std::string_literals;
    writeFile(file_, "10.0.0.1,alice,AB,1\nnul\0,CD\n\n,,AB2\r\n10.0.0.2,bob,AB\r\nlast;EF"s, 0600);
    for (const auto& [key, separators, size, expected, text] :
         rowsOf<const char*, const char*, int, int, const char*>("platform/found_lines")) {
        char line[64] = "?";
        EXPECT_EQ(VLIBCFileGetLine(kFile, key, line, size, separators), expected) << key;
        EXPECT_STREQ(line, text) << key;
    }
}

TEST_F(LineFile, AddedLinesAreWholeOrNotThere) {
    const mode_t mask = umask(0);
    EXPECT_EQ(VLIBCFileAddLine(kFile, "12345678", 8), 0);
    umask(mask);
    EXPECT_EQ(statusOf(file_).st_mode & 0777, 0600U);
    for (const char* refused : {"123456789", "a\nb", "a\r"})
        EXPECT_FAILS(VLIBCFileAddLine(kFile, refused, 8), EINVAL, VEXO_ERR_PARAMETER);
    EXPECT_FAILS(VLIBCFileAddLine("/none/x", "a", 8), ENOENT, VEXO_ERR_FILE);
    writeFile(file_, "torn", 0600);
    EXPECT_EQ(VLIBCFileAddLine(kFile, "a", 8), 0);
    EXPECT_EQ(VLIBCSysRename(kFile, "/tmp/renamed"), 0);
    EXPECT_EQ(readFile(systemRoot() + "/tmp/renamed"), "torn\na\n");
    EXPECT_FAILS(VLIBCSysRename(kFile, "/tmp/renamed"), ENOENT, VEXO_ERR_FILE);
}

TEST_F(LineFile, WhatAFullDiskCutShortIsTakenBack) {
    SKIP_WITHOUT_ROOT();
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        if (mount("none", (systemRoot() + "/tmp").c_str(), "tmpfs", 0, "size=16k") != 0) return 1;
        const std::string before = std::string(4000, 'x') + "\n";
        writeFile(file_, before, 0600);
        writeFile(systemRoot() + "/tmp/filler", std::string(1 << 16, 'x'));
        const std::string line(500, 'y');  // its second page has no room
        EXPECT_FAILS(VLIBCFileAddLine(kFile, line.c_str(), 512), ENOSPC, VEXO_ERR_NO_SPACE);
        EXPECT_TRUE(readFile(file_) == before);
        return 0;
    }));
}

TEST_F(LineFile, PlantedFilesAreRefusedAtOnce) {
    plantEach(file_, [] {
        char line[32];
        EXPECT_REFUSED(VLIBCFileGetLine(kFile, "key", line, sizeof line, ","));
        EXPECT_REFUSED(VLIBCFileAddLine(kFile, "line", 512));
        EXPECT_REFUSED(VexoCgiBeginCriticalSection(kFile, 30000));
    });
}

// Who looks for a line holds no lock while a check renames its rewrite onto the file.
TEST_F(LineFile, AFileThatIsReplacedMeanwhileIsReadAllTheSame) {
    writeFile(file_, "a,b\n", 0600);
    const std::string rewrite = file_ + ".tmp";
    const Rival replacer([&] {
        writeFile(rewrite, "a,b\n", 0600);
        if (rename(rewrite.c_str(), file_.c_str()) != 0) _exit(1);
    });
    int missed = 0;
    for (int i = 0; i < 20000; ++i) {
        char line[8];
        missed += VLIBCFileGetLine(kFile, "b", line, sizeof line, ",") == 1 ? 0 : 1;
    }
    EXPECT_EQ(missed, 0);
}

TEST_F(LineFile, WhoActsForAUserWritesAsRoot) {
    SKIP_WITHOUT_ROOT();
    actingForAlice([&] {
        EXPECT_EQ(VLIBCFileAddLine(kFile, "a,b", 512), 0);
        char line[8];
        EXPECT_EQ(VLIBCFileGetLine(kFile, "b", line, sizeof line, ","), 1);
        VexoCgiEndCriticalSection(VexoCgiBeginCriticalSection(kLock, 0));
        EXPECT_EQ(VLIBCSysRename(kFile, "/etc/taken"), -1) << "a rename is the caller's own";
        for (const char* name : {kFile, kLock}) {
            const struct stat status = statusOf(systemRoot() + name);
            EXPECT_TRUE(status.st_uid == 0 && (status.st_mode & 0777) == 0600) << name;
        }
    });
}

}  // namespace
