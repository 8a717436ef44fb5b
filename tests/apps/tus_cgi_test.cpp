// The program tus: uploads that go on after an interruption.
#include <sys/file.h>
#include <utime.h>

#include <thread>

#include "apps/cgi_test.h"

namespace {

class TusCgi : public CgiTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        SKIP_WITHOUT_ROOT();
    }
    static RawReply send(const std::string& method, const std::string& query, const std::string& body = "",
                         Variables more = {}, const std::string& user = "alice") {
        more.try_emplace("HTTP_TUS_RESUMABLE", "1.0.0");
        return RawReply(runCgi(PROGRAM_TUS, user, method, query, body, more));
    }
    static RawReply begin(const std::string& query, long long size, Variables more = {}) {
        more["HTTP_UPLOAD_LENGTH"] = std::to_string(size);
        return send("POST", query, "", more);
    }
    static std::string idOf(const RawReply& created) {
        EXPECT_EQ(created.status, 201) << created.body;
        const std::string location = created.headers.count("Location") > 0 ? created.headers.at("Location") : "";
        EXPECT_TRUE(location.starts_with("?id=")) << location;
        return location.substr(std::min(location.size(), size_t{4}));
    }
    static RawReply append(const std::string& id, long long offset, const std::string& body, Variables more = {}) {
        more["HTTP_UPLOAD_OFFSET"] = std::to_string(offset);
        more.try_emplace("CONTENT_TYPE", "application/offset+octet-stream");
        return send("PATCH", "id=" + id, body, more);
    }
    static std::string offset(const RawReply& reply) {
        return reply.headers.count("Upload-Offset") > 0 ? reply.headers.at("Upload-Offset") : "";
    }
    static std::string offsetOf(const std::string& id) { return offset(send("HEAD", "id=" + id)); }
    static int codeIn(const RawReply& reply) {
        const size_t at = reply.body.find("\"code\":");
        return at == std::string::npos ? 0 : std::stoi(reply.body.substr(at + 7));
    }
    std::string record(const std::string& id) const {
        return systemRoot() + "/var/lib/vexo/uploads/" + std::to_string(kAliceUid) + "/" + id;
    }
    static std::string bytes(const std::string& id) {
        return "/tmp/@tmp/orvel/upload-" + std::to_string(kAliceUid) + "/resume-" + id;
    }
    // In a process other than this one.
    static bool isOpenElsewhere(const std::string& path) {
        std::error_code gone;
        for (const auto& process : fs::directory_iterator("/proc")) {
            if (process.path().filename() == std::to_string(getpid())) continue;
            for (const auto& open : fs::directory_iterator(process.path() / "fd", gone)) {
                if (fs::read_symlink(open.path(), gone) == path) return true;
            }
        }
        return false;
    }
    static void makeOld(const std::string& path) {
        const time_t then = time(nullptr) - 3 * 24 * 3600;
        const utimbuf times = {then, then};
        EXPECT_EQ(utime(path.c_str(), &times), 0) << path;
    }
};

TEST_F(TusCgi, WhatWasCutOffGoesOnAndIsWholeUnderItsName) {
    const std::string data("0123\0\xFF\r\n89", 10);
    const std::string id =
        idOf(begin("path=/photo/new/a.bin&mtime=1000000000", 10, {{"HTTP_UPLOAD_METADATA", "type dGV4dA=="}}));
    EXPECT_EQ(offsetOf(id), "0");
    const RawReply cut = append(id, 0, data.substr(0, 4), {{"CONTENT_LENGTH", "10"}});
    EXPECT_EQ(cut.status, 400);
    const RawReply asked = send("HEAD", "id=" + id);
    EXPECT_EQ(asked.status, 200);
    EXPECT_EQ(offset(asked), "4");
    EXPECT_EQ(asked.headers.at("Upload-Length"), "10");
    EXPECT_EQ(asked.headers.at("Upload-Metadata"), "type dGV4dA==");
    EXPECT_TRUE(asked.headers.at("Upload-Expires").ends_with(" GMT"));
    EXPECT_FALSE(fs::exists(photo_ + "/new"));
    const CgiReply listed = get(PROGRAM_TUS, "alice", "");
    EXPECT_EQ(listed.json["data"]["items"][0]["path"], "/photo/new/a.bin");
    EXPECT_EQ(listed.json["data"]["items"][0]["offset"], 4);
    EXPECT_EQ(append(id, 4, data.substr(4, 3)).status, 204);
    // A client that cannot PATCH.
    const RawReply last = send("POST", "id=" + id, data.substr(7),
                               {{"HTTP_X_HTTP_METHOD_OVERRIDE", "PATCH"},
                                {"HTTP_UPLOAD_OFFSET", "7"},
                                {"CONTENT_TYPE", "application/offset+octet-stream"}});
    EXPECT_EQ(last.status, 204) << last.body;
    EXPECT_EQ(last.headers.at("Orvel-Path"), "/photo/new/a.bin");
    EXPECT_EQ(readFile(photo_ + "/new/a.bin"), data);
    expectOwned(photo_ + "/new/a.bin", kAliceUid, 0644);
    EXPECT_EQ(statusOf(photo_ + "/new/a.bin").st_mtime, 1000000000);
    // The reply to the last piece got lost.
    EXPECT_EQ(offsetOf(id), "10");
    EXPECT_EQ(append(id, 10, "").status, 204);
    EXPECT_FALSE(fs::exists(bytes(id)));
    EXPECT_EQ(get(PROGRAM_TUS, "alice", "").json["data"]["items"].size(), 0U);

    // In one request, into a folder under a name of its own; and nothing at all.
    const RawReply one = send("POST", "path=/photo/new", "text",
                              {{"HTTP_UPLOAD_LENGTH", "4"},
                               {"HTTP_UPLOAD_METADATA", "filename YiBi"},
                               {"CONTENT_TYPE", "application/offset+octet-stream"}});
    EXPECT_EQ(offset(one), "4");
    EXPECT_EQ(readFile(photo_ + "/new/b b"), "text");
    EXPECT_EQ(offsetOf(idOf(begin("path=/photo/empty", 0))), "0");
    EXPECT_TRUE(fs::exists(photo_ + "/empty"));
    // An administrator's process is root, and the file the administrator's own.
    const std::string open = addShare("open", "read only = no\nvalid users = carol\n");
    const RawReply admin =
        send("POST", "path=/open/admin", "x",
             {{"HTTP_UPLOAD_LENGTH", "1"}, {"CONTENT_TYPE", "application/offset+octet-stream"}}, "carol");
    EXPECT_EQ(admin.status, 201) << admin.body;
    expectOwned(open + "/admin", kCarolUid, 0644);
}

TEST_F(TusCgi, ATakenNameMeansWhatWasAskedFor) {
    const Rows<const char*, int, const char*, const char*> rows = {{"error", 412, "old", nullptr},
                                                                   {"skip", 204, "old", nullptr},
                                                                   {"overwrite", 204, "new", nullptr},
                                                                   {"keep_both", 204, "old", "f (2).x"}};
    for (const auto& [conflict, status, content, beside] : rows) {
        SCOPED_TRACE(conflict);
        const std::string folder = photo_ + "/" + conflict,
                          query = std::string("path=/photo/") + conflict + "/f.x&conflict=" + conflict;
        openFolder(folder);
        const std::string id = idOf(begin(query, 3));
        EXPECT_EQ(append(id, 0, "ne").status, 204);
        writeFile(folder + "/f.x", "old", 0666);
        give(folder + "/f.x");
        const RawReply last = append(id, 2, "w");
        EXPECT_EQ(last.status, status) << last.body;
        EXPECT_EQ(readFile(folder + "/f.x"), content);
        EXPECT_EQ(beside == nullptr ? "new" : readFile(folder + "/" + beside), "new");
        // Where it is taken from the beginning, no byte has to come.
        const bool refused = std::string(conflict) == "error" || std::string(conflict) == "skip";
        const RawReply again = begin(query, 3);
        EXPECT_EQ(again.status, refused ? 412 : 201);
        EXPECT_EQ(codeIn(again), refused ? 414 : 0);
        if (status == 204) continue;
        // What was refused is whole, and gets its name when it is free.
        EXPECT_EQ(codeIn(last), 414);
        fs::remove(folder + "/f.x");
        EXPECT_EQ(offsetOf(id), "3");
        EXPECT_EQ(readFile(folder + "/f.x"), "new");
    }
}

TEST_F(TusCgi, WhatLacksItsChecksumDoesNotCount) {
    // echo -n abc | openssl dgst -ALGORITHM -binary | base64
    const Rows<const char*, const char*> rows = {{"sha1", "qZk+NkcGgWq6PiVxeFDCbJzQ2J0="},
                                                 {"sha256", "ungWv48Bz+pBQUDeXa4iI7ADYaOWF3qctBD/YfIAFa0="},
                                                 {"md5", "kAFQmDzST7DWlj99KOF/cg=="}};
    for (const auto& [algorithm, digest] : rows) {
        SCOPED_TRACE(algorithm);
        const Variables sum = {{"HTTP_UPLOAD_CHECKSUM", std::string(algorithm) + " " + digest}};
        const std::string id = idOf(begin(std::string("path=/photo/") + algorithm, 5));
        EXPECT_EQ(append(id, 0, "xy").status, 204);
        const RawReply wrong = append(id, 2, "abd", sum);
        EXPECT_EQ(wrong.status, 460);
        EXPECT_EQ(offset(wrong), "2");
        Variables cut = sum;
        cut["CONTENT_LENGTH"] = "3";
        EXPECT_EQ(append(id, 2, "ab", cut).status, 400);
        EXPECT_EQ(offsetOf(id), "2");
        EXPECT_EQ(append(id, 2, "abc", {{"HTTP_UPLOAD_CHECKSUM", "crc32 AAAA"}}).status, 400);
        // Killed before the checksum was known.
        std::string text = readFile(record(id));
        text.replace(8, 22, "c 00000000000000000002");
        writeFile(record(id), text);
        writeFile(bytes(id), "xyzz");
        EXPECT_EQ(offsetOf(id), "2");
        EXPECT_EQ(append(id, 2, "abc", sum).status, 204);
        EXPECT_EQ(readFile(photo_ + "/" + algorithm), "xyabc");
    }
}

TEST_F(TusCgi, WhatIsNotOfTheProtocolIsRefused) {
    const std::string id = idOf(begin("path=/photo/a", 5));
    EXPECT_EQ(append(id, 0, "12").status, 204);
    const Variables old = {{"HTTP_TUS_RESUMABLE", "0.2.2"}};
    const Variables piece = {{"HTTP_UPLOAD_OFFSET", "2"}, {"CONTENT_TYPE", "application/offset+octet-stream"}};
    struct {
        const char* what;
        RawReply reply;
        int status;
    } const rows[] = {
        {"a version", send("HEAD", "id=" + id, "", old), 412},
        {"a stranger's question", send("HEAD", "id=" + id, "", {}, "bob"), 404},
        {"a stranger's piece", send("PATCH", "id=" + id, "345", piece, "bob"), 404},
        {"a stranger's end", send("DELETE", "id=" + id, "", {}, "bob"), 404},
        {"no id", send("HEAD", "id=../" + id), 404},
        {"before", append(id, 1, "345"), 409},
        {"behind", append(id, 3, "45"), 409},
        {"too long", append(id, 2, "3456"), 413},
        {"a type", append(id, 2, "345", {{"CONTENT_TYPE", "text/plain"}}), 415},
        {"no length", send("POST", "path=/photo/b", "", {{"HTTP_UPLOAD_DEFER_LENGTH", "1"}}), 400},
        {"no path", begin("", 1), 400},
        {"a mode", begin("path=/photo/b&conflict=else", 1), 400},
        {"metadata", begin("path=/photo/b", 1, {{"HTTP_UPLOAD_METADATA", "name *"}}), 400},
        {"a name with a folder", begin("path=/photo", 1, {{"HTTP_UPLOAD_METADATA", "filename Li4vYg=="}}), 400},
        {"a share that is missing", begin("path=/nowhere/b", 1), 404},
        {"a share of others",
         RawReply(runCgi(PROGRAM_TUS, "bob", "POST", "path=/photo/b", "",
                         {{"HTTP_TUS_RESUMABLE", "1.0.0"}, {"HTTP_UPLOAD_LENGTH", "1"}})),
         403},
        {"a hidden name", begin("path=/photo/.vexo-part-x", 1), 400},
        {"more than there is room", begin("path=/photo/b", 1LL << 39), 507},
        {"more than anybody may", begin("path=/photo/b", 1LL << 41), 413},
    };
    for (const auto& [what, reply, status] : rows) {
        EXPECT_EQ(reply.status, status) << what << reply.body;
        EXPECT_EQ(reply.headers.at("Tus-Resumable"), "1.0.0") << what;
    }
    EXPECT_EQ(offsetOf(id), "2");
    {
        // Another request is at work.
        const orvel::Descriptor other(open(record(id).c_str(), O_RDONLY | O_CLOEXEC));
        ASSERT_EQ(flock(other.get(), LOCK_EX | LOCK_NB), 0);
        EXPECT_EQ(append(id, 2, "345").status, 423);
        EXPECT_EQ(send("DELETE", "id=" + id).status, 423);
        EXPECT_EQ(send("DELETE", "id=" + id + "&wait=11").status, 400);
        EXPECT_EQ(offsetOf(id), "2");
        std::thread ends([&] { EXPECT_EQ(send("DELETE", "id=" + id + "&wait=10").status, 204); });
        EXPECT_TRUE(waitUntil("the end that waits", [&] { return isOpenElsewhere(record(id)); }));
        EXPECT_EQ(flock(other.get(), LOCK_UN), 0);
        ends.join();
    }
    EXPECT_EQ(send("HEAD", "id=" + id).status, 404);
    EXPECT_FALSE(fs::exists(bytes(id)));
    EXPECT_EQ(namesIn(photo_), Names{});
    const RawReply known = send("OPTIONS", "", "", {{"HTTP_TUS_RESUMABLE", ""}});
    EXPECT_EQ(known.status, 204);
    EXPECT_EQ(known.headers.at("Tus-Version"), "1.0.0");
}

// Between the pieces others change the place; nothing is lost, and it goes on when the place is as it was.
TEST_F(TusCgi, AnotherPlaceIsRefusedAndTheBytesStay) {
    const std::string folder = photo_ + "/d", away = photo_ + "/away";
    const struct {
        const char* what;
        std::function<void()> change, back;
        int code;
    } rows[] = {
        {"renamed", [&] { fs::rename(folder, away); }, [&] { fs::rename(away, folder); }, 408},
        {"another one", [&] { fs::rename(folder, away), openFolder(folder); },
         [&] { fs::remove(folder), fs::rename(away, folder); }, 408},
        {"a link", [&] { fs::rename(folder, away), openFolder(photo_ + "/e"), fs::create_symlink("e", folder); },
         [&] { fs::remove(folder), fs::rename(away, folder); }, 408},
        {"not writable", [&] { EXPECT_EQ(chmod(folder.c_str(), 0555), 0); },
         [&] { EXPECT_EQ(chmod(folder.c_str(), 0777), 0); }, 407},
        {"read-only share", [&] { addShare("photo", "read only = yes\nvalid users = alice\n"); },
         [&] { addShare("photo", "read only = no\nvalid users = alice\n"); }, 407},
    };
    openFolder(folder);
    for (const auto& [what, change, back, code] : rows) {
        SCOPED_TRACE(what);
        const std::string name = percentEncode(what), id = idOf(begin("path=/photo/d/" + name, 2));
        EXPECT_EQ(append(id, 0, "1").status, 204);
        change();
        const RawReply last = append(id, 1, "2");
        EXPECT_EQ(last.status, 403) << last.body;
        EXPECT_EQ(codeIn(last), code);
        EXPECT_EQ(offset(last), "2");
        EXPECT_EQ(send("HEAD", "id=" + id).status, 403);
        EXPECT_EQ(readFile(bytes(id)), "12");
        back();
        EXPECT_EQ(offsetOf(id), "2");
        EXPECT_EQ(readFile(folder + "/" + what), "12");
    }
}

TEST_F(TusCgi, ThereAreBoundsAndAnEnd) {
    setSetting("unfinished_upload_gib", "1");
    const std::string first = idOf(begin("path=/photo/a", 600 << 20));
    EXPECT_EQ(codeIn(begin("path=/photo/b", 600 << 20)), 415);
    const std::string second = idOf(begin("path=/photo/b", 2));
    EXPECT_EQ(append(first, 0, "1").status, 204);
    EXPECT_EQ(append(second, 0, "1").status, 204);
    for (const std::string& id : {first, second}) makeOld(bytes(id));
    makeOld(record(first));
    writeFile(bytes(std::string(32, 'a')), "without a record");
    makeOld(bytes(std::string(32, 'a')));
    EXPECT_EQ(send("HEAD", "id=" + first).status, 404);
    EXPECT_EQ(orvelctl({"sweep", "--quiet"}).status, 0);
    EXPECT_FALSE(fs::exists(record(first)) || fs::exists(bytes(first)) || fs::exists(bytes(std::string(32, 'a'))));
    EXPECT_EQ(offsetOf(second), "1");
    // Killed between the renaming and its note.
    std::string text = readFile(record(second));
    text.replace(8, 22, "n 00000000000000000001");
    writeFile(record(second), text);
    fs::rename(bytes(second), photo_ + "/b");
    EXPECT_EQ(offsetOf(second), "2");
    EXPECT_TRUE(readFile(record(second)).starts_with("ORVTUS1 d"));
}

}  // namespace
