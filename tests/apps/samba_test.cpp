// The shares of one smb.conf as a real smbd serves them, beside what the programs make of it: who lists, reads and
// writes what. Nobody may more here than there, and where somebody may less, the row says why.
#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>

#include <csignal>
#include <iostream>

#include "apps/program.h"
#include "platform/private_mounts.h"
#include "support/testing.h"
#include "support/wait.h"
#include "text.h"

using orvel::cgi::percentEncode;

namespace {

struct ShareRow {
    const char* name;
    const char* options;
    const char* narrower = "";  // why somebody may do less here
};

constexpr const char* kClosed = "closed, as the option is not honoured here";

const ShareRow kShareRows[] = {
    {"plain", "read only = no\n"},
    {"reading", ""},
    {"valid", "read only = no\nvalid users = alice, @team\n"},
    {"case", "writeable = yes\nvalid users = ALICE @TEAM +readers\n"},
    {"invalid", "read only = no\ninvalid users = bob @readers +nosuch\n"},
    {"both", "read only = no\nvalid users = @team @readers judy\ninvalid users = gina\n"},
    {"readlist", "read only = no\nread list = alice @readers\n"},
    {"writelist", "write list = bob @team\n"},
    {"twolists", "read only = no\nread list = @team\nwrite list = alice\n"},
    {"outsider", "valid users = alice dave\nwrite list = bob dave\nread list = judy\n"},
    {"frank", "read only = no\nvalid users = %S\n"},
    {"star", "read only = no\nvalid users = *\n"},
    {"nobody", "valid users = \"\"\n"},
    {"netgroup", "valid users = &team alice\n"},
    {"plusnet", "valid users = +&team\n"},
    {"copied", "copy = valid\nread only = yes\nwrite list = alice\n"},
    {"admins", "admin users = dave\nread only = yes\n"},
    {"adminwrites", "admin users = dave\nread only = no\nvalid users = dave erin\n"},
    {"guests", "guest ok = yes\nread only = no\nvalid users = alice\n"},
    {"off", "available = no\nread only = no\n"},
    {"hidden", "browseable = no\nread only = no\n"},
    {"printer", "printable = yes\n", "a printer is no share"},
    {"group", "read only = no\nforce group = team\ncreate mask = 0600\n"},
    {"temporary", "read only = no\nveto files = /@tmp/\n"},
    {"modules", "read only = no\nvfs objects =\nrecycle:keeptree = yes\n"},
    {"each", "read only = no\npath = %ROOT%/each/%U\n"},
    {"rightsof", "read only = no\npath = %ROOT%/shut\n"},
    {"opened", "read only = no\nhosts allow = 127.\nvexo:ignore = hosts allow\n"},
    {"hosts", "read only = no\nhosts allow = 127.\n", kClosed},
    {"nohosts", "hosts deny = ALL\n"},
    {"forced", "read only = no\nforce user = erin\n", kClosed},
    {"guestonly", "guest ok = yes\nguest only = yes\nread only = no\n", kClosed},
    {"unreadable", "read only = no\nhide unreadable = yes\n", kClosed},
    {"vetoed", "read only = no\nveto files = /f.txt/\n", kClosed},
    {"nolinks", "read only = no\nfollow symlinks = no\n", kClosed},
    {"asks", "read only = no\nroot preexec = /bin/false\nroot preexec close = yes\n"},
    {"encrypted", "read only = no\nsmb encrypt = mandatory\n", kClosed},
    {"unknown", "read only = no\nsome new option = yes\n", kClosed},
};
const char* const kUserNames[] = {"alice", "bob", "carol", "dave", "erin", "frank", "gina", "hugo", "ivan", "judy"};

// What somebody may do in a share.
struct May {
    bool list = false, read = false, write = false;
    [[nodiscard]] std::string text() const {
        return std::string(list ? "l" : "-") + (read ? "r" : "-") + (write ? "w" : "-");
    }
    [[nodiscard]] bool isWithin(const May& other) const {
        return (!list || other.list) && (!read || other.read) && (!write || other.write);
    }
};

int freePort() {
    const int fd = socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_in address{};
    socklen_t size = sizeof address;
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    const bool bound = bind(fd, reinterpret_cast<sockaddr*>(&address), size) == 0 &&
                       getsockname(fd, reinterpret_cast<sockaddr*>(&address), &size) == 0;
    close(fd);
    return bound ? ntohs(address.sin_port) : 0;
}

// smbd on a port of the loopback device, with the appliance's accounts as the machine's. Gone with the object.
class Smbd {
 public:
    Smbd(const std::string& folder, const std::string& passwd, const std::string& group)
        : port_(std::to_string(freePort())), state_(folder + "/state"), config_(folder + "/etc/samba/smb.conf") {
        EXPECT_EQ(mount(passwd.c_str(), "/etc/passwd", nullptr, MS_BIND, nullptr), 0);
        EXPECT_EQ(mount(group.c_str(), "/etc/group", nullptr, MS_BIND, nullptr), 0);
        makeFolder(state_, 0755);
    }
    ~Smbd() {
        if (process_ <= 0) return;
        kill(-process_, SIGTERM);
        if (!waitUntil("the end of smbd", [&] { return waitpid(process_, nullptr, WNOHANG) == process_; })) {
            kill(-process_, SIGKILL);
            waitpid(process_, nullptr, 0);
        }
    }
    Smbd(const Smbd&) = delete;
    Smbd& operator=(const Smbd&) = delete;

    // The part of [global] that keeps it to itself.
    [[nodiscard]] std::string global() const {
        std::string text =
            "[global]\nnetbios name = ORACLE\nserver role = standalone server\ninterfaces = 127.0.0.1/8\n"
            "bind interfaces only = yes\nload printers = no\nprinting = bsd\ndisable spoolss = yes\n"
            "map to guest = never\nsmb ports = " +
            port_ + "\npassdb backend = smbpasswd:" + state_ + "/smbpasswd\nlog file = " + state_ + "/log\n";
        for (const char* key :
             {"private dir", "lock directory", "state directory", "cache directory", "pid directory", "ncalrpc dir"}) {
            text += std::string(key) + " = " + state_ + "\n";
        }
        return text;
    }
    void start() {
        for (const char* user : kUserNames) {
            const Finished added = runProgram(
                {"/usr/bin/timeout", "60", "/usr/bin/smbpasswd", "-c", config_, "-a", "-s", user}, {}, "pw\npw\n");
            EXPECT_EQ(added.status, 0) << user << added.output;
        }
        process_ = fork();
        if (process_ == 0) {
            setpgid(0, 0);
            prctl(PR_SET_PDEATHSIG, SIGTERM);
            const int null = open("/dev/null", O_RDWR);
            for (const int fd : {0, 1, 2}) dup2(null, fd);
            execl("/usr/sbin/smbd", "smbd", "-F", "--no-process-group", "-s", config_.c_str(), nullptr);
            _exit(127);
        }
        waitUntil("smbd on port " + port_, [&] { return ask("alice", "plain", "ls").status == 0 || HasFailure(); });
    }
    [[nodiscard]] May may(const std::string& user, const std::string& share, const std::string& file) const {
        const std::string text = ask(user, share, "ls f.txt; get f.txt /dev/null; put " + file + " by-" + user).output;
        return {text.find("  f.txt  ") != std::string::npos, text.find("getting file") != std::string::npos,
                text.find("putting file") != std::string::npos};
    }

 private:
    [[nodiscard]] Finished ask(const std::string& user, const std::string& share, const std::string& commands) const {
        return runProgram({"/usr/bin/timeout", "60", "/bin/sh", "-c", "exec /usr/bin/smbclient \"$@\" 2>&1", "sh", "-s",
                           config_, "-p", port_, "-U", user + "%pw", "//127.0.0.1/" + share, "-c", commands});
    }
    static bool HasFailure() { return ::testing::Test::HasFailure(); }

    std::string port_, state_, config_;
    pid_t process_ = -1;
};

class SambaOracle : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addGroup("none", 20105, {});
        setSetting("admin_group", "none");  // administrators are not asked by shares here
        unsigned uid = 20010;
        for (const char* user : {"dave", "erin", "frank", "gina", "hugo", "ivan", "judy"}) {
            addUser(user, ++uid, kUsersGid);
        }
        addUser("nobody", 65534, 65534);
        addGroup("nogroup", 65534, {});
        addGroup("team", 20110, {"alice", "dave", "gina"});
        addGroup("readers", 20111, {"bob", "gina", "hugo"});
    }
    // The text of the shares, and their folders: everybody's by their Unix permissions, but those of one.
    static std::string makeShares(const std::string& root) {
        std::string text;
        for (const ShareRow& row : kShareRows) {
            std::string options = row.options;
            const size_t mark = options.find("%ROOT%");
            if (mark != std::string::npos) options.replace(mark, 6, root);
            // A path of its own replaces this one.
            text += std::string("[") + row.name + "]\npath = " + root + "/" + row.name + "\n" + options;
            fill(root + "/" + row.name);
        }
        for (const char* user : {"alice", "bob"}) fill(root + "/each/" + user);
        fill(root + "/shut", 0755);
        return text;
    }
    static void fill(const std::string& folder, mode_t mode = 0777) {
        makeFolder(folder, mode);
        writeFile(folder + "/f.txt", "content", 0666);
        chmod((folder + "/f.txt").c_str(), 0666);
    }
    static May ours(const std::string& user, const std::string& share) {
        const std::string path = "path=" + percentEncode("/" + share);
        const CgiReply listed(runCgi(PROGRAM_LIST, user, "GET", "action=folder&" + path));
        const RawReply read(runCgi(PROGRAM_DOWNLOAD, user, "GET", path + "/f.txt"));
        const CgiReply written(runCgi(PROGRAM_UPLOAD, user, "PUT", path + "/from-" + user, "x"));
        return {listed.json["success"].asBool() && listed.body.find("f.txt") != std::string::npos,
                read.status == 200 && read.body == "content", written.json["success"].asBool()};
    }
};

TEST_F(SambaOracle, NobodyMayMoreThanInSamba) {
    SKIP_WITHOUT_ROOT();
    ASSERT_EQ(access("/usr/sbin/smbd", X_OK) + access("/usr/bin/smbclient", X_OK), 0) << "script/packages names them";
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        const std::string root = shareRoot("photo"), file = systemRoot() + "/file";
        Smbd smbd(systemRoot(), systemRoot() + "/etc/passwd", systemRoot() + "/etc/group");
        writeRootFile("/etc/samba/smb.conf", smbd.global() + makeShares(root));
        setSetting("share_definitions", "/etc/samba/smb.conf");
        writeRootFile("/file", "x");
        smbd.start();
        int cells = 0;
        for (const ShareRow& row : kShareRows) {
            if (::testing::Test::HasFatalFailure()) break;
            bool anyLess = false;
            for (const char* user : kUserNames) {
                const May theirs = smbd.may(user, row.name, file), mine = ours(user, row.name);
                ++cells;
                EXPECT_TRUE(mine.isWithin(theirs))
                    << row.name << " " << user << ": here " << mine.text() << ", Samba " << theirs.text();
                anyLess = anyLess || !theirs.isWithin(mine);
                EXPECT_TRUE(*row.narrower != '\0' || theirs.isWithin(mine))
                    << row.name << " " << user << ": here " << mine.text() << ", Samba " << theirs.text();
            }
            EXPECT_EQ(anyLess, *row.narrower != '\0') << row.name << " is named as narrower without need";
        }
        std::cout << cells << " cells\n";
        takeLog();
        return 0;
    }));
}

}  // namespace
