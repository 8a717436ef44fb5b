// The program thumbnail with real pictures, and the place in which foreign decoders run.
#include <sys/file.h>
#include <sys/mman.h>

#include "apps/cgi_test.h"
#include "thumbnail/sandbox.h"

namespace {

using orvel::cgi::runInSandbox;
using orvel::cgi::SandboxEnd;

// What a camera held on its side writes behind the first two bytes of a JPEG file.
const std::string kTurned(
    "\xFF\xE1\0\x22"
    "Exif\0\0MM\0*\0\0\0\x08\0\x01\x01\x12\0\x03\0\0\0\x01\0\x06\0\0\0\0\0\0",
    36);
constexpr const char* kDocument =
    "%PDF-1.4\n1 0 obj<</Type/Catalog/Pages 2 0 R>>endobj 2 0 obj<</Type/Pages/Kids[3 0 R]/Count 1>>endobj\n"
    "3 0 obj<</Type/Page/Parent 2 0 R/MediaBox[0 0 800 400]>>endobj\ntrailer<</Root 1 0 R>>\n";

class ThumbnailCgi : public CgiTest {
 protected:
    void SetUp() override {
        CgiTest::SetUp();
        makeFolder(shareRoot("photo"), 0755);
        vips({"black", at("a.png"), "320", "160", "--bands", "3"});
        chmod(at("a.png").c_str(), 0644);
    }
    static std::string at(const std::string& name) { return shareRoot("photo") + "/" + name; }
    static void vips(std::vector<std::string> words) {
        words.insert(words.begin(), "/usr/bin/vips");
        EXPECT_EQ(runProgram(words).status, 0) << words[1] << " " << words.back();
    }
    static RawReply fetch(const std::string& name, const std::string& more = "", const Variables& variables = {}) {
        return RawReply(runCgi(PROGRAM_THUMBNAIL, "alice", "GET", "path=/photo/" + name + more, "", variables));
    }
    // "WIDTHxHEIGHT".
    std::string extentOf(const std::string& picture) {
        const std::string file = systemRoot() + "/tmp/drawn";
        writeFile(file, picture, 0600);
        std::istringstream words(runProgram({"/usr/bin/vipsheader", file}).output);  // behind the name
        std::string extent;
        words >> extent >> extent;
        return extent;
    }
    // All the seats of those who make pictures.
    std::vector<orvel::Descriptor> takeSeats() {
        std::vector<orvel::Descriptor> seats;
        for (int number = 0; number < 16; ++number) {
            const std::string seat = systemRoot() + "/var/cache/orvel/thumbnails/seat" + std::to_string(number);
            seats.emplace_back(open(seat.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
            EXPECT_EQ(flock(seats.back().get(), LOCK_EX | LOCK_NB), 0) << seat;
        }
        return seats;
    }
};

TEST_F(ThumbnailCgi, EachKindIsDrawnSmallAndUpright) {
    for (const char* ending : {"jpg", "gif", "tif", "heic", "avif"})
        vips({"copy", at("a.png"), at(std::string("a.") + ending)});
    vips({"black", at("a.webp"), "800", "400", "--bands", "3"});
    const std::string camera = readFile(at("a.jpg"));
    writeFile(at("turned.jpg"), camera.substr(0, 2) + kTurned + camera.substr(2), 0644);
    writeFile(at("a.pdf"), kDocument, 0644);
    fs::copy_file(at("a.png"), at("named.txt"));
    for (const auto& [name, more, type, extent] :
         rowsOf<std::string, std::string, std::string, std::string>("apps/thumbnails")) {
        SCOPED_TRACE(name);
        const RawReply reply = fetch(name, more);
        ASSERT_EQ(reply.status, 200) << reply.body;
        EXPECT_EQ(reply.headers.at("Content-Type"), type);
        EXPECT_EQ(reply.headers.at("Content-Length"), std::to_string(reply.body.size()));
        EXPECT_EQ(extentOf(reply.body), extent);
    }
}

TEST_F(ThumbnailCgi, WhatIsKeptIsGivenToWhoeverMayReadTheSource) {
    const RawReply first = fetch("a.png");
    ASSERT_EQ(first.status, 200);
    const std::string tag = first.headers.at("ETag");
    writeFile(at("b.png"), readFile(at("a.png")), 0644);
    writeFile(at("broken.png"), readFile(at("a.png")).substr(0, 40), 0644);
    EXPECT_EQ(fetch("broken.png").status, 415);
    {
        const auto seats = takeSeats();
        EXPECT_EQ(fetch("a.png").body, first.body) << "kept";
        EXPECT_EQ(fetch("broken.png").status, 415) << "kept, too";
        const RawReply late = fetch("b.png");
        EXPECT_EQ(late.status, 503);
        EXPECT_EQ(late.headers.at("Retry-After"), "2");
    }
    EXPECT_EQ(fetch("a.png", "", {{"HTTP_IF_NONE_MATCH", tag}}).status, 304);
    const RawReply head(runCgi(PROGRAM_THUMBNAIL, "alice", "HEAD", "path=/photo/a.png"));
    EXPECT_TRUE(head.status == 200 && head.body.empty());
    vips({"black", at("a.png"), "400", "400", "--bands", "3"});
    EXPECT_NE(fetch("a.png", "", {{"HTTP_IF_NONE_MATCH", tag}}).headers.at("ETag"), tag);
    SKIP_WITHOUT_ROOT();
    chmod(at("a.png").c_str(), 0600);
    EXPECT_EQ(fetch("a.png").status, 403);
}

TEST_F(ThumbnailCgi, Refusals) {
    std::string huge = readFile(at("a.png"));
    huge.replace(16, 8, std::string("\0\1\xFF\xFF\0\1\xFF\xFF", 8));  // 131071 pixels each way, by its header
    writeFile(at("huge.png"), huge, 0644);
    writeFile(at("text.jpg"), "no picture", 0644);
    writeFile(at("bare.jpg"), "\xFF\xD8\xFF", 0644);
    writeFile(at("bare.pdf"), "%PDF-1.4", 0644);
    makeFolder(at("folder.jpg"), 0755);
    for (const auto& [name, more, status] : rowsOf<std::string, std::string, int>("apps/thumbnail_refusals"))
        EXPECT_EQ(fetch(name, more).status, status) << name << more;
}

TEST(Sandbox, AProgramHasItsBytesAndNothingElse) {
    const auto run = [](const std::vector<std::string>& words, const std::string& wanted, SandboxEnd end) {
        SCOPED_TRACE(words.back());
        const orvel::Descriptor input(memfd_create("input", MFD_CLOEXEC)), output(memfd_create("output", MFD_CLOEXEC));
        EXPECT_EQ(write(input.get(), "given", 5), 5);
        lseek(input.get(), 0, SEEK_SET);
        EXPECT_EQ(static_cast<int>(runInSandbox(words, input.get(), output.get(),
                                                {.memory = 256 << 20,
                                                 .output = 1 << 20,
                                                 .processor = 1,
                                                 .time = std::chrono::seconds(end == SandboxEnd::kTimeOut ? 1 : 60)})),
                  static_cast<int>(end));
        if (end == SandboxEnd::kDone) {
            EXPECT_EQ(support::readFile(output.path()), wanted);
        }
    };
    const auto perl = [&](const std::string& script, const std::string& wanted, SandboxEnd end = SandboxEnd::kDone) {
        run({"/usr/bin/perl", "-e", script}, wanted, end);
    };
    run({"/usr/bin/cat"}, "given", SandboxEnd::kDone);
    perl("print join ' ', grep { -e \"/proc/self/fd/$_\" } 0..9", "0 1 2");
    perl("print defined(fork) ? 'made' : $!", "Operation not permitted");
    perl("use Socket; print socket(S, PF_INET, SOCK_STREAM, 0) ? 'made' : $!", "Operation not permitted");
    perl("print kill(0, getppid) ? 'sent' : $!", "Operation not permitted");
    perl("print scalar keys %ENV", "5");
    if (geteuid() == 0) perl("print \"$< $> $( $)\"", "65534 65534 65534 65534");
    perl("print open(F, '<', '/etc/passwd') ? 'open' : 'shut'", "shut");
    perl("print open(F, '>', '/tmp/sandbox') ? 'open' : 'shut'", "shut");
    perl("while (1) { $i++ }", "", SandboxEnd::kRefused);
    perl("while (1) { print 'x' x 65536 }", "", SandboxEnd::kRefused);
    perl("my $all = 'x' x (1 << 30)", "", SandboxEnd::kRefused);
    perl("sleep 100", "", SandboxEnd::kTimeOut);
    support::announceLog("/usr/bin/none could not be started");
    run({"/usr/bin/none"}, "", SandboxEnd::kFailed);
}

}  // namespace
