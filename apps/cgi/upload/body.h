// The body of a request that brings files, as a stream.
#ifndef ORVEL_CGI_UPLOAD_BODY_H
#define ORVEL_CGI_UPLOAD_BODY_H

#include <functional>
#include <optional>
#include <string_view>

namespace orvel::cgi {

// What the request announces. Nothing for a length that is missing, no number or more than a file can have.
std::optional<long long> bodyLength();

// Reads the announced body piece by piece. False when `take` refused one; `whole` says whether the body came to its own
// end.
bool readBody(long long length, bool& whole, const std::function<bool(std::string_view data)>& take);

}  // namespace orvel::cgi

#endif
