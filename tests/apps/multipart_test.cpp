#include "multipart.h"

#include "support/testing.h"

namespace {

using Status = orvel::cgi::MultipartReader::Status;

struct Part {
    std::string name, fileName, data;
    bool isFile = false, ended = false;
};

struct Collector final : orvel::cgi::PartSink {
    bool partBegin(const orvel::cgi::PartHeader& header) override {
        parts.push_back({header.name, header.fileName, "", header.isFile});
        return header.name != "stop";
    }
    bool partData(std::string_view data) override {
        parts.back().data += data;
        largest = std::max(largest, data.size());
        return true;
    }
    bool partEnd() override {
        parts.back().ended = true;
        return true;
    }
    std::vector<Part> parts;
    std::size_t largest = 0;
};

Status readWhole(const std::string& body, Collector& collector, std::size_t piece) {
    orvel::cgi::MultipartReader reader("XX", collector);
    for (std::size_t at = 0; at < body.size(); at += piece) reader.feed(std::string_view(body).substr(at, piece));
    return reader.status();
}

std::string field(const std::string& disposition, const std::string& data) {
    return "--XX\r\nContent-Disposition: form-data; " + disposition + "\r\n\r\n" + data + "\r\n";
}

TEST(Multipart, PartsInPiecesOfAnySize) {
    const std::string tricky = std::string("\r\n--X\r\n-\r\n--\r\r\n\n\0\r\n--Y", 22) + std::string(300, '\r');
    const std::string body = "preamble\r\n" + field("name=\"path\"", "/photo/a b") +
                             field("name=empty; filename=\"\"", "") +
                             field("filename=\"C:\\dir\\\"q\\\".txt\"; name=\"file\"", tricky) +
                             field("name=f; filename=\"../../x%22%0a.txt\"", "z") + "--XX--\r\nepilogue";
    for (const std::size_t piece : {body.size(), std::size_t{1}, std::size_t{2}, std::size_t{3}, std::size_t{17}}) {
        SCOPED_TRACE(piece);
        Collector all;
        ASSERT_EQ(readWhole(body, all, piece), Status::kDone);
        ASSERT_EQ(all.parts.size(), 4U);
        EXPECT_EQ(all.parts[0].data, "/photo/a b");
        EXPECT_FALSE(all.parts[0].isFile);
        EXPECT_EQ(all.parts[1].name, "empty");
        EXPECT_TRUE(all.parts[1].isFile);
        EXPECT_EQ(all.parts[1].data, "");
        EXPECT_EQ(all.parts[2].fileName, "C:\\dir\"q\".txt");
        EXPECT_EQ(all.parts[2].data, tricky);
        EXPECT_EQ(all.parts[3].fileName, "x\"\n.txt") << "the last component alone";
        for (const auto& part : all.parts) EXPECT_TRUE(part.ended);
    }
}

TEST(Multipart, Malformed) {
    for (const auto& [what, body, status] : Rows<const char*, std::string, Status>{
             {"nothing", "", Status::kMore},
             {"no delimiter", "just text", Status::kMore},
             {"cut in the data", field("name=a", "data"), Status::kMore},
             {"cut in the headers", "--XX\r\nContent-Disp", Status::kMore},
             {"no name", field("filename=x", "data"), Status::kMalformed},
             {"another disposition", "--XX\r\nContent-Disposition: attachment; name=a\r\n\r\nx\r\n--XX--",
              Status::kMalformed},
             {"no headers", "--XX\r\n\r\ndata\r\n--XX--", Status::kMalformed},
             {"junk behind the delimiter", "--XXjunk\r\n\r\n", Status::kMalformed},
             {"endless headers", "--XX\r\n" + std::string(20000, 'h'), Status::kMalformed},
             {"too many parts",
              [] {
                  std::string body;
                  for (int i = 0; i < 1001; ++i) body += field("name=a", "");
                  return body;
              }(),
              Status::kMalformed},
             {"the sink stops", field("name=stop", "data"), Status::kStopped},
         }) {
        SCOPED_TRACE(what);
        Collector all;
        EXPECT_EQ(readWhole(body, all, 5), status);
    }
}

TEST(Multipart, LimitsAreTheSameInPiecesOfAnySize) {
    const auto headers = [](std::size_t length) {
        const std::string line = "Content-Disposition: form-data; name=a\r\nX: ";
        return line + std::string(length - line.size(), 'x');
    };
    struct {
        std::size_t blanks, headers;
        Status expected;
    } const cases[] = {{63, 100, Status::kDone},  {64, 100, Status::kMalformed},  {5000, 100, Status::kMalformed},
                       {0, 16379, Status::kDone}, {0, 16380, Status::kMalformed}, {0, 50000, Status::kMalformed}};
    for (const auto& [blanks, length, expected] : cases) {
        const std::string body = "--XX" + std::string(blanks, ' ') + "\r\n" + headers(length) + "\r\n\r\nb\r\n--XX--";
        for (const std::size_t piece : {body.size(), std::size_t{1}, std::size_t{7}}) {
            Collector all;
            EXPECT_EQ(readWhole(body, all, piece), expected) << blanks << " " << length << " in pieces of " << piece;
        }
    }
}

TEST(Multipart, MemoryStaysFlat) {
    Collector all;
    orvel::cgi::MultipartReader reader("XX", all);
    reader.feed("--XX\r\nContent-Disposition: form-data; name=a; filename=b\r\n\r\n");
    const std::string piece(4096, 'd');
    for (int i = 0; i < 256; ++i) reader.feed(piece);
    reader.feed("\r\n--XX--");
    EXPECT_EQ(reader.status(), Status::kDone);
    EXPECT_EQ(all.parts.at(0).data.size(), 256 * piece.size());
    EXPECT_LT(all.largest, 2 * piece.size()) << "handed on as it comes";
}

TEST(Multipart, Boundary) {
    for (const auto& [type, boundary] : Rows<std::string, std::string>{
             row("multipart/form-data; boundary=abc", "abc"),
             row("Multipart/Form-Data ;charset=x; BOUNDARY=\"a b;c\" ; x=y", "a b;c"), row("multipart/form-data", ""),
             row("multipart/form-data; boundary=", ""), row("multipart/mixed; boundary=abc", ""),
             row("multipart/form-data; boundary=" + std::string(71, 'b'), ""), row("", "")})
        EXPECT_EQ(orvel::cgi::boundaryOf(type), boundary) << type;
}

}  // namespace
