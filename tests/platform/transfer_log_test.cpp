// The transfer log: its lines and its file.
#include <json/reader.h>
#include <json/value.h>
#include <sys/mount.h>
#include <sys/wait.h>

#include <sstream>

#include "platform/private_mounts.h"
#include "support/testing.h"
#include "transfer_entry.h"
#include "vexo/xferlog.h"

namespace {

class TransferLogTest : public ApplianceTest {
 protected:
    static Json::Value parse(const std::string& line) {
        Json::Value value;
        std::istringstream in(line);
        EXPECT_TRUE(parseFromStream(Json::CharReaderBuilder(), in, &value, nullptr)) << line;
        return value;
    }
    std::vector<std::string> lines() {
        std::vector<std::string> all;
        std::istringstream in(readFile(log_));
        for (std::string line; std::getline(in, line);) all.push_back(line);
        return all;
    }
    std::string log_ = systemRoot() + "/var/log/vexo/xfer.log";
};

TEST_F(TransferLogTest, AnEntryIsOneLineWhateverTheTexts) {
    EXPECT_EQ(vexo::buildTransferEntry({1767323045, "::1", "alice", "upload", 12, "/photo/a", false}),
              "{\"time\":\"2026-01-02T03:04:05Z\",\"address\":\"::1\",\"user\":\"alice\",\"action\":\"upload\","
              "\"size\":12,\"path\":\"/photo/a\",\"flag\":false}\n");
    const std::string odd = "/photo/\"q\\\n\x01\x7F\xC3\xA4 \xE2\x80\xA8%";
    const Json::Value value = parse(vexo::buildTransferEntry({0, "a", "b", "c", -1, odd, true}));
    EXPECT_EQ(value["path"].asString(), odd);
    EXPECT_TRUE(value["flag"].asBool() && value["size"].asInt64() == -1 && !value.isMember("path_raw"));
    const std::string broken = "/photo/\xFF\"\xE4%.jpg";
    const std::string line = vexo::buildTransferEntry({0, "a", "b", "c", 0, broken, false});
    EXPECT_EQ(parse(line)["path"].asString(), "/photo/\xEF\xBF\xBD\"\xEF\xBF\xBD%.jpg");
    EXPECT_EQ(parse(line)["path_raw"].asString(), "/photo/%FF%22%E4%25.jpg");
    EXPECT_EQ(line.find('\n'), line.size() - 1);
}

TEST_F(TransferLogTest, EntriesOfManyProcessesAreAllThereAndWhole) {
    const mode_t before = umask(0);
    constexpr int kWriters = 4;
    constexpr int kEach = 200;
    const std::string path = "/photo/" + std::string(3000, 'p');
    std::vector<pid_t> children;
    for (int writer = 0; writer < kWriters; ++writer) {
        children.push_back(fork());
        if (children.back() != 0) continue;
        for (int i = 0; i < kEach; ++i) VEXOLogKTRFMXferLog("::1", "u", "upload", i, path.c_str(), true);
        _exit(0);
    }
    for (const pid_t child : children) EXPECT_EQ(waitpid(child, nullptr, 0), child);
    umask(before);
    const auto all = lines();
    EXPECT_EQ(all.size(), size_t{kWriters * kEach});
    for (const std::string& line : all) EXPECT_EQ(parse(line)["path"].asString(), path);
    EXPECT_EQ(fs::status(log_).permissions(), fs::perms{0600});
    EXPECT_EQ(fs::status(fs::path(log_).parent_path()).permissions(), fs::perms{0755});
}

TEST_F(TransferLogTest, ASwitchedProgramStillLogsAndStaysSwitched) {
    SKIP_WITHOUT_ROOT();
    const auto body = [] {
        if (setegid(kUsersGid) != 0 || seteuid(kAliceUid) != 0) return 97;
        EXPECT_EQ(VEXOLogKTRFMXferLog("::1", "alice", "mkdir", 0, "/photo/a", true), 0);
        return geteuid() == kAliceUid && getegid() == kUsersGid ? 0 : 1;
    };
    EXPECT_EQ(inChild(body), 0);
    EXPECT_EQ(lines().size(), 1U);
}

TEST_F(TransferLogTest, ALogThatOthersCouldHaveForgedIsNotWritten) {
    const auto attempt = [] { return VEXOLogKTRFMXferLog("::1", "u", "delete", 0, "/photo/a", false); };
    const std::string elsewhere = systemRoot() + "/elsewhere";
    writeFile(elsewhere, "");
    makeFolder(fs::path(log_).parent_path());
    for (const auto& [name, lay] :
         Rows<const char*, std::function<void()>>{{"link", [&] { fs::create_symlink(elsewhere, log_); }},
                                                  {"second name", [&] { fs::create_hard_link(elsewhere, log_); }},
                                                  {"writable by others", [&] { writeFile(log_, "", 0666); }},
                                                  {"pipe", [&] { EXPECT_EQ(mkfifo(log_.c_str(), 0600), 0); }}}) {
        SCOPED_TRACE(name);
        lay();
        EXPECT_EQ(attempt(), -1);
        EXPECT_NE(errno, 0);
        EXPECT_EQ(readFile(elsewhere), "");
        ASSERT_EQ(unlink(log_.c_str()), 0);
    }
    EXPECT_EQ(attempt(), 0);
    EXPECT_EQ(VEXOLogKTRFMXferLog(nullptr, "u", "delete", 0, "/photo/a", false), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    EXPECT_EQ(lines().size(), 1U);
}

TEST_F(TransferLogTest, AFullDiskLeavesNoTornLine) {
    SKIP_WITHOUT_ROOT();
    const std::string folder = fs::path(log_).parent_path();
    makeFolder(folder);
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        EXPECT_EQ(mount("none", folder.c_str(), "tmpfs", 0, "size=16k,mode=0755"), 0);
        const std::string path = "/photo/" + std::string(3000, 'p');
        size_t written = 0;
        while (VEXOLogKTRFMXferLog("::1", "u", "upload", 0, path.c_str(), true) == 0 && written < 100) ++written;
        EXPECT_EQ(errno, ENOSPC);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
        EXPECT_GE(written, 1U);
        EXPECT_EQ(lines().size(), written);
        for (const std::string& line : lines()) EXPECT_EQ(parse(line)["path"].asString(), path);
        return 0;
    }));
}

}  // namespace
