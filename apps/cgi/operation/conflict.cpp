#include "operation/conflict.h"

namespace orvel::cgi {

std::optional<Conflict> conflictOf(std::string_view word) {
    if (word == "error") return Conflict::kError;
    if (word == "skip") return Conflict::kSkip;
    if (word == "overwrite") return Conflict::kOverwrite;
    if (word == "keep_both") return Conflict::kKeepBoth;
    return std::nullopt;
}

}  // namespace orvel::cgi
