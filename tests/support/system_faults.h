// Failing system calls that the platform's fault gate cannot reach: the library makes them itself. The C library's
// functions are replaced for the whole test program that uses this.
#ifndef ORVEL_TESTS_SUPPORT_SYSTEM_FAULTS_H
#define ORVEL_TESTS_SUPPORT_SYSTEM_FAULTS_H

#include <string>

namespace support {

// What fails while a fault lives, at one path.
struct FaultOrder {
    std::string path;
    int error = 0;
    int count = 0;
};

class SystemFault {
 public:
    SystemFault(FaultOrder& order, const std::string& path, int error, int count);
    ~SystemFault();
    SystemFault(const SystemFault&) = delete;
    SystemFault& operator=(const SystemFault&) = delete;

 private:
    FaultOrder& order_;
};

inline FaultOrder failingReading, failingStatus, failingOpening;

// The `nth` reading (getdents64, 1 is the next) of the open folder `path` fails.
struct ReadingFault : SystemFault {
    ReadingFault(const std::string& path, int error, int nth = 1) : SystemFault(failingReading, path, error, nth) {}
};
// The status of `path` cannot be read by fstatat.
struct StatusFault : SystemFault {
    StatusFault(const std::string& path, int error) : SystemFault(failingStatus, path, error, 1) {}
};
// The next `times` openings of the absolute path `path` fail.
struct OpeningFault : SystemFault {
    OpeningFault(const std::string& path, int error, int times) : SystemFault(failingOpening, path, error, times) {}
};

}  // namespace support

#endif
