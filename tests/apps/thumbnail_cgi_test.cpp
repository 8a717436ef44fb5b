// The program thumbnail with real pictures and films, and with what somebody made of them who means harm; the place in
// which foreign decoders run.
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/wait.h>

#include "apps/camera_file.h"
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
    // Black for most of its time.
    static void film(const std::string& name, const std::vector<std::string>& more = {}) {
        std::vector<std::string> words = {"/usr/bin/ffmpeg",
                                          "-v",
                                          "error",
                                          "-f",
                                          "lavfi",
                                          "-i",
                                          "color=black:s=320x160:r=5:d=8",
                                          "-f",
                                          "lavfi",
                                          "-i",
                                          "testsrc2=s=320x160:r=5:d=4",
                                          "-filter_complex",
                                          "[0][1]concat",
                                          "-g",
                                          "5"};
        words.insert(words.end(), more.begin(), more.end());
        words.push_back(at(name));
        EXPECT_EQ(runProgram(words).status, 0) << name;
    }
    static void cameraFile(const std::string& name) {
        vips({"black", at("preview.jpg[strip]"), "320", "160", "--bands", "3"});
        writeFile(at(name), cameraFileWith(readFile(at("preview.jpg"))), 0644);
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
    // All but kept pictures and sessions.
    static Names allFiles() {
        Names names = namesIn(shareRoot("photo"));
        for (const auto& entry : fs::recursive_directory_iterator(systemRoot())) {
            const std::string path = entry.path();
            if (path.find("/thumbnails/") == path.find("/sessions/")) names.push_back(path);
        }
        std::sort(names.begin(), names.end());
        return names;
    }
    // Of what extentOf looked at.
    double brightness() { return std::stod(runProgram({"/usr/bin/vips", "avg", systemRoot() + "/tmp/drawn"}).output); }
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
    cameraFile("camera.dng");
    for (const char* name : {"a.mkv", "a.avi", "a.mp4"}) film(name);
    EXPECT_EQ(runProgram({"/usr/bin/ffmpeg", "-v", "error", "-i", at("a.mp4"), "-c", "copy", "-metadata:s:v",
                          "rotate=90", at("turned.mov")})
                  .status,
              0);
    for (const auto& [name, more, type, extent] :
         rowsOf<std::string, std::string, std::string, std::string>("apps/thumbnails")) {
        SCOPED_TRACE(name);
        const RawReply reply = fetch(name, more);
        ASSERT_EQ(reply.status, 200) << reply.body;
        EXPECT_EQ(reply.headers.at("Content-Type"), type);
        EXPECT_EQ(reply.headers.at("Content-Length"), std::to_string(reply.body.size()));
        EXPECT_EQ(extentOf(reply.body), extent);
        if (extent == "256x128" && fs::path(name).extension().string().find_first_of("mv") == 1) {
            EXPECT_GT(brightness(), 50) << "a black frame";
        }
    }
}

TEST_F(ThumbnailCgi, WithoutItsDecoderAFilmHasNoPicture) {
    film("a.mkv");
    makeFolder(systemRoot() + "/alone/cgi", 0755);
    const std::string program = systemRoot() + "/alone/cgi/thumbnail";
    fs::copy_file(fs::canonical(PROGRAM_THUMBNAIL), program);
    EXPECT_EQ(RawReply(runCgi(program, "alice", "GET", "path=/photo/a.mkv")).status, 415);
    EXPECT_EQ(fetch("a.mkv").status, 200) << "it was not kept that there is none";
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

// Sound files, and what was done to them.
class Hostile {
 public:
    explicit Hostile(std::vector<std::string> sound) : sound_(std::move(sound)) {}

    std::string next() {
        std::string file = any();
        if (below(8) == 0) return file.substr(0, 12 + below(500)) + any();  // one that becomes another
        const size_t size = file.size();
        for (size_t left = 1 + below(20); left > 0; --left) {
            switch (below(4)) {
                case 0:
                    file[below(size)] = static_cast<char>(below(256));
                    break;
                case 1:
                    file[below(std::min<size_t>(size, 400))] ^= static_cast<char>(1 << below(8));  // where headers are
                    break;
                case 2:
                    file.replace(below(size), 4, below(2) == 0 ? "\xFF\xFF\xFF\xFF" : "\x7F\xFF\xFF\xFF");
                    break;
                default:
                    file.resize(std::max<size_t>(size, file.size()), '\0');
                    file.insert(below(size), file, below(size), below(5000));
            }
        }
        if (below(2) == 0) file.resize(1 + below(file.size()));
        return file;
    }

 private:
    size_t below(size_t most) { return random_() % most; }
    std::string any() { return sound_[below(sound_.size())]; }
    std::vector<std::string> sound_;
    std::minstd_rand random_{7};
};

// Twelve, or in the long mode two hundred.
TEST_F(ThumbnailCgi, HostileFilesHarmNothing) {
    const bool isLong = getenv("ORVEL_TEST_LONG") != nullptr;
    for (const char* ending : {"jpg", "gif", "tif", "webp", "heic", "avif"})
        vips({"gaussnoise", at(std::string("n.") + ending), "64", "64"});
    film("a.mkv");
    film("a.mp4");
    film("a.avi");
    cameraFile("a.dng");
    writeFile(at("a.pdf"), kDocument, 0644);
    std::vector<std::string> sound;
    for (const std::string& name : namesIn(shareRoot("photo"))) sound.push_back(readFile(at(name)));
    Hostile hostile(std::move(sound));
    // Lists of other files, in the clothes of a film; pixels without end.
    std::vector<std::string> files = {
        std::string("\0\0\0\x14"
                    "ftypisom",
                    12) +
            "\nffconcat version 1.0\nfile /etc/passwd\n",
        "#EXTM3U\n#EXTINF:1,\n/etc/passwd\n",
        std::string("GIF89a\xFF\xFF\xFF\xFF\x80\0\0", 13) + std::string(200, '\xAA'),
        "%PDF-1.4\n1 0 obj<</Type/Catalog/Pages 2 0 R>>endobj 2 0 obj<</Type/Pages/Kids[2 0 R 2 0 R]/Count 9>>endobj\n"
        "trailer<</Root 1 0 R>>\n"};
    while (files.size() < (isLong ? 200 : 12)) files.push_back(hostile.next());

    prctl(PR_SET_CHILD_SUBREAPER, 1);
    EXPECT_EQ(fetch("a.pdf").status, 200);
    const Names before = allFiles();
    std::map<int, int> ends;
    for (size_t number = 0; number < files.size(); ++number) {
        const std::string name = "hostile" + std::to_string(number);
        writeFile(at(name), files[number], 0644);
        const auto begin = std::chrono::steady_clock::now();
        const int status = fetch(name).status;
        const std::chrono::duration<double> took = std::chrono::steady_clock::now() - begin;
        ++ends[status];
        if (isLong && took.count() > 5) std::printf("%s: %d after %.1f s\n", name.c_str(), status, took.count());
        EXPECT_TRUE(status == 200 || status == 415 || status == 503) << name << ": " << status;
        EXPECT_TRUE(waitpid(-1, nullptr, WNOHANG) == -1 && errno == ECHILD) << name << " left a process";
        fs::remove(at(name));
    }
    EXPECT_EQ(allFiles(), before);
    EXPECT_EQ(fetch("a.png").status, 200);
    if (isLong) {
        for (const auto& [status, count] : ends) std::printf("%d: %d\n", status, count);
    }
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
    run({"/usr/bin/none"}, "", SandboxEnd::kMissing);
}

}  // namespace
