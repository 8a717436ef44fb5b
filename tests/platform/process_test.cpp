// Programs that the platform runs.
#include "vexo/process.h"

#include "support/testing.h"

namespace {

using ProcessTest = ApplianceTest;

TEST_F(ProcessTest, TheProgramSeesItsArgumentsAndNothingOfThisProcess) {
    const std::string report = photo_ + "/report";
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
    });
    const std::string seen = readFile(report);
    for (const char* part : {"a b;$(touch x)\n", "LC_ALL=C\n", "0 -> /dev/null", "SigBlk:\t0000000000000000"})
        EXPECT_NE(seen.find(part), std::string::npos) << part << " in " << seen;
    for (const char* part : {"SECRET", " -> /\n", "deaf"}) EXPECT_EQ(seen.find(part), std::string::npos) << seen;
}

TEST_F(ProcessTest, Failures) {
    const std::string plain = photo_ + "/plain";
    writeFile(plain, "no program");
    for (const auto& [program, systemCode, code] :
         Rows<const char*, int, int>{{"true", EINVAL, VEXO_ERR_PARAMETER},
                                     {"/nowhere", ENOENT, VEXO_ERR_FILE},
                                     {plain.c_str(), EACCES, VEXO_ERR_DENIED}})
        EXPECT_FAILS(VLIBCExec(program, nullptr), systemCode, code);
    EXPECT_EQ(VLIBCExec("/bin/sh", "-c", "kill -9 $$", nullptr), -1);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
}

}  // namespace
