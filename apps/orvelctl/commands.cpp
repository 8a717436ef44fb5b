#include <cctype>

#include "arguments.h"
#include "command.h"

namespace orvel::ctl {
namespace {

constexpr const char* kWords = "real_path|size|owner|time|perm|type|mount_point_type|volume_status|sync_share|icon";
constexpr const char* kSearchWords = "real_path|size|owner|time|perm|type|icon";
constexpr const char* kColumns = "name|size|user|group|mtime|atime|ctime|crtime|posix|type";
constexpr const char* kSearchColumns = "name|ppath|size|user|group|mtime|atime|ctime|crtime|posix|type";

const std::vector<Command>& table() {
    static const std::vector<Command> all = {
        {.name = "ls",
         .run = ls,
         .summary = "what a folder holds, and which shares a user has",
         .forms = {{"PATH", "PATH is a folder as users name it, /photo/2012; / lists the home and the shares"}},
         .options = {{"--user", "USER", "as whom; needed"},
                     {"--sort", kColumns, "order, folders first; by name without it"},
                     {"--desc", "", "the other way round"},
                     {"--offset", "N", "leave out the first N"},
                     {"--limit", "N", "at most N; 0, the default, for all"},
                     {"--pattern", "PATTERNS", "names to show: patterns with * and ?, separated by commas"},
                     {"--type", "dir|file|all", "folders, files or both"},
                     {"--additional", kWords, "what to show of each, words separated by commas"},
                     {"--json", "", "as the program list answers it"}},
         .examples = {{"orvelctl ls / --user alice", "the shares that alice sees, with her right in each"},
                      {"orvelctl ls /photo --user alice --sort size --desc --limit 10", "the ten largest files"}}},
        {.name = "why",
         .run = why,
         .summary = "which rule decides what a user may do at a path",
         .forms = {{"PATH"}},
         .options = {{"--user", "USER", "about whom; needed"}},
         .examples = {{"orvelctl why /projects --user bob", "which list of the share names bob, and what follows"}}},
        {.name = "search",
         .run = search,
         .summary = "what a search finds",
         .forms = {{"FOLDER...", "all that is asked for must hold; at least one thing must be"}},
         .options = {{"--user", "USER", "as whom; needed"},
                     {"--flat", "", "only what lies directly in the folders"},
                     {"--name", "PATTERNS", "any of these, separated by commas; one without wildcards stands anywhere"},
                     {"--type", "dir|file", "folders or files"},
                     {"--extension", "LIST", "any of these, without the dot, separated by commas"},
                     {"--owner", "USER", "whose it is"},
                     {"--group", "GROUP", "which group it belongs to"},
                     {"--mtime-from", "SECONDS", "modified then or later; seconds since 1970"},
                     {"--mtime-to", "SECONDS", "modified before"},
                     {"--crtime-from", "SECONDS", "created then or later"},
                     {"--crtime-to", "SECONDS", "created before"},
                     {"--atime-from", "SECONDS", "read then or later"},
                     {"--atime-to", "SECONDS", "read before"},
                     {"--size-equal", "BYTES", "as large, within 5 per cent"},
                     {"--size-less", "BYTES", "smaller"},
                     {"--size-greater", "BYTES", "larger"},
                     {"--sort", kSearchColumns, "order; by name without it"},
                     {"--desc", "", "the other way round"},
                     {"--offset", "N", "leave out the first N"},
                     {"--limit", "N", "at most N; 0, the default, for all"},
                     {"--additional", kSearchWords, "what to show of each, words separated by commas"},
                     {"--json", "", "as a page of the program search"}},
         .examples = {{"orvelctl search /photo /music --user alice --name '*.jpg,track' --size-greater 1000000",
                       "pictures, and what is called track, above a megabyte"},
                      {"orvelctl search /home --user alice --mtime-from $(date -d yesterday +%s)",
                       "what changed in alice's home since yesterday"}},
         .notes =
             "Standard error says for each share whether its index or a walk answered. An interrupt ends the search "
             "with what it has found."},
        {.name = "index",
         .run = index,
         .summary = "the file index of a share, which makes searches fast",
         .forms = {{"build SHARE", "makes it anew"},
                   {"update SHARE", "compares the folders that changed"},
                   {"refresh", "brings those of all shares up to date, and makes those that are missing"},
                   {"watch SHARE", "keeps it in step with the files until it is ended; builds one that is missing"},
                   {"drop SHARE", "removes it"},
                   {"status SHARE", "how large and how old it is; exit status 1 when there is none"}},
         .options = {{"--full", "", "compare all folders: what changed within a file does not show on its folder",
                      "update refresh"},
                     {"--every", "SECONDS", "update so often where the kernel reports no changes; 300 without it",
                      "watch"}},
         .examples = {{"orvelctl index build photo", "once"},
                      {"orvelctl index update photo", "regularly"},
                      {"orvelctl index watch photo", "as a service: orvel-index@photo"}},
         .notes = "All but status need root. A share is indexed when its definition says \"vexo:index = yes\"."},
        {.name = "link",
         .run = link,
         .summary = "public links",
         .forms = {{"create PATH", "publishes a file or folder; prints the link's id and address"},
                   {"list", "the links, of everybody or of one user"},
                   {"revoke ID", "ends a link"}},
         .options = {{"--user", "USER", "whose; create needs it"},
                     {"--password", "PASSWORD", "what visitors must give", "create"},
                     {"--propose", "", "draws a password and prints it", "create"},
                     {"--from", "DAY", "from when on, 2024-12-31 or seconds since 1970; needs --until", "create"},
                     {"--until", "DAY", "the last day", "create"},
                     {"--receive", "NAME",
                      "visitors send files into a new folder of this name in PATH, and see nothing", "create"},
                     {"--downloads", "COUNT", "how many downloads may be begun; any number without it", "create"}},
         .examples = {{"orvelctl link create /photo/2012 --user alice --propose --until 2031-12-31",
                       "a folder behind a new password, to the end of that day"},
                      {"orvelctl link list --user alice", ""}}},
        {.name = "sharing",
         .run = sharing,
         .summary = "who may make public links",
         .forms = {{"set everybody|admin_only|per_user", "everybody, administrators, or those who are chosen"},
                   {"set yes|no", "whether --user is chosen; counts with per_user"},
                   {"get USER", "whether the user may"},
                   {"list", "the setting and the choices"}},
         .options = {{"--user", "USER", "whom the choice is about", "set"}},
         .examples = {{"orvelctl sharing set per_user", ""}, {"orvelctl sharing set yes --user bob", ""}}},
        {.name = "status",
         .run = status,
         .summary = "what orveld does and has done",
         .forms = {{""}},
         .options = {{"--socket", "FILE", "the socket of orveld; without it the one of the settings"},
                     {"--json", "", "the same as JSON"}},
         .examples = {{"orvelctl status", "requests running and waiting, and how fast each program answers"}}},
        {.name = "doctor",
         .run = doctor,
         .summary = "what is not as it should be, and what to do about it",
         .forms = {{"[CHECK...]",
                    "these checks, without any all of them; an unknown one is answered with their names"}},
         .options = {{"--json", "", "{\"problems\",\"findings\":[{\"check\",\"severity\",\"text\",\"advice\",...}]}"}},
         .examples = {{"orvelctl doctor", "\"!!\" marks what to see to; the exit status is 1 when there is any"},
                      {"orvelctl doctor shares volumes", "why a share is not there"}}},
        {.name = "sweep",
         .run = sweep,
         .summary = "removes what is over",
         .forms = {{"", "ended sessions and work, results nobody can reach, what killed processes left"}},
         .options = {{"--json", "", "{\"failures\",\"swept\":[{\"name\",\"removed\",\"error\"}]}"},
                     {"--quiet", "", "only failures, for a timer"}},
         .examples = {{"orvelctl sweep --quiet", "safe beside running work and beside another sweep"}},
         .notes = "Keeps recycle bins to the settings recycle_days and recycle_mib, see orvel-settings(5), and "
                  "prepares the temporary folders of every volume. Needs root."},
        {.name = "volumes",
         .run = volumes,
         .summary = "makes the temporary folders of every volume",
         .forms = {{"", "to be called when the machine starts, and when shares were added"}},
         .options = {{"--user", "USER", "also that user's own"}},
         .examples = {{"orvelctl volumes", "prints the volumes that have them now"}}},
        {.name = "help",
         .run = help,
         .summary = "this list, or the options and examples of a command",
         .forms = {{"[COMMAND]", "\"orvelctl COMMAND --help\" is the same"}},
         .options = {{"--man", "", "the commands as a part of the manual page, for scdoc(1)"}}},
        {.name = "completion",
         .run = completion,
         .summary = "prints what a shell needs in order to complete command lines",
         .forms = {{"bash|zsh"}},
         .examples = {{". <(orvelctl completion bash)", "for this shell; packages install it for all"},
                      {". <(orvelctl completion zsh)", "in .zshrc, behind compinit"}}},
    };
    return all;
}

bool isAmong(std::string_view words, std::string_view word) {
    const std::string all = " " + std::string(words) + " ";
    return all.find(" " + std::string(word) + " ") != std::string::npos;
}

}  // namespace

const std::vector<Command>& commands() {
    return table();
}

const Command* findCommand(std::string_view name) {
    for (const Command& command : commands()) {
        if (command.name == name) return &command;
    }
    return nullptr;
}

std::string nameOf(const Form& form) {
    const std::string_view words = form.words;
    const std::string_view first = words.substr(0, words.find(' '));
    const bool named = !first.empty() && std::islower(static_cast<unsigned char>(first[0])) != 0 &&
                       first.find('|') == std::string_view::npos;
    return std::string(named ? first : "");
}

bool takes(const Option& option, std::string_view form) {
    return *option.forms == '\0' || isAmong(option.forms, form);
}

std::string takeForm(std::string_view command, std::vector<std::string>& words) {
    std::string known;
    for (const Form& form : findCommand(command)->forms) {
        std::string name = nameOf(form);
        if (!words.empty() && words.front() == name) {
            words.erase(words.begin());
            return name;
        }
        if (!isAmong(known, name)) known += " " + name;
    }
    throw UsageError(std::string(command) + " takes one of:" + known);
}

}  // namespace orvel::ctl
