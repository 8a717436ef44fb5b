#include "tus/checksum.h"

#include <nettle/base64.h>

#include <cstdint>

namespace orvel::cgi {
namespace {

// What the three algorithms differ in.
void begin(sha1_ctx& state) {
    sha1_init(&state);
}
void begin(sha256_ctx& state) {
    sha256_init(&state);
}
void begin(md5_ctx& state) {
    md5_init(&state);
}
void update(sha1_ctx& state, size_t length, const uint8_t* data) {
    sha1_update(&state, length, data);
}
void update(sha256_ctx& state, size_t length, const uint8_t* data) {
    sha256_update(&state, length, data);
}
void update(md5_ctx& state, size_t length, const uint8_t* data) {
    md5_update(&state, length, data);
}
size_t digest(sha1_ctx state, uint8_t* out) {
    sha1_digest(&state, SHA1_DIGEST_SIZE, out);
    return SHA1_DIGEST_SIZE;
}
size_t digest(sha256_ctx state, uint8_t* out) {
    sha256_digest(&state, SHA256_DIGEST_SIZE, out);
    return SHA256_DIGEST_SIZE;
}
size_t digest(md5_ctx state, uint8_t* out) {
    md5_digest(&state, MD5_DIGEST_SIZE, out);
    return MD5_DIGEST_SIZE;
}

}  // namespace

std::optional<std::string> base64Decode(std::string_view text) {
    base64_decode_ctx state;
    base64_decode_init(&state);
    std::string bytes(BASE64_DECODE_LENGTH(text.size()), '\0');
    size_t length = bytes.size();
    const int decoded =
        base64_decode_update(&state, &length, reinterpret_cast<uint8_t*>(bytes.data()), text.size(), text.data());
    if (decoded != 1 || base64_decode_final(&state) != 1) return std::nullopt;
    bytes.resize(length);
    return bytes;
}

std::optional<Checksum> Checksum::parse(std::string_view header) {
    const size_t blank = header.find(' ');
    if (blank == std::string_view::npos) return std::nullopt;
    const std::string_view name = header.substr(0, blank);
    auto expected = base64Decode(header.substr(blank + 1));
    Checksum sum;
    if (name == "sha256") {
        sum.state_.emplace<sha256_ctx>();
    } else if (name == "md5") {
        sum.state_.emplace<md5_ctx>();
    } else if (name != "sha1") {
        return std::nullopt;
    }
    std::visit([](auto& state) { begin(state); }, sum.state_);
    uint8_t longest[SHA256_DIGEST_SIZE];
    const size_t length = std::visit([&](const auto& state) { return digest(state, longest); }, sum.state_);
    if (!expected || expected->size() != length) return std::nullopt;
    sum.expected_ = std::move(*expected);
    return sum;
}

void Checksum::add(std::string_view data) {
    std::visit([&](auto& state) { update(state, data.size(), reinterpret_cast<const uint8_t*>(data.data())); }, state_);
}

bool Checksum::holds() const {
    uint8_t found[SHA256_DIGEST_SIZE];
    const size_t length = std::visit([&](const auto& state) { return digest(state, found); }, state_);
    return std::string_view(reinterpret_cast<const char*>(found), length) == expected_;
}

}  // namespace orvel::cgi
