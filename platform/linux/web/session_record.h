// The content of a session's file, docs/formats/session.md. Pure.
#ifndef VEXO_LINUX_SESSION_RECORD_H
#define VEXO_LINUX_SESSION_RECORD_H

#include <optional>
#include <string>
#include <string_view>

namespace vexo {

struct SessionRecord {
    std::string user;
    std::string address;  // of the log-in, "" unknown
    long long time = 0;   // of the log-in, seconds since the epoch
};

// Empty when the user or the address holds what a line cannot: control bytes.
std::optional<std::string> buildSessionRecord(const SessionRecord& record);
// Empty when the user or the time is missing.
std::optional<SessionRecord> parseSessionRecord(std::string_view text);

// True for what may name a session's file: 32 lower-case hexadecimal digits.
bool isSessionId(std::string_view text);

}  // namespace vexo

#endif
