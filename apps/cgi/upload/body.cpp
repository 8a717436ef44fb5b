#include "upload/body.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "request.h"
#include "upload/store.h"

namespace orvel::cgi {
namespace {

constexpr size_t kPiece = size_t{256} * 1024;

}  // namespace

std::optional<long long> bodyLength() {
    const char* text = getenv("CONTENT_LENGTH");
    const auto length = parseNumber(text == nullptr ? "" : text);
    if (!length || *length > static_cast<unsigned long>(INT64_MAX)) return std::nullopt;
    return static_cast<long long>(*length);
}

bool readBody(long long length, bool& whole, const std::function<bool(std::string_view data)>& take) {
    std::string piece(kPiece, '\0');
    long long left = length;
    while (left > 0 && isCancelled() == 0) {
        const size_t wanted = std::min(kPiece, static_cast<size_t>(left));
        const ssize_t got = read(0, piece.data(), wanted);
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) break;  // the client hung up
        left -= got;
        if (!take(std::string_view(piece.data(), static_cast<size_t>(got)))) return false;
    }
    whole = left == 0;
    return true;
}

}  // namespace orvel::cgi
