// Uploads that name the state of the file that they replace.

#include <thread>

#include "apps/cgi_test.h"

namespace {

class UploadConditionCgi : public CgiTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        SKIP_WITHOUT_ROOT();
        openFolder(shareRoot("photo"));
    }
    static RawReply fetch() { return RawReply(runCgi(PROGRAM_DOWNLOAD, "alice", "GET", "path=/photo/f")); }
    static CgiReply put(const std::string& body, const Variables& headers) {
        return CgiReply(runCgi(PROGRAM_UPLOAD, "alice", "PUT", "path=/photo/f", body, headers));
    }
};

TEST_F(UploadConditionCgi, AFileIsReplacedOnlyWhileItIsTheOneThatWasRead) {
    const std::string file = shareRoot("photo") + "/f";
    enum class Tag { kCurrent, kOld, kWeak, kAny, kListed };
    for (const auto& [which, there, status] :
         Rows<Tag, bool, int>{row(Tag::kCurrent, true, 200), row(Tag::kAny, true, 200), row(Tag::kListed, true, 200),
                              row(Tag::kOld, true, 412), row(Tag::kWeak, true, 412), row(Tag::kAny, false, 412)}) {
        SCOPED_TRACE(static_cast<int>(which));
        fs::remove(file);
        if (there) writeFile(file, "old", 0640);
        if (there) give(file);
        const std::string current = there ? fetch().headers.at("ETag") : "";
        const std::string named = which == Tag::kOld      ? "\"1-2-3.4\""
                                  : which == Tag::kWeak   ? "W/" + current
                                  : which == Tag::kAny    ? "*"
                                  : which == Tag::kListed ? "\"1-2-3.4\", " + current
                                                          : current;
        const CgiReply reply = put("new", {{"HTTP_IF_MATCH", named}});
        EXPECT_EQ(reply.status, status);
        EXPECT_EQ(code(reply), status == 200 ? 0 : 1806);
        ASSERT_EQ(fs::exists(file), there);
        EXPECT_EQ(there ? readFile(file) : "", !there ? "" : status == 200 ? "new" : "old");
        if (there) expectOwned(file, kAliceUid, 0640);
        // The next one can go on from there.
        if (status == 200) {
            EXPECT_EQ(reply.json["data"]["files"][0]["etag"], fetch().headers.at("ETag"));
        }
    }
    fs::remove(file);
    EXPECT_EQ(put("first", {{"HTTP_IF_NONE_MATCH", "*"}}).status, 200);
    const CgiReply second = put("second", {{"HTTP_IF_NONE_MATCH", "*"}});
    EXPECT_TRUE(second.status == 412 && code(second) == 1806) << second.status;
    EXPECT_EQ(put("x", {{"HTTP_IF_NONE_MATCH", "\"1-2-3.4\""}}).status, 400);
    EXPECT_EQ(readFile(file), "first");
    EXPECT_EQ(namesIn(shareRoot("photo")), Names{"f"});
}

TEST_F(UploadConditionCgi, WhatSomebodyIsWritingStays) {
    const std::string file = shareRoot("photo") + "/f";
    writeFile(file, "old");
    give(file);
    const Variables known = {{"HTTP_IF_MATCH", fetch().headers.at("ETag")}};
    const int writing = open(file.c_str(), O_WRONLY | O_CLOEXEC);
    const CgiReply refused = put("new", known);
    EXPECT_TRUE(refused.status == 412 && code(refused) == 1807) << refused.status;
    EXPECT_EQ(readFile(file), "old");
    close(writing);
    const int reading = open(file.c_str(), O_RDONLY | O_CLOEXEC);
    EXPECT_EQ(put("new", known).status, 200);
    close(reading);
}

// Each adds its own line to what it read, again after a refusal: a line that is missing was a change that got lost.
TEST_F(UploadConditionCgi, OfManyAtOnceNoChangeIsLost) {
    constexpr int kWriters = 4, kLines = 4;
    writeFile(shareRoot("photo") + "/f", "");
    give(shareRoot("photo") + "/f");
    std::vector<std::thread> writers;
    for (int writer = 0; writer < kWriters; ++writer)
        writers.emplace_back([writer] {
            for (int line = 0; line < kLines;) {
                const RawReply read = fetch();
                ASSERT_TRUE(read.headers.contains("ETag")) << read.status << " " << read.body;
                const std::string body = read.body + std::to_string(writer) + "." + std::to_string(line) + "\n";
                const CgiReply reply = put(body, {{"HTTP_IF_MATCH", read.headers.at("ETag")}});
                if (reply.status == 200) ++line;
                if (reply.status != 200 && reply.status != 412) return;
            }
        });
    for (std::thread& writer : writers) writer.join();
    const std::string text = readFile(shareRoot("photo") + "/f");
    EXPECT_EQ(std::count(text.begin(), text.end(), '\n'), kWriters * kLines) << text;
    EXPECT_EQ(namesIn(shareRoot("photo")), Names{"f"});
}

}  // namespace
