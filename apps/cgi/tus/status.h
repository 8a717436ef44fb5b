// HTTP statuses that the protocol tus asks for, beside those of every program.
#ifndef ORVEL_CGI_TUS_STATUS_H
#define ORVEL_CGI_TUS_STATUS_H

#include "reply.h"

namespace orvel::cgi {

inline constexpr Status kStatusCreated{201};
inline constexpr Status kStatusNoContent{204};
inline constexpr Status kStatusConflict{409};
inline constexpr Status kStatusLocked{423};
inline constexpr Status kStatusMismatch{460};  // of a checksum
inline constexpr Status kStatusNoSpace{507};

}  // namespace orvel::cgi

#endif
