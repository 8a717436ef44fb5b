// The conversations that are held, in /run/vexo/logins: for each a file ID, locked by its process and naming its
// client, and the socket ID.s at which it takes answers.
#ifndef VEXO_LINUX_LOGIN_CONVERSATIONS_H
#define VEXO_LINUX_LOGIN_CONVERSATIONS_H

#include <string>

#include "io/file_io.h"

namespace vexo {

enum class Conversation { kStarted, kTooMany, kFailed };

// Starts one. `id` and `connection`, over which its process waits for the first packet, are filled on success; errno
// on failure.
[[nodiscard]] Conversation startConversation(const std::string& client, std::string& id, Descriptor& connection);

// A connection to the process of conversation `id`; empty when there is none.
[[nodiscard]] Descriptor joinConversation(const std::string& id);

}  // namespace vexo

#endif
