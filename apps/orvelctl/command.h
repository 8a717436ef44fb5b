// The commands of orvelctl, each in a file of its own name.
#ifndef ORVEL_ORVELCTL_COMMAND_H
#define ORVEL_ORVELCTL_COMMAND_H

#include <string>
#include <string_view>
#include <vector>

struct DIRENTRY_INFO;

namespace orvel::ctl {

// Each takes the words behind its name and returns the exit status: 0, or 1 with the reason on standard error. A wrong
// command line throws UsageError.
int ls(const std::vector<std::string>& words);
int why(const std::vector<std::string>& words);
int index(const std::vector<std::string>& words);
int search(const std::vector<std::string>& words);
int link(const std::vector<std::string>& words);
int sharing(const std::vector<std::string>& words);
int status(const std::vector<std::string>& words);
int doctor(const std::vector<std::string>& words);
int volumes(const std::vector<std::string>& words);

// Takes on the user's identity as a request would. Where this process is not root it stays what it is and says so. 0 or
// a library code.
int becomeUser(const std::string& user, bool needsHome);

// Says on standard error why a path was refused. Returns 1.
int refused(std::string_view path, int code);

// The line of one entry, with the properties that the ADDITIONAL_... bits name; `shares`: also the user's right.
std::string entryRow(const DIRENTRY_INFO& entry, int additional, bool shares);

// `bytes` for a terminal: readable; what would steer it, or turn the direction of text, as "\xNN" for each byte.
std::string terminalText(std::string_view bytes);

}  // namespace orvel::ctl

#endif
