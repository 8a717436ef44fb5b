// orvelctl: the library without a web server.
#include <sqlite3.h>

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>
#include <vector>

#include "arguments.h"
#include "command.h"

namespace {

using orvel::ctl::Command;

int usageError(const std::string& reason, const std::string& command) {
    fprintf(stderr, "orvelctl: %s\n", orvel::ctl::terminalText(reason).c_str());
    const bool known = orvel::ctl::findCommand(command) != nullptr;
    fprintf(stderr, "\"orvelctl help%s\" says more\n", known ? (" " + command).c_str() : "");
    return 2;
}

// Whether help is asked for: "--help" where an option may stand, and not as the value of another one.
bool asksForHelp(const Command& command, const std::vector<std::string>& words) {
    for (size_t i = 0; i < words.size(); ++i) {
        if (words[i] == "--help") return true;
        for (const orvel::ctl::Option& option : command.options) {
            if (words[i] == option.name && *option.value != '\0') ++i;
            if (i >= words.size()) return false;
        }
    }
    return false;
}

int run(std::vector<std::string> words, std::string& name) {
    if (words.size() >= 2 && words[0] == "--root") {
        setenv("VEXO_ROOT", words[1].c_str(), 1);  // read at the first call of the platform
        words.erase(words.begin(), words.begin() + 2);
    }
    if (words.empty()) return usageError("a command is missing", "");
    name = words[0];
    words.erase(words.begin());
    if (name == "--help" || name == "-h") return orvel::ctl::help(words);
    if (name == "--version") return printf("orvelctl %s\n", ORVEL_VERSION), 0;
    const Command* command = orvel::ctl::findCommand(name);
    if (command == nullptr) return usageError("unknown command " + name, "");
    return asksForHelp(*command, words) ? orvel::ctl::help({name}) : command->run(words);
}

}  // namespace

int main(int argc, char** argv) {
    sqlite3_config(SQLITE_CONFIG_MEMSTATUS, 0);  // nobody reads the count, which takes a lock for each allocation
    std::string name;
    try {
        const int status = run({argv + 1, argv + argc}, name);
        return fflush(stdout) == 0 ? status : 1;
    } catch (const orvel::ctl::UsageError& error) {
        return usageError(error.what(), name);
    } catch (const std::exception& error) {
        fprintf(stderr, "orvelctl: %s\n", error.what());
        return 1;
    }
}
