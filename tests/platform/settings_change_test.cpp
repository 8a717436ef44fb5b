// Changing settings files: the texts, the file, and processes that are killed while they write.
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/wait.h>

#include <array>
#include <atomic>
#include <chrono>
#include <csignal>
#include <random>
#include <string_view>
#include <thread>

#include "platform/planted_files.h"
#include "platform/private_mounts.h"
#include "platform/refuse_calls.h"
#include "settings_file.h"
#include "settings_text.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

namespace {

using std::string_view;

constexpr const char* kFile = "/etc/sharing.conf";
constexpr const char* kFormat = "%s=\"%s\"\n";

TEST(SettingsChange, EveryOtherByteStays) {
    using namespace std::string_view_literals;
    for (const auto& [before, key, line, after] : Rows<string_view, string_view, string_view, string_view>{
             {"", "a", "a=1", "a=1\n"},
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
    for (const auto& [text, expected] : Rows<const char*, bool>{{"aaaa\nbbbb\ncccc\n", true},
                                                                {"aaaa\ncccc\n\n\n\n\n\n", true},
                                                                {"aaaa\ncccc\ncccc\n", true},
                                                                {"aaaa\ncccc\n", true},
                                                                {"aaaa\nbbbb\ndddd\n", false},
                                                                {"aaaa\n", false},
                                                                {"aaaa\nbbbb\ncccc\nd\n", false}}) {
        EXPECT_EQ(vexo::isOnTheWay(text, change), expected) << text;
    }
}

class SettingsChangeTest : public ApplianceTest {
 protected:
    std::string file_ = systemRoot() + kFile;
};

TEST_F(SettingsChangeTest, WhatDoesNotReadBackIsRefused) {
    writeFile(file_, "keep=1");
    for (const auto& [key, value, format] : Rows<const char*, const char*, const char*>{{"a", "say \"hi\"", kFormat},
                                                                                        {"a", "b\nc=\"1\"", kFormat},
                                                                                        {"a", "b\r", kFormat},
                                                                                        {"a", "\x7F", kFormat},
                                                                                        {"a", " b", "%s=%s\n"},
                                                                                        {"", "b", kFormat},
                                                                                        {"#a", "b", kFormat},
                                                                                        {"a=b", "c", kFormat},
                                                                                        {" a", "b", kFormat},
                                                                                        {"a\n", "b", kFormat},
                                                                                        {"a", "b", "%n%s"},
                                                                                        {"a", "b", ""},
                                                                                        {nullptr, "b", kFormat},
                                                                                        {"a", nullptr, kFormat}}) {
        EXPECT_FAILS(VLIBCFileSetKeyValue(kFile, key, value, format), EINVAL, VEXO_ERR_PARAMETER);
    }
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

// Eight writers with keys of their own, each killed again and again; what each knows lies in shared memory.
struct Choice {
    std::atomic<int> known;   // -1 no line, else the value
    std::atomic<int> wanted;  // what was asked for last
};
constexpr size_t kWriters = 8;
constexpr int kKeys = 50;
using Choices = std::array<Choice, kWriters * kKeys>;
using Clock = std::chrono::steady_clock;

std::string keyOf(size_t number) {
    return std::to_string(20000 + number);
}

int valueOf(size_t number) {
    char value[16];
    const int found = VLIBCFileGetKeyValue(kFile, keyOf(number).c_str(), value, sizeof value, 0);
    return found == 1 ? std::stoi(value) : found == 0 ? -1 : -2;
}

// Changes one key after the other, each under the lock on the file, until it is killed.
[[noreturn]] void writeForever(const std::string& path, size_t writer, Choices& choices) {
    std::minstd_rand random(static_cast<unsigned>(getpid()));
    while (true) {
        const size_t number = writer * kKeys + random() % kKeys;
        Choice& choice = choices[number];
        const int fd = open(path.c_str(), O_RDWR | O_CLOEXEC);
        if (fd < 0 || flock(fd, LOCK_EX) != 0) _exit(1);
        if (choice.wanted != choice.known) choice.known = valueOf(number);  // killed in between: either is right
        const int value = std::max(static_cast<int>(random() % 3000) - 1000, -1);
        choice.wanted = value;
        const std::string key = keyOf(number);
        const int result = value < 0 ? VLIBCFileRemoveKey(kFile, key.c_str())
                                     : VLIBCFileSetKeyValue(kFile, key.c_str(), std::to_string(value).c_str(), kFormat);
        if (result != 0) _exit(2);
        choice.known = value;
        close(fd);
    }
}

// The text without the lines of the writers' keys; "torn" when one of them is.
std::string withoutChoices(string_view text) {
    std::string kept;
    while (!text.empty()) {
        const string_view line = text.substr(0, std::min(text.find('\n'), text.size() - 1) + 1);
        text.remove_prefix(line.size());
        if (!line.starts_with('2')) {
            kept.append(line);
        } else if (line.size() > 13 || line.find("=\"") != 5 || !line.ends_with("\"\n")) {
            return "torn";
        }
    }
    return kept;
}

std::string readWhole() {
    std::string text;
    vexo::FileVersion version;
    return vexo::readSettingsFile(VEXO::SystemPath(kFile), text, version) ? text : "unreadable";
}

TEST_F(SettingsChangeTest, KilledWritersLoseNothing) {
    std::string others = "# kept\r\n\nno setting\nother=\"\xFF\"\n";
    // Long lines: many pages to write, little to parse, so that kills meet writes.
    for (int i = 0; i < 100; ++i) others += "other" + std::to_string(i) + " = " + std::string(600, 'x') + "\r\n";
    writeFile(file_, others);
    void* shared = mmap(nullptr, sizeof(Choices), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(shared, MAP_FAILED);
    Choices& choices = *new (shared) Choices;
    for (Choice& choice : choices) choice.known = choice.wanted = -1;
    const auto start = [&](size_t writer) {
        const pid_t child = fork();
        if (child == 0) writeForever(file_, writer, choices);
        return child;
    };
    std::array<pid_t, kWriters> writers{};
    for (size_t i = 0; i < kWriters; ++i) writers[i] = start(i);
    const auto end = Clock::now() + std::chrono::seconds(3);
    const pid_t looker = fork();
    if (looker == 0) {
        while (Clock::now() < end) {
            if (withoutChoices(readWhole()) != others) _exit(1);
        }
        _exit(0);
    }
    std::minstd_rand random(static_cast<unsigned>(time(nullptr)));
    int status = 0;
    while (Clock::now() < end) {
        std::this_thread::sleep_for(std::chrono::microseconds(500 + random() % 2000));
        const size_t victim = random() % kWriters;
        kill(writers[victim], SIGKILL);
        waitpid(writers[victim], &status, 0);
        EXPECT_TRUE(WIFSIGNALED(status)) << "a change failed";
        writers[victim] = start(victim);
    }
    for (const pid_t writer : writers) {
        kill(writer, SIGKILL);
        waitpid(writer, nullptr, 0);
    }
    EXPECT_EQ(waitpid(looker, &status, 0), looker);
    EXPECT_EQ(status, 0) << "a reader without a lock saw a torn text";
    EXPECT_TRUE(withoutChoices(readWhole()) == others);
    for (size_t number = 0; number < choices.size(); ++number) {
        const int value = valueOf(number);
        EXPECT_TRUE(value == choices[number].known || value == choices[number].wanted)
            << keyOf(number) << " is " << value;
    }
    munmap(shared, sizeof(Choices));
}

}  // namespace
