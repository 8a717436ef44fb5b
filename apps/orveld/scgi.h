// The header block of an SCGI request: a netstring of names and values, each ended by a NUL byte.
#ifndef ORVEL_ORVELD_SCGI_H
#define ORVEL_ORVELD_SCGI_H

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace orvel::orveld {

// The longest block, its length and the two separators included.
constexpr size_t kLongestBlock = size_t{64} * 1024;
// So many bytes can be read before the length is known without reaching into the body behind a block that is one: the
// shortest holds the names CONTENT_LENGTH and SCGI.
constexpr size_t kShortestBlock = 8;

// The path (SCRIPT_NAME) at which root and orveld's own user find the figures: in the format of Prometheus, or with the
// query "format=json" as JSON. It lies outside what web servers hand over.
constexpr const char* kStatusPath = "/orveld/status";

enum class BlockState { kMore, kKnown, kBad };

// The length of the whole block, `text` being its first bytes: all that is interpreted before there is a process for
// the request. kBad: not a netstring, or longer than kLongestBlock.
BlockState blockLength(std::string_view text, size_t& length);

// The variables of a whole block, "NAME=value" each, for an environment; nothing when the block is malformed: torn,
// with a NUL byte too many, a name twice, no length of the body in front. Names that no web server sends are left out,
// so that none of the process's own variables can be set. BODY_LENGTH, where there is one, is the
// length of the body instead: nginx announces no more of a body that it passes through than has arrived.
std::optional<std::vector<std::string>> parseBlock(std::string_view block);

// A block of `variables` ("NAME=value"), for whoever asks.
std::string buildBlock(const std::vector<std::string>& variables);

}  // namespace orvel::orveld

#endif
