// The content of a session's file, docs/formats/session.md. Pure.
#ifndef VEXO_LINUX_SESSION_RECORD_H
#define VEXO_LINUX_SESSION_RECORD_H

#include <sys/types.h>

#include <optional>
#include <string>
#include <string_view>

namespace vexo {

struct SessionRecord {
    std::string user;
    std::string address;  // of the log-in, "" unknown
    long long time = 0;   // of the log-in, seconds since the epoch
    // The rest is of a session that a log-in made, which lets its user in by itself.
    bool loggedIn = false;
    uid_t uid = 0;
    std::string name;     // by which the user may know it
    std::string browser;  // what it said of itself
};

// Empty when the user or the address holds what a line cannot: control bytes.
std::optional<std::string> buildSessionRecord(const SessionRecord& record);
// Empty when the user or the time is missing, and for a version that we do not know.
std::optional<SessionRecord> parseSessionRecord(std::string_view text);

// True for what may name a session's file: 32 lower-case hexadecimal digits.
bool isSessionId(std::string_view text);

}  // namespace vexo

#endif
