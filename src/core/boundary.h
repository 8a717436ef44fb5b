// The boundary of the library: no exception crosses it.
#ifndef ORVEL_CORE_BOUNDARY_H
#define ORVEL_CORE_BOUNDARY_H

#include <utility>

#include "orvel/error_state.h"

namespace orvel {

// Runs the body of an exported function. Whatever it throws becomes `failure`, with the library code 401.
template <class Result, class Body>
Result guarded(Result failure, Body&& body) noexcept {
    try {
        return std::forward<Body>(body)();
    } catch (...) {
        OrvLibSetErr(ORV_ERR_GENERAL);
        return failure;
    }
}

// The same for functions whose failures set no library code.
template <class Result, class Body>
Result guardedQuietly(Result failure, Body&& body) noexcept {
    try {
        return std::forward<Body>(body)();
    } catch (...) {
        return failure;
    }
}

}  // namespace orvel

#endif
