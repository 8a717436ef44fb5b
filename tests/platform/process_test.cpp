// Programs that the platform runs.
#include "vexo/process.h"

#include <csignal>

#include "support/testing.h"

namespace {

class ProcessTest : public ApplianceTest {
 protected:
    std::string root_ = shareRoot("photo");
};

TEST_F(ProcessTest, TheProgramSeesItsArgumentsAndNothingOfThisProcess) {
    const std::string report = root_ + "/report";
    const std::string script =
        "{ echo \"$0\"; env; ls -l /proc/$$/fd; grep SigBlk /proc/self/status; sh -c 'kill -PIPE $$; echo deaf'; } > " +
        report + "; exit 7";
    inChild([&] {
        setenv("SECRET", "yes", 1);
        open("/", O_RDONLY);  // NOLINT(android-cloexec-open): as a foreign library would leave it
        sigset_t blocked;
        sigemptyset(&blocked);
        sigaddset(&blocked, SIGTERM);
        sigprocmask(SIG_BLOCK, &blocked, nullptr);
        signal(SIGPIPE, SIG_IGN);
        errno = 0;
        EXPECT_EQ(VLIBCExec("/bin/sh", "-c", script.c_str(), "a b;$(touch x)", nullptr), 7);
        EXPECT_EQ(errno, 0);
        return 0;
    });
    const std::string seen = readFile(report);
    for (const char* part : {"a b;$(touch x)\n", "LC_ALL=C\n", "0 -> /dev/null", "SigBlk:\t0000000000000000"}) {
        EXPECT_NE(seen.find(part), std::string::npos) << part << " in " << seen;
    }
    for (const char* part : {"SECRET", " -> /\n", "deaf"}) EXPECT_EQ(seen.find(part), std::string::npos) << seen;
}

TEST_F(ProcessTest, Failures) {
    writeFile(root_ + "/plain", "no program");
    const std::string plain = root_ + "/plain";
    const struct {
        const char* program;
        int code, systemCode;
    } cases[] = {{nullptr, VEXO_ERR_PARAMETER, EINVAL},
                 {"true", VEXO_ERR_PARAMETER, EINVAL},
                 {"/nowhere/true", VEXO_ERR_FILE, ENOENT},
                 {plain.c_str(), VEXO_ERR_DENIED, EACCES}};
    for (const auto& c : cases) {
        EXPECT_EQ(VLIBCExec(c.program, nullptr), -1);
        EXPECT_EQ(errno, c.systemCode) << &c - cases;
        EXPECT_EQ(VLIBCErrGet(), c.code);
    }
    EXPECT_EQ(VLIBCExec("/bin/sh", "-c", "kill -9 $$", nullptr), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
}

}  // namespace
