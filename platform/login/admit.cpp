// What is asked about a user whose password was right.
#include <fcntl.h>
#include <poll.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include "base/descriptor.h"
#include "talk.h"
#include "vexo/system_root.h"

namespace vexo::login {
namespace {

constexpr const char* kSambaTool = "/usr/bin/pdbedit";
constexpr size_t kLongestAccount = size_t{64} << 10;

// What the tool says of one user, its hashes not among it; "" when it knows none of that name, or cannot say.
std::string sambaAccount(const std::string& user) {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0) return "";
    const orvel::Descriptor reading(ends[0]);
    orvel::Descriptor writing(ends[1]);
    const std::string program = VEXO::SystemPath(kSambaTool), name = "--user=" + user;
    const pid_t child = fork();
    if (child == 0) {
        dup2(writing.get(), STDOUT_FILENO);
        execl(program.c_str(), kSambaTool, "--list", "--verbose", name.c_str(), nullptr);
        _exit(127);
    }
    writing.reset();
    std::string text;
    char piece[4096];
    for (ssize_t got = 0; child > 0 && text.size() < kLongestAccount;) {
        got = read(reading.get(), piece, sizeof piece);
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) break;
        text.append(piece, static_cast<size_t>(got));
    }
    int status = -1;
    while (child > 0 && waitpid(child, &status, 0) < 0 && errno == EINTR) {
    }
    return WIFEXITED(status) && WEXITSTATUS(status) == 0 ? text : "";
}

// "Account Flags:        [DU         ]". A user whom Samba does not know is not disabled there.
bool isDisabledInSamba(const std::string& user) {
    const std::string program = VEXO::SystemPath(kSambaTool);
    if (access(program.c_str(), X_OK) != 0) return false;
    const std::string account = sambaAccount(user);
    const size_t line = account.find("Account Flags:");
    if (line == std::string::npos) return false;
    const std::string flags = account.substr(line, account.find('\n', line) - line);
    return flags.find('D', flags.find('[')) != std::string::npos;
}

}  // namespace

void admitUser(Talk& talk, const std::string& user) {
    const int reason = VEXOLogInAllowed(user.c_str());
    if (reason == 0 && isDisabledInSamba(user)) return talk.refuse(VEXO_LOGIN_LOCKED);
    if (reason == 0) return talk.finish(user);
    if (reason == VEXO_LOGIN_WRONG) talk.waitAsForAnyFailure({});
    talk.refuse(static_cast<VEXO_LOGIN_REASON>(reason));
}

}  // namespace vexo::login
