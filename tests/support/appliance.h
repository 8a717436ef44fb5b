// A real appliance in a temporary system root: users, groups, shares, settings and mounts as files, the real platform
// on top. Every test that needs users or shares derives from ApplianceTest.
#ifndef ORVEL_TESTS_SUPPORT_APPLIANCE_H
#define ORVEL_TESTS_SUPPORT_APPLIANCE_H

#include <gtest/gtest.h>
#include <sys/types.h>

#include <chrono>
#include <functional>
#include <string>
#include <type_traits>
#include <vector>

namespace support {

// One log line that the code under test wrote: priority and text (with %m resolved).
struct LogLine {
    int priority;
    std::string text;
};

// Log lines are part of the contract: each must be announced. announceLog takes the text that the line must contain
// after its "file:line" prefix, or as a whole when it has none.
void announceLog(const std::string& part);
// Takes the lines written so far, announced or not.
std::vector<LogLine> takeLog();

// Owner ids of the fixture's users. bob is a plain user, carol an administrator.
enum : unsigned { kAliceUid = 20001, kBobUid = 20002, kCarolUid = 20003, kUsersGid = 20100, kAdminGid = 20101 };

// The users, settings and shares below are there from the start; tests add what else they need. Share roots are
// /tmp/<tag>-<share>; an option "path" replaces that.
class ApplianceTest : public ::testing::Test {
 protected:
    void SetUp() override;
    // Fails on unannounced log lines, announced ones that never came, and leaked descriptors. The environment and the
    // mask of new files are as they were.
    void TearDown() override;

    // The folder that stands for "/" of the appliance (VEXO_ROOT is read once a process, so all tests of a program
    // share it; its files are written anew for each test).
    static const std::string& systemRoot();

    // Adds a share; `options` are further lines of its section ("write list = alice\n"). Returns its root, made with
    // mode 0777. A name that is there already is replaced.
    std::string addShare(const std::string& name, const std::string& options);
    // The root that addShare gives a share of this name.
    static std::string shareRoot(const std::string& name);
    const std::string photo_ = shareRoot("photo");
    // Adds a line to etc/passwd (groups by addGroup). Home folders come from the share "homes".
    void addUser(const std::string& name, unsigned uid, unsigned gid);
    void addGroup(const std::string& name, unsigned gid, const std::vector<std::string>& members);
    void setSetting(const std::string& key, const std::string& value);         // /etc/vexoinfo.conf
    void setDefaultSetting(const std::string& key, const std::string& value);  // /etc.defaults/vexoinfo.conf
    // Adds a line of the mount table. The root has a table of its own from the start: "/" as ext4.
    void addMount(const std::string& folder, const std::string& type, const std::string& options = "rw");
    void writeRootFile(const std::string& path, const std::string& text);  // any other file below the system root

 private:
    void writeShares();
    void writeAccounts();
    struct Share {
        std::string name, options;
    };
    std::vector<Share> shares_;
    std::string passwd_, group_, settings_, defaults_, mounts_;
    std::vector<std::string> environment_;
    mode_t mask_ = 0;
    int descriptors_ = 0;
};

// Writes `text` into a new file with this mode, parents included.
void writeFile(const std::string& path, const std::string& text, mode_t mode = 0644);
std::string readFile(const std::string& path);
void makeFolder(const std::string& path, mode_t mode = 0755);
int openDescriptors();

// Runs `body` in a forked child whose real and effective ids and groups are those given, and returns its result (an
// exit status below 100); gtest failures inside count as failures of the test. Needs root: see SKIP_WITHOUT_ROOT.
int asUser(uid_t uid, gid_t gid, const std::function<int()>& body);
// Runs `body` in a forked child with the caller's ids: for what changes the process for good.
int inChild(const std::function<int()>& body, std::chrono::minutes limit = std::chrono::minutes(4));

// Bodies without a result of their own: 0.
template <class Body>
requires std::is_void_v<std::invoke_result_t<const Body&>>
int inChild(const Body& body) {
    return inChild([&] { return body(), 0; });
}
template <class Body>
requires std::is_void_v<std::invoke_result_t<const Body&>>
int asUser(uid_t uid, gid_t gid, const Body& body) {
    return asUser(uid, gid, [&] { return body(), 0; });
}

}  // namespace support

#define SKIP_WITHOUT_ROOT()                                                      \
    do {                                                                         \
        if (geteuid() != 0) GTEST_SKIP() << "needs root, to act as other users"; \
    } while (false)

#endif
