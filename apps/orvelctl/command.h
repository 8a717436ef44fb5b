// The commands of orvelctl, each in a file of its own name, and the table of them.
#ifndef ORVEL_ORVELCTL_COMMAND_H
#define ORVEL_ORVELCTL_COMMAND_H

#include <cstdint>
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
int sweep(const std::vector<std::string>& words);
int volumes(const std::vector<std::string>& words);
int help(const std::vector<std::string>& words);
int completion(const std::vector<std::string>& words);

// The command line of a command, as it is parsed, explained and completed. There is no other list of options.
struct Option {
    const char* name;
    const char* value;       // what stands behind it; "" for a flag. Words with "|" between them are all that it may be
    const char* text;        // what it means
    const char* forms = "";  // the forms that take it, separated by blanks; "" for all
};

struct Form {
    const char* words;  // what stands behind the command: "create PATH". A first word in lower case is the form's name
    const char* text = "";
};

struct Example {
    const char* line;
    const char* text;
};

struct Command {
    const char* name;
    int (*run)(const std::vector<std::string>&);
    const char* summary;
    std::vector<Form> forms;
    std::vector<Option> options = {};
    std::vector<Example> examples = {};
    const char* notes = "";
};

const std::vector<Command>& commands();
// Null when there is no command of that name.
const Command* findCommand(std::string_view name);
// The name of a form, "" when it has none.
std::string nameOf(const Form& form);
// Whether the form called `form` takes the option.
bool takes(const Option& option, std::string_view form);
// Takes the name of a form of the command from the front of `words`. Throws UsageError when it is none of them.
std::string takeForm(std::string_view command, std::vector<std::string>& words);

// Takes on the user's identity as a request would. Where this process is not root it stays what it is and says so. 0 or
// a library code.
int becomeUser(const std::string& user, bool needsHome);

// What orveld at `socket` says of itself, as JSON. False with `error` when nobody answers, or with a refusal.
bool askFigures(const std::string& socket, std::string& body, std::string& error);

// Says on standard error why a path was refused. Returns 1.
int refused(std::string_view path, int code);

// The line of one entry, with the properties that the ADDITIONAL_... bits name; `shares`: also the user's right.
std::string entryRow(const DIRENTRY_INFO& entry, int additional, bool shares);

// `bytes` for a terminal: readable; what would steer it, or turn the direction of text, as "\xNN" for each byte.
std::string terminalText(std::string_view bytes);
// Local time to the minute, or to the second; "?" for what is no time.
std::string timeText(int64_t seconds, bool exact = false);

}  // namespace orvel::ctl

#endif
