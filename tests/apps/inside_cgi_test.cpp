// What archives hold: looked at, taken out in parts, sent one by one.
#include <numeric>

#include "apps/pack.h"

namespace {

std::string fromBase64(const std::string& text) {
    static const std::string kDigits = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string bytes;
    unsigned bits = 0, count = 0;
    for (const char digit : text.substr(0, text.find('='))) {
        bits = bits << 6 | static_cast<unsigned>(kDigits.find(digit));
        if ((count += 6) >= 8) bytes += static_cast<char>(bits >> (count -= 8) & 0xFF);
    }
    return bytes;
}

// Encrypted by another tool, which libarchive cannot undo: what files hold, and their names, too.
const std::string kLocked7z =
    "N3q8ryccAATDbN26EAAAAAAAAABaAAAAAAAAANvhC+PI9jGJKCxWZm/"
    "UadO4XvoUAQQGAAEJEAAHCwEAAiQG8QcBElMPg03hMCwmBiqAockq8YpYByEhAQAB"
    "AAwFAQAICgG379yDAAAFARkBABEFAGEAAAAUCgEAx17tjNd63QEVBgEAIICkgQAA";
const std::string kHidden7z =
    "N3q8ryccAATz2Cu9cAAAAAAAAAAuAAAAAAAAALLWmM86tCXOihpWDif0eA6shO6M7D6V7IZ8OTYZ/"
    "hlq0VPOc19W+xPl9B6UZ02dYcSeRvKZBZVtuUEy+tMm"
    "+h+Gc7UUaq0bVDRHaTbYMsa/4Fq66RR9RpdLhmpSupAOuAoZSvyJK/"
    "XV26RUjTAskL3efVfmFwYQAQlgAAcLAQABJAbxBwESUw+wl8F9XcSzng+kURcWMb4G"
    "DFoKAXS2GOkAAA==";
// "d/a.txt", which holds "1".
const std::string kRar = "UmFyIRoHAQDFGjMyAwEAAEttjcsaAgIBBgGkgwIAypo7t+/cgwABB2QvYS50eHQxGbI6NQMFAAA=";

class InsideCgi : public TaskCgi {
 protected:
    void SetUp() override {
        TaskCgi::SetUp();
        if (!IsSkipped()) setSetting("archive_look_seconds", "600");
    }
    static CgiReply look(const std::string& archive, const std::string& more = "") {
        return post(PROGRAM_LIST, "alice", "action=archive&path=" + percentEncode(archive) + more);
    }
    // "folder/ file*=size", * for what is encrypted, and what is said beside; or the code of a refusal.
    static std::string seen(const CgiReply& reply) {
        if (!reply.json["success"].asBool()) return std::to_string(code(reply));
        const Json::Value& data = reply.json["data"];
        std::string text;
        for (const Json::Value& item : data["items"]) {
            text += (text.empty() ? "" : " ") + item["name"].asString() + (item["isdir"].asBool() ? "/" : "") +
                    (item["link"].asBool() ? "@" : "") + (item["encrypted"].asBool() ? "*" : "") +
                    (item["size"].isNull() ? "" : "=" + item["size"].asString());
        }
        if (data["refused"].asInt() != 0) text += " -" + data["refused"].asString();
        if (!data["cut"].isNull()) text += " " + data["cut"].asString();
        return text.substr(text.starts_with(" ") ? 1 : 0);
    }
    // One file out of an archive; of a refusal its status and code.
    static std::string sent(const std::string& archive, const std::string& inside, const std::string& more = "") {
        const RawReply reply(runCgi(PROGRAM_DOWNLOAD, "alice", "POST", "",
                                    "path=" + archive + "&inside=" + inside + more,
                                    {{"CONTENT_TYPE", "application/x-www-form-urlencoded"}}));
        if (reply.status != 200)
            return std::to_string(reply.status) + " " + jsonOf(reply.body)["error"]["code"].asString();
        EXPECT_EQ(reply.headers.at("Content-Disposition").substr(0, 10), "attachment");
        EXPECT_EQ(reply.headers.at("Content-Length"), std::to_string(reply.body.size()));
        return reply.body;
    }
};

TEST_F(InsideCgi, HostileArchivesAreSeenAndExtractedWithinTheirBounds) {
    setSetting("archive_look_members", "40");
    setSetting("extract_max_size", "1");
    setSetting("extract_max_members", "40");
    const auto file = [](const char* name, const std::string& text = "x") { return Packed{name, AE_IFREG, text}; };
    const auto link = [](const char* name, const char* to) { return Packed{name, AE_IFLNK, to}; };
    const auto tar = [this](const std::vector<Packed>& members) {
        pack(video_ + "/h.tar", "pax", nullptr, members);
        return readFile(video_ + "/h.tar");
    };
    const auto zip = [this](const std::vector<Packed>& members) {
        pack(video_ + "/h.zip", "zip", nullptr, members);
        return readFile(video_ + "/h.zip");
    };
    // A file of 8 GiB: the bytes of its tar, packed so well that they are soon written, and long in reading.
    const auto endless = [this] {
        std::string head(512, '\0');
        head.replace(0, 3, "big")
            .replace(100, 8, "0000644\0", 8)
            .replace(124, 11, "77777777777")
            .replace(136, 11, "00000000000");
        head.replace(148, 8, 8, ' ').replace(156, 1, "0").replace(257, 8, "ustar\00000", 8);
        char sum[8];
        snprintf(sum, sizeof sum, "%06o", std::accumulate(head.begin(), head.end(), 0U));
        head.replace(148, 7, sum, 7);
        const auto zipped = [this](const std::string& bytes) {
            pack(video_ + "/h.gz", "raw", "gzip", {{"x", AE_IFREG, bytes}});
            return readFile(video_ + "/h.gz");
        };
        const std::string zeros = zipped(std::string(1 << 20, '\0'));
        std::string all = zipped(head);
        for (int i = 0; i < 8192; ++i) all += zeros;
        return all;
    };
    // What its decoder has to keep in mind is said in the head of its only block.
    [[maybe_unused]] const auto greedy = [](std::string bytes) {
        bytes[16] = 40;
        unsigned sum = ~0U;
        for (size_t i = 12; i < 20; ++i) {
            sum ^= static_cast<unsigned char>(bytes[i]);
            for (int bit = 0; bit < 8; ++bit) sum = sum >> 1 ^ ((sum & 1) != 0 ? 0xEDB88320U : 0);
        }
        for (size_t i = 0; i < 4; ++i) bytes[20 + i] = static_cast<char>(~sum >> 8 * i);
        return bytes;
    };
    const auto with = [](std::string bytes, const std::string& from, const std::string& to) {
        for (size_t at = 0; (at = bytes.find(from, at)) != std::string::npos; at += to.size())
            bytes.replace(at, from.size(), to);
        return bytes;
    };
    std::string nested = "n";
    while (nested.size() < 3000) nested += "/n";
    const std::string whole = tar({file("first", "1"), file("half", std::string(8192, 'h'))});
    const Rows<const char*, std::string, std::string, std::string> cases = {
        {"names that lead out", tar({file("/abs"), file("../up"), file("a/../../up"), file("good")}), "good=1 -3",
         "good=x | //abs 1006 /../up 1006 /a/../../up 1006"},
        {"NUL in a name", with(zip({file("nul!.exe")}), "nul!", std::string("nul\0", 4)), "nul=1", "nul=x |"},
        {"a backslash", zip({file("..\\up")}), "-1", "| /../up 1006"},
        {"one name twice", tar({file("a", "1"), file("a", "22")}), "a=2", "a=1 |"},
        {"a file through a link", tar({link("door", "/tmp"), file("door/x"), link("in", "good"), file("good/y")}),
         "door/@ good/ in@=0", "door/x=x good/y=x | /door 407"},
        {"a hard link to outside",
         tar({{"h", AE_IFREG, "../../etc/passwd", true}, {"p", AE_IFREG, "/etc/passwd", true}}), "h p",
         "| /h 1006 /p 1006"},
        {"devices", tar({{"null", AE_IFCHR, ""}, {"pipe", AE_IFIFO, ""}}), "-2", "| /null 407 /pipe 407"},
        {"cut short", whole.substr(0, whole.size() / 2), "first=1 half=8192 damaged", "first=1 | /half 1402 !1402"},
        {"thousands of folders", tar({file((nested + "/x").c_str())}), "n/", "| /" + nested + "/x 1007 !1007"},
        {"too many members", tar(std::vector<Packed>(45, file("same"))), "same=1 members", "same=x | !1007"},
        {"more than its room", zip({file("big", std::string(2 << 20, '\0'))}), "big=2097152", "| /big 1007 !1007"},
        {"endless", endless(), "seconds", "| /big 1007 !1007"},
#ifndef __SANITIZE_ADDRESS__  // whose memory is not bounded by address space
        {"a dictionary of 4 GiB",
         [&] {
             pack(video_ + "/h.xz", "ustar", "xz", {file("a")});
             return greedy(readFile(video_ + "/h.xz"));
         }(),
         "demanding", "| !2302"},
#endif
        {"names encrypted", fromBase64(kHidden7z), "2301", "| !2301"},
        {"an unknown cipher", fromBase64(kLocked7z), "a*=1", "| !2301"},
        {"no archive", "no archive", "1401", "| !1401"},
    };
    openFolder(photo_ + "/t");
    for (const auto& [what, bytes, shown, extracted] : cases) {
        SCOPED_TRACE(what);
        writeFile(video_ + "/a.bin", bytes);
        setSetting("archive_look_seconds", shown.ends_with("seconds") ? "1" : "600");
        std::string now = seen(look("/video/a.bin"));
        if (shown == "seconds")
            now = now.substr(now.rfind(' ') + 1);  // what was found by then is not the same each time
        EXPECT_EQ(now, shown);
        const Json::Value task =
            perform("alice", "action=extract&conflict=skip&own_folder=true" + about({"/video/a.bin"}, "/photo/t"));
        std::string ended = fs::exists(photo_ + "/t/a") ? filesOf(photo_ + "/t/a") + " |" : "|";
        for (const Json::Value& error : task["errors"]) {
            const std::string path = error["path"].asString();
            const bool whole_ = path == "/video/a.bin";
            ended +=
                (whole_ ? " !" : " " + path.substr(std::min(path.size(), std::string("/photo/t/a").size())) + " ") +
                error["code"].asString();
        }
        if (ended.starts_with(" ")) ended.erase(0, 1);
        EXPECT_EQ(ended, extracted);
        fs::remove_all(photo_ + "/t/a");
        fs::remove_all(photo_ + "/t/n");
        EXPECT_EQ(namesIn(photo_ + "/t"), Names{});
    }
    EXPECT_FALSE(hasParts(photo_));
}

TEST_F(InsideCgi, AFolderInAnArchiveIsShownAndTakenOutInParts) {
    openFolder(photo_ + "/t");
    pack(video_ + "/p-1.tar.zst", "pax", "zstd",
         {{"./", AE_IFDIR, ""},
          {"./p-1/a 10", AE_IFREG, "10"},
          {"./p-1/a 9", AE_IFREG, "9"},
          {"./p-1/d/x", AE_IFREG, "x"},
          {"./p-1/d/h", AE_IFREG, "./p-1/d/x", true},
          {"./p-1/e/y", AE_IFREG, "y"}});
    const CgiReply top = look("/video/p-1.tar.zst");
    const std::string index = "&index=" + top.json["data"]["index"].asString();
    EXPECT_EQ(seen(top), "p-1/");
    const Rows<const char*, std::string> looks = {
        {"&inside=p-1&natural=en", "d/ e/ a 9=1 a 10=2"},
        {"&inside=p-1", "d/ e/ a 10=2 a 9=1"},
        {"&inside=p-1&sort_by=size&sort_direction=desc", "d/ e/ a 10=2 a 9=1"},
        {"&inside=p-1&offset=1&limit=2", "e/ a 10=2"},
        {"&inside=p-1/d", "h x=1"},
        {"&inside=none", "408"},
        {"&inside=../p-1", "400"},
        {"&limit=10001", "400"}};
    for (const auto& [asked, shown] : looks) EXPECT_EQ(seen(look("/video/p-1.tar.zst", asked + index)), shown) << asked;
    EXPECT_EQ(code(post(PROGRAM_LIST, "bob", "action=archive&path=/video/none.zip")), 408);

    const Rows<std::string, std::string, std::string> parts = {
        {"", "p-1/a 10=10 p-1/a 9=9 p-1/d/h=x p-1/d/x=x p-1/e/y=y", ""},
        {"&own_folder=true", "p-1/a 10=10 p-1/a 9=9 p-1/d/h=x p-1/d/x=x p-1/e/y=y", ""},
        {"&inside=p-1&members_raw=d%0Aa%25209", "a 9=9 d/h=x d/x=x", ""},
        {"&inside=p-1&members_raw=a%25209&own_folder=true", "p-1/a 9=9", ""},
        {"&inside=p-1/e", "y=y", ""},
        {"&inside=p-1/d&members_raw=h", "", "/photo/t/h 408\n"},
        {"&members_raw=gone", "", "/video/p-1.tar.zst/gone 408\n"},
    };
    for (const auto& [asked, files, refused] : parts) {
        const Json::Value task = perform("alice", "action=extract" + asked + about({"/video/p-1.tar.zst"}, "/photo/t"));
        EXPECT_EQ(filesOf(photo_ + "/t") + errors(task), files + refused) << asked;
        fs::remove_all(photo_ + "/t");
        openFolder(photo_ + "/t");
    }
    for (const char* wrong : {"&members_raw=a/b", "&members_raw=..", "&inside=/p-1", "&members_raw=%25"})
        EXPECT_EQ(code(ask("alice", "action=extract" + std::string(wrong) + about({"/video/p-1.tar.zst"}, "/photo/t"))),
                  400);
    // A folder of that name is there: neither is touched.
    writeFiles(photo_, {"/t/p-1/mine"}, "m");
    EXPECT_EQ(errors(perform("alice", "action=extract&own_folder=true" + about({"/video/p-1.tar.zst"}, "/photo/t"))),
              "");
    EXPECT_EQ(namesIn(photo_ + "/t"), (Names{"p-1", "p-1 (2)"}));
    EXPECT_EQ(namesIn(photo_ + "/t/p-1"), Names{"mine"});

    // What was found in another archive of that name is not believed.
    pack(video_ + "/p-1.tar.zst", "pax", "zstd", {{"other", AE_IFREG, "1"}});
    EXPECT_EQ(seen(look("/video/p-1.tar.zst", index)), "other=1");
}

TEST_F(InsideCgi, EveryFormatIsReadAndWritten) {
    openFolder(photo_ + "/t");
    writeFiles(photo_, {"/d/a.txt"}, "1");
    for (const std::string format : {"zip", "tar.gz", "tar.xz", "tar.zst", "7z", "zip&password=p%C3%A9"}) {
        SCOPED_TRACE(format);
        const bool locked = format.find('&') != std::string::npos;
        const std::string asked = "action=compress&conflict=overwrite&format=" + format;
        EXPECT_EQ(errors(perform("alice", asked + about({"/photo/d"}, "/video/made"))), "");
        EXPECT_EQ(readFile(video_ + "/made").find("a.txt") != std::string::npos, format.starts_with("zip"));
        EXPECT_EQ(seen(look("/video/made", "&inside=d")), locked ? "a.txt*=1" : "a.txt=1");
        const std::string password = locked ? "&password=p%C3%A9" : "";
        EXPECT_EQ(sent("/video/made", "d/a.txt"), locked ? "500 1403" : "1");
        EXPECT_EQ(sent("/video/made", "d/a.txt", password), "1");
        EXPECT_EQ(errors(perform("alice", "action=extract" + password + about({"/video/made"}, "/photo/t"))), "");
        EXPECT_EQ(filesOf(photo_ + "/t"), "d/a.txt=1");
        fs::remove_all(photo_ + "/t/d");
    }
    EXPECT_EQ(code(ask("alice", "action=compress&format=7z&password=x" + about({"/photo/d"}, "/video/m"))), 400);
    EXPECT_EQ(namesIn(video_), Names{"made"}) << "what was in between is gone";

    writeFile(video_ + "/r.rar", fromBase64(kRar));
    pack(video_ + "/i.iso", "iso9660", nullptr, {{"d/a.txt", AE_IFREG, "1"}});
    writeFile(video_ + "/l.7z", fromBase64(kLocked7z));
    const Rows<const char*, const char*, std::string> one = {
        {"/video/r.rar", "d/a.txt", "1"},    {"/video/i.iso", "d/a.txt", "1"},    {"/video/l.7z", "a", "500 2301"},
        {"/video/r.rar", "d", "404 408"},    {"/video/r.rar", "../x", "400 400"}, {"/video/d", "a", "404 408"},
        {"/photo/d/a.txt", "a", "500 1401"}, {"/photo/d", "a", "500 1401"}};
    for (const auto& [archive, inside, content] : one) EXPECT_EQ(sent(archive, inside), content) << archive << inside;
}

TEST_F(InsideCgi, NamesOfOldZipsAreReadable) {
    const Rows<std::string, std::string> names = {{"\x81"
                                                   "bung.txt",
                                                   "\xC3\xBC"
                                                   "bung.txt"},                                              // German
                                                  {"ch\x83teau", "ch\xC3\xA2teau"},                          // French
                                                  {"\x93\xFA\x96\x7B.txt", "\xE6\x97\xA5\xE6\x9C\xAC.txt"},  // Japanese
                                                  {"\xC3\xA9", "\xC3\xA9"}};                                 // UTF-8
    std::vector<Packed> members;
    for (const auto& [bytes, name] : names) members.push_back({bytes.c_str(), AE_IFREG, name});
    openFolder(photo_ + "/t");
    pack(video_ + "/o.zip", "zip", nullptr, members);
    pack(video_ + "/o.tar", "ustar", nullptr, members);
    const CgiReply shown = look("/video/o.zip"), raw = look("/video/o.tar");
    Names wanted, bytesOfTar;
    for (const auto& [bytes, name] : names) wanted.push_back(name);
    std::sort(wanted.begin(), wanted.end());
    EXPECT_EQ(each(shown.json["data"]["items"], "name"), wanted);
    EXPECT_EQ(raw.json["data"]["items"][1]["name_raw"].asString(), "%81bung.txt") << "a tar's names are bytes";
    EXPECT_EQ(errors(perform("alice", "action=extract" + about({"/video/o.zip"}, "/photo/t"))), "");
    EXPECT_EQ(namesIn(photo_ + "/t"), wanted);
}

}  // namespace
