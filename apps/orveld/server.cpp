#include "server.h"

#include <fcntl.h>
#include <sys/epoll.h>
#include <sys/resource.h>
#include <sys/signalfd.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <ctime>

#include "child.h"
#include "orvel/error_state.h"
#include "program/program.h"
#include "reply.h"
#include "scgi.h"
#include "service_manager.h"
#include "vexo/process.h"

namespace orvel::orveld {
namespace {

// What events belong to, where it is not a connection; those are numbered from kFirstNumber on.
constexpr std::uint64_t kListener = 0;
constexpr std::uint64_t kSignals = 1;
constexpr std::uint64_t kFirstNumber = 2;
constexpr int kEvents = 64;
constexpr int kAcceptedAtOnce = 64;
constexpr rlim_t kMostDescriptors = 65536;
constexpr size_t kSpareDescriptors = 32;
constexpr std::chrono::seconds kHeaderTime{5};
constexpr std::chrono::seconds kWaitingTime{10};
constexpr std::chrono::seconds kLingerTime{1};
constexpr size_t kMostDiscarded = size_t{4} << 20;
constexpr std::chrono::seconds kStopTime{60};
constexpr std::chrono::seconds kWarmTime{1};

std::string wholeReply(cgi::Status status, int code) {
    cgi::Output out(-1);
    cgi::replyFailure(out, status, "", code, "");
    return out.text();
}

// Descriptors for so many connections as the system lets us have.
size_t raiseDescriptors() {
    rlimit limit = {};
    if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return 0;
    limit.rlim_cur = std::min(limit.rlim_max, kMostDescriptors);
    setrlimit(RLIMIT_NOFILE, &limit);
    getrlimit(RLIMIT_NOFILE, &limit);
    return static_cast<size_t>(limit.rlim_cur);
}

}  // namespace

bool Server::prepare() {
    sigset_t taken;
    sigemptyset(&taken);
    for (const int signal : {SIGCHLD, SIGTERM, SIGINT, SIGHUP}) sigaddset(&taken, signal);
    sigprocmask(SIG_BLOCK, &taken, nullptr);
    std::signal(SIGPIPE, SIG_IGN);
    signals_ = signalfd(-1, &taken, SFD_NONBLOCK | SFD_CLOEXEC);
    epoll_ = epoll_create1(EPOLL_CLOEXEC);
    if (signals_ < 0 || epoll_ < 0 || !slots_.map() || !watch(signals_, kSignals, EPOLLIN, false)) return false;
    limits_ = readLimits();
    const size_t descriptors = raiseDescriptors();
    mostLingering_ = limits_.children + limits_.queued;
    const size_t others = 2 * mostLingering_ + kSpareDescriptors;
    mostReading_ = descriptors > 2 * others ? descriptors - others : descriptors / 2;
    lastNumber_ = kFirstNumber - 1;
    busy_ = wholeReply(cgi::Status::kBusy, ORV_ERR_BUSY);
    forbidden_ = wholeReply(cgi::Status::kForbidden, ORV_ERR_DENIED);
    malformed_ = wholeReply(cgi::Status::kBadRequest, ORV_ERR_PARAMETER);
    figures_.started = static_cast<std::uint64_t>(time(nullptr));
    figures_.programs.resize(cgi::programs().size());
    warmed_ = Clock::now();
    listenAgain(true);
    return listening_;
}

std::vector<int> Server::descriptors() const {
    return {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO, listener_, epoll_, signals_};
}

void Server::run() {
    notifyManager("READY=1");
    epoll_event events[kEvents];
    while (!stopping_ || !(reading_.empty() && waiting_.empty() && served_.empty() && lingering_.empty())) {
        const int count = epoll_wait(epoll_, events, kEvents, patience());
        for (int i = 0; i < count; ++i) handle(events[i].data.u64, events[i].events);
        expire();
        startWaiting();
        if (stopping_ && Clock::now() >= stopBy_) break;
    }
    reap();
    for (const auto& [child, number] : children_) kill(child, SIGTERM);
    std::fprintf(stderr, "orveld: ended, %zu requests cut off\n", children_.size());
}

void Server::handle(std::uint64_t number, std::uint32_t events) {
    if (number == kListener) return acceptSome();
    if (number == kSignals) return readSignals();
    if (const auto at = reading_.find(number); at != reading_.end()) return readMore(at);
    if (const auto at = lingering_.find(number); at != lingering_.end()) return discardSome(at);
    if ((events & (EPOLLHUP | EPOLLERR)) == 0) return;
    if (const auto at = waiting_.find(number); at != waiting_.end()) {
        ++figures_.abandoned;
        return drop(waiting_, at);
    }
    if (const auto at = served_.find(number); at != served_.end()) hungUp(at->second);
}

bool Server::watch(int fd, std::uint64_t number, std::uint32_t events, bool again) const {
    epoll_event event = {};
    event.events = events;
    event.data.u64 = number;
    return epoll_ctl(epoll_, again ? EPOLL_CTL_MOD : EPOLL_CTL_ADD, fd, &event) == 0;
}

void Server::listenAgain(bool on) {
    if (on == listening_ || listener_ < 0) return;
    if (!on) epoll_ctl(epoll_, EPOLL_CTL_DEL, listener_, nullptr);
    listening_ = on && watch(listener_, kListener, EPOLLIN, false);
}

void Server::acceptSome() {
    for (int i = 0; i < kAcceptedAtOnce; ++i) {
        const int fd = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
        if (fd >= 0) {
            acceptOne(fd);
        } else if (errno == EMFILE || errno == ENFILE || errno == ENOBUFS || errno == ENOMEM) {
            if (!makeRoom()) return listenAgain(false);  // until something ends; requests wait in the socket
        } else if (errno != ECONNABORTED && errno != EINTR) {
            return;
        }
    }
}

// Whoever has its answer goes first, then who has been slow for longest.
bool Server::makeRoom() {
    if (!lingering_.empty()) {
        drop(lingering_, lingering_.begin());
        return true;
    }
    if (reading_.empty()) return false;
    dropSlowest();
    return true;
}

void Server::dropSlowest() {
    ++figures_.malformed;
    drop(reading_, reading_.begin());
}

void Server::acceptOne(int fd) {
    ucred peer = {};
    socklen_t size = sizeof peer;
    const bool known = getsockopt(fd, SOL_SOCKET, SO_PEERCRED, &peer, &size) == 0;
    Connection connection;
    connection.fd = fd;
    connection.peer = peer.uid;
    connection.since = Clock::now();
    const auto at = reading_.emplace(++lastNumber_, std::move(connection)).first;
    if (!known || (peer.uid != 0 && peer.uid != getuid() && !isIn(limits_.speakers, peer.uid))) {
        return refuse(reading_, at, forbidden_);
    }
    if (reading_.size() > mostReading_) dropSlowest();
    readMore(at);
}

void Server::readMore(Connections::iterator at) {
    Connection& connection = at->second;
    char piece[kLongestBlock];
    while (connection.length == 0 || connection.block.size() < connection.length) {
        const size_t wanted = (connection.length == 0 ? kShortestBlock : connection.length) - connection.block.size();
        const ssize_t got = recv(connection.fd, piece, wanted, MSG_DONTWAIT);
        if (got < 0 && errno == EINTR) continue;
        if (got < 0 && errno == EAGAIN) {
            if (!connection.watched) connection.watched = watch(connection.fd, at->first, EPOLLIN, false);
            return;
        }
        if (got <= 0) {
            ++figures_.malformed;
            return drop(reading_, at);
        }
        connection.block.append(piece, static_cast<size_t>(got));
        if (connection.length == 0 && blockLength(connection.block, connection.length) == BlockState::kBad) {
            ++figures_.malformed;
            return refuse(reading_, at, malformed_);
        }
    }
    begin(at);
}

void Server::begin(Connections::iterator at) {
    if (waiting_.empty() && served_.size() < limits_.children) return start(reading_, at);
    if (waiting_.size() >= limits_.queued) {
        ++figures_.refused;
        return refuse(reading_, at, busy_);
    }
    at->second.watched = watch(at->second.fd, at->first, 0, at->second.watched);  // whether the client goes away
    waiting_.insert(reading_.extract(at));
}

void Server::startWaiting() {
    while (!waiting_.empty() && served_.size() < limits_.children) start(waiting_, waiting_.begin());
}

void Server::start(Connections& from, Connections::iterator at) {
    keepWarm();
    Connection& connection = at->second;
    const auto slot = slots_.take();
    figures_.reading = reading_.size() - (&from == &reading_ ? 1 : 0);
    figures_.queued = waiting_.size() - (&from == &waiting_ ? 1 : 0);
    figures_.running = served_.size();
    const pid_t child = slot ? fork() : -1;
    if (child == 0) {
        serveInChild({connection.fd, connection.block, connection.peer, slots_, *slot, limits_, figures_});
    }
    if (child < 0) {
        std::fprintf(stderr, "orveld: request %llu: no process: %s\n", static_cast<unsigned long long>(at->first),
                     std::strerror(errno));
        if (slot) slots_.give(*slot);
        ++figures_.refused;
        return refuse(from, at, busy_);
    }
    connection.child = child;
    connection.slot = *slot;
    connection.block = std::string();
    connection.watched = watch(connection.fd, at->first, 0, connection.watched);
    children_.emplace(child, at->first);
    served_.insert(from.extract(at));
}

// What fits into the empty buffer of the socket; nobody is waited for.
void Server::refuse(Connections& from, Connections::iterator at, const std::string& reply) {
    static_cast<void>(send(at->second.fd, reply.data(), reply.size(), MSG_DONTWAIT | MSG_NOSIGNAL));
    shutdown(at->second.fd, SHUT_WR);
    linger(from, at);
}

// A web server that still sends a body when the connection is closed may lose the reply: it gets a while to see it, in
// which no child and no place of its client's is held.
void Server::linger(Connections& from, Connections::iterator at) {
    if (lingering_.size() >= mostLingering_) drop(lingering_, lingering_.begin());
    auto node = from.extract(at);
    node.key() = ++lastNumber_;
    Connection& connection = node.mapped();
    connection.since = Clock::now();
    connection.watched = watch(connection.fd, node.key(), EPOLLIN, connection.watched);
    const auto kept = lingering_.insert(std::move(node)).position;
    if (!kept->second.watched) drop(lingering_, kept);
}

void Server::discardSome(Connections::iterator at) {
    static char piece[kLongestBlock];
    const ssize_t got = recv(at->second.fd, piece, sizeof piece, MSG_DONTWAIT);
    if (got < 0 && (errno == EAGAIN || errno == EINTR)) return;
    if (got > 0) at->second.discarded += static_cast<size_t>(got);
    if (got <= 0 || at->second.discarded > kMostDiscarded) drop(lingering_, at);
}

void Server::drop(Connections& from, Connections::iterator at) {
    if (at->second.watched) epoll_ctl(epoll_, EPOLL_CTL_DEL, at->second.fd, nullptr);
    close(at->second.fd);
    from.erase(at);
    if (!stopping_) listenAgain(true);
}

// A child that has begun to reply sees by itself that nobody reads.
void Server::hungUp(Connection& connection) {
    epoll_ctl(epoll_, EPOLL_CTL_DEL, connection.fd, nullptr);
    connection.watched = false;
    if (slots_.at(connection.slot).state.load() != static_cast<std::uint32_t>(SlotState::kServing)) return;
    connection.abandoned = true;
    kill(connection.child, SIGTERM);
}

void Server::readSignals() {
    signalfd_siginfo info;
    while (read(signals_, &info, sizeof info) == sizeof info) {
        if (info.ssi_signo == SIGHUP) reload();
        if (info.ssi_signo == SIGTERM || info.ssi_signo == SIGINT) stop();
    }
    reap();
}

void Server::reap() {
    int status = 0;
    for (pid_t child = 0; (child = waitpid(-1, &status, WNOHANG)) > 0;) {
        const auto known = children_.find(child);
        if (known == children_.end()) continue;
        const auto at = served_.find(known->second);
        account(at->second, at->first, status);
        const bool bodyLeft = slots_.at(at->second.slot).bodyLeft.load() != 0;
        slots_.give(at->second.slot);
        children_.erase(known);
        if (bodyLeft && !at->second.abandoned) {
            linger(served_, at);
        } else {
            drop(served_, at);
        }
    }
}

void Server::account(const Connection& connection, std::uint64_t number, int status) {
    const Slot& slot = slots_.at(connection.slot);
    const size_t program = slot.program.load();
    const bool named = program >= 1 && program <= figures_.programs.size();
    if (connection.abandoned) {
        ++figures_.abandoned;
    } else if (WIFSIGNALED(status)) {
        ++figures_.crashed;
        const std::string name = named ? std::string(cgi::programs()[program - 1].name) : "unknown program";
        std::fprintf(stderr, "orveld: request %llu (%s, process %d) was ended by signal %d\n",
                     static_cast<unsigned long long>(number), name.c_str(), connection.child, WTERMSIG(status));
    } else if (slot.state.load() == static_cast<std::uint32_t>(SlotState::kRefused)) {
        ++figures_.refused;
    } else if (slot.state.load() == static_cast<std::uint32_t>(SlotState::kAnswered) && named) {
        ProgramFigures& figures = figures_.programs[program - 1];
        const auto since = connection.since.time_since_epoch();
        const auto now = Clock::now().time_since_epoch();
        const std::chrono::nanoseconds answered(slot.answered.load());
        figures.durations.add(std::clamp<std::chrono::nanoseconds>(answered, since, now) - since);
        ++figures.served;
        ++figures_.served;
    }
}

int Server::patience() const {
    auto by = Clock::time_point::max();
    if (!reading_.empty()) by = std::min(by, reading_.begin()->second.since + kHeaderTime);
    if (!waiting_.empty()) by = std::min(by, waiting_.begin()->second.since + kHeaderTime + kWaitingTime);
    if (!lingering_.empty()) by = std::min(by, lingering_.begin()->second.since + kLingerTime);
    if (stopping_) by = std::min(by, stopBy_);
    if (by == Clock::time_point::max()) return -1;
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(by - Clock::now());
    return static_cast<int>(std::max<std::int64_t>(0, left.count()));
}

void Server::expire() {
    const auto now = Clock::now();
    while (!lingering_.empty() && lingering_.begin()->second.since + kLingerTime <= now) {
        drop(lingering_, lingering_.begin());
    }
    while (!reading_.empty() && reading_.begin()->second.since + kHeaderTime <= now) dropSlowest();
    while (!waiting_.empty() && waiting_.begin()->second.since + kHeaderTime + kWaitingTime <= now) {
        ++figures_.refused;
        refuse(waiting_, waiting_.begin(), busy_);
    }
}

void Server::reload() {
    notifyReloading();
    limits_ = readLimits();
    warmed_ = {};
    keepWarm();
    notifyManager("READY=1");
    std::fprintf(stderr, "orveld: settings read again\n");
}

// No connection is accepted any more; those that are here are served.
void Server::stop() {
    if (stopping_) {
        stopBy_ = Clock::now();
        return;
    }
    notifyManager("STOPPING=1");
    stopping_ = true;
    stopBy_ = Clock::now() + kStopTime;
    listenAgain(false);
    if (!ownSocket_.empty()) unlink(ownSocket_.c_str());
    close(listener_);
    listener_ = -1;
}

// What every child would read from files is read here when it changed, so that children find it in their memory. They
// check it again by the versions of the files.
void Server::keepWarm() {
    const auto now = Clock::now();
    if (now - warmed_ < kWarmTime) return;
    VEXOWarm();
    closelog();  // what it had to say may have opened a connection
    warmed_ = now;
}

}  // namespace orvel::orveld
