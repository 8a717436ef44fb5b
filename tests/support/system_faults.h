// Failing system calls that the platform's fault gate cannot reach: the library makes them itself. The C library's
// functions are replaced for the whole test program that uses this.
#ifndef ORVEL_TESTS_SUPPORT_SYSTEM_FAULTS_H
#define ORVEL_TESTS_SUPPORT_SYSTEM_FAULTS_H

#include <string>

namespace support {

// While it lives, the `nth` reading (getdents64, 1 is the next) of the open folder `path` fails.
class ReadingFault {
 public:
    ReadingFault(const std::string& path, int error, int nth = 1);
    ~ReadingFault();
    ReadingFault(const ReadingFault&) = delete;
    ReadingFault& operator=(const ReadingFault&) = delete;
};

// While it lives, the status of `path` cannot be read by fstatat.
class StatusFault {
 public:
    StatusFault(const std::string& path, int error);
    ~StatusFault();
    StatusFault(const StatusFault&) = delete;
    StatusFault& operator=(const StatusFault&) = delete;
};

// While it lives, the next `times` openings of the absolute path `path` fail.
class OpeningFault {
 public:
    OpeningFault(const std::string& path, int error, int times);
    ~OpeningFault();
    OpeningFault(const OpeningFault&) = delete;
    OpeningFault& operator=(const OpeningFault&) = delete;
};

}  // namespace support

#endif
