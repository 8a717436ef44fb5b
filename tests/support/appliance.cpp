#include "support/appliance.h"

#include <dirent.h>
#include <fcntl.h>
#include <grp.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>

#include "fault_gate.h"
#include "index/index_connections.h"
#include "orvel/error_state.h"
#include "support/wait.h"

namespace fs = std::filesystem;

namespace support {
namespace {

std::vector<LogLine> capturedLog;
std::vector<std::string> announced;

__attribute__((format(printf, 2, 0))) void capture(int priority, const char* format, va_list args) {
    char* text = nullptr;
    if (vasprintf(&text, format, args) < 0) return;
    capturedLog.push_back({priority, text});
    free(text);  // NOLINT(cppcoreguidelines-no-malloc): vasprintf allocated it
}

// The tag keeps the share roots of test programs that run side by side apart.
const std::string& tag() {
    static const std::string value = "orveltest-" + std::to_string(getpid());
    return value;
}

// Made and removed once a program, before main and after it: the platform reads VEXO_ROOT once. Where that may be
// mounted, the program has a /tmp of its own: the shares' temporary place, /tmp/@tmp, is the machine's otherwise.
class SystemRootFolder {
 public:
    SystemRootFolder() : path_("/tmp/" + tag()), machine_(open("/tmp", O_PATH | O_DIRECTORY | O_CLOEXEC)) {
        const std::string own = path_ + "-tmp";
        mkdir(own.c_str(), 01777);
        chmod(own.c_str(), 01777);
        // What lies in the machine's /tmp could not be run any more.
        private_ = !fs::read_symlink("/proc/self/exe").string().starts_with("/tmp/") && unshare(CLONE_NEWNS) == 0 &&
                   mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
                   mount(own.c_str(), "/tmp", nullptr, MS_BIND, nullptr) == 0;
        fs::create_directories(path_);
        fs::permissions(path_, fs::perms(0755));
        setenv("VEXO_ROOT", path_.c_str(), 1);
    }
    ~SystemRootFolder() {
        if (getpid() != owner_) return;
        std::error_code ignored;
        for (const std::string& place : {std::string("/tmp"), "/proc/self/fd/" + std::to_string(machine_)}) {
            for (const auto& entry : fs::directory_iterator(place + "/", ignored)) {
                if (entry.path().filename().string().starts_with(tag())) fs::remove_all(entry.path(), ignored);
            }
        }
    }
    [[nodiscard]] const std::string& path() const { return path_; }
    [[nodiscard]] bool isPrivate() const { return private_; }

 private:
    std::string path_;
    int machine_;  // its /tmp
    bool private_ = false;
    pid_t owner_ = getpid();
};

const SystemRootFolder root;

// A key stands once: of several lines the platform would read the first.
void replaceSetting(std::string& text, const std::string& key, const std::string& value) {
    std::string kept;
    std::istringstream lines(text);
    for (std::string line; std::getline(lines, line);) {
        if (!line.starts_with(key + "=")) kept += line + "\n";
    }
    text = kept + key + "=\"" + value + "\"\n";
}

}  // namespace

void announceLog(const std::string& part) {
    announced.push_back(part);
}

std::vector<LogLine> takeLog() {
    return std::exchange(capturedLog, {});
}

void writeFile(const std::string& path, const std::string& text, mode_t mode) {
    fs::create_directories(fs::path(path).parent_path());
    std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
    chmod(path.c_str(), mode);
}

std::string readFile(const std::string& path) {
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf();
    return text.str();
}

void makeFolder(const std::string& path, mode_t mode) {
    fs::create_directories(path);
    chmod(path.c_str(), mode);
}

int openDescriptors() {
    return static_cast<int>(std::distance(fs::directory_iterator("/proc/self/fd"), fs::directory_iterator{}));
}

int inChild(const std::function<int()>& body, std::chrono::minutes limit) {
    fflush(nullptr);
    const pid_t child = fork();
    if (child == 0) {
        int result = 99;
        try {
            result = body();
        } catch (...) {
            result = 98;
        }
        fflush(nullptr);
        _exit(::testing::Test::HasFailure() ? 99 : result);
    }
    const int status = waitForEnd(child, "a child of the test", limit);
    const int result = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    EXPECT_LT(result, 98) << "the child failed";
    return result;
}

int asUser(uid_t uid, gid_t gid, const std::function<int()>& body) {
    return inChild([&] {
        if (setgroups(1, &gid) != 0 || setresgid(gid, gid, gid) != 0 || setresuid(uid, uid, uid) != 0) return 97;
        return body();
    });
}

const std::string& ApplianceTest::systemRoot() {
    return root.path();
}

std::string ApplianceTest::shareRoot(const std::string& name) {
    return "/tmp/" + tag() + "-" + name;
}

void ApplianceTest::SetUp() {
    passwd_ = "root:x:0:0::/root:/bin/sh\n";
    group_ = "root:x:0:\n";
    settings_ = "userhome_enable=\"yes\"\ntrusted_log_in=\"yes\"\n";
    defaults_.clear();
    mounts_ = "/dev/root / ext4 rw 0 0\n";
    shares_.clear();
    addGroup("users", kUsersGid, {});
    addGroup("administrators", kAdminGid, {"carol"});
    addUser("alice", kAliceUid, kUsersGid);
    addUser("bob", kBobUid, kUsersGid);
    addUser("carol", kCarolUid, kUsersGid);
    writeRootFile("/etc/vexoinfo.conf", settings_);
    writeRootFile("/etc.defaults/vexoinfo.conf", defaults_);
    writeRootFile("/proc/mounts", mounts_);
    addShare("photo", "read only = no\nvalid users = alice, bob\nread list = bob\n");
    addShare("homes", "read only = no\nvalid users = alice, bob, carol\n");
    vexo::gate::reset();
    capturedLog.clear();
    announced.clear();
    OrvLibSetErr(0);
    errno = 0;
    environment_.clear();
    for (char** entry = environ; *entry != nullptr; ++entry) environment_.emplace_back(*entry);
    mask_ = umask(0);
    umask(mask_);
    descriptors_ = openDescriptors();
}

void ApplianceTest::TearDown() {
    vexo::gate::reset();
    for (const auto& line : capturedLog) {
        const auto match = std::find_if(announced.begin(), announced.end(),
                                        [&](const auto& part) { return line.text.find(part) != std::string::npos; });
        if (match == announced.end()) {
            ADD_FAILURE() << "unannounced log line: " << line.text;
        } else {
            announced.erase(match);
        }
    }
    for (const auto& part : announced) ADD_FAILURE() << "announced, but never logged: " << part;
    capturedLog.clear();
    announced.clear();
    vexo::fileindex::closeDatabases();
    EXPECT_EQ(openDescriptors(), descriptors_) << "descriptors were left open";
    if (chdir("/") != 0) ADD_FAILURE() << "chdir: " << strerror(errno);
    clearenv();
    for (const std::string& entry : environment_) {
        const size_t equals = entry.find('=');
        setenv(entry.substr(0, equals).c_str(), entry.c_str() + equals + 1, 1);
    }
    umask(mask_);
    std::error_code ignored;
    for (const auto& share : shares_) fs::remove_all(shareRoot(share.name), ignored);
    for (const auto& entry : fs::directory_iterator(systemRoot(), ignored)) fs::remove_all(entry.path(), ignored);
    if (root.isPrivate()) fs::remove_all("/tmp/@tmp", ignored);
}

std::string ApplianceTest::addShare(const std::string& name, const std::string& options) {
    std::erase_if(shares_, [&](const Share& share) { return share.name == name; });
    shares_.push_back({name, options});
    writeShares();
    makeFolder(shareRoot(name), 0777);
    return shareRoot(name);
}

void ApplianceTest::writeShares() {
    std::string text;
    for (const auto& share : shares_)
        text += "[" + share.name + "]\npath = " + shareRoot(share.name) + "\n" + share.options + "\n";
    writeRootFile("/etc/vexo/shares.conf", text);
}

void ApplianceTest::addUser(const std::string& name, unsigned uid, unsigned gid) {
    passwd_ += name + ":x:" + std::to_string(uid) + ":" + std::to_string(gid) + "::/nonexistent:/bin/false\n";
    writeAccounts();
}

void ApplianceTest::addGroup(const std::string& name, unsigned gid, const std::vector<std::string>& members) {
    std::string list;
    for (const auto& member : members) list += (list.empty() ? "" : ",") + member;
    group_ += name + ":x:" + std::to_string(gid) + ":" + list + "\n";
    writeAccounts();
}

void ApplianceTest::writeAccounts() {
    writeRootFile("/etc/passwd", passwd_);
    writeRootFile("/etc/group", group_);
}

void ApplianceTest::setSetting(const std::string& key, const std::string& value) {
    replaceSetting(settings_, key, value);
    writeRootFile("/etc/vexoinfo.conf", settings_);
}

void ApplianceTest::setDefaultSetting(const std::string& key, const std::string& value) {
    replaceSetting(defaults_, key, value);
    writeRootFile("/etc.defaults/vexoinfo.conf", defaults_);
}

void ApplianceTest::addMount(const std::string& folder, const std::string& type, const std::string& options) {
    mounts_ += "none " + folder + " " + type + " " + options + " 0 0\n";
    writeRootFile("/proc/mounts", mounts_);
}

// Replaced by rename, so that readers which remember a file by its inode see each new version.
void ApplianceTest::writeRootFile(const std::string& path, const std::string& text) {
    const std::string target = systemRoot() + path;
    writeFile(target + ".new", text);
    fs::rename(target + ".new", target);
}

}  // namespace support

// The C library's log functions, replaced for the whole test program and the libraries it loads.
extern "C" {
void syslog(int priority, const char* format, ...) {
    va_list args;
    va_start(args, format);
    support::capture(priority, format, args);
    va_end(args);
    errno = EXFULL;  // the real ones do not keep it either
}

__attribute__((format(printf, 3, 4))) void __syslog_chk(int priority, int, const char* format, ...) {
    va_list args;
    va_start(args, format);
    support::capture(priority, format, args);
    va_end(args);
    errno = EXFULL;  // the real ones do not keep it either
}
}
