// orvelctl: the library without a web server.
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <string>
#include <vector>

#include "arguments.h"
#include "command.h"

namespace {

struct Command {
    const char* name;
    int (*run)(const std::vector<std::string>&);
    const char* usage;
};

constexpr Command kCommands[] = {
    {"ls", orvel::ctl::ls,
     "ls PATH --user U [--json] [--sort KEY] [--desc] [--offset N] [--limit N]\n"
     "       [--additional WORDS] [--pattern P] [--type dir|file|all]   what a folder holds; \"/\" for the shares"},
    {"why", orvel::ctl::why,
     "why PATH --user U                                  which rule decides what U may do there"},
    {"search", orvel::ctl::search,
     "search FOLDER... --user U [--flat] [--name PATTERNS] [--type dir|file] [--extension LIST]\n"
     "       [--owner U] [--group G] [--mtime-from SECONDS] [--mtime-to SECONDS] [--crtime-...] [--atime-...]\n"
     "       [--size-equal|less|greater BYTES] [--json] [--sort KEY] [--desc] [--offset N] [--limit N]\n"
     "       [--additional WORDS]                        what a search finds"},
    {"index", orvel::ctl::index,
     "index build|update|drop|status SHARE [--full]      the file index of a share; update compares the folders that\n"
     "       changed, --full all of them: what changed within a file does not show on its folder"},
    {"link", orvel::ctl::link,
     "link create PATH --user U [--propose | --password P] [--from DAY] [--until DAY]\n"
     "                                                   publishes a path; a day is 2024-12-31;\n"
     "                                                   --propose draws a password and prints it\n"
     "       link list [--user U], link revoke ID [--user U]"},
    {"sharing", orvel::ctl::sharing,
     "sharing set everybody|admin_only|per_user           who may create links; list shows it\n"
     "       sharing set yes|no --user U, sharing get U, sharing list"},
    {"status", orvel::ctl::status, "status [--json] [--socket PATH]                    what orveld does and has done"},
    {"doctor", orvel::ctl::doctor,
     "doctor [--json]                                     what keeps shares from being there, and what to do about it"},
    {"volumes", orvel::ctl::volumes,
     "volumes [--user U]                                  makes the temporary folders of every volume, as the machine\n"
     "       should at its start; with --user also that user's own"},
};

int usage(const char* reason) {
    if (reason != nullptr) fprintf(stderr, "orvelctl: %s\n", reason);
    fprintf(stderr, "usage: orvelctl [--root FOLDER] COMMAND ...\n");
    for (const Command& command : kCommands) fprintf(stderr, "  %s\n", command.usage);
    fprintf(stderr, "FOLDER of --root is the appliance's system root; else the variable VEXO_ROOT names it.\n");
    return 2;
}

int run(std::vector<std::string> words) {
    if (words.size() >= 2 && words[0] == "--root") {
        setenv("VEXO_ROOT", words[1].c_str(), 1);  // read at the first call of the platform
        words.erase(words.begin(), words.begin() + 2);
    }
    if (words.empty()) return usage(nullptr);
    const std::string name = words[0];
    words.erase(words.begin());
    for (const Command& command : kCommands) {
        if (name == command.name) return command.run(words);
    }
    return usage(("unknown command " + name).c_str());
}

}  // namespace

int main(int argc, char** argv) {
    try {
        const int status = run({argv + 1, argv + argc});
        return fflush(stdout) == 0 ? status : 1;
    } catch (const orvel::ctl::UsageError& error) {
        return usage(error.what());
    } catch (const std::exception& error) {
        fprintf(stderr, "orvelctl: %s\n", error.what());
        return 1;
    }
}
