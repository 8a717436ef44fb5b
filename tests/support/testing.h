// What nearly every test of the platform and of the library needs.
#ifndef ORVEL_TESTS_SUPPORT_TESTING_H
#define ORVEL_TESTS_SUPPORT_TESTING_H

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <functional>
#include <map>
#include <memory>
#include <random>
#include <set>
#include <sstream>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "base/descriptor.h"
#include "fault_gate.h"
#include "orvel/error_state.h"
#include "support/appliance.h"
#include "support/log_texts.h"
#include "support/race.h"
#include "support/refuse_calls.h"
#include "support/table.h"
#include "support/wait.h"
#include "vexo/error.h"
#include "vexo/list.h"

namespace support {

// The status of what must be there, no link followed.
inline struct stat statusOf(const std::string& path) {
    struct stat status {};
    EXPECT_EQ(lstat(path.c_str(), &status), 0) << path;
    return status;
}

// The strings of a list, each with a bar behind it; the list stays the caller's. "null" for none.
inline std::string joined(PVLIBCSZLIST list) {
    std::string text = list == nullptr ? "null" : "";
    for (int i = 0; list != nullptr && i < list->nItem; ++i) text += std::string(VLIBCSzListGet(list, i)) + '|';
    return text;
}

}  // namespace support

namespace fs = std::filesystem;
using namespace support;  // tests alone include this

// The library's function answers this, and leaves this code.
#define EXPECT_CODE(call, answer, code)  \
    do {                                 \
        EXPECT_EQ(call, answer);         \
        EXPECT_EQ(OrvLibGetErr(), code); \
    } while (false)

// The platform's operation fails, with this errno and this error number.
#define EXPECT_FAILS(operation, systemCode, platformCode) \
    do {                                                  \
        errno = 0;                                        \
        VLIBCErrSetEx(0, "", 0);                          \
        EXPECT_LT(operation, 0);                          \
        EXPECT_EQ(errno, systemCode);                     \
        EXPECT_EQ(VLIBCErrGet(), platformCode);           \
    } while (false)

#endif
