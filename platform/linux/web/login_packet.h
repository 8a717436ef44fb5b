// What libvexo and the process of a conversation (platform/login) say to each other: packets over a local socket, each
// one record, within one build. Towards libvexo a packet is a VEXOLOGIN.
#ifndef VEXO_LINUX_LOGIN_PACKET_H
#define VEXO_LINUX_LOGIN_PACKET_H

#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstring>

#include "vexo/login.h"

namespace vexo {

inline constexpr unsigned long kLongestAnswer = 4096;
inline constexpr std::uint32_t kNoAnswer = ~0U;  // as a size: what was answered cannot be a password
inline constexpr int kConversationSeconds = 60;

enum class LogInWord : std::uint32_t { kBegin, kAnswer, kEnd };

struct LogInPacket {
    LogInWord word;
    std::uint32_t size;  // of the text, or kNoAnswer; where it begins 1, or 0 for a name that no service shall see
    char id[33];         // of the conversation, where it begins
    char user[512];      // where it begins
    char client[64];     // the address as it was given
    char text[kLongestAnswer + 1];  // with a NUL behind it
};

// The descriptors of the process of a conversation.
inline constexpr int kFirstAsker = 3;  // the connection to who begins it
inline constexpr int kRecordFile = 4;  // locked as long as the conversation lasts
inline constexpr int kFolder = 5;      // where its socket goes, named id + kSocketSuffix
inline constexpr const char* kSocketSuffix = ".s";

template <class Packet>
[[nodiscard]] bool sendPacket(int socket, const Packet& packet) {
    ssize_t sent = 0;
    do {
        sent = send(socket, &packet, sizeof packet, MSG_NOSIGNAL);
    } while (sent < 0 && errno == EINTR);
    return sent == static_cast<ssize_t>(sizeof packet);
}

// Waits for a whole packet, `seconds` at most. False at the end of the connection, too.
template <class Packet>
[[nodiscard]] bool receivePacket(int socket, Packet& packet, int seconds) {
    pollfd watched = {socket, POLLIN, 0};
    int ready = 0;
    do {
        ready = poll(&watched, 1, seconds * 1000);
    } while (ready < 0 && errno == EINTR);
    return ready == 1 && recv(socket, &packet, sizeof packet, MSG_DONTWAIT) == static_cast<ssize_t>(sizeof packet);
}

}  // namespace vexo

#endif
