// Changing settings files: the texts, the file, and processes that are killed while they write.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <ctime>
#include <filesystem>
#include <functional>
#include <random>
#include <string>
#include <string_view>
#include <thread>

#include "platform/private_mounts.h"
#include "settings_file.h"
#include "settings_text.h"
#include "support/appliance.h"
#include "vexo/error.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

namespace {

using support::readFile;
using support::writeFile;

constexpr const char* kFile = "/etc/sharing.conf";
constexpr const char* kFormat = "%s=\"%s\"\n";

TEST(SettingsChange, EveryOtherByteStays) {
    struct Case {
        std::string_view before, key, line, after;
    };
    using namespace std::string_view_literals;
    const Case cases[] = {
        {"", "a", "a=\"1\"", "a=\"1\"\n"},
        {"b=2", "a", "a=\"1\"", "b=2\na=\"1\"\n"},
        {"a=0\nb = 2 \r\n", "a", "a=\"1\"", "a=\"1\"\nb = 2 \r\n"},
        {"b\r\n a = 0\r\nc", "a", "a=\"1\"", "b\r\na=\"1\"\r\nc"},
        {"a=\"0", "a", "a=\"1\"", "a=\"1\"\n"},
        {"x\na=1\n\n#a=2\na=3\na b=4", "a", "a=\"1\"", "x\na=\"1\"\n\n#a=2\na b=4"},
        {"a=1\n=\n\xFF\0=1\na=2\r\n\n"sv, "a", "", "=\n\xFF\0=1\n\n"sv},
        {"b=1\na=2", "a", "", "b=1\n"},
        {"ab=1\nb=1", "a", "", "ab=1\nb=1"},
        {"a", "a", "", "a"},
    };
    for (const auto& [before, key, line, after] : cases) {
        EXPECT_EQ(vexo::changeSetting(before, key, line), after) << before;
    }
}

TEST(SettingsChange, AnInterruptedChangeIsToldFromAnotherHand) {
    const vexo::PendingChange change{"aaaa\nbbbb\ncccc\n", "aaaa\ncccc\n"};
    const auto readBack = vexo::parsePendingChange(vexo::buildPendingChange(change.before, change.after));
    ASSERT_TRUE(readBack);
    EXPECT_EQ(readBack->before, change.before);
    EXPECT_EQ(readBack->after, change.after);
    for (const char* torn :
         {"", "3", "3 ", "3 1", "3 1\nabc", "3 1\nabcdd", "-1 4\nabc", "18446744073709551615 2\na"}) {
        EXPECT_FALSE(vexo::parsePendingChange(torn)) << torn;
    }
    struct Case {
        const char* text;
        bool expected;
    };
    for (const auto& [text, expected] :
         {Case{"aaaa\nbbbb\ncccc\n", true}, Case{"aaaa\ncccc\n\n\n\n\n\n", true}, Case{"aaaa\ncccc\ncccc\n", true},
          Case{"aaaa\ncccc\n", true}, Case{"aaaa\nbbbb\ndddd\n", false}, Case{"aaaa\n", false},
          Case{"aaaa\nbbbb\ncccc\nd\n", false}}) {
        EXPECT_EQ(vexo::isOnTheWay(text, change), expected) << text;
    }
}

class SettingsChangeTest : public support::ApplianceTest {
 protected:
    std::string file_ = systemRoot() + kFile;
};

TEST_F(SettingsChangeTest, WhatDoesNotReadBackIsRefused) {
    writeFile(file_, "keep=1");
    struct Case {
        const char *key, *value, *format;
    };
    const Case cases[] = {
        {"a", "say \"hi\"", kFormat}, {"a", "b\nc=\"1\"", kFormat}, {"a", "b\r", kFormat}, {"a", "\x7F", kFormat},
        {"a", " b", "%s=%s\n"},       {"", "b", kFormat},           {"#a", "b", kFormat},  {"a=b", "c", kFormat},
        {" a", "b", kFormat},         {"a\n", "b", kFormat},        {"a", "b", "%n%s"},    {"a", "b", ""},
        {nullptr, "b", kFormat},      {"a", nullptr, kFormat},
    };
    for (const auto& [key, value, format] : cases) {
        EXPECT_EQ(VLIBCFileSetKeyValue(kFile, key, value, format), -1) << value;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    }
    EXPECT_EQ(readFile(file_), "keep=1");
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "a", "%s =#\xE4", kFormat), 0);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "b", "plain", "%s=%s\n"), 0);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "c", "", nullptr), 0);
    EXPECT_EQ(readFile(file_), "keep=1\na=\"%s =#\xE4\"\nb=plain\nc=\"\"\n");
}

TEST_F(SettingsChangeTest, TheFileKeepsItsInodeAndIsMadeReadableToAll) {
    const mode_t mask = umask(077);
    EXPECT_EQ(VLIBCFileRemoveKey(kFile, "a"), 0) << "no file";
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "a", "true", kFormat), 0);
    umask(mask);
    struct stat before {};
    struct stat after {};
    ASSERT_EQ(stat(file_.c_str(), &before), 0);
    EXPECT_EQ(before.st_mode & 0777, 0644U);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "b", "true", kFormat), 0);
    EXPECT_EQ(VLIBCFileRemoveKey(kFile, "a"), 0);
    EXPECT_EQ(VLIBCFileRemoveKey(kFile, "a"), 0);
    ASSERT_EQ(stat(file_.c_str(), &after), 0);
    EXPECT_EQ(after.st_ino, before.st_ino);
    EXPECT_EQ(readFile(file_), "b=\"true\"\n");
    EXPECT_EQ(VLIBCFileSetKeyValue("/none/x.conf", "a", "1", kFormat), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);

    // A change that its writer did not live to make is there for readers, is made by the next writer, and gives way to
    // whoever wrote the file in another way since.
    writeFile(file_ + ".pending", vexo::buildPendingChange("b=\"true\"\n", "c=\"1\"\n"), 0644);
    char value[8];
    EXPECT_EQ(VLIBCFileGetKeyValue(kFile, "c", value, sizeof value, 0), 1);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "d", "2", kFormat), 0);
    EXPECT_EQ(readFile(file_), "c=\"1\"\nd=\"2\"\n");
    writeFile(file_ + ".pending", vexo::buildPendingChange("b=\"true\"\n", "c=\"1\"\n"), 0644);
    EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "c", "2", kFormat), 0);
    EXPECT_EQ(readFile(file_), "c=\"2\"\nd=\"2\"\n");
    EXPECT_FALSE(std::filesystem::exists(file_ + ".pending"));
}

TEST_F(SettingsChangeTest, PlantedFilesAreRefused) {
    const std::string other = systemRoot() + "/etc/other.conf";
    const auto expectRefused = [&](const char* what) {
        EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "a", "1", kFormat), -1) << what;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED) << what;
        EXPECT_EQ(VLIBCFileRemoveKey(kFile, "a"), -1) << what;
        std::filesystem::remove(file_);
    };
    writeFile(other, "a=0\n");
    ASSERT_EQ(symlink(other.c_str(), file_.c_str()), 0);
    expectRefused("a link");
    ASSERT_EQ(link(other.c_str(), file_.c_str()), 0);
    expectRefused("a second name");
    ASSERT_EQ(mkfifo(file_.c_str(), 0600), 0);
    expectRefused("a pipe");
    writeFile(file_, "a=0\n", 0666);
    expectRefused("anybody's to write");
    if (geteuid() == 0) {
        writeFile(file_, "a=0\n");
        ASSERT_EQ(chown(file_.c_str(), support::kBobUid, support::kUsersGid), 0);
        expectRefused("a foreign file");
    }
    EXPECT_EQ(readFile(other), "a=0\n");
}

TEST_F(SettingsChangeTest, AFullDiskLeavesTheFileWhole) {
    SKIP_WITHOUT_ROOT();
    EXPECT_WITH_PRIVATE_MOUNTS(support::inPrivateMounts([&] {
        if (mount("none", (systemRoot() + "/etc").c_str(), "tmpfs", 0, "size=64k") != 0) return 1;
        writeFile(file_, "other\r\na=\"true\"\nlast");
        std::string filler(1 << 20, 'x');
        writeFile(systemRoot() + "/etc/filler", filler);
        const std::string longValue(5000, 'v');
        EXPECT_EQ(VLIBCFileSetKeyValue(kFile, "b", longValue.c_str(), kFormat), -1);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
        EXPECT_EQ(errno, ENOSPC);
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
constexpr int kWriters = 8;
constexpr int kKeys = 50;
using Choices = std::array<std::array<Choice, kKeys>, kWriters>;

std::string keyOf(int writer, int key) {
    return std::to_string(20000 + writer * 1000 + key);
}

int valueOf(const std::string& key) {
    char value[16];
    const int found = VLIBCFileGetKeyValue(kFile, key.c_str(), value, sizeof value, 0);
    return found == 1 ? std::stoi(value) : found == 0 ? -1 : -2;
}

// Changes one key after the other, each under the lock on the file, until it is killed.
[[noreturn]] void writeForever(const std::string& path, int writer, Choices& choices) {
    std::minstd_rand random(static_cast<unsigned>(getpid()));
    while (true) {
        const int number = static_cast<int>(random() % kKeys);
        Choice& choice = choices[static_cast<size_t>(writer)][static_cast<size_t>(number)];
        const std::string key = keyOf(writer, number);
        const int fd = open(path.c_str(), O_RDWR | O_CLOEXEC);
        if (fd < 0 || flock(fd, LOCK_EX) != 0) _exit(1);
        if (choice.wanted != choice.known) choice.known = valueOf(key);  // killed in between: either is right
        const int value = static_cast<int>(random() % 3000) - 1000;
        choice.wanted = value < 0 ? -1 : value;
        const int result = value < 0 ? VLIBCFileRemoveKey(kFile, key.c_str())
                                     : VLIBCFileSetKeyValue(kFile, key.c_str(), std::to_string(value).c_str(), kFormat);
        if (result != 0) _exit(2);
        choice.known = choice.wanted.load();
        close(fd);
    }
}

// The text without the lines of the writers' keys.
std::string withoutChoices(std::string_view text) {
    std::string kept;
    while (!text.empty()) {
        const std::string_view line = text.substr(0, std::min(text.find('\n'), text.size() - 1) + 1);
        if (!line.starts_with('2')) kept.append(line);
        text.remove_prefix(line.size());
    }
    return kept;
}

// Reads without a lock: every text must be a whole one. Ends by itself.
[[noreturn]] void lookUntil(std::chrono::steady_clock::time_point end, const std::string& others) {
    while (std::chrono::steady_clock::now() < end) {
        std::string text;
        vexo::FileVersion version;
        if (!vexo::readSettingsFile(VEXO::SystemPath(kFile), text, version)) _exit(3);
        if (withoutChoices(text) != others) _exit(4);
        for (const auto& [key, value] : vexo::parseSettings(text, "=")) {
            if (key[0] == '2' && (key.size() != 5 || value.empty() || value.size() > 4)) _exit(5);
        }
    }
    _exit(0);
}

// Kills one writer after the other until `end`; the number of kills, -1 when a writer ended by itself.
int killUntil(std::chrono::steady_clock::time_point end, std::array<pid_t, kWriters>& writers,
              const std::function<pid_t(int)>& start) {
    std::minstd_rand random(static_cast<unsigned>(time(nullptr)));
    int kills = 0;
    for (; std::chrono::steady_clock::now() < end; ++kills) {
        std::this_thread::sleep_for(std::chrono::microseconds(500 + random() % 2000));
        const size_t victim = random() % kWriters;
        int status = 0;
        kill(writers[victim], SIGKILL);
        waitpid(writers[victim], &status, 0);
        if (!WIFSIGNALED(status)) return -1;
        writers[victim] = start(static_cast<int>(victim));
    }
    for (const pid_t writer : writers) {
        kill(writer, SIGKILL);
        waitpid(writer, nullptr, 0);
    }
    return kills;
}

void expectEveryChoice(const Choices& choices, const std::string& text) {
    const auto settings = vexo::parseSettings(text, "=");
    for (int writer = 0; writer < kWriters; ++writer) {
        for (int number = 0; number < kKeys; ++number) {
            const Choice& choice = choices[static_cast<size_t>(writer)][static_cast<size_t>(number)];
            const auto found = vexo::findSetting(settings, keyOf(writer, number));
            const int value = found ? std::stoi(std::string(*found)) : -1;
            EXPECT_TRUE(value == choice.known || value == choice.wanted) << keyOf(writer, number) << " is " << value;
        }
    }
}

void fightForTheFile(const std::string& path) {
    std::string others = "# kept\r\n\nno setting\nother=\"\xFF\"\n";
    // Long lines: many pages to write, little to parse, so that kills meet writes.
    for (int i = 0; i < 100; ++i) others += "other" + std::to_string(i) + " = " + std::string(600, 'x') + "\r\n";
    writeFile(path, others);
    void* shared = mmap(nullptr, sizeof(Choices), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(shared, MAP_FAILED);
    Choices& choices = *new (shared) Choices;
    for (auto& writer : choices) {
        for (Choice& choice : writer) choice.known = choice.wanted = -1;
    }
    const auto start = [&](int writer) {
        const pid_t child = fork();
        if (child == 0) writeForever(path, writer, choices);
        return child;
    };
    std::array<pid_t, kWriters> writers{};
    for (int i = 0; i < kWriters; ++i) writers[static_cast<size_t>(i)] = start(i);
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(4);
    const pid_t looker = fork();
    if (looker == 0) lookUntil(end, others);
    EXPECT_GT(killUntil(end, writers, start), 100) << "or a change failed";
    int status = 0;
    EXPECT_EQ(waitpid(looker, &status, 0), looker);
    EXPECT_EQ(status, 0) << "a reader saw a torn text";
    std::string text;
    vexo::FileVersion version;
    EXPECT_TRUE(vexo::readSettingsFile(path, text, version));
    EXPECT_TRUE(withoutChoices(text) == others);
    expectEveryChoice(choices, text);
    munmap(shared, sizeof(Choices));
}

TEST_F(SettingsChangeTest, KilledWritersLoseNothing) {
    fightForTheFile(file_);
}

}  // namespace
