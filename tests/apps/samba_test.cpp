// The shares of one smb.conf as a real smbd serves them, beside what the programs make of it: who lists, reads and
// writes what. Nobody may more here than there, and where somebody may less, the row says why.
#include <net/if.h>
#include <sys/ioctl.h>
#include <sys/socket.h>

#include <iostream>

#include "apps/program.h"
#include "platform/private_mounts.h"
#include "support/testing.h"
#include "text.h"

using orvel::cgi::percentEncode;

namespace {

struct ShareRow {
    const char* name;
    const char* options;
    const char* narrower;  // why somebody may do less here
};

const std::vector<ShareRow>& shareRows() {
    static const auto rows = recordsOf<ShareRow, const char*, const char*, const char*>("apps/samba_shares");
    return rows;
}

// Shares that users define, a file each, made after [like]; %PATH% is a folder of the row's `owner`.
struct UserShareRow {
    const char* name;
    uid_t file, owner;
    const char* text;
    mode_t mode;
};
constexpr const char* kLike = "[like]\n-valid = no\npath = /tmp\nread only = yes\ninvalid users = judy\n";
const std::vector<UserShareRow>& userShareRows() {
    static const auto rows =
        recordsOf<UserShareRow, const char*, uid_t, uid_t, const char*, mode_t>("apps/samba_user_shares");
    return rows;
}

// Shares in which files and folders are made, by smbclient and by the programs; `parent` is the mode of the share's
// root.
struct ModeRow {
    const char* name;
    const char* options;
    mode_t parent;
    const char* acl;  // entries of the root's default ACL
};
const std::vector<ModeRow>& modeRows() {
    static const auto rows = recordsOf<ModeRow, const char*, const char*, mode_t, const char*>("apps/samba_modes");
    return rows;
}
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

// A network of our own, in which no port is taken.
bool hasOwnNetwork() {
    ifreq loopback{};
    strcpy(loopback.ifr_name, "lo");
    loopback.ifr_flags = IFF_UP;
    return unshare(CLONE_NEWNET) == 0 &&
           ioctl(orvel::Descriptor(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0)).get(), SIOCSIFFLAGS, &loopback) == 0;
}

// smbd on a port of the loopback device, with the appliance's accounts as the machine's. Gone with the object.
class Smbd {
 public:
    Smbd(const std::string& folder, const std::string& passwd, const std::string& group)
        : state_(folder + "/state"), config_(folder + "/etc/samba/smb.conf") {
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
            "map to guest = never\nusershare template share = like\nsmb ports = " +
            port_ + "\nmap archive = no\npassdb backend = smbpasswd:" + state_ + "/smbpasswd\nlog file = " + state_ +
            "/log\n";
        for (const char* key :
             {"private dir", "lock directory", "state directory", "cache directory", "pid directory", "ncalrpc dir"})
            text += std::string(key) + " = " + state_ + "\n";
        return text;
    }
    void start(const std::vector<std::string>& users) {
        for (const std::string& user : users) {
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
    // The reply to commands of `user` in one connection.
    std::string say(const std::string& user, const std::string& share, const std::string& commands) const {
        return ask(user, share, commands).output;
    }
    // In each share, all of them in one connection.
    [[nodiscard]] std::map<std::string, May> may(const std::string& user, const std::string& file,
                                                 const std::vector<std::string>& shares) const {
        std::string commands;
        for (const std::string& share : shares) {
            const std::string name = ownFile(share);
            commands += "tcon " + share + "; ls " + name + "; get " + name + " /dev/null; put " + file + " by-" + user +
                        "-" + share + "; ";
        }
        const std::string text = ask(user, "plain", commands).output;
        const auto said = [&](const std::string& words) { return text.find(words) != std::string::npos; };
        std::map<std::string, May> all;
        for (const std::string& share : shares) {
            const std::string name = ownFile(share);
            all[share] = {said("  " + name + " "), said("getting file \\" + name),
                          said(" as \\by-" + user + "-" + share + " ")};
        }
        return all;
    }
    // By which the reply tells the shares apart.
    static std::string ownFile(const std::string& share) { return "f-" + share + ".txt"; }

 private:
    [[nodiscard]] Finished ask(const std::string& user, const std::string& share, const std::string& commands) const {
        return runProgram({"/usr/bin/timeout", "60", "/bin/sh", "-c", "exec /usr/bin/smbclient \"$@\" 2>&1", "sh", "-s",
                           config_, "-p", port_, "-U", user + "%pw", "//127.0.0.1/" + share, "-c", commands});
    }
    static bool HasFailure() { return ::testing::Test::HasFailure(); }

    const std::string port_ = "4450";
    std::string state_, config_;
    pid_t process_ = -1;
};

class SambaOracle : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        addGroup("none", 20105, {});
        setSetting("admin_group", "none");  // administrators are not asked by shares here
        unsigned uid = 20010;
        for (const char* user : {"dave", "erin", "frank", "gina", "hugo", "ivan", "judy"})
            addUser(user, ++uid, kUsersGid);
        addUser("nobody", 65534, 65534);
        addGroup("nogroup", 65534, {});
        addGroup("team", 20110, {"alice", "dave", "gina"});
        addGroup("readers", 20111, {"bob", "gina", "hugo"});
    }
    // Runs `body` beside an smbd that knows these users.
    void serve(const std::vector<std::string>& users,
               const std::function<void(const Smbd& smbd, const std::string& root, const std::string& file)>& body) {
        SKIP_WITHOUT_ROOT();
        ASSERT_EQ(access("/usr/sbin/smbd", X_OK) + access("/usr/bin/smbclient", X_OK), 0)
            << "script/packages names them";
        EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
            if (!hasOwnNetwork()) return kNoPrivateMounts;
            Smbd smbd(systemRoot(), systemRoot() + "/etc/passwd", systemRoot() + "/etc/group");
            const std::string root = shareRoot("photo");
            writeRootFile("/etc/samba/smb.conf", smbd.global() + "usershare prefix deny list = " + root + "/u-pre\n" +
                                                     kLike + makeShares(root));
            makeUserShares(root);
            setSetting("share_definitions", "/etc/samba/smb.conf");
            writeRootFile("/file", "x");
            smbd.start(users);
            body(smbd, shareRoot("photo"), systemRoot() + "/file");
            takeLog();
            return 0;
        }));
    }
    // The text of the shares, and their folders: everybody's by their Unix permissions, but those of one.
    static std::string makeShares(const std::string& root) {
        std::string text;
        for (const ShareRow& row : shareRows()) {
            std::string options = row.options;
            const size_t mark = options.find("%ROOT%");
            if (mark != std::string::npos) options.replace(mark, 6, root);
            // A path of its own replaces this one.
            text += std::string("[") + row.name + "]\npath = " + root + "/" + row.name + "\n" + options;
            fill(root + "/" + row.name);
        }
        for (const ModeRow& row : modeRows()) {
            const std::string folder = root + "/" + row.name;
            text += std::string("[") + row.name + "]\npath = " + folder + "\nread only = no\n" + row.options;
            fill(folder, row.parent);
            EXPECT_EQ(chown(folder.c_str(), 20012, 20111), 0);  // erin's, and the readers'
            chmod(folder.c_str(), row.parent);
            if (*row.acl == '\0') continue;
            EXPECT_EQ(runProgram({"/usr/bin/setfacl", "-d", "-m", row.acl, folder}).status, 0) << row.name;
        }
        fill(root + "/bin");
        text += "[bin]\npath = " + root +
                "/bin\nread only = no\nvfs objects = recycle\nrecycle:repository = .bin/%U\n"
                "recycle:keeptree = yes\n";
        for (const char* user : {"alice", "bob"}) fill(root + "/each/" + user);
        for (const char* user : kUserNames) {
            fill(root + "/homes/" + user);
            writeFile(root + "/homes/" + user + "/" + Smbd::ownFile(user), "content", 0666);
        }
        text += "[homes]\npath = " + root + "/homes/%S\nread only = no\nvalid users = %S\ninvalid users = judy\n";
        fill(root + "/shut", 0755);
        for (const ShareRow& row : shareRows()) {
            for (const std::string folder : {row.name, "each/alice", "each/bob", "shut"})
                writeFile(root + "/" + folder + "/" + Smbd::ownFile(row.name), "content", 0666);
        }
        return text;
    }
    static void makeUserShares(const std::string& root) {
        const std::string folder = systemRoot() + "/var/lib/samba/usershares";
        makeFolder(folder);
        EXPECT_EQ(chmod(folder.c_str(), 01770), 0);
        EXPECT_EQ(mount(folder.c_str(), "/var/lib/samba/usershares", nullptr, MS_BIND, nullptr), 0);
        for (const UserShareRow& row : userShareRows()) {
            const std::string path =
                root + (strcmp(row.name, "reading") == 0 ? "/u-reading" : std::string("/") + row.name);
            const std::string file = folder + "/" + row.name;
            std::string text = row.text;
            const size_t mark = text.find("%PATH%");
            if (mark != std::string::npos) text.replace(mark, 6, path);
            fill(path);
            writeFile(path + "/" + Smbd::ownFile(row.name), "content", 0666);
            writeFile(file, text);
            EXPECT_EQ(chown(path.c_str(), row.owner, kUsersGid), 0);
            EXPECT_EQ(chown(file.c_str(), row.file, kUsersGid) + chmod(file.c_str(), row.mode), 0);
        }
        EXPECT_EQ(symlink("u-all", (folder + "/u-link").c_str()), 0);
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

// "MODE OWNER GROUP".
std::string lookOf(const std::string& path) {
    struct stat status {};
    if (lstat(path.c_str(), &status) != 0) return "none";
    char text[64];
    snprintf(text, sizeof text, "%o %u %u", status.st_mode & 07777, status.st_uid, status.st_gid);
    return text;
}

std::string operate(const std::string& user, const std::string& form) {
    const CgiReply reply(
        runCgi(PROGRAM_OPERATION, user, "POST", "", form, {{"CONTENT_TYPE", "application/x-www-form-urlencoded"}}));
    const std::string id = reply.json["data"]["taskid"].asString();
    if (id.empty()) return reply.json["success"].asBool() ? "" : reply.body;
    Json::Value data;
    waitUntil("the end of " + id, [&] {
        data = CgiReply(runCgi(PROGRAM_OPERATION, user, "GET", "action=status&taskid=" + id)).json["data"];
        return data["finished"].asBool();
    });
    return data["errors"].empty() ? "" : data.toStyledString();
}

// What smbclient and the programs make looks alike.
int compareModes(const Smbd& smbd, const std::string& root, const std::string& file) {
    int cells = 0;
    for (const ModeRow& row : modeRows()) {
        for (const std::string user : {"alice", "bob"}) {
            const std::string share = row.name, at = root + "/" + share + "/";
            smbd.say(user, share,
                     "put " + file + " s-" + user + "; mkdir sd-" + user + "; put " + file + " sd-" + user + "/f");
            const std::string in = "/" + share + "/";
            runCgi(PROGRAM_UPLOAD, user, "PUT", "path=" + percentEncode(in + "o-" + user), "x");
            operate(user, "action=mkdir&path=" + percentEncode(in + "od-" + user));
            runCgi(PROGRAM_UPLOAD, user, "PUT", "path=" + percentEncode(in + "od-" + user + "/f"), "x");
            for (const std::string& name : {"-" + user, "d-" + user, "d-" + user + "/f"}) {
                ++cells;
                EXPECT_EQ(lookOf(at + "o" + name), lookOf(at + "s" + name)) << share << " " << user << " " << name;
            }
        }
    }
    return cells;
}

// Names that a share keeps out: never seen, opened or made, by any way.
int compareVeto(const Smbd& smbd, const std::string& root, const std::string& file) {
    const std::string at = root + "/vetoed/";
    for (const char* name : {"x.no", "sub/y.NO", "sub/z", "dir.no/in"}) writeFile(at + name, name, 0666);
    for (const char* folder : {"sub", "dir.no"}) chmod((at + folder).c_str(), 0777);
    const std::string theirs = smbd.say("alice", "vetoed",
                                        "ls; ls sub/*; get x.no /dev/null; get dir.no/in /dev/null; put " + file +
                                            " new.no; mkdir made.no; rename sub/z z.no; del sub/y.NO");
    for (const char* name : {"new.no", "made.no", "z.no"}) EXPECT_EQ(lookOf(at + name), "none") << theirs;
    EXPECT_EQ(theirs.find("getting file"), std::string::npos) << theirs;
    EXPECT_EQ(theirs.find("x.no  "), std::string::npos) << theirs;

    const auto body = [](const char* program, const std::string& query) {
        return runCgi(program, "alice", "GET", query);
    };
    const std::string top = body(PROGRAM_LIST, "action=folder&path=/vetoed"),
                      sub = body(PROGRAM_LIST, "action=folder&path=/vetoed/sub");
    for (const char* name : {"x.no", "f.txt", "dir.no", "y.NO"})
        EXPECT_EQ((top + sub).find(name), std::string::npos) << name;
    EXPECT_NE(sub.find("/vetoed/sub/z"), std::string::npos) << sub;
    EXPECT_EQ(RawReply(body(PROGRAM_DOWNLOAD, "path=/vetoed/x.no")).status, 404);
    EXPECT_EQ(RawReply(body(PROGRAM_DOWNLOAD, "path=/vetoed/dir.no/in")).status, 404);
    EXPECT_EQ(body(PROGRAM_LIST, "action=folder&path=/vetoed/dir.no").find("/in"), std::string::npos);
    const CgiReply put(runCgi(PROGRAM_UPLOAD, "alice", "PUT", "path=/vetoed/new.no", "x"));
    EXPECT_FALSE(put.json["success"].asBool());
    for (const char* form :
         {"action=mkdir&path=/vetoed/made.no", "action=rename&path=/vetoed/sub/z&name=z.no",
          "action=copy&path=/plain/c.no&target=/vetoed", "action=copy&path=/plain/tree&target=/vetoed",
          "action=delete&permanent=true&path=/vetoed/sub"}) {
        writeFile(root + "/plain/c.no", "", 0666);
        writeFile(root + "/plain/tree/d.no", "", 0666);
        EXPECT_NE(operate("alice", form), "") << form;
    }
    for (const char* name : {"new.no", "made.no", "z.no", "c.no", "tree/d.no"}) EXPECT_EQ(lookOf(at + name), "none");
    EXPECT_NE(lookOf(at + "sub/y.NO"), "none") << "what is not shown is not removed";
    // Searches, by a walk and by an index that was built before.
    const std::string found = runProgram({ORVELCTL, "search", "/vetoed", "--user", "alice", "--name", "*"}).output;
    EXPECT_EQ(found.find(".no"), std::string::npos) << found;
    return 1;
}

// One bin: what either deletes the other finds.
int compareBins(const Smbd& smbd, const std::string& root) {
    const std::string at = root + "/bin/";
    for (const char* name : {"a/one", "a/two"}) writeFile(at + name, name, 0666);
    chmod((at + "a").c_str(), 0777);
    smbd.say("alice", "bin", "del a/one");
    EXPECT_EQ(operate("alice", "action=delete&path=/bin/a/two"), "");
    for (const char* name : {"one", "two"}) EXPECT_EQ(readFile(at + ".bin/alice/a/" + name), std::string("a/") + name);
    EXPECT_EQ(lookOf(at + "#recycle"), "none");
    EXPECT_EQ(operate("alice", "action=restore&path=/bin/.bin/alice/a/one"), "");
    EXPECT_EQ(readFile(at + "a/one"), "a/one");
    return 1;
}

TEST_F(SambaOracle, NobodyMayMoreThanInSamba) {
    const std::vector<std::string> users(std::begin(kUserNames), std::end(kUserNames));
    serve(users, [this](const Smbd& smbd, const std::string&, const std::string& file) {
        int cells = 0;
        std::vector<std::string> shares = {"u-link", "alice", "hugo", "judy"};
        for (const ShareRow& row : shareRows()) shares.emplace_back(row.name);
        for (const UserShareRow& row : userShareRows()) shares.emplace_back(row.name);
        std::map<std::string, std::map<std::string, May>> samba;
        for (const char* user : kUserNames) samba[user] = smbd.may(user, file, shares);
        const auto compare = [&](const ShareRow& row, std::initializer_list<const char*> whom) {
            bool anyLess = false;
            for (const char* user : whom) {
                const May theirs = samba[user][row.name], mine = ours(user, row.name);
                ++cells;
                EXPECT_TRUE(mine.isWithin(theirs))
                    << row.name << " " << user << ": here " << mine.text() << ", Samba " << theirs.text();
                anyLess = anyLess || !theirs.isWithin(mine);
                EXPECT_TRUE(*row.narrower != '\0' || theirs.isWithin(mine))
                    << row.name << " " << user << ": here " << mine.text() << ", Samba " << theirs.text();
            }
            EXPECT_EQ(anyLess, *row.narrower != '\0') << row.name << " is named as narrower without need";
        };
        for (const ShareRow& row : shareRows())
            compare(row, {"alice", "bob", "carol", "dave", "erin", "frank", "gina", "hugo", "ivan", "judy"});
        for (const UserShareRow& row : userShareRows()) compare({row.name, "", ""}, {"alice", "bob", "dave", "judy"});
        compare({"u-link", "", ""}, {"alice"});
        // Homes are named after their users in Samba; here everybody has one, and no name leads to another's.
        setSetting("userhome_enable", "yes");
        for (const std::string user : {"alice", "hugo", "judy"}) {
            ++cells;
            EXPECT_EQ(ours(user, "home").text(), samba[user][user].text()) << user;
            EXPECT_EQ(ours(user, "hugo").text(), user == "hugo" ? "---" : samba[user]["hugo"].text()) << user;
        }
        std::cout << cells << " cells\n";
    });
}

TEST_F(SambaOracle, FilesAreAsSambaMakesThem) {
    serve({"alice", "bob"}, [](const Smbd& smbd, const std::string& root, const std::string& file) {
        std::cout << compareModes(smbd, root, file) << " cells\n";
        compareVeto(smbd, root, file);
        compareBins(smbd, root);
    });
}

}  // namespace
