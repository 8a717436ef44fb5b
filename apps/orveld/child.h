// The process that answers one request.
#ifndef ORVEL_ORVELD_CHILD_H
#define ORVEL_ORVELD_CHILD_H

#include <sys/types.h>

#include <cstddef>
#include <string>

#include "figures.h"
#include "load_limits.h"
#include "slots.h"

namespace orvel::orveld {

struct Handover {
    int connection;
    const std::string& block;  // the request's header block, whole
    uid_t peer;                // whose process sent it
    Slots& slots;
    size_t slot;
    const Limits& limits;
    const Figures& figures;
};

// To be called at the beginning of the parent: what ends a reply is done last in a child, when everything that is done
// at exit is done.
void prepareChildren();

// In a new child: answers, and ends the process.
[[noreturn]] void serveInChild(const Handover& given);

}  // namespace orvel::orveld

#endif
