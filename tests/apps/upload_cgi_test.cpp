// The program upload, run as a web server runs it.
#include <sched.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/sysmacros.h>

#include "apps/cgi_test.h"

namespace {

class UploadCgi : public CgiTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        SKIP_WITHOUT_ROOT();
    }
    static CgiReply put(const std::string& user, const std::string& path, const std::string& body,
                        const std::string& mode = "error", const Variables& more = {}) {
        const std::string query = "path=" + percentEncode(path) + "&overwrite=" + mode;
        return CgiReply(runCgi(PROGRAM_UPLOAD, user, "PUT", query, body, more));
    }
    static Variables variables(const std::string& path, const std::string& body, const std::string& mode) {
        return {{"REQUEST_METHOD", "PUT"},
                {"REMOTE_ADDR", "127.0.0.1"},
                {"REMOTE_USER", "alice"},
                {"CONTENT_LENGTH", std::to_string(body.size())},
                {"QUERY_STRING", "path=" + percentEncode(path) + "&overwrite=" + mode}};
    }
    static std::string part(const std::string& disposition, const std::string& data) {
        return "--XX\r\nContent-Disposition: form-data; " + disposition + "\r\n\r\n" + data + "\r\n";
    }
    static CgiReply post(const std::string& user, const std::string& query, const std::string& body) {
        return CgiReply(
            runCgi(PROGRAM_UPLOAD, user, "POST", query, body, {{"CONTENT_TYPE", "multipart/form-data; boundary=XX"}}));
    }
    // What uploads of this user left in the temporary place of the volume.
    static Names temporaries(unsigned uid) {
        const std::string folder = "/tmp/@tmp/orvel/upload-" + std::to_string(uid);
        Names names = fs::exists(folder) ? namesIn(folder) : Names();
        // What is to be gone on with is another program's.
        std::erase_if(names, [](const std::string& name) { return name.starts_with("resume-"); });
        return names;
    }
};

TEST_F(UploadCgi, AFileBelongsToItsUserWithTheFoldersAboveIt) {
    const std::string root = addShare("photo", "read only = no\nvalid users = alice, carol\n");
    const std::string data("a\0\r\n\xFF", 5);
    const mode_t mask = umask(0);
    const CgiReply reply = put("alice", "/photo/new/deeper/a.bin", data);
    umask(mask);
    EXPECT_EQ(reply.status, 200);
    EXPECT_EQ(reply.json["data"]["files"][0]["path"], "/photo/new/deeper/a.bin");
    EXPECT_EQ(reply.json["data"]["files"][0]["size"], 5);
    EXPECT_EQ(readFile(root + "/new/deeper/a.bin"), data);
    expectOwned(root + "/new", kAliceUid, 0755);
    expectOwned(root + "/new/deeper", kAliceUid, 0755);
    expectOwned(root + "/new/deeper/a.bin", kAliceUid, 0644);

    EXPECT_TRUE(put("carol", "/photo/admin/b", "").json["success"].asBool());
    expectOwned(root + "/admin", kCarolUid, 0755);
    expectOwned(root + "/admin/b", kCarolUid, 0644);
    EXPECT_TRUE(put("bob", "/home/c", "x").json["success"].asBool());
    expectOwned(shareRoot("homes") + "/bob/c", kBobUid, 0644);
    for (const unsigned uid : {unsigned{kAliceUid}, 0U}) EXPECT_EQ(temporaries(uid), Names{});
}

TEST_F(UploadCgi, WhatExistsIsReplacedOnlyWhenAskedForAndAllowed) {
    const std::string fixed = addShare("archive", "read only = no\nvalid users = alice\nvexo:restriction = 2\n");
    const Rows<const char*, const char*, int, bool, const char*> rows = {
        {"photo", "error", 414, false, "old"},   {"photo", "skip", 0, true, "old"},
        {"photo", "overwrite", 0, false, "new"}, {"archive", "error", 0, true, "old"},
        {"archive", "skip", 0, true, "old"},     {"archive", "overwrite", 0, true, "old"}};
    for (const auto& [share, mode, expected, skipped, content] : rows) {
        SCOPED_TRACE(std::string(share) + " " + mode);
        const std::string file = shareRoot(share) + "/f";
        writeFile(file, "old", 0640);
        ASSERT_EQ(chown(file.c_str(), kAliceUid, kUsersGid), 0);
        const CgiReply reply = put("alice", std::string("/") + share + "/f", "new", mode);
        EXPECT_EQ(code(reply), expected);
        EXPECT_EQ(reply.json["data"]["files"][0]["skipped"].asBool(), skipped);
        EXPECT_EQ(readFile(file), content);
        expectOwned(file, kAliceUid, 0640);
    }
    EXPECT_EQ(code(put("alice", "/archive/other", "new")), 0);
    EXPECT_EQ(temporaries(kAliceUid), Names{});
}

TEST_F(UploadCgi, RefusalsSayWhyAndLeaveNothing) {
    const std::string fat = addShare("usb", "read only = no\n");
    addMount(fat, "vfat");
    makeFolder(photo_ + "/folder", 0777);
    makeFolder(photo_ + "/root's", 0755);
    writeFile(photo_ + "/file", "x", 0666);
    ASSERT_EQ(mkfifo((photo_ + "/pipe").c_str(), 0666), 0);
    ASSERT_EQ(mknod((photo_ + "/device").c_str(), S_IFCHR | 0666, makedev(1, 3)), 0);
    makeFolder(photo_ + "/folder/@tmp", 0777);
    fs::create_symlink("folder/@tmp", photo_ + "/hidden");
    fs::create_symlink("folder", photo_ + "/inside");
    fs::create_symlink("/tmp", photo_ + "/outside");
    fs::create_symlink("nowhere", photo_ + "/dangling");
    const auto before = namesIn(photo_);
    for (const auto& [user, path, expected] : rowsOf<std::string, std::string, int>("apps/refused_uploads")) {
        for (const char* mode : {"error", "overwrite"}) {
            const bool shareRoot = path == "/photo" && *mode == 'o';
            EXPECT_EQ(code(put(user, path, "data", mode)), shareRoot ? 400 : expected) << path << mode;
        }
    }
    std::string deep = "/photo";
    while (deep.size() < 4200) deep += "/" + std::string(200, 'd');
    EXPECT_EQ(code(put("alice", deep, "data")), 412);
    EXPECT_EQ(code(put("alice", "/photo/dangling", "data", "overwrite")), 414);
    EXPECT_EQ(namesIn(photo_), before);
    EXPECT_EQ(namesIn(fat), Names{});
    EXPECT_EQ(temporaries(kAliceUid), Names{});

    EXPECT_EQ(code(put("alice", "/photo/inside/x", "data")), 0);
    EXPECT_EQ(readFile(photo_ + "/folder/x"), "data");
    setSetting("link_policy_photo", "none");
    EXPECT_EQ(code(put("alice", "/photo/inside/y", "data")), 407);
}

TEST_F(UploadCgi, ABodyThatIsNotWhatWasAnnouncedLeavesNothing) {
    for (const char* length : {"-1", "", "0x10", "4 ", "9223372036854775808"}) {
        const CgiReply reply = put("alice", "/photo/new/x", "data", "error", {{"CONTENT_LENGTH", length}});
        EXPECT_EQ(reply.status, 400) << length;
        EXPECT_EQ(code(reply), 1802) << length;
    }
    // The client hung up.
    for (const char* length : {"5", "9223372036854775807"})
        EXPECT_EQ(code(put("alice", "/photo/new/x", "data", "error", {{"CONTENT_LENGTH", length}})), 1802) << length;
    EXPECT_EQ(CgiReply(runCgi(PROGRAM_UPLOAD, "alice", "GET", "path=/photo/x")).status, 405);
    EXPECT_EQ(put("alice", "/photo/x", "data", "sometimes").status, 400);
    EXPECT_EQ(put("", "/photo/x", "data").status, 401);
    EXPECT_EQ(namesIn(photo_), Names{});
    EXPECT_EQ(temporaries(kAliceUid), Names{});

    EXPECT_EQ(code(put("alice", "/photo/x", "data", "error", {{"CONTENT_LENGTH", "3"}})), 0);
    EXPECT_EQ(readFile(photo_ + "/x"), "dat");
}

TEST_F(UploadCgi, AFormBringsSeveralFiles) {
    const CgiReply reply = post("alice", "",
                                part("name=path", "/photo/sub/") + part("name=b; filename=\"\"", "") +
                                    part("name=a; filename=\"../../two\xFF%0A.txt\"", "22") +
                                    part("name=a; filename=\"C:\\\\dir\\three\"", "333") + "--XX--\r\n");
    EXPECT_EQ(code(reply), 418) << "a colon";
    EXPECT_EQ(reply.json["error"]["path"], "/photo/sub/C:\\dir\\three");
    EXPECT_EQ(reply.json["data"]["files"].size(), 1U);
    EXPECT_EQ(reply.json["data"]["files"][0]["path_raw"], "/photo/sub/two%FF%0A.txt");
    const CgiReply second = post("alice", "path=/photo/sub&overwrite=overwrite",
                                 part("name=a; filename=\"dir/two\xFF%0a.txt\"", "2222") +
                                     part("name=a; filename=\"\\\\three\"", "333") + "--XX--\r\n");
    EXPECT_EQ(code(second), 0);
    EXPECT_EQ(second.json["data"]["files"].size(), 2U);
    EXPECT_EQ(readFile(photo_ + "/sub/two\xFF\n.txt"), "2222");
    EXPECT_EQ(namesIn(photo_ + "/sub"), (Names{"\\three", "two\xFF\n.txt"}));
    for (const std::string& name : namesIn(photo_ + "/sub")) expectOwned(photo_ + "/sub/" + name, kAliceUid, 0644);
}

TEST_F(UploadCgi, FilesKeepTheirTimes) {
    const auto modified = [&](const std::string& name) {
        struct stat status {};
        EXPECT_EQ(stat((photo_ + "/" + name).c_str(), &status), 0) << name;
        return status.st_mtime;
    };
    const time_t before = time(nullptr);
    EXPECT_EQ(code(put("alice", "/photo/a", "1", "error&mtime=1000000000")), 0);
    EXPECT_EQ(modified("a"), 1000000000);
    EXPECT_EQ(code(put("alice", "/photo/a", "2", "overwrite&mtime=4294967295")), 0);
    EXPECT_EQ(modified("a"), 4294967295);
    for (const char* bad : {"4294967296", "-1", "1.5", "x"})
        EXPECT_EQ(put("alice", "/photo/a", "3", std::string("overwrite&mtime=") + bad).status, 400) << bad;
    EXPECT_EQ(readFile(photo_ + "/a"), "2");
    EXPECT_EQ(code(post("alice", "path=/photo",
                        part("name=mtime", "7") + part("name=f; filename=b", "") + part("name=f; filename=c", "") +
                            part("name=mtime", "9") + part("name=f; filename=d", "") + "--XX--\r\n")),
              0);
    EXPECT_EQ(modified("b"), 7);
    EXPECT_GE(modified("c"), before) << "a time is that of one file";
    EXPECT_EQ(modified("d"), 9);
}

TEST_F(UploadCgi, ABrokenFormKeepsOnlyItsWholeFiles) {
    const std::string file = part("name=a; filename=\"one\"", "1");
    for (const auto& [body, expected, left] : Rows<std::string, int, Names>{
             {file, 1800, {}},
             {file + "--XX", 1800, {"one"}},
             {file + "--XX\r\nContent-Disposition: form-data; name=b; filename=two\r\n\r\n22222", 1800, {"one"}},
             {part("name=path", "/photo/%00") + part("name=path_raw", "%00") + file + "--XX--", 1801, {}},
             {part("name=path", std::string("/photo\0/x", 9)) + file + "--XX--", 1801, {}},
             {part("name=path", std::string(70000, '/')) + file + "--XX--", 1801, {}},
             {part("name=overwrite", "perhaps") + file + "--XX--", 1801, {}},
             {part("name=path", "") + file + "--XX--", 1801, {}},
             {part("name=a; filename=\"" + std::string("a\0b", 3) + "\"", "1") + "--XX--", 400, {}},
         }) {
        SCOPED_TRACE(body.substr(0, 200));
        const CgiReply reply = post("alice", "path=/photo", body);
        EXPECT_EQ(code(reply), expected);
        EXPECT_EQ(namesIn(photo_), left);
        EXPECT_EQ(reply.json["data"]["files"].size(), left.size());
        fs::remove(photo_ + "/one");
    }
    EXPECT_EQ(temporaries(kAliceUid), Names{});
    for (const char* type : {"multipart/form-data", "multipart/mixed; boundary=XX", "multipart/form-data; boundary="}) {
        const CgiReply reply(runCgi(PROGRAM_UPLOAD, "alice", "POST", "path=/photo", file, {{"CONTENT_TYPE", type}}));
        EXPECT_EQ(code(reply), 1800) << type;
    }
}

TEST_F(UploadCgi, FullAndReadOnlyFileSystems) {
    put("alice", "/photo/first", "makes the temporary folders");
    const std::string big(size_t{3} << 20, 'x');
    struct {
        std::string folder;
        const char* options;
        unsigned long flags;
        int code;
    } const cases[] = {
        {photo_, "size=1m,mode=0777", 0, 416},
        {"/tmp/@tmp/orvel", "size=1m,mode=0777", 0, 416},
        {photo_, "mode=0777,usrquota_block_hardlimit=1M", 0, 415},
        {"/tmp/@tmp/orvel", "mode=0777,usrquota_block_hardlimit=1M", 0, 415},
        {photo_, "mode=0777", MS_RDONLY, 407},
        {"/tmp/@tmp/orvel", "mode=0777", MS_RDONLY, 411},
    };
    for (const auto& full : cases) {
        SCOPED_TRACE(full.folder + " " + full.options);
        const int result = inChild([&] {
            if (unshare(CLONE_NEWNS) != 0) return 3;
            if (mount("full", full.folder.c_str(), "tmpfs", full.flags, full.options) != 0) return 3;
            EXPECT_EQ(code(put("alice", "/photo/new/big", big)), full.code);
            EXPECT_EQ(code(put("alice", "/photo/new/big", big, "overwrite")), full.code);
            Names left;
            for (const auto& entry : fs::recursive_directory_iterator(full.folder)) {
                if (entry.is_regular_file() || full.folder == photo_) left.push_back(entry.path());
            }
            EXPECT_EQ(left, Names{});
            return 0;
        });
        if (result != 0) std::cout << "SKIPPED: could not mount a file system with " << full.options << '\n';
    }
    EXPECT_EQ(namesIn(photo_), Names{"first"});
}

TEST_F(UploadCgi, WhatAKilledUploadLeftIsRemovedByALaterOne) {
    put("alice", "/photo/first", "makes the temporary folder");
    const std::string folder = "/tmp/@tmp/orvel/upload-" + std::to_string(kAliceUid);
    for (const char* name : {"part-old", "part-new", "other"}) {
        writeFile(folder + "/" + name, "x");
        ASSERT_EQ(chown((folder + "/" + name).c_str(), kAliceUid, kUsersGid), 0);
    }
    const auto longAgo = fs::file_time_type::clock::now() - std::chrono::hours(2);
    for (const char* name : {"part-old", "other"}) fs::last_write_time(folder + "/" + name, longAgo);
    EXPECT_EQ(code(put("alice", "/photo/second", "data")), 0);
    EXPECT_EQ(temporaries(kAliceUid), (Names{"other", "part-new"}));
    fs::remove_all(folder);
}

// Of any size, on its way in and out.
TEST_F(UploadCgi, AFileTakesNoMemory) {
    const std::string body = systemRoot() + "/body";
    const auto peakOf = [&](off_t size) {
        writeFile(body, "");
        EXPECT_EQ(truncate(body.c_str(), size), 0);
        Variables request = variables("/photo/" + std::to_string(size), "", "error");
        request["CONTENT_LENGTH"] = std::to_string(size);
        const std::string stored = runProgram({"/bin/sh", "-c", PROGRAM_UPLOAD " <" + body + "; true"}, request).output;
        EXPECT_NE(stored.find("\"success\":true"), std::string::npos) << stored;
        request["REQUEST_METHOD"] = "GET";
        request["CONTENT_LENGTH"] = "";
        const std::string fetched = runProgram({"/bin/sh", "-c", PROGRAM_DOWNLOAD " | wc -c"}, request).output;
        EXPECT_GT(std::stoll(fetched), size);
        rusage most{};
        getrusage(RUSAGE_CHILDREN, &most);
        return most.ru_maxrss;
    };
    inChild([&] {
        const long small = peakOf(1);
        EXPECT_LT(peakOf(96 << 20) - small, 32 << 10) << "KiB";
    });
}

TEST_F(UploadCgi, TwoAtOnceEndAsTheirModesSay) {
    const std::string file = shareRoot("photo") + "/f";
    const std::string bodies[] = {std::string(300000, 'a'), std::string(300000, 'b')};
    const auto stored = [](const std::string& reply) {
        return reply.find("\"success\":true") != std::string::npos &&
               reply.find("\"skipped\":false") != std::string::npos;
    };
    for (const auto& [first, second] : Rows<std::string, std::string>{
             row("error", "error"), row("skip", "skip"), row("overwrite", "overwrite"), row("error", "overwrite")}) {
        for (int round = 0; round < 5; ++round) {
            SCOPED_TRACE(first + " " + second);
            const std::string modes[] = {first, second};
            std::string replies[2];
            std::thread other([&] {
                replies[1] = runProgram({PROGRAM_UPLOAD}, variables("/photo/f", bodies[1], modes[1]), bodies[1]).output;
            });
            replies[0] = runProgram({PROGRAM_UPLOAD}, variables("/photo/f", bodies[0], modes[0]), bodies[0]).output;
            other.join();
            const std::string found = readFile(file);
            EXPECT_TRUE(found == bodies[0] || found == bodies[1]) << found.size();
            EXPECT_TRUE(stored(replies[found == bodies[0] ? 0 : 1]));
            const int both = stored(replies[0]) + stored(replies[1]);
            EXPECT_TRUE(first != second ? found == bodies[1] : both == (first == "overwrite" ? 2 : 1)) << both;
            const bool refused = (replies[0] + replies[1]).find("\"code\":414") != std::string::npos;
            EXPECT_TRUE(refused || first != "error" || second != "error") << replies[0] << replies[1];
            EXPECT_EQ(namesIn(shareRoot("photo")), Names{"f"});
            fs::remove(file);
        }
    }
}

}  // namespace
