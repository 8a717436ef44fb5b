// Programs that the platform runs.
#include "vexo/process.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <filesystem>
#include <string>

#include "file_io.h"
#include "support/appliance.h"
#include "vexo/error.h"

namespace {

class ProcessTest : public support::ApplianceTest {
 protected:
    std::string root_ = shareRoot("photo");
};

TEST_F(ProcessTest, ExitStatusAndArgumentsPassThrough) {
    errno = 0;
    EXPECT_EQ(VLIBCExec("/bin/true", nullptr), 0);
    EXPECT_EQ(VLIBCExec("/bin/sh", "-c", "exit 7", nullptr), 7);
    const std::string odd = root_ + "/a b;$(touch x)";
    EXPECT_EQ(VLIBCExec("/bin/mkdir", "-p", odd.c_str(), nullptr), 0);
    EXPECT_TRUE(std::filesystem::is_directory(odd));
    EXPECT_EQ(errno, 0);
}

TEST_F(ProcessTest, TheProgramSeesNothingOfThisProcess) {
    setenv("SECRET", "yes", 1);
    const vexo::Descriptor open(::open("/", O_RDONLY));  // without close-on-exec, as a foreign library would leave it
    sigset_t blocked;
    sigset_t before;
    sigemptyset(&blocked);
    sigaddset(&blocked, SIGTERM);
    sigprocmask(SIG_BLOCK, &blocked, &before);
    const auto pipeHandler = signal(SIGPIPE, SIG_IGN);
    const std::string report = root_ + "/report";
    const std::string script =
        "{ env; ls -l /proc/$$/fd; } > " + report + "; exec grep -E '^Sig(Blk|Ign)' /proc/self/status >> " + report;
    EXPECT_EQ(VLIBCExec("/bin/sh", "-c", script.c_str(), nullptr), 0);
    signal(SIGPIPE, pipeHandler);
    sigprocmask(SIG_SETMASK, &before, nullptr);
    unsetenv("SECRET");
    const std::string seen = support::readFile(report);
    EXPECT_EQ(seen.find("SECRET"), std::string::npos) << seen;
    EXPECT_NE(seen.find("LC_ALL=C\n"), std::string::npos) << seen;
    EXPECT_NE(seen.find("0 -> /dev/null"), std::string::npos) << seen;
    EXPECT_EQ(seen.find(" -> /\n"), std::string::npos) << seen;
    EXPECT_NE(seen.find("SigBlk:\t0000000000000000"), std::string::npos) << seen;
    const size_t ignored = seen.find("SigIgn:\t");
    ASSERT_NE(ignored, std::string::npos) << seen;
    EXPECT_EQ(std::stoull(seen.substr(ignored + 8), nullptr, 16) & (1ULL << (SIGPIPE - 1)), 0ULL) << seen;
}

TEST_F(ProcessTest, Failures) {
    support::writeFile(root_ + "/plain", "no program");
    const std::string plain = root_ + "/plain";
    const struct {
        const char* program;
        int code, systemCode;
    } cases[] = {{nullptr, VEXO_ERR_PARAMETER, EINVAL},
                 {"true", VEXO_ERR_PARAMETER, EINVAL},
                 {"", VEXO_ERR_PARAMETER, EINVAL},
                 {"/nowhere/true", VEXO_ERR_FILE, ENOENT},
                 {plain.c_str(), VEXO_ERR_DENIED, EACCES}};
    for (const auto& c : cases) {
        SCOPED_TRACE(c.program == nullptr ? "null" : c.program);
        VLIBCErrSetEx(0, "", 0);
        EXPECT_EQ(VLIBCExec(c.program, nullptr), -1);
        EXPECT_EQ(errno, c.systemCode);
        EXPECT_EQ(VLIBCErrGet(), c.code);
    }
    EXPECT_EQ(VLIBCExec("/bin/sh", "-c", "kill -9 $$", nullptr), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
}

}  // namespace
