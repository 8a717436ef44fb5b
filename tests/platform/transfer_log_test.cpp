// The transfer log: its lines and its file.
#include <json/reader.h>

#include "platform/private_mounts.h"
#include "platform/trust.h"
#include "transfer_entry.h"
#include "vexo/xferlog.h"

namespace {

Json::Value parse(const std::string& line) {
    Json::Value value;
    std::istringstream in(line);
    EXPECT_TRUE(parseFromStream(Json::CharReaderBuilder(), in, &value, nullptr)) << line;
    return value;
}

TEST(TransferEntry, IsOneLineWhateverTheTexts) {
    EXPECT_EQ(vexo::buildTransferEntry({1767323045, "::1", "alice", "upload", 12, "/photo/a", false}),
              "{\"time\":\"2026-01-02T03:04:05Z\",\"address\":\"::1\",\"user\":\"alice\",\"action\":\"upload\","
              "\"size\":12,\"path\":\"/photo/a\",\"flag\":false}\n");
    const std::string odd = "/photo/\"q\\\n\x01\x7F\xC3\xA4 \xE2\x80\xA8%";
    std::string line = vexo::buildTransferEntry({0, "a", "b", "c", -1, odd, true});
    EXPECT_EQ(line.find('\n'), line.size() - 1);
    EXPECT_EQ(parse(line)["path"].asString(), odd);
    EXPECT_FALSE(parse(line).isMember("path_raw"));
    line = vexo::buildTransferEntry({0, "a", "b", "c", 0, "/photo/\xFF\"\xE4%.jpg", false});
    EXPECT_EQ(parse(line)["path"].asString(), "/photo/\xEF\xBF\xBD\"\xEF\xBF\xBD%.jpg");
    EXPECT_EQ(parse(line)["path_raw"].asString(), "/photo/%FF%22%E4%25.jpg");
}

class TransferLogTest : public ApplianceTest {
 protected:
    int log() { return VEXOLogKTRFMXferLog("::1", "u", "upload", 0, path_.c_str(), true); }
    // How many whole lines there are; there must be no others.
    int lines() {
        int count = 0;
        std::istringstream in(readFile(log_));
        for (std::string line; std::getline(in, line); ++count) EXPECT_EQ(parse(line)["path"].asString(), path_);
        return count;
    }
    std::string log_ = systemRoot() + "/var/log/vexo/xfer.log";
    std::string path_ = "/photo/" + std::string(3000, 'p');
};

TEST_F(TransferLogTest, EntriesOfManyProcessesAreAllThereAndWhole) {
    const mode_t before = umask(0);
    const auto writes = [this] {
        for (int i = 0; i < 200; ++i) {
            if (log() != 0) return false;
        }
        return true;
    };
    EXPECT_EQ(countAtOnce(4, writes), 4);
    umask(before);
    EXPECT_EQ(lines(), 4 * 200);
    EXPECT_EQ(statusOf(log_).st_mode & 0777, 0600U);
    EXPECT_EQ(statusOf(fs::path(log_).parent_path()).st_mode & 0777, 0755U);
}

TEST_F(TransferLogTest, OnlyALogOfOursIsWrittenAndByASwitchedProgramToo) {
    makeFolder(fs::path(log_).parent_path());
    plantEach(log_, [&] {
        EXPECT_EQ(log(), -1);
        EXPECT_NE(errno, 0);
    });
    EXPECT_EQ(log(), 0);
    if (geteuid() == 0) actingForAlice([&] { EXPECT_EQ(log(), 0); });
    EXPECT_EQ(lines(), geteuid() == 0 ? 2 : 1);

    const std::string torn = R"({"time":"2026-01-)";
    writeFile(log_, torn, 0600);
    EXPECT_EQ(log(), 0);
    const std::string text = readFile(log_);
    EXPECT_EQ(text.substr(0, torn.size() + 1), torn + "\n") << "what a killed writer left takes no other entry along";
    EXPECT_EQ(parse(text.substr(torn.size() + 1))["path"].asString(), path_);
}

TEST_F(TransferLogTest, AFullDiskLeavesNoTornLine) {
    SKIP_WITHOUT_ROOT();
    const std::string folder = fs::path(log_).parent_path();
    makeFolder(folder);
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        EXPECT_EQ(mount("none", folder.c_str(), "tmpfs", 0, "size=16k,mode=0755"), 0);
        int written = 0;
        while (log() == 0 && written < 100) ++written;
        EXPECT_EQ(errno, ENOSPC);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_NO_SPACE);
        EXPECT_GE(written, 1);
        EXPECT_EQ(lines(), written);
        return 0;
    }));
}

}  // namespace
