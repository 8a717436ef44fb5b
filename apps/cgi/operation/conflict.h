// What becomes of a file whose name is taken at its target. Pure.
#ifndef ORVEL_CGI_OPERATION_CONFLICT_H
#define ORVEL_CGI_OPERATION_CONFLICT_H

#include <optional>
#include <string_view>

namespace orvel::cgi {

// Parameter "conflict": "error" (default), "skip", "overwrite" or "keep_both". Folders that meet are merged under skip
// and overwrite; a file is replaced by a file, a link by a link, and nothing else by anything.
enum class Conflict { kError, kSkip, kOverwrite, kKeepBoth };
std::optional<Conflict> conflictOf(std::string_view word);

}  // namespace orvel::cgi

#endif
