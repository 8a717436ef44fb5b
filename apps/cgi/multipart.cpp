#include "multipart.h"

#include <strings.h>

#include <algorithm>
#include <array>
#include <utility>

namespace orvel::cgi {
namespace {

constexpr std::size_t kLongestHeaders = 16 * 1024;
constexpr std::size_t kLongestBoundary = 70;
constexpr std::size_t kLongestPadding = 64;
constexpr int kMostParts = 1000;

bool sameWord(std::string_view a, std::string_view b) {
    return a.size() == b.size() && strncasecmp(a.data(), b.data(), a.size()) == 0;
}

std::string_view trimmed(std::string_view text) {
    const std::size_t first = text.find_first_not_of(" \t");
    if (first == std::string_view::npos) return {};
    return text.substr(first, text.find_last_not_of(" \t") - first + 1);
}

// Browsers write the three bytes that a quoted value cannot hold percent-encoded, and nothing else.
std::string withoutFormEscapes(std::string_view text) {
    static constexpr std::array<std::pair<std::string_view, char>, 3> escapes = {
        {{"%22", '"'}, {"%0D", '\r'}, {"%0A", '\n'}}};
    std::string out;
    for (std::size_t at = 0; at < text.size();) {
        char c = text[at];
        std::size_t length = 1;
        for (const auto& [escape, byte] : escapes) {
            if (sameWord(text.substr(at, 3), escape)) {
                c = byte;
                length = 3;
            }
        }
        out += c;
        at += length;
    }
    return out;
}

// Takes the value of a parameter off the front of `rest`: a token, or a quoted string in which a backslash before a
// quote or a backslash escapes it (before anything else it is a byte of a file name).
std::string takeValue(std::string_view& rest) {
    if (!rest.starts_with('"')) {
        const std::size_t end = rest.find(';');
        const std::string_view token = rest.substr(0, end);
        rest.remove_prefix(token.size());
        return std::string(trimmed(token));
    }
    std::string raw;
    std::size_t at = 1;
    for (; at < rest.size() && rest[at] != '"'; ++at) {
        if (rest[at] == '\\' && at + 1 < rest.size() && (rest[at + 1] == '"' || rest[at + 1] == '\\')) ++at;
        raw += rest[at];
    }
    rest.remove_prefix(at < rest.size() ? at + 1 : at);
    return withoutFormEscapes(raw);
}

// Calls `take(name, value)` for each parameter behind the first ";" of a header value.
template <class Take>
void forEachParameter(std::string_view value, Take take) {
    std::size_t semicolon = value.find(';');
    while (semicolon != std::string_view::npos) {
        value.remove_prefix(semicolon + 1);
        const std::size_t equals = value.find_first_of("=;");
        if (equals == std::string_view::npos) return;
        if (value[equals] == ';') {
            semicolon = equals;
            continue;
        }
        const std::string_view name = trimmed(value.substr(0, equals));
        value.remove_prefix(equals + 1);
        value.remove_prefix(std::min(value.size(), value.find_first_not_of(" \t")));
        take(name, takeValue(value));
        semicolon = value.find(';');
    }
}

}  // namespace

std::string boundaryOf(std::string_view contentType) {
    if (!sameWord(trimmed(contentType.substr(0, contentType.find(';'))), "multipart/form-data")) return {};
    std::string boundary;
    forEachParameter(contentType, [&](std::string_view name, std::string value) {
        if (boundary.empty() && sameWord(name, "boundary")) boundary = std::move(value);
    });
    return boundary.size() <= kLongestBoundary ? boundary : std::string();
}

bool parsePartHeader(std::string_view lines, PartHeader& header) {
    header = {};
    bool named = false;
    while (!lines.empty()) {
        const std::size_t end = lines.find("\r\n");
        const std::string_view line = lines.substr(0, end);
        lines.remove_prefix(end == std::string_view::npos ? lines.size() : end + 2);
        const std::size_t colon = line.find(':');
        if (colon == std::string_view::npos || !sameWord(trimmed(line.substr(0, colon)), "Content-Disposition"))
            continue;
        const std::string_view value = trimmed(line.substr(colon + 1));
        if (!sameWord(trimmed(value.substr(0, value.find(';'))), "form-data")) return false;
        forEachParameter(value, [&](std::string_view name, std::string text) {
            if (sameWord(name, "name")) {
                header.name = std::move(text);
                named = true;
            } else if (sameWord(name, "filename")) {
                header.fileName = text.substr(text.rfind('/') + 1);
                header.isFile = true;
            }
        });
    }
    return named;
}

// The first delimiter may open the body; a line end put before it lets it be found like the others.
MultipartReader::MultipartReader(std::string_view boundary, PartSink& sink)
    : delimiter_("\r\n--" + std::string(boundary)), sink_(sink), buffer_("\r\n") {
    if (boundary.empty()) status_ = Status::kMalformed;
}

MultipartReader::Status MultipartReader::feed(std::string_view bytes) {
    if (status_ != Status::kMore) return status_;
    buffer_.append(bytes);
    while (status_ == Status::kMore && step()) {
    }
    return status_;
}

bool MultipartReader::end(Status status) {
    status_ = status;
    buffer_.clear();
    return false;
}

// One step of the reading; false when more bytes are needed or the reading has ended.
bool MultipartReader::step() {
    switch (state_) {
        case State::kDelimiterEnd:
            return afterDelimiter();
        case State::kHeaders:
            return readHeaders();
        case State::kPreamble:
        case State::kBody:
            return readBody();
    }
    return false;
}

bool MultipartReader::afterDelimiter() {
    if (buffer_.size() < 2) return false;
    if (buffer_.starts_with("--")) return end(Status::kDone);
    const std::size_t lineEnd = buffer_.find("\r\n");
    const std::size_t padding = std::min(buffer_.find_first_not_of(" \t"), buffer_.size());
    if (lineEnd == std::string::npos) {
        const bool mayCome = padding >= buffer_.size() - 1 && buffer_.size() <= kLongestPadding;
        return mayCome ? false : end(Status::kMalformed);
    }
    // The limit is the same whether the line came at once or in pieces; so is the one of headers.
    if (padding != lineEnd || lineEnd >= kLongestPadding || ++parts_ > kMostParts) return end(Status::kMalformed);
    buffer_.erase(0, lineEnd);  // the line end stays: headers that are empty end at once
    state_ = State::kHeaders;
    return true;
}

bool MultipartReader::readHeaders() {
    const std::size_t headersEnd = buffer_.find("\r\n\r\n");
    if (headersEnd == std::string::npos) {
        return buffer_.size() > kLongestHeaders ? end(Status::kMalformed) : false;
    }
    PartHeader header;
    if (headersEnd < 2 || headersEnd + 3 > kLongestHeaders ||
        !parsePartHeader(std::string_view(buffer_).substr(2, headersEnd - 2), header)) {
        return end(Status::kMalformed);
    }
    buffer_.erase(0, headersEnd + 2);  // again the line end stays: an empty body is followed by its delimiter at once
    if (!sink_.partBegin(header)) return end(Status::kStopped);
    state_ = State::kBody;
    skip_ = 2;
    return true;
}

bool MultipartReader::readBody() {
    const std::size_t found = buffer_.find(delimiter_);
    // Bytes that cannot be the beginning of a delimiter are data.
    const std::size_t data = found != std::string::npos            ? found
                             : buffer_.size() >= delimiter_.size() ? buffer_.size() - delimiter_.size() + 1
                                                                   : 0;
    if (state_ == State::kBody && data > 0) {
        const std::size_t skip = std::min(skip_, data);
        skip_ -= skip;
        if (data > skip && !sink_.partData(std::string_view(buffer_).substr(skip, data - skip))) {
            return end(Status::kStopped);
        }
    }
    buffer_.erase(0, data);
    if (found == std::string::npos) return false;
    buffer_.erase(0, delimiter_.size());
    if (state_ == State::kBody && !sink_.partEnd()) return end(Status::kStopped);
    state_ = State::kDelimiterEnd;
    return true;
}

}  // namespace orvel::cgi
