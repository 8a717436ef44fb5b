// Bodies in pieces of any size are read alike: the same parts, the same end.
#include <cstdint>
#include <cstdlib>
#include <string>

#include "multipart.h"

namespace {

struct Recorder final : orvel::cgi::PartSink {
    bool partBegin(const orvel::cgi::PartHeader& header) override {
        text += "[" + header.name + "|" + (header.isFile ? "f" : "-") + "|" + header.fileName + "|";
        return true;
    }
    bool partData(std::string_view data) override {
        text += data;
        return true;
    }
    bool partEnd() override {
        text += "]";
        return true;
    }
    std::string text;
};

std::string read(std::string_view body, std::size_t piece) {
    Recorder recorder;
    orvel::cgi::MultipartReader reader("b", recorder);
    for (std::size_t at = 0; at < body.size(); at += piece) reader.feed(body.substr(at, piece));
    recorder.text += std::to_string(static_cast<int>(reader.status()));
    return recorder.text;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view body(reinterpret_cast<const char*>(data), size);
    static_cast<void>(orvel::cgi::boundaryOf(body));
    const std::string whole = read(body, size + 1);
    // A body cut short gives out what it has as it comes; only complete ones must agree to the byte.
    if (whole.ends_with("1") && (read(body, 1) != whole || read(body, 7) != whole)) std::abort();
    return 0;
}
