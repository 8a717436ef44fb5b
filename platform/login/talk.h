// The side of a conversation that judges: it asks, and says in the end what came out.
#ifndef VEXO_LOGIN_TALK_H
#define VEXO_LOGIN_TALK_H

#include <chrono>
#include <cstring>
#include <string>
#include <string_view>
#include <utility>

#include "vexo/login.h"
#include "web/login_packet.h"

namespace vexo::login {

using Clock = std::chrono::steady_clock;

// An answer, wiped when it goes.
struct Secret {
    Secret() = default;
    ~Secret() { explicit_bzero(text, sizeof text); }
    Secret(const Secret&) = delete;
    Secret& operator=(const Secret&) = delete;

    char text[kLongestAnswer + 1] = {};
};

class Talk {
 public:
    Talk(int socket, std::string user, std::string address)
        : socket_(socket), user_(std::move(user)), address_(std::move(address)) {}

    [[nodiscard]] const std::string& user() const { return user_; }  // as it was typed
    [[nodiscard]] const std::string& address() const { return address_; }

    // Text that goes with the next question or the outcome.
    void say(std::string_view message);
    // Asks and waits. False when nobody answers, or too much was asked: the conversation is over then. In place of an
    // answer that can be no password, and of every hidden one about a user who may not log in, `answer` is something
    // that nobody knows.
    [[nodiscard]] bool ask(std::string_view question, bool hidden, Secret& answer);
    // Not before `earliest` after the last answer, and then a whole number of steps after it: what judging took does
    // not show. Once for an answer.
    void waitAsForAnyFailure(std::chrono::microseconds earliest);

    // The outcome. Nothing is said after it.
    void finish(const std::string& user);
    void refuse(VEXO_LOGIN_REASON reason);

 private:
    void send(VEXOLOGIN& packet);

    int socket_;
    std::string user_;
    std::string address_;
    std::string messages_;
    int questions_ = 0;
    bool shutOut_ = false;
    bool waited_ = false;
    Clock::time_point answered_ = Clock::now();
};

// Judges the log-in: says an outcome in every case, unless nobody listens any more.
void judgeByPam(Talk& talk);
// Where tests have laid a PAM service of their own, for a root that is not the machine's; nullptr without one.
const char* folderOfTests();
void judgeByShadow(Talk& talk);
// For a name that nobody can have.
void judgeNobody(Talk& talk);

// Says who it is, unless the account, or Samba's, says that he may not.
void admitUser(Talk& talk, const std::string& user);

}  // namespace vexo::login

#endif
