// Owner of a critical section.
#ifndef ORVEL_SHARING_CRITICAL_SECTION_H
#define ORVEL_SHARING_CRITICAL_SECTION_H

#include "vexo/critical_section.h"

namespace orvel {

// Enters the section on construction, waiting at most 30 seconds, and leaves it on destruction.
class CriticalSection {
 public:
    explicit CriticalSection(const char* name) : handle_(VexoCgiBeginCriticalSection(name, 30000)) {}
    ~CriticalSection() { VexoCgiEndCriticalSection(handle_); }
    CriticalSection(const CriticalSection&) = delete;
    CriticalSection& operator=(const CriticalSection&) = delete;
    explicit operator bool() const { return handle_ >= 0; }

 private:
    int handle_;
};

}  // namespace orvel

#endif
