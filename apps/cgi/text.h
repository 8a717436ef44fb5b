// Names are bytes, JSON is UTF-8: what stands between the two.
#ifndef ORVEL_CGI_TEXT_H
#define ORVEL_CGI_TEXT_H

#include <json/forwards.h>

#include <optional>
#include <string>
#include <string_view>

namespace orvel::cgi {

// Whether every byte belongs to a well-formed sequence of RFC 3629: no surrogates, no overlong forms, nothing above
// U+10FFFF.
bool isUtf8(std::string_view bytes);

// `bytes` with each byte that belongs to no well-formed sequence replaced by U+FFFD.
std::string readable(std::string_view bytes);

// Everything but letters, digits, "-", ".", "_", "~" and "/" as "%XX", and back. Decoding takes any other byte as it
// stands; nothing for a broken "%" and for "%00", which no path can hold.
std::string percentEncode(std::string_view bytes);
std::optional<std::string> percentDecode(std::string_view text);

// The compact text of a value whose strings are UTF-8.
void appendJson(const Json::Value& value, std::string& out);

}  // namespace orvel::cgi

#endif
