#include "file_system.h"

#include <sys/stat.h>
#include <sys/statfs.h>

#include <cstring>

namespace orvel::cgi {

std::uint64_t fileSystemOf(int file) {
    struct stat status {};
    struct statfs system {};
    if (fstat(file, &status) != 0 || fstatfs(file, &system) != 0) return 0;
    std::uint64_t identity = 0;
    static_assert(sizeof identity == sizeof system.f_fsid);
    memcpy(&identity, &system.f_fsid, sizeof identity);
    return identity != 0 ? identity : status.st_dev;
}

}  // namespace orvel::cgi
