// The process of one log-in conversation (vexo/login.h). libvexo starts it with three descriptors (web/login_packet.h);
// it has no arguments, and nothing secret is in its environment.
//
// It is two: this one keeps the time and takes answers, one after the other, from whichever request brings them; the
// other judges, with PAM and its modules. Whatever becomes of that one (a loop, a crash, processes that it leaves
// behind), this one answers, and ends its process group.
#include <fcntl.h>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <string>

#include "base/descriptor.h"
#include "talk.h"
#include "vexo/system_root.h"
#include "web/login_packet.h"

namespace vexo::login {
namespace {

using orvel::Descriptor;
constexpr int kPatience = 2;  // seconds for the packet of who has connected

// For how long a conversation lasts. Tests that wait for its end set a shorter time.
std::chrono::seconds lifetime() {
#ifdef VEXO_FAULT_GATE
    if (const char* set = getenv("VEXO_GATE_LOGIN_SECONDS")) return std::chrono::seconds(strtoll(set, nullptr, 10));
#endif
    return std::chrono::seconds(kConversationSeconds);
}

[[noreturn]] void judge(int socket, const LogInPacket& begin) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    std::signal(SIGCHLD, SIG_DFL);  // modules wait for programs of theirs
    std::signal(SIGPIPE, SIG_DFL);
    umask(022);
    int status = 0;
    try {
        Talk talk(socket, begin.user, begin.client);
        if (begin.size == 0) {
            judgeNobody(talk);
        } else if (VEXO::SystemRoot().empty() || folderOfTests() != nullptr) {
            judgeByPam(talk);
        } else {
            judgeByShadow(talk);
        }
    } catch (const std::exception& failure) {
        syslog(LOG_ERR, "log-in: %s", failure.what());
        status = 1;
    }
    _exit(status);
}

class Conversation {
 public:
    // False when it cannot be held.
    bool begin();
    void hold();
    ~Conversation();
    Conversation() = default;
    Conversation(const Conversation&) = delete;
    Conversation& operator=(const Conversation&) = delete;

 private:
    void release();
    bool listen();
    bool startJudge();
    void handOn();
    void take();
    void reply(const VEXOLOGIN& packet);
    void replyRefusal(int reason);
    [[nodiscard]] std::string socketPath() const {
        return "/proc/self/fd/" + std::to_string(kFolder) + "/" + first_.id + kSocketSuffix;
    }

    LogInPacket first_ = {};
    Descriptor asker_{kFirstAsker};  // who waits for what the judge says next, or nobody
    Descriptor listener_, judge_;
    pid_t child_ = -1;
    bool judging_ = true;  // the judge has an answer, or has not asked anything yet
    bool over_ = false;
};

Conversation::~Conversation() {
    release();
}

// Ends the judge and gives the client's place free: before the outcome is known, so that who learns it can begin anew.
void Conversation::release() {
    if (child_ > 0) kill(-child_, SIGKILL);
    child_ = -1;
    if (first_.id[0] == '\0') return;
    unlinkat(kFolder, (std::string(first_.id) + kSocketSuffix).c_str(), 0);
    unlinkat(kFolder, first_.id, 0);
    first_.id[0] = '\0';
    close(kRecordFile);
}

bool Conversation::listen() {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    snprintf(address.sun_path, sizeof address.sun_path, "%s", socketPath().c_str());
    listener_ = Descriptor(socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0));
    return listener_ && bind(listener_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0 &&
           ::listen(listener_.get(), 4) == 0;
}

bool Conversation::startJudge() {
    int ends[2];
    if (socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends) != 0) return false;
    judge_ = Descriptor(ends[0]);
    const Descriptor given(ends[1]);
    child_ = fork();
    if (child_ != 0) {
        // Here as well, so that the group is there before anybody ends it.
        if (child_ > 0) setpgid(child_, child_);
        return child_ > 0;
    }
    setpgid(0, 0);
    // Nothing of the conversation's but the one connection: modules may hand descriptors on.
    const int own = fcntl(given.get(), F_DUPFD_CLOEXEC, kFirstAsker + 3);
    dup3(own, kFirstAsker, O_CLOEXEC);
    close_range(kFirstAsker + 1, ~0U, 0);
    judge(kFirstAsker, first_);
}

bool Conversation::begin() {
    for (const int fd : {kFirstAsker, kRecordFile, kFolder}) {
        if (fcntl(fd, F_SETFD, FD_CLOEXEC) != 0) return false;
    }
    return receivePacket(kFirstAsker, first_, kPatience) && first_.word == LogInWord::kBegin && listen() &&
           startJudge();
}

void Conversation::reply(const VEXOLOGIN& packet) {
    if (packet.step != VEXO_LOGIN_ASK) release();
    if (asker_) static_cast<void>(sendPacket(asker_.get(), packet));
    asker_.reset();
}

void Conversation::replyRefusal(int reason) {
    VEXOLOGIN packet = {};
    packet.step = VEXO_LOGIN_REFUSED;
    packet.reason = reason;
    snprintf(packet.user, sizeof packet.user, "%s", first_.user);
    reply(packet);
}

// What the judge says goes to who waits for it.
void Conversation::handOn() {
    VEXOLOGIN packet = {};
    const bool said = receivePacket(judge_.get(), packet, 0);
    over_ = !said || packet.step != VEXO_LOGIN_ASK;
    judging_ = false;
    if (!said) {
        syslog(LOG_ERR, "log-in: the service broke down");
        return replyRefusal(VEXO_LOGIN_SERVICE);
    }
    if (!over_) memcpy(packet.id, first_.id, sizeof packet.id);
    reply(packet);
}

// Takes one answer.
void Conversation::take() {
    Descriptor connection(accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC));
    LogInPacket packet = {};
    if (!connection || !receivePacket(connection.get(), packet, kPatience)) return;
    VEXOLOGIN refusal = {};
    refusal.step = VEXO_LOGIN_REFUSED;
    refusal.reason = VEXO_LOGIN_OVER;
    const bool ours = strcmp(packet.client, first_.client) == 0;
    if (ours && packet.word == LogInWord::kAnswer && !judging_) {
        judging_ = true;
        asker_ = std::move(connection);
        over_ = !sendPacket(judge_.get(), packet);
        if (over_) replyRefusal(VEXO_LOGIN_SERVICE);  // the judge is gone
    } else {
        if (ours && packet.word == LogInWord::kAnswer) {
            refusal.reason = VEXO_LOGIN_TWICE;
            memcpy(refusal.id, first_.id, sizeof refusal.id);
        }
        over_ = ours && packet.word == LogInWord::kEnd;
        if (over_) release();
        static_cast<void>(sendPacket(connection.get(), refusal));
    }
    explicit_bzero(&packet, sizeof packet);
}

void Conversation::hold() {
    const auto end = Clock::now() + lifetime();
    while (!over_) {
        const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(end - Clock::now()).count();
        pollfd watched[] = {{judge_.get(), POLLIN, 0}, {listener_.get(), POLLIN, 0}};
        const int ready = left <= 0 ? 0 : poll(watched, 2, static_cast<int>(left));
        if (ready < 0 && errno == EINTR) continue;
        if (ready <= 0) {
            if (judging_) syslog(LOG_ERR, "log-in: the service does not answer");
            return replyRefusal(judging_ ? VEXO_LOGIN_SERVICE : VEXO_LOGIN_OVER);
        }
        if (watched[0].revents != 0) {
            handOn();
        } else if (watched[1].revents != 0) {
            take();
        }
    }
}

int hold() {
    prctl(PR_SET_DUMPABLE, 0);
    const rlimit none = {0, 0};
    setrlimit(RLIMIT_CORE, &none);
    std::signal(SIGPIPE, SIG_IGN);
    std::signal(SIGCHLD, SIG_IGN);
    umask(077);
    try {
        Conversation conversation;
        if (!conversation.begin()) return 1;
        conversation.hold();
        return 0;
    } catch (const std::exception&) {
        return 1;
    }
}

}  // namespace
}  // namespace vexo::login

// Who started us waits for the process that it knows, and for no longer.
int main() {
    const pid_t child = fork();
    if (child != 0) _exit(child > 0 ? 0 : 1);
    _exit(vexo::login::hold());
}
