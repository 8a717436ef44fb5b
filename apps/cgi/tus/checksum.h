// The checksum of a piece of an upload, as the header Upload-Checksum announces it.
#ifndef ORVEL_CGI_TUS_CHECKSUM_H
#define ORVEL_CGI_TUS_CHECKSUM_H

#include <nettle/md5.h>
#include <nettle/sha1.h>
#include <nettle/sha2.h>

#include <optional>
#include <string>
#include <string_view>
#include <variant>

namespace orvel::cgi {

inline constexpr const char* kChecksums = "sha1,sha256,md5";

// The bytes that a text in base64 stands for; nothing for a text that is not base64.
std::optional<std::string> base64Decode(std::string_view text);

class Checksum {
 public:
    // "sha1 Kq5sNclPz7QV2+lfQIuc6R7oRu0="; nothing for another algorithm, or what is no checksum of it.
    static std::optional<Checksum> parse(std::string_view header);
    void add(std::string_view data);
    // Whether what was added has it.
    [[nodiscard]] bool holds() const;

 private:
    std::variant<sha1_ctx, sha256_ctx, md5_ctx> state_;
    std::string expected_;
};

}  // namespace orvel::cgi

#endif
