// The process that stays: it accepts connections, reads each request's header block, and forks a child for it when the
// block is whole. It interprets nothing of a request but the length of that block.
#ifndef ORVEL_ORVELD_SERVER_H
#define ORVEL_ORVELD_SERVER_H

#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <map>
#include <string>
#include <unordered_map>
#include <vector>

#include "figures.h"
#include "load_limits.h"
#include "slots.h"

namespace orvel::orveld {

class Server {
 public:
    // `listener`: non-blocking; `ownSocket`: its path, to be removed at the end, "" for one that was handed over.
    Server(int listener, std::string ownSocket) : listener_(listener), ownSocket_(std::move(ownSocket)) {}
    Server(const Server&) = delete;
    Server& operator=(const Server&) = delete;

    // False with errno.
    [[nodiscard]] bool prepare();
    // What this process has open once it is prepared.
    [[nodiscard]] std::vector<int> descriptors() const;
    // Until a signal ends it.
    void run();

 private:
    using Clock = std::chrono::steady_clock;

    struct Connection {
        int fd = -1;
        uid_t peer = 0;
        Clock::time_point since;
        std::string block;
        size_t length = 0;  // of the block; 0: not known yet
        bool watched = false;
        pid_t child = 0;
        size_t slot = 0;
        bool abandoned = false;
        size_t discarded = 0;
    };
    using Connections = std::map<std::uint64_t, Connection>;  // by the number of the request: the oldest first

    [[nodiscard]] bool watch(int fd, std::uint64_t number, std::uint32_t events, bool again) const;
    [[nodiscard]] int patience() const;
    void handle(std::uint64_t number, std::uint32_t events);

    void acceptSome();
    void acceptOne(int fd);
    void listenAgain(bool on);
    bool makeRoom();
    void dropSlowest();
    void readMore(Connections::iterator at);
    void begin(Connections::iterator at);
    void startWaiting();
    void start(Connections& from, Connections::iterator at);
    void refuse(Connections& from, Connections::iterator at, const std::string& reply);
    void linger(Connections& from, Connections::iterator at);
    void discardSome(Connections::iterator at);
    void drop(Connections& from, Connections::iterator at);
    void hungUp(Connection& connection);

    void readSignals();
    void reap();
    void account(const Connection& connection, std::uint64_t number, int status);
    void expire();
    void reload();
    void stop();
    void keepWarm();

    int listener_;
    std::string ownSocket_;
    int epoll_ = -1;
    int signals_ = -1;
    bool listening_ = false;
    bool stopping_ = false;
    Clock::time_point stopBy_;
    Clock::time_point warmed_;
    size_t mostReading_ = 0;
    size_t mostLingering_ = 0;
    std::uint64_t lastNumber_ = 0;
    Limits limits_;
    Slots slots_;
    Figures figures_;
    Connections reading_;  // whose block is not whole
    Connections waiting_;  // for a child
    Connections served_;
    Connections lingering_;  // answered, with a body that nobody has read
    std::unordered_map<pid_t, std::uint64_t> children_;
    std::string busy_, forbidden_, malformed_;  // whole replies
};

}  // namespace orvel::orveld

#endif
