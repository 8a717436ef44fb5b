#include "web/login_conversations.h"

#include <dirent.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string_view>

#include "base/owner.h"
#include "base/raised_identity.h"
#include "base/random.h"
#include "start_program.h"
#include "vexo/system_root.h"
#include "web/login_packet.h"
#include "web/run_folder.h"
#include "web/session_record.h"

namespace vexo {
namespace {

constexpr const char* kLogIns = "logins";
constexpr const char* kLock = "lock";
constexpr size_t kMost = 32;
constexpr size_t kMostOfClient = 2;
constexpr size_t kLongestClient = 256;
using Folder = std::unique_ptr<DIR, orvel::Releaser<closedir>>;

// The part of our environment that a conversation's process has: nothing of the request.
std::vector<std::string> conversationEnvironment() {
    std::vector<std::string> list = {"PATH=/usr/sbin:/usr/bin:/sbin:/bin", "LC_ALL=C.UTF-8"};
    for (char** entry = environ; *entry != nullptr; ++entry) {
        const std::string_view text = *entry;
        if (text.starts_with("VEXO_") || text.starts_with("TZ=")) list.emplace_back(text);
    }
    return list;
}

std::string programPath() {
    const char* own = secure_getenv("VEXO_LOGIN_PROGRAM");
    return own == nullptr || *own != '/' ? VEXO_LOGIN_PROGRAM : own;
}

struct Held {
    size_t all = 0;
    size_t ofClient = 0;
};

// Counts those that are held, and removes what ended ones left. False with errno.
bool countHeld(int store, const std::string& client, Held& held) {
    Descriptor again = openFile(store, ".", O_RDONLY | O_DIRECTORY);
    const Folder folder(again ? fdopendir(again.get()) : nullptr);
    if (!folder) return false;
    static_cast<void>(again.release());
    while (const dirent* entry = readdir(folder.get())) {
        if (!isSessionId(entry->d_name)) continue;
        const Descriptor file = openFile(store, entry->d_name, O_RDONLY | O_NOFOLLOW | O_NONBLOCK);
        std::string of;
        if (!file || lockFile(file.get(), LOCK_SH | LOCK_NB)) {
            unlinkat(store, entry->d_name, 0);
            unlinkat(store, (std::string(entry->d_name) + kSocketSuffix).c_str(), 0);
        } else if (readAll(file.get(), of, kLongestClient)) {
            ++held.all;
            if (of == client) ++held.ofClient;
        }
    }
    return true;
}

bool run(int store, const Descriptor& record, const Descriptor& connection) {
    const ProgramStart program = {.words = {programPath()},
                                  .environment = conversationEnvironment(),
                                  .descriptors = {connection.get(), record.get(), store},
                                  .session = true};
    pid_t child = -1;
    if (const int failure = startProgram(program, child)) {
        errno = failure;
        return false;
    }
    // It leaves another process behind and ends at once.
    int status = 0;
    while (waitpid(child, &status, 0) < 0) {
        if (errno != EINTR) return errno == ECHILD;  // children are reaped elsewhere
    }
    errno = EPIPE;
    return WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

}  // namespace

Conversation startConversation(const std::string& client, std::string& id, Descriptor& connection) {
    const orvel::RaisedIdentity raised;
    const Descriptor store = makeRunFolder(kLogIns) ? openRunFolder(kLogIns) : Descriptor();
    const Descriptor lock = store ? openFile(store.get(), kLock, O_RDWR | O_CREAT | O_NOFOLLOW, 0600) : Descriptor();
    if (!lock || !lockFile(lock.get(), LOCK_EX)) return Conversation::kFailed;
    Held held;
    if (!countHeld(store.get(), client, held)) return Conversation::kFailed;
    if (held.all >= kMost || held.ofClient >= kMostOfClient) return Conversation::kTooMany;

    id = orvel::draw<16>();
    if (id.empty()) return Conversation::kFailed;
    const Descriptor record = openFile(store.get(), id.c_str(), O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW, 0600);
    int ends[2];
    if (!record || !lockFile(record.get(), LOCK_EX | LOCK_NB) || !writeAll(record.get(), client) ||
        socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends) != 0) {
        return Conversation::kFailed;
    }
    connection = Descriptor(ends[0]);
    const Descriptor given(ends[1]);
    return run(store.get(), record, given) ? Conversation::kStarted : Conversation::kFailed;
}

Descriptor joinConversation(const std::string& id) {
    const orvel::RaisedIdentity raised;
    const Descriptor store = isSessionId(id) ? openRunFolder(kLogIns) : Descriptor();
    Descriptor connection(socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0));
    if (!store || !connection) return Descriptor();
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    snprintf(address.sun_path, sizeof address.sun_path, "%s", store.path(id + kSocketSuffix).c_str());
    const auto* name = reinterpret_cast<const sockaddr*>(&address);
    return connect(connection.get(), name, sizeof address) == 0 ? std::move(connection) : Descriptor();
}

}  // namespace vexo
