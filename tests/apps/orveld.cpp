#include "apps/orveld.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstring>
#include <memory>
#include <sstream>
#include <utility>

#include "listener.h"
#include "scgi.h"
#include "support/appliance.h"
#include "support/wait.h"
#include "vexo/system_root.h"

namespace support {
namespace {

constexpr int kPatience = 120000;  // milliseconds

std::vector<std::string> texts(const Variables& variables) {
    std::vector<std::string> list;
    for (const auto& [name, value] : variables) {
        // An SCGI block begins with the length.
        if (name == "CONTENT_LENGTH") list.insert(list.begin(), name + "=" + value);
        if (name != "CONTENT_LENGTH") list.push_back(name + "=" + value);
    }
    return list;
}

pid_t spawn(std::vector<std::string> words, const Variables& more) {
    std::vector<char*> arguments, environment;
    for (std::string& word : words) arguments.push_back(word.data());
    arguments.push_back(nullptr);
    Variables all = more;
    all["ASAN_OPTIONS"] = "detect_leaks=0";  // a process that took on another identity cannot be traced
    std::vector<std::string> added;
    for (const auto& [name, value] : all) added.push_back(name + "=" + value);
    // The first of a name counts.
    for (std::string& text : added) environment.push_back(text.data());
    for (char** entry = environ; *entry != nullptr; ++entry) environment.push_back(*entry);
    environment.push_back(nullptr);
    const pid_t child = fork();
    if (child != 0) return child;
    prctl(PR_SET_PDEATHSIG, SIGTERM);  // however the test ends
    execve(arguments[0], arguments.data(), environment.data());
    _exit(127);
}

std::vector<pid_t> childrenOf(pid_t process) {
    const std::string number = std::to_string(process);
    std::istringstream list(readFile("/proc/" + number + "/task/" + number + "/children"));
    std::vector<pid_t> children;
    for (pid_t child = 0; list >> child;) children.push_back(child);
    return children;
}

// Several may run at a time; the first of a test has the first name.
std::string freeSocket() {
    const std::string path = "/tmp/orveld-" + std::to_string(getpid());
    for (int i = 1;; ++i) {
        const int probe = orvel::orveld::connectTo(path + "-" + std::to_string(i));
        if (probe < 0) return path + "-" + std::to_string(i);
        close(probe);
    }
}

}  // namespace

Connection::Connection(const std::string& socket) : fd_(orvel::orveld::connectTo(socket)) {
    EXPECT_GE(fd_, 0) << socket << " " << strerror(errno);
}

Connection::Connection(Connection&& other) noexcept : fd_(std::exchange(other.fd_, -1)) {}

bool Connection::send(const std::string& bytes) const {
    return ::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(bytes.size());
}

void Connection::endBody() const {
    shutdown(fd_, SHUT_WR);
}

std::string Connection::receive() const {
    std::string all;
    char piece[65536];
    pollfd watched = {fd_, POLLIN, 0};
    while (poll(&watched, 1, kPatience) == 1) {
        const ssize_t got = read(fd_, piece, sizeof piece);
        if (got <= 0) return all;
        all.append(piece, static_cast<size_t>(got));
    }
    ADD_FAILURE() << "no end of a reply; so far: " << all;
    return all;
}

bool Connection::hasReply() const {
    pollfd watched = {fd_, POLLIN, 0};
    return poll(&watched, 1, 0) == 1;
}

void Connection::hangUp() {
    if (fd_ >= 0) close(fd_);
    fd_ = -1;
}

Orveld::Orveld(const Variables& settings, const Variables& environment, bool kept)
    : socket_(freeSocket()), kept_(kept) {
    const std::string file = VEXO::SystemPath("/etc/vexoinfo.conf"), before = readFile(file);
    Variables all = {{"orveld_trusted_logins", std::to_string(getuid())}};
    for (const auto& [name, value] : settings) all[name] = value;
    std::string text = before;
    for (const auto& [name, value] : all) text += name + "=\"" + value + "\"\n";
    writeFile(file, text);
    const std::vector<std::string> alone = {ORVELD, "--socket", socket_}, through = {ORVELD_KEEPER, socket_, ORVELD};
    started_ = spawn(kept ? through : alone, environment);
    EXPECT_GT(started_, 0);
    waitUntil("orveld to listen", [&] { return !figures().isNull(); });
    if (!kept) writeFile(file, before);
}

std::string Orveld::ask(const Variables& variables, const std::string& body) const {
    const Connection connection = connect();
    connection.send(blockOf(variables));
    connection.send(body);
    connection.endBody();
    return connection.receive();
}

Json::Value Orveld::figures() const {
    const int probe = orvel::orveld::connectTo(socket_);
    if (probe < 0) return {};
    close(probe);
    const std::string reply = ask({{"CONTENT_LENGTH", "0"},
                                   {"SCGI", "1"},
                                   {"SCRIPT_NAME", orvel::orveld::kStatusPath},
                                   {"QUERY_STRING", "format=json"}});
    const size_t end = reply.find("\r\n\r\n");
    if (!reply.starts_with("Status: 200") || end == std::string::npos) return {};
    return jsonOf(reply.substr(end + 4));
}

pid_t Orveld::process() const {
    if (!kept_) return started_;
    const auto children = childrenOf(started_);
    return children.empty() ? -1 : children.front();
}

std::vector<pid_t> Orveld::children() const {
    return childrenOf(process());
}

std::vector<pid_t> Orveld::readers() const {
    std::vector<pid_t> list;
    for (const pid_t child : children()) {
        if (readFile("/proc/" + std::to_string(child) + "/syscall").starts_with("0 0x0 ")) list.push_back(child);
    }
    return list;
}

int Orveld::end() {
    if (started_ <= 0) return -1;
    kill(started_, SIGTERM);
    const int status = support::waitForEnd(started_, "orveld");
    started_ = -1;
    return WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
}

std::string blockOf(const Variables& variables) {
    return orvel::orveld::buildBlock(texts(variables));
}

Variables requestOf(const std::string& program, const std::string& user, const std::string& query,
                    const std::string& method, const Variables& more) {
    Variables variables = {{"CONTENT_LENGTH", "0"},
                           {"SCGI", "1"},
                           {"REQUEST_METHOD", method},
                           {"REMOTE_ADDR", "127.0.0.1"},
                           {"REMOTE_USER", user},
                           {"QUERY_STRING", query},
                           {"SCRIPT_NAME", "/cgi-bin/" + program}};
    for (const auto& [name, value] : more) variables[name] = value;
    return variables;
}

}  // namespace support
