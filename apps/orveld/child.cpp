#include "child.h"

#include <fcntl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <ctime>
#include <string_view>
#include <vector>

#include "oom.h"
#include "orvel/error_state.h"
#include "program/program.h"
#include "reply.h"
#include "request.h"
#include "scgi.h"

namespace orvel::orveld {
namespace {

// Of the process's own environment a request sees what begins so.
constexpr std::string_view kOwnVariables[] = {"PATH=", "TZ=", "VEXO_"};

pid_t answering = 0;  // the child that answers, not one that it made
Slot* ownSlot = nullptr;
bool hasBody = false;

std::int64_t monotonicNow() {
    timespec now = {};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return std::int64_t{now.tv_sec} * 1000000000 + now.tv_nsec;
}

// A refusal stays one.
void setState(SlotState state) {
    if (ownSlot->state.load() == static_cast<std::uint32_t>(SlotState::kRefused)) return;
    ownSlot->state = static_cast<std::uint32_t>(state);
}

// Once a reply has begun its reader's end shows at the next write. What follows the last one must not be cut off.
void replyBegins() {
    setState(SlotState::kKept);
}

// The parent may have decided to end this process just before; a program that can be cancelled takes the signal back.
void keepGoing() {
    setState(SlotState::kKept);
    std::signal(SIGTERM, SIG_IGN);
}

// The last of what is done at exit, and the end: the libraries' own destructors only give memory back, and running
// them touches pages of each library.
void endReply(int status, void*) {
    if (answering != getpid()) return;
    ownSlot->answered = monotonicNow();
    setState(SlotState::kAnswered);
    shutdown(STDOUT_FILENO, SHUT_WR);
    ownSlot->bodyLeft = hasBody ? 1 : 0;
    _exit(status);
}

void takeConnection(int connection, const Limits& limits) {
    dup2(connection, STDIN_FILENO);
    dup2(connection, STDOUT_FILENO);
    close_range(STDERR_FILENO + 1, ~0U, 0);
    const timeval idle = {limits.idle.count(), 0};
    setsockopt(STDIN_FILENO, SOL_SOCKET, SO_RCVTIMEO, &idle, sizeof idle);
    setsockopt(STDIN_FILENO, SOL_SOCKET, SO_SNDTIMEO, &idle, sizeof idle);
}

void takeSignals() {
    sigset_t none;
    sigemptyset(&none);
    sigprocmask(SIG_SETMASK, &none, nullptr);
}

// The environment is the request's, and a list of its own: nothing of the parent's is left in it.
void takeEnvironment(std::vector<std::string> variables) {
    for (char** own = environ; *own != nullptr; ++own) {
        const std::string_view text = *own;
        const auto begins = [text](std::string_view begin) { return text.starts_with(begin); };
        if (std::any_of(std::begin(kOwnVariables), std::end(kOwnVariables), begins)) variables.emplace_back(text);
    }
    static auto& texts = *new std::vector<std::string>(std::move(variables));
    static auto& list = *new std::vector<char*>;
    for (std::string& text : texts) list.push_back(text.data());
    list.push_back(nullptr);
    environ = list.data();
}

std::string variable(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? "" : value;
}

int finish(cgi::Output& out) {
    replyBegins();
    return out.finish() ? 0 : 1;
}

int refuse(cgi::Status status, int code) {
    cgi::Output out(STDOUT_FILENO);
    cgi::replyFailure(out, status, "", code, "");
    return finish(out);
}

int serveFigures(const Handover& given) {
    if (given.peer != 0 && given.peer != getuid()) return refuse(cgi::Status::kForbidden, ORV_ERR_DENIED);
    const bool json = variable("QUERY_STRING") == "format=json";
    cgi::Output out(STDOUT_FILENO);
    out.text() = "Status: 200 OK\r\nCache-Control: no-store\r\nContent-Type: ";
    out.text() += json ? "application/json; charset=UTF-8\r\n\r\n" : "text/plain; version=0.0.4; charset=utf-8\r\n\r\n";
    out.text() += json ? figuresAsJson(given.figures) : figuresAsText(given.figures);
    return finish(out);
}

int serve(const Handover& given) {
    hasBody = true;  // as long as the block does not say that there is none
    auto variables = parseBlock(given.block);
    if (!variables) return refuse(cgi::Status::kBadRequest, ORV_ERR_PARAMETER);
    takeEnvironment(std::move(*variables));
    const std::string length = variable("CONTENT_LENGTH");
    hasBody = !length.empty() && length != "0";
    const std::string path = variable("SCRIPT_NAME") + variable("PATH_INFO");
    if (path == kStatusPath) return serveFigures(given);

    const cgi::Program* program = cgi::findProgram(path.substr(path.rfind('/') + 1));
    if (program == nullptr) return refuse(cgi::Status::kNotFound, ORV_ERR_MISSING);
    ownSlot->program = static_cast<std::uint32_t>(program - cgi::programs().data()) + 1;
    cgi::settleClientAddress();
    if (!given.slots.admit(given.slot, cgi::clientAddress(), given.limits.perAddress)) {
        return refuse(cgi::Status::kBusy, ORV_ERR_BUSY);
    }
    if (!isIn(given.limits.trusted, given.peer)) unsetenv("REMOTE_USER");
    if (!program->endsWithClient) keepGoing();
    return cgi::serveRequest(*program, replyBegins);
}

}  // namespace

void prepareChildren() {
    on_exit(endReply, nullptr);
}

void serveInChild(const Handover& given) {
    answering = getpid();
    ownSlot = &given.slots.at(given.slot);
    takeSignals();
    leaveProtection();
    takeConnection(given.connection, given.limits);
    int status = 1;
    try {
        status = serve(given);
    } catch (...) {
        status = 1;  // memory is out
    }
    std::exit(status);  // commits what the index still holds, then ends the reply
}

}  // namespace orvel::orveld
