// What a client asks of one file's bytes: pure decisions over header texts.
#ifndef ORVEL_CGI_DOWNLOAD_RANGE_H
#define ORVEL_CGI_DOWNLOAD_RANGE_H

#include <cstdint>
#include <string>
#include <string_view>

namespace orvel::cgi {

// The bytes `first` to `last`, both included.
struct ByteRange {
    std::int64_t first = 0, last = -1;
    [[nodiscard]] std::int64_t length() const { return last - first + 1; }
};

enum class RangeAnswer { kWhole, kPart, kUnsatisfiable };

// Judges a Range header over a file of `size` bytes. One range of bytes is served; several, another unit or a malformed
// header mean the whole file.
RangeAnswer judgeRange(std::string_view header, std::int64_t size, ByteRange& range);

// The entity tag of a file's state, quoted.
std::string entityTag(std::uint64_t inode, std::int64_t size, std::int64_t seconds, std::int64_t nanoseconds);

// Whether the client's copy is current: If-None-Match decides when given, else If-Modified-Since (`modified` in
// seconds).
bool isCurrent(std::string_view ifNoneMatch, std::string_view ifModifiedSince, std::string_view tag,
               std::int64_t modified);

// Whether an If-Match header names this tag; "*" names any.
bool namesTag(std::string_view ifMatch, std::string_view tag);

// Whether a Range header counts: If-Range is absent, this tag, or this very date.
bool rangeCounts(std::string_view ifRange, std::string_view tag, std::int64_t modified);

// An HTTP date, and back (-1 for anything else, and for what lies before 1970).
std::string httpDate(std::int64_t seconds);
std::int64_t parseHttpDate(std::string_view text);

// The value of Content-Disposition for a file name of any bytes: a plain form for old clients and the exact one.
std::string disposition(const char* how, std::string_view name);

}  // namespace orvel::cgi

#endif
