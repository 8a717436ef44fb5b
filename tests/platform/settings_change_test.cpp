// Changing settings files: the texts, the file, and processes that are killed while they write.
#include <sys/file.h>
#include <sys/mount.h>
#include <sys/wait.h>

#include <array>
#include <csignal>
#include <random>

#include "platform/private_mounts.h"
#include "platform/trust.h"
#include "settings/settings_file.h"
#include "settings/settings_text.h"
#include "support/refuse_calls.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

namespace {

constexpr const char* kFile = "/etc/sharing.conf";
constexpr const char* kFormat = "%s=\"%s\"\n";

TEST(SettingsChange, EveryOtherByteStays) {
    using namespace std::string_view_literals;
    for (const auto& [before, key, line, after] :
         Rows<std::string_view, std::string_view, std::string_view, std::string_view>{
             {"b=2", "a", "a=1", "b=2\na=1\n"},
             {"a=0\nb = 2 \r\n", "a", "a=1", "a=1\nb = 2 \r\n"},
             {"b\r\n a = 0\r\nc", "a", "a=1", "b\r\na=1\r\nc"},
             {"a=\"0", "a", "a=1", "a=1\n"},
             {"x\na=1\n\n#a=2\na=3\na b=4", "a", "a=1", "x\na=1\n\n#a=2\na b=4"},
             {"a=1\n=\n\xFF\0=1\na=2\r\n\n"sv, "a", "", "=\n\xFF\0=1\n\n"sv},
             {"b=1\na=2", "a", "", "b=1\n"},
             {"ab=1\nb=1", "a", "", "ab=1\nb=1"}}) {
        EXPECT_EQ(vexo::changeSetting(before, key, line), after) << before;
    }
}

TEST(SettingsChange, AnInterruptedChangeIsToldFromAnotherHand) {
    const vexo::PendingChange change{"aaaa\nbbbb\ncccc\n", "aaaa\ncccc\n"};
    EXPECT_EQ(vexo::parsePendingChange(vexo::buildPendingChange(change.before, change.after)), change);
    for (const char* torn :
         {"", "3", "3 ", "3 1", "3 1\nabc", "3 1\nabcdd", "-1 4\nabc", "18446744073709551615 2\na"}) {
        EXPECT_FALSE(vexo::parsePendingChange(torn)) << torn;
    }
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

TEST_F(SettingsChangeTest, TheFileKeepsItsInodeAndUnfinishedChangesAreEnded) {
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
    // A change that its writer did not live to make is there for readers, is made by the next writer, and gives way to
    // whoever wrote the file in another way since.
    const std::string change = vexo::buildPendingChange("b=\"true\"\n", "c=\"1\"\n");
    writeFile(file_ + ".pending", change);
    char value[8];
    EXPECT_EQ(VLIBCFileGetKeyValue(kFile, "c", value, sizeof value, 0), 1);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "d", "2", kFormat), 0);
    EXPECT_EQ(readFile(file_), "c=\"1\"\nd=\"2\"\n");
    writeFile(file_ + ".pending", change);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "c", "2", kFormat), 0);
    EXPECT_EQ(readFile(file_), "c=\"2\"\nd=\"2\"\n");
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

int countOf(const std::string& key) {
    char value[16] = "";
    const int found = VLIBCFileGetKeyValue(kFile, key.c_str(), value, sizeof value, 0);
    return found == 1 ? std::stoi(value) : found;
}

// Counts on from where it was killed, each change under the lock on the file; every other one removes another key.
[[noreturn]] void countForever(const std::string& path, const std::string& key) {
    for (int next = 0;; ++next) {
        const int fd = open(path.c_str(), O_RDWR | O_CLOEXEC);
        if (fd < 0 || flock(fd, LOCK_EX) != 0) _exit(1);
        const int known = countOf(key);
        if (next == 0) next = known + 1;
        if (known != next - 1) _exit(5);
        if (VLIBCFileSetKeyValue(kFile, key.c_str(), std::to_string(next).c_str(), kFormat) != 0) _exit(2);
        const std::string other = std::to_string(std::stoi(key) + 1000);
        if (next % 2 == 0 && VLIBCFileRemoveKey(kFile, other.c_str()) != 0) _exit(3);
        if (next % 2 == 1 && VLIBCFileSetKeyValue(kFile, other.c_str(), "1", kFormat) != 0) _exit(4);
        close(fd);
    }
}

// Eight writers with keys of their own, each killed again and again: what one of them had written stays.
TEST_F(SettingsChangeTest, KilledWritersLoseNothing) {
    std::string others = "# kept\r\n\nno setting\nother=\"\xFF\"\n";
    // Long lines: many pages to write, little to parse, so that kills meet writes.
    for (int i = 0; i < 100; ++i) others += "other" + std::to_string(i) + " = " + std::string(600, 'x') + "\r\n";
    writeFile(file_, others);
    std::array<pid_t, 8> writers{};
    std::array<int, 8> counts{};
    const auto isWhole = [&] {
        std::string text;
        vexo::FileVersion version;
        if (!vexo::readSettingsFile(file_, text, version) || !text.starts_with(others)) return false;
        const auto found = vexo::parseSettings(std::string_view(text).substr(others.size()), "=");
        const auto lines = std::count(text.begin(), text.end(), '\n') - std::count(others.begin(), others.end(), '\n');
        return text.ends_with('\n') && std::ssize(found) == lines &&
               std::all_of(found.begin(), found.end(), [](const vexo::Setting& count) {
                   return count.key.size() == 5 && count.value.find_first_not_of("0123456789") == std::string::npos;
               });
    };
    const auto keyOf = [](size_t writer) { return std::to_string(20000 + writer); };
    const auto start = [&](size_t writer) {
        writers[writer] = fork();
        if (writers[writer] == 0) countForever(file_, keyOf(writer));
    };
    for (size_t i = 0; i < writers.size(); ++i) start(i);
    const time_t end = time(nullptr) + 3;
    const pid_t looker = fork();
    if (looker == 0) {
        while (time(nullptr) < end) {
            if (!isWhole()) _exit(1);
        }
        _exit(0);
    }
    std::minstd_rand random(static_cast<unsigned>(time(nullptr)));
    int status = 0;
    while (time(nullptr) < end) {
        usleep(500 + random() % 2000);
        const size_t victim = random() % writers.size();
        kill(writers[victim], SIGKILL);
        waitpid(writers[victim], &status, 0);
        EXPECT_TRUE(WIFSIGNALED(status)) << "a change failed";
        const int count = countOf(keyOf(victim));
        EXPECT_GE(count, counts[victim]);
        counts[victim] = count;
        start(victim);
    }
    for (const pid_t writer : writers) {
        kill(writer, SIGKILL);
        waitpid(writer, nullptr, 0);
    }
    EXPECT_EQ(waitpid(looker, &status, 0), looker);
    EXPECT_EQ(status, 0) << "a reader without a lock saw a torn text";
    EXPECT_TRUE(isWhole());
    for (size_t i = 0; i < writers.size(); ++i) EXPECT_GE(countOf(keyOf(i)), counts[i]);
}

}  // namespace
