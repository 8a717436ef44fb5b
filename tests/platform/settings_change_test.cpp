// Changing settings files: the texts, the file, and processes that are killed while they write.
#include "platform/private_mounts.h"
#include "platform/trust.h"
#include "settings/settings_file.h"
#include "settings/settings_text.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

namespace {

constexpr const char* kFile = "/etc/sharing.conf";
constexpr const char* kFormat = "%s=\"%s\"\n";

TEST(SettingsChange, EveryOtherByteStays) {
    using namespace std::string_view_literals;
    for (const auto& [before, key, line, after] :
         Rows<std::string_view, std::string_view, std::string_view, std::string_view>{
             row("b=2", "a", "a=1", "b=2\na=1\n"), row("a=0\nb = 2 \r\n", "a", "a=1", "a=1\nb = 2 \r\n"),
             row("b\r\n a = 0\r\nc", "a", "a=1", "b\r\na=1\r\nc"), row("a=\"0", "a", "a=1", "a=1\n"),
             row("x\na=1\n\n#a=2\na=3\na b=4", "a", "a=1", "x\na=1\n\n#a=2\na b=4"),
             row("a=1\n=\n\xFF\0=1\na=2\r\n\n"sv, "a", "", "=\n\xFF\0=1\n\n"sv), row("b=1\na=2", "a", "", "b=1\n"),
             row("ab=1\nb=1", "a", "", "ab=1\nb=1")})
        EXPECT_EQ(vexo::changeSetting(before, key, line), after) << before;
}

TEST(SettingsChange, AnInterruptedChangeIsToldFromAnotherHand) {
    const vexo::PendingChange change{"aaaa\nbbbb\ncccc\n", "aaaa\ncccc\n"};
    EXPECT_EQ(vexo::parsePendingChange(vexo::buildPendingChange(change.before, change.after)), change);
    for (const char* torn : {"", "3", "3 ", "3 1", "3 1\nabc", "3 1\nabcdd", "-1 4\nabc", "18446744073709551615 2\na"})
        EXPECT_FALSE(vexo::parsePendingChange(torn)) << torn;
    for (const char* half : {"aaaa\nbbbb\ncccc\n", "aaaa\ncccc\n\n\n\n\n\n", "aaaa\ncccc\ncccc\n", "aaaa\ncccc\n"})
        EXPECT_TRUE(vexo::isOnTheWay(half, change)) << half;
    for (const char* other : {"aaaa\nbbbb\ndddd\n", "aaaa\n", "aaaa\nbbbb\ncccc\nd\n"})
        EXPECT_FALSE(vexo::isOnTheWay(other, change)) << other;
}

class SettingsChangeTest : public ApplianceTest {
 protected:
    std::string file_ = systemRoot() + kFile;
};

TEST_F(SettingsChangeTest, WhatDoesNotReadBackIsRefused) {
    writeFile(file_, "keep=1");
    for (const char* value : {"say \"hi\"", "b\nc=\"1\"", "b\r", "\x7F", static_cast<const char*>(nullptr)})
        EXPECT_FAILS(VLIBCFileSetKeyValue(kFile, "a", value, kFormat), EINVAL, VEXO_ERR_PARAMETER);
    for (const char* key : {"", "#a", "a=b", " a", "a\n"})
        EXPECT_FAILS(VLIBCFileSetKeyValue(kFile, key, "b", kFormat), EINVAL, VEXO_ERR_PARAMETER);
    for (const char* format : {"%n%s", "", "%s=%s\n"})
        EXPECT_FAILS(VLIBCFileSetKeyValue(kFile, "a", " b", format), EINVAL, VEXO_ERR_PARAMETER);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "a", "%s =#\xE4", kFormat), 0);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "b", "plain", "%s=%s\n"), 0);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "c", "", nullptr), 0);
    EXPECT_EQ(readFile(file_), "keep=1\na=\"%s =#\xE4\"\nb=plain\nc=\"\"\n");
    plantEach(file_, [] {
        EXPECT_REFUSED(VLIBCFileSetKeyValue(kFile, "a", "1", kFormat));
        EXPECT_REFUSED(VLIBCFileRemoveKey(kFile, "a"));
    });
}

TEST_F(SettingsChangeTest, TheFileKeepsItsInodeAndChangesAreAnnounced) {
    const mode_t mask = umask(077);
    EXPECT_EQ(VLIBCFileRemoveKey(kFile, "a"), 0) << "no file";
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "a", "true", kFormat), 0);
    umask(mask);
    const struct stat before = statusOf(file_);
    EXPECT_EQ(before.st_mode & 0777, 0644U);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "b", "true", kFormat), 0);
    EXPECT_EQ(VLIBCFileRemoveKey(kFile, "a"), 0);
    EXPECT_EQ(statusOf(file_).st_ino, before.st_ino);
    EXPECT_EQ(readFile(file_), "b=\"true\"\n");
    EXPECT_FAILS(VLIBCFileSetKeyValue("/none/x.conf", "a", "1", kFormat), ENOENT, VEXO_ERR_FILE);

    // A writer that the disk leaves in the lurch has announced its change before.
    inChild([] {
        if (!refuseCalls({{SYS_pwrite64, EIO}})) return 0;
        EXPECT_FAILS(VLIBCFileSetKeyValue(kFile, "b", "false", kFormat), EIO, VEXO_ERR_GENERAL);
        EXPECT_TRUE(fs::exists(VEXO::SystemPath(kFile) + ".pending"));
        return 0;
    });
    // One that its writer did not live to make gives way to whoever wrote the file in another way since.
    writeFile(file_ + ".pending", vexo::buildPendingChange("b=\"other\"\n", "c=\"1\"\n"));
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "c", "2", kFormat), 0);
    EXPECT_EQ(readFile(file_), "b=\"true\"\nc=\"2\"\n");
    EXPECT_FALSE(fs::exists(file_ + ".pending"));
}

TEST_F(SettingsChangeTest, AFullDiskLeavesTheFileWhole) {
    SKIP_WITHOUT_ROOT();
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        if (mount("none", (systemRoot() + "/etc").c_str(), "tmpfs", 0, "size=64k") != 0) return 1;
        writeFile(file_, "other\r\na=\"true\"\nlast");
        writeFile(systemRoot() + "/etc/filler", std::string(1 << 20, 'x'));
        const std::string value(5000, 'v');
        EXPECT_FAILS(VLIBCFileSetKeyValue(kFile, "b", value.c_str(), kFormat), ENOSPC, VEXO_ERR_NO_SPACE);
        EXPECT_EQ(readFile(file_), "other\r\na=\"true\"\nlast");
        EXPECT_EQ(VLIBCFileRemoveKey(kFile, "a"), 0) << "a right can be taken away all the same";
        EXPECT_EQ(readFile(file_), "other\r\nlast");
        return 0;
    }));
}

// Whenever a writer is killed its change is made or not, for readers as for the next writer.
TEST_F(SettingsChangeTest, KilledWritersLoseNothing) {
    const std::string others = "# kept\r\n\nno setting\nother=\"\xFF\"\nlong = " + std::string(9000, 'x') + "\r\n";
    for (const long call : {SYS_openat, SYS_write, SYS_fchmod, SYS_rename, SYS_pwrite64, SYS_ftruncate, SYS_unlink}) {
        for (const bool removes : {false, true}) {
            SCOPED_TRACE(std::to_string(call) + (removes ? " removes" : " changes"));
            writeFile(file_, "a=\"old\"\n" + others);
            expectKilled([call, removes] {
                if (!refuseCalls({{call, kKilled}})) return -1;
                return removes ? VLIBCFileRemoveKey(kFile, "a") : VLIBCFileSetKeyValue(kFile, "a", "changed", kFormat);
            });
            char value[8] = "";
            VLIBCFileGetKeyValue(kFile, "a", value, sizeof value, 0);
            EXPECT_TRUE(strcmp(value, "old") == 0 || strcmp(value, removes ? "" : "changed") == 0) << value;
            EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "b", "1", kFormat), 0);
            const std::string line = *value == '\0' ? "" : std::string("a=\"") + value + "\"\n";
            EXPECT_TRUE(readFile(file_) == line + others + "b=\"1\"\n") << readFile(file_).substr(0, 80);
            EXPECT_FALSE(fs::exists(file_ + ".pending"));
        }
    }
}

// Who reads without a lock meets no text that is neither the old one nor the new one.
TEST_F(SettingsChangeTest, AReaderBesideAWriterSeesWholeTexts) {
    const std::string others = "# kept\r\nother = " + std::string(30000, 'x') + "\r\n";
    writeFile(file_, others);
    size_t length = 0;
    const Rival writer([&] {
        length = (length + 7001) % 20000;
        if (VLIBCFileSetKeyValue(kFile, "a", std::string(length, 'a').c_str(), kFormat) != 0) _exit(1);
    });
    int torn = 0;
    for (int reading = 0; reading < 5000; ++reading) {
        std::string text;
        vexo::FileVersion version;
        const bool read = vexo::readSettingsFile(file_, text, version) && text.starts_with(others);
        const std::string line = read ? text.substr(others.size()) : "none";
        const bool isWhole = line.starts_with("a=\"") && line.find_first_not_of('a', 3) == line.size() - 2;
        torn += line.empty() || isWhole ? 0 : 1;
    }
    EXPECT_EQ(torn, 0);
}

}  // namespace
