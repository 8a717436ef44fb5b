#include "talk.h"

#include <algorithm>
#include <cstdio>
#include <memory>
#include <thread>

#include "base/owner.h"
#include "base/random.h"
#include "vexo/user.h"

namespace vexo::login {
namespace {

constexpr int kMostQuestions = 16;
constexpr std::chrono::microseconds kStep{500000};

// A user who is there, and may not log in.
bool isShutOut(const std::string& user) {
    std::unique_ptr<VEXOUSER, orvel::Releaser<VEXOUserFree>> record;
    return VEXOUserGet(user.c_str(), orvel::acquire(record)) >= 0 && VEXOLogInAllowed(user.c_str()) == VEXO_LOGIN_WRONG;
}

template <size_t size>
void copyCut(std::string_view text, char (&field)[size]) {
    field[text.copy(field, size - 1)] = '\0';
}

}  // namespace

void Talk::say(std::string_view message) {
    if (!messages_.empty()) messages_ += '\n';
    messages_ += message;
}

void Talk::send(VEXOLOGIN& packet) {
    copyCut(messages_, packet.messages);
    messages_.clear();
    static_cast<void>(sendPacket(socket_, packet));
}

bool Talk::ask(std::string_view question, bool hidden, Secret& answer) {
    if (++questions_ > kMostQuestions) return false;
    VEXOLOGIN packet = {};
    packet.step = VEXO_LOGIN_ASK;
    packet.hidden = static_cast<int>(hidden);
    copyCut(question, packet.text);
    send(packet);
    LogInPacket heard;
    if (!receivePacket(socket_, heard, kConversationSeconds)) return false;
    answered_ = Clock::now();
    waited_ = false;
    // Asked for now and not before: what the name services take for it must not show.
    if (questions_ == 1) shutOut_ = isShutOut(user_);
    const bool counts = heard.size <= kLongestAnswer && !(hidden && shutOut_);
    const std::string unknown = counts ? std::string() : orvel::draw<32>();
    copyCut(counts ? std::string_view(heard.text, heard.size) : std::string_view(unknown), answer.text);
    explicit_bzero(&heard, sizeof heard);
    return counts || !unknown.empty();
}

void Talk::waitAsForAnyFailure(std::chrono::microseconds earliest) {
    if (waited_) return;
    waited_ = true;
    const auto taken = std::chrono::duration_cast<std::chrono::microseconds>(Clock::now() - answered_);
    const auto least = std::max(earliest, kStep);
    const auto steps = taken <= least ? 0 : (taken - least) / kStep + 1;
    std::this_thread::sleep_until(answered_ + least + steps * kStep);
}

void Talk::finish(const std::string& user) {
    VEXOLOGIN packet = {};
    packet.step = VEXO_LOGIN_DONE;
    if (user.size() >= sizeof packet.user) return refuse(VEXO_LOGIN_SERVICE);
    copyCut(user, packet.user);
    send(packet);
}

void Talk::refuse(VEXO_LOGIN_REASON reason) {
    VEXOLOGIN packet = {};
    packet.step = VEXO_LOGIN_REFUSED;
    packet.reason = reason;
    copyCut(user_, packet.user);
    // What a service says of a name that somebody only typed may be true of some names alone.
    if (reason == VEXO_LOGIN_WRONG) messages_.clear();
    send(packet);
}

}  // namespace vexo::login
