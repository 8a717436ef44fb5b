// The program download, run as a web server runs it. Archives are read back by libarchive's own reader.
#include <archive.h>
#include <archive_entry.h>
#include <sys/resource.h>
#include <sys/sysmacros.h>

#include <clocale>

#include "apps/cgi_test.h"

namespace {

using Members = std::map<std::string, std::string>;

// The members of a zip with their content; a folder's name ends in "/".
Members membersOf(const std::string& zip) {
    Members members;
    setlocale(LC_CTYPE, "C.UTF-8");
    archive* reader = archive_read_new();
    archive_read_support_format_zip(reader);
    EXPECT_EQ(archive_read_open_memory(reader, zip.data(), zip.size()), ARCHIVE_OK);
    archive_entry* entry = nullptr;
    while (archive_read_next_header(reader, &entry) == ARCHIVE_OK) {
        const std::string name = archive_entry_pathname(entry);
        EXPECT_EQ(members.count(name), 0U) << name;
        char data[4096];
        std::string& content = members[name];
        for (la_ssize_t got; (got = archive_read_data(reader, data, sizeof data)) != 0;) {
            if (got < 0) ADD_FAILURE() << archive_error_string(reader);
            if (got < 0) break;
            content.append(data, static_cast<size_t>(got));
        }
    }
    archive_read_free(reader);
    setlocale(LC_CTYPE, "C");  // other tests write names as they are
    return members;
}

class DownloadCgi : public CgiTest {
 protected:
    static std::string ask(const std::string& user, const std::string& query, const Variables& more = {},
                           const std::string& method = "GET") {
        return runCgi(PROGRAM_DOWNLOAD, user, method, query, "", more);
    }
    static RawReply fetch(const std::string& path, const Variables& more = {}, const std::string& method = "GET") {
        return RawReply(ask("alice", "path=" + percentEncode(path), more, method));
    }
    static Members zip(const std::string& query) {
        const RawReply reply(ask("alice", query));
        EXPECT_EQ(reply.status, 200);
        EXPECT_EQ(reply.headers.at("Content-Type"), "application/zip");
        return membersOf(reply.body);
    }
};

TEST_F(DownloadCgi, WhatABrowserMayShowIsAShortList) {
    for (const auto& [name, type] : Rows<const char*, const char*>{{"a.PNG", "image/png"},
                                                                   {"a.jpeg", "image/jpeg"},
                                                                   {"a.txt", "text/plain; charset=utf-8"},
                                                                   {"a.html", ""},
                                                                   {"a.svg", ""},
                                                                   {"a.xml", ""},
                                                                   {"a.xhtml", ""},
                                                                   {"a.pdf", ""},
                                                                   {"a.png.html", ""},
                                                                   {"png", ""}}) {
        writeFile(shareRoot("photo") + "/" + name, "<script>", 0644);
        const bool shown = *type != '\0';
        auto shownAs = RawReply(ask("alice", "inline=1&path=/photo/" + std::string(name))).headers;
        EXPECT_EQ(shownAs["Content-Type"], shown ? type : "application/octet-stream") << name;
        EXPECT_TRUE(shownAs["Content-Disposition"].starts_with(shown ? "inline; " : "attachment; ")) << name;
        EXPECT_TRUE(shownAs["Content-Security-Policy"].starts_with("sandbox; default-src 'none'")) << name;
        EXPECT_EQ(shownAs["X-Content-Type-Options"], "nosniff");
        EXPECT_EQ(fetch("/photo/" + std::string(name)).headers.at("Content-Type"), "application/octet-stream");
    }
}

TEST_F(DownloadCgi, AFileComesWholeOrInPart) {
    const std::string data("0123456789\0\r\n\xFF", 14);
    writeFile(shareRoot("photo") + "/f.html", data, 0644);
    writeFile(shareRoot("photo") + "/empty", "", 0644);
    const RawReply whole = fetch("/photo/f.html");
    EXPECT_EQ(whole.status, 200);
    EXPECT_EQ(whole.body, data);
    EXPECT_EQ(whole.headers.at("Content-Length"), "14");
    EXPECT_EQ(whole.headers.at("Content-Type"), "application/octet-stream");
    EXPECT_EQ(whole.headers.at("X-Content-Type-Options"), "nosniff");
    EXPECT_EQ(whole.headers.at("Accept-Ranges"), "bytes");
    EXPECT_EQ(whole.headers.at("Content-Disposition"), "attachment; filename=\"f.html\"; filename*=UTF-8''f.html");
    const std::string tag = whole.headers.at("ETag"), date = whole.headers.at("Last-Modified");
    for (const auto& [method, headers, status, body, range] :
         Rows<const char*, Variables, int, std::string, std::string>{
             {"GET", {{"HTTP_RANGE", "bytes=2-4"}}, 206, "234", "bytes 2-4/14"},
             {"GET", {{"HTTP_RANGE", "bytes=-2"}}, 206, "\n\xFF", "bytes 12-13/14"},
             {"GET", {{"HTTP_RANGE", "bytes=9-"}}, 206, data.substr(9), "bytes 9-13/14"},
             {"GET", {{"HTTP_RANGE", "bytes=14-"}}, 416, "", "bytes */14"},
             {"GET", {{"HTTP_RANGE", "bytes=0-1,4-5"}}, 200, data, ""},
             {"GET", {{"HTTP_RANGE", "bytes=2-4"}, {"HTTP_IF_RANGE", tag}}, 206, "234", "bytes 2-4/14"},
             {"GET", {{"HTTP_RANGE", "bytes=2-4"}, {"HTTP_IF_RANGE", "\"old\""}}, 200, data, ""},
             {"GET", {{"HTTP_IF_NONE_MATCH", tag}, {"HTTP_RANGE", "bytes=2-4"}}, 304, "", ""},
             {"GET", {{"HTTP_IF_MODIFIED_SINCE", date}}, 304, "", ""},
             {"HEAD", {}, 200, "", ""},
             {"HEAD", {{"HTTP_RANGE", "bytes=2-4"}}, 200, "", ""},
             {"POST", {{"HTTP_IF_NONE_MATCH", tag}}, 200, data, ""},
         }) {
        const RawReply reply = fetch("/photo/f.html", headers, method);
        SCOPED_TRACE(std::string(method) + " " + range + " " + std::to_string(status));
        EXPECT_EQ(reply.status, status);
        EXPECT_EQ(reply.body, body);
        EXPECT_EQ(reply.headers.count("Content-Range") == 0 ? "" : reply.headers.at("Content-Range"), range);
        EXPECT_TRUE(status != 206 || reply.headers.at("Content-Length") == std::to_string(body.size()));
        EXPECT_TRUE(status != 304 || reply.headers.at("ETag") == tag);
    }
    EXPECT_EQ(fetch("/photo/empty").headers.at("Content-Length"), "0");
    EXPECT_EQ(fetch("/photo/empty", {{"HTTP_RANGE", "bytes=0-"}}).status, 416);
    writeFile(shareRoot("photo") + "/f.html", "another time", 0644);
    EXPECT_EQ(fetch("/photo/f.html", {{"HTTP_IF_NONE_MATCH", tag}}).status, 200);
}

TEST_F(DownloadCgi, RefusalsShowInTheStatus) {
    addShare("preview", "read only = no\nvalid users = alice\nvexo:restriction = 4\n");
    writeFile(shareRoot("preview") + "/f", "secret", 0644);
    writeFile(photo_ + "/folder/f", "x", 0644);
    writeFile(photo_ + "/folder/@tmp/f", "x", 0644);
    ASSERT_EQ(mkfifo((photo_ + "/pipe").c_str(), 0666), 0);
    fs::create_symlink("folder/f", photo_ + "/inside");
    fs::create_symlink("/etc/passwd", photo_ + "/outside");
    fs::create_symlink("/etc", photo_ + "/etc");
    fs::create_symlink("../" + fs::path(shareRoot("preview")).filename().string(), photo_ + "/next");
    for (const auto& [user, query, status, code] :
         rowsOf<std::string, std::string, int, int>("apps/refused_downloads")) {
        SCOPED_TRACE(query);
        const CgiReply reply(ask(user, query));
        EXPECT_EQ(reply.status, status);
        EXPECT_EQ(reply.json["error"]["code"], code);
        EXPECT_EQ(reply.headers.at("Content-Type"), "application/json; charset=UTF-8");
    }
    EXPECT_EQ(fetch("/photo/inside").body, "x");
    setSetting("link_policy_photo", "none");
    EXPECT_EQ(fetch("/photo/inside").status, 403);
}

TEST_F(DownloadCgi, FoldersAndSeveralPathsComeAsZip) {
    makeFolder(photo_ + "/sub/empty");
    for (const char* name : {"/sub/ü.txt", "/sub/日本", "/sub/\xE9", "/sub/\xE8"}) writeFile(photo_ + name, name, 0644);
    writeFile(photo_ + "/sub/@tmp/x", "hidden", 0644);
    writeFile(photo_ + "/other/sub/big", std::string(300000, 'z'), 0644);
    fs::create_symlink("/etc/passwd", photo_ + "/sub/link");
    ASSERT_EQ(mkfifo((photo_ + "/sub/pipe").c_str(), 0666), 0);

    const Members sub = {{"sub/", ""},
                         {"sub/empty/", ""},
                         {"sub/ü.txt", "/sub/ü.txt"},
                         {"sub/日本", "/sub/日本"},
                         {"sub/%E9", "/sub/\xE9"},
                         {"sub/%E8", "/sub/\xE8"}};
    EXPECT_EQ(zip("path=/photo/sub"), sub);
    EXPECT_EQ(zip("path=/photo/sub/empty/.."), sub) << "no member leads out";
    EXPECT_EQ(zip("path=/photo/sub/"), sub);
    const Members two = zip("path=/photo/sub/empty&path_raw=/photo/other/sub&path_raw=/photo/sub&name=both");
    EXPECT_EQ(two.count("sub (2)/%E9"), 1U);
    EXPECT_EQ(two.count("_not_included.txt"), 0U);
    EXPECT_EQ(two.at("sub/big"), std::string(300000, 'z'));
    EXPECT_EQ(RawReply(ask("alice", "path=/photo/sub&name=my%22%0Aown")).headers.at("Content-Disposition"),
              "attachment; filename=\"my__own.zip\"; filename*=UTF-8''my%22%0Aown.zip");
    EXPECT_EQ(RawReply(ask("alice", "path=/photo")).headers.at("Content-Disposition"),
              "attachment; filename=\"photo.zip\"; filename*=UTF-8''photo.zip");
}

TEST_F(DownloadCgi, AZipTellsWhatItLacks) {
    SKIP_WITHOUT_ROOT();
    writeFile(photo_ + "/sub/readable", "x", 0644);
    writeFile(photo_ + "/sub/closed.txt", "secret", 0600);
    writeFile(photo_ + "/sub/closed/inner", "secret", 0644);
    chmod((photo_ + "/sub/closed").c_str(), 0700);
    const Members members = zip("path=/photo/sub");
    EXPECT_EQ(members.at("sub/readable"), "x");
    EXPECT_EQ(members.size(), 3U);
    EXPECT_EQ(members.at("_not_included.txt"),
              "These could not be included:\nsub/closed: Permission denied\nsub/closed.txt: Permission denied\n");
    EXPECT_EQ(fetch("/photo/sub/closed.txt").status, 403);
    EXPECT_EQ(RawReply(ask("carol", "path=/photo/sub/closed.txt")).status, 403) << "not in the share's list";
}

TEST_F(DownloadCgi, ManyPathsNeedFewDescriptorsAndEachComesOnce) {
    std::string list;
    Members all;
    for (int i = 0; i < 200; ++i) {
        const std::string path = "/" + std::to_string(i) + "/a.txt";
        writeFile(photo_ + path, path, 0644);
        list += "&path=/photo" + path;
        all[i == 0 ? "a.txt" : "a (" + std::to_string(i + 1) + ").txt"] = path;
    }
    std::string again = "path=/photo/0/a.txt";
    for (int i = 0; i < 300; ++i) again += i % 2 == 0 ? "&path=/photo/0/a.txt" : "&path_raw=/photo/0/a.txt";
    EXPECT_EQ(fetch("/photo/0/a.txt").body, RawReply(ask("alice", again)).body);
    inChild([&] {
        const rlimit few = {40, 40};
        EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &few), 0);
        EXPECT_EQ(zip(list.substr(1)), all);
    });
    // A list is long; what is too long is said to be.
    for (const auto& [length, status] : Rows<size_t, int>{row(size_t{2} << 20, 200), row(size_t{17} << 20, 413)}) {
        std::string form = "path=/photo/0/a.txt&filler=";
        form.resize(length, 'x');
        const Variables more = {{"CONTENT_TYPE", "application/x-www-form-urlencoded"}};
        EXPECT_EQ(RawReply(runCgi(PROGRAM_DOWNLOAD, "alice", "POST", "", form, more)).status, status);
    }
}

TEST_F(DownloadCgi, RowsOfAKeptListingComeAsTheyWereShown) {
    for (const char* name : {"/a", "/b", "/c", "/d/e"}) writeFile(photo_ + name, name, 0644);
    const CgiReply kept = get(PROGRAM_LIST, "alice", "action=folder&keep=1&path=/photo");
    const std::string rows = "listing=" + kept.json["data"]["listing"].asString() + "&ranges=";
    fs::remove(photo_ + "/b");
    writeFile(photo_ + "/came later", "", 0644);
    const Members members = zip(rows + "0-3");
    EXPECT_EQ(members, (Members{{"a", "/a"},
                                {"c", "/c"},
                                {"d/", ""},
                                {"d/e", "/d/e"},
                                {"_not_included.txt", "These could not be included:\nb: missing\n"}}));
    EXPECT_EQ(RawReply(ask("alice", rows + "1")).body, "/a") << "one file comes as it is";
    EXPECT_EQ(RawReply(ask("alice", rows + "2")).status, 404);
    EXPECT_EQ(RawReply(ask("alice", rows + "4")).status, 400);
}

}  // namespace
