// A running orveld, and requests to it as a web server makes them.
#ifndef ORVEL_TESTS_APPS_ORVELD_H
#define ORVEL_TESTS_APPS_ORVELD_H

#include <json/value.h>
#include <sys/types.h>

#include <string>
#include <vector>

#include "apps/program.h"

namespace support {

// The end of a connection that a web server holds.
class Connection {
 public:
    explicit Connection(const std::string& socket);
    ~Connection() { hangUp(); }
    Connection(Connection&& other) noexcept;
    Connection& operator=(Connection&&) = delete;

    // Sends what the other side takes. False when it is gone.
    bool send(const std::string& bytes) const;
    void endBody() const;
    // All that comes until the other side closes; waits at most half a minute, after which the test has failed.
    [[nodiscard]] std::string receive() const;
    // Something has come, or the other side has closed.
    [[nodiscard]] bool hasReply() const;
    void hangUp();

 private:
    int fd_;
};

class Orveld {
 public:
    // Starts it on the socket of the fixture's system root with `settings` (they stay in force when the fixture writes
    // its file again); our own log-ins are believed. `kept`: through the keeper, which starts it again.
    explicit Orveld(const Variables& settings = {}, const Variables& environment = {}, bool kept = false);
    ~Orveld() { end(); }
    Orveld(const Orveld&) = delete;
    Orveld& operator=(const Orveld&) = delete;

    [[nodiscard]] const std::string& socket() const { return socket_; }
    [[nodiscard]] Connection connect() const { return Connection(socket_); }
    // A whole request.
    [[nodiscard]] std::string ask(const Variables& variables, const std::string& body = "") const;
    [[nodiscard]] Json::Value figures() const;
    // The process that serves (not the keeper), and its children.
    [[nodiscard]] pid_t process() const;
    [[nodiscard]] std::vector<pid_t> children() const;
    // Those of its children that wait for the body of their request.
    [[nodiscard]] std::vector<pid_t> readers() const;
    // SIGTERM, and waits for the end; its exit status.
    int end();

 private:
    std::string socket_;
    pid_t started_ = -1;
    bool kept_;
};

// The header block of a request of `user` to a program.
std::string blockOf(const Variables& variables);
Variables requestOf(const std::string& program, const std::string& user, const std::string& query,
                    const std::string& method = "GET", const Variables& more = {});

}  // namespace support

#endif
