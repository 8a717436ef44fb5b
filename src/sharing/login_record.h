// One line of the login-record file. Pure.
#ifndef ORVEL_SHARING_LOGIN_RECORD_H
#define ORVEL_SHARING_LOGIN_RECORD_H

#include <cstddef>
#include <string>
#include <string_view>

namespace orvel {

// The fields in their order; views of the line they were read from.
struct LoginRecord {
    std::string_view address;
    std::string_view user;
    std::string_view session;
    std::string_view loginTime;   // seconds of uptime
    std::string_view accessTime;  // seconds of uptime
    std::string_view position;
    std::string_view neverExpires;  // "0": the record expires
    std::string_view link;
    std::string_view line;  // all of it with its end, where that is how the record would be written; whoever changes a
                            // field empties it
};

// Longest line, without its end, that a check and a look-up read; a longer one is no record.
constexpr std::size_t kLongestCheckedLine = 747;
constexpr std::size_t kLongestLookedUpLine = 1023;

// Takes the next line of at most `longest` bytes that is a record off `text`; the ones before it are passed over.
// False when there is none.
bool nextLoginRecord(std::string_view& text, std::size_t longest, LoginRecord& record);
// The same without the short cut for lines that are as they are written.
bool nextLoginRecordOfAnyForm(std::string_view& text, std::size_t longest, LoginRecord& record);

// Appends the line of a record, its end included.
void appendLoginRecord(const LoginRecord& record, std::string& out);

// What strtol, base 10, makes of a field.
long numberOf(std::string_view field);

// Was a session last used within `timeout` seconds? The difference is taken as a signed 32-bit number (kept): after a
// restart of the machine, times ahead of the uptime count as fresh.
bool isFresh(long accessTime, long now, long timeout);

}  // namespace orvel

#endif
