// Where kept listings lie: /var/lib/vexo/listings/<uid> below the system root, see own_store.h.
//
// The time of a file is when its listing was last shown. One that was at rest for an hour is gone; a user has at most
// eight, of 64 MiB together: the one that was at rest longest makes room. Whoever works with one holds it (a shared
// lock), and it stays as long.
#ifndef ORVEL_CGI_KEPT_STORE_H
#define ORVEL_CGI_KEPT_STORE_H

#include <string>
#include <string_view>

#include "base/descriptor.h"
#include "own_store.h"

namespace orvel::cgi {

inline constexpr int kMostKept = 8;
inline constexpr long long kMostKeptBytes = 64LL * 1024 * 1024;
inline constexpr long long kKeptSeconds = 3600;

// An id as they are drawn: it can name nothing else in the folder.
[[nodiscard]] bool isKeptId(std::string_view text);

enum class KeptResult { kDone, kFull, kFailed };

// Keeps the bytes of a listing of `user` under a new `id`. kFull when they are too many, or when what makes no room is
// held. The process has the user's identity.
[[nodiscard]] KeptResult keepBytes(const std::string& user, std::string_view bytes, std::string& id);

// Opens and holds one, which is shown now: its hour begins anew. Null with errno when the user has none of that id.
[[nodiscard]] Descriptor openKept(const std::string& user, const std::string& id);

// Removes one that is of no use; one that is held stays.
void dropKept(const std::string& user, const std::string& id);

// Removes what was at rest for an hour, of all users, and is not held.
[[nodiscard]] OwnSweep sweepKeptListings();

}  // namespace orvel::cgi

#endif
